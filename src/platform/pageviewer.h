#pragma once

#include <QString>

namespace tagora {

class SettingsStore;

// Shows a page the system wrote in a new window of the user's browser. The
// window lives on its own: nothing is kept of it and nothing waits for it.
class PageViewer {
public:
    virtual ~PageViewer() = default;
    // False with a description when the browser could not be started.
    virtual bool showPage(const QString& path, QString* error) = 0;
};

// The user's browser: the command in settings section "Browser", key
// "Command" ("%1" stands for the page's address; without it the address is
// appended), or else the desktop's default browser.
class DesktopPageViewer : public PageViewer {
public:
    explicit DesktopPageViewer(SettingsStore* settings = nullptr) : m_settings(settings) {}
    bool showPage(const QString& path, QString* error) override;

private:
    SettingsStore* m_settings;
};

} // namespace tagora
