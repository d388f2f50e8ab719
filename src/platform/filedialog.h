#pragma once

#include <QObject>
#include <QString>
#include <deque>
#include <optional>

class QWidget;

namespace tagora {

// What a file dialog is asked: a filter in the "Description|pattern|..." form
// that label-file choosers are written in, the 1-based filter shown first, flags.
struct FileRequest {
    QString title;
    QString filter;
    int filterIndex = 1;
    int flags = 0;
    QString initialPath;
};

// Shows a file dialog, or answers it from a script. Nothing means cancelled.
class FileDialogProvider {
public:
    virtual ~FileDialogProvider() = default;
    virtual std::optional<QString> openFile(const FileRequest& request) = 0;
};

class WidgetFileDialog : public FileDialogProvider {
public:
    explicit WidgetFileDialog(QWidget* parent = nullptr) : m_parent(parent) {}
    std::optional<QString> openFile(const FileRequest& request) override;

    // "All Files (*.*)|*.*|X (*.lbl)|*.lbl" as Qt writes it.
    static QStringList qtFilters(const QString& filter);

private:
    QWidget* m_parent;
};

// Answers dialogs in order from a queue; an empty queue cancels.
class ScriptedFileDialog : public FileDialogProvider {
public:
    void queue(const QString& path) { m_answers.push_back(path); }
    std::optional<QString> openFile(const FileRequest& request) override;
    const std::deque<FileRequest>& asked() const { return m_asked; }

private:
    std::deque<QString> m_answers;
    std::deque<FileRequest> m_asked;
};

// The control's file dialog (ComDlg1): properties set by the caller, then shown.
class CommonDialog : public QObject {
    Q_OBJECT
    Q_PROPERTY(QString Filter MEMBER filter)
    Q_PROPERTY(int FilterIndex MEMBER filterIndex)
    Q_PROPERTY(int Flags MEMBER flags)
    Q_PROPERTY(QString FileName MEMBER fileName)
    Q_PROPERTY(QString DialogTitle MEMBER title)
public:
    enum Flag { HideReadOnly = 4, CreatePrompt = 8192 };

    explicit CommonDialog(QObject* parent = nullptr);
    void setProvider(FileDialogProvider* provider) { m_provider = provider; }

    // True when a file was chosen (then in fileName); false when cancelled.
    bool showOpen();

    QString filter;
    int filterIndex = 1;
    int flags = 0;
    QString fileName;
    QString title;

private:
    FileDialogProvider* m_provider = nullptr;
};

} // namespace tagora
