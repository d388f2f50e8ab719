#pragma once

#include <QString>
#include <functional>

namespace tagora {

class SettingsStore;

// Shows a page the system wrote in a new window of the user's browser. The
// window lives on its own: nothing is kept of it and nothing waits for it.
class PageViewer {
public:
    virtual ~PageViewer() = default;
    // False with a description when the browser could not be started.
    virtual bool showPage(const QString& path, QString* error) = 0;
    // Moves the window that shows the page `from` on to the page `to`. A
    // desktop browser started for a page cannot be driven afterwards, so by
    // default the page moves itself: `from` must carry kPageReloadMeta (it
    // reloads itself every second), and is replaced, whole, by a page that
    // sends the window on to `to`. A viewer that can drive its window does so
    // instead.
    virtual bool navigate(const QString& from, const QString& to, QString* error);
};

// The head element of a page that waits to be moved on by navigate().
inline constexpr char kPageReloadMeta[] = "<meta http-equiv='refresh' content='1'>";

// A page that takes a while to write, with a waiting page before it: the
// waiting page (already written, with kPageReloadMeta) is shown in a new
// window, then writePage runs and the window moves to the page it returns
// (the page, or a page telling why it could not be made). Empty text leaves
// the window on the waiting page. False with a description when the window
// could not be opened or moved.
bool ShowPageAfterWaitPage(PageViewer& pages, const QString& waitPage, const std::function<QString()>& writePage,
                           QString* error);

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
