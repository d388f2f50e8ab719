#pragma once

#include <QString>
#include <memory>

class QDialog;

namespace tagora {

class SettingsStore;
class Prompt;
class FileDialogProvider;
class PrinterCatalog;
class PrintDialogProvider;
class DialogRunner;
// Defined by the labels layer; held here only by pointer, so the services can
// carry a host's label program providers without this layer knowing them.
class AutomationRegistry;
class PageViewer;

// How a modal dialog is shown: on a screen it runs its own event loop; the
// headless host and the tests drive it from their script instead.
class DialogRunner {
public:
    virtual ~DialogRunner() = default;
    virtual int run(QDialog& dialog);
};

// What a dialog may ask of the control that opened it: an item's card, or
// one of the control's own print commands. Dialogs are given this rather
// than the control, so they sit below it and can be opened by any host.
class ControlCommands {
public:
    virtual ~ControlCommands() = default;
    // Opens the card of an item: from the ERP, or from the local databases.
    virtual void showItemCard(const QString& itemKey, bool fromErp) = 0;
    // Prints the marked items, as the control's print-by-items button does.
    virtual void printMarkedItems() = 0;
};

// What the control needs from its host's platform. A host leaves a member
// empty to get the default: the per-user store, message boxes, file dialogs
// and the machine's printers.
struct Services {
    std::shared_ptr<SettingsStore> settings;
    std::shared_ptr<Prompt> prompt;
    std::shared_ptr<FileDialogProvider> fileDialog;
    std::shared_ptr<PrinterCatalog> printers;
    // The printer dialog shown before a grid is printed.
    std::shared_ptr<PrintDialogProvider> printDialog;
    std::shared_ptr<DialogRunner> dialogs;
    // Providers of label programs' automation objects; the journal named in
    // the settings serves every program without one.
    std::shared_ptr<AutomationRegistry> automation;
    // Where pages the system writes are shown: the user's browser by default.
    std::shared_ptr<PageViewer> pages;
};

} // namespace tagora
