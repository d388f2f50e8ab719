#pragma once

#include <QString>

class QPrinter;
class QWidget;

namespace tagora {

class FileDialogProvider;

// The printer dialog a print command shows before it prints: on a screen
// the system's, in the headless host and the tests an answer from the
// script. False means cancelled: nothing is printed.
class PrintDialogProvider {
public:
    virtual ~PrintDialogProvider() = default;
    virtual bool setUp(QPrinter& printer) = 0;
};

class WidgetPrintDialog : public PrintDialogProvider {
public:
    explicit WidgetPrintDialog(QWidget* parent = nullptr) : m_parent(parent) {}
    bool setUp(QPrinter& printer) override;

private:
    QWidget* m_parent;
};

// Answered like the file dialogs, from the same queue of answers: the next
// one names the PDF file printed into; none left cancels.
class ScriptedPrintDialog : public PrintDialogProvider {
public:
    explicit ScriptedPrintDialog(FileDialogProvider* files) : m_files(files) {}
    bool setUp(QPrinter& printer) override;

private:
    FileDialogProvider* m_files;
};

} // namespace tagora
