#pragma once

#include <memory>

namespace tagora {

class SettingsStore;
class Prompt;
class FileDialogProvider;
class PrinterCatalog;

// What the control needs from its host's platform. A host leaves a member
// empty to get the default: the per-user store, message boxes, file dialogs
// and the machine's printers.
struct Services {
    std::shared_ptr<SettingsStore> settings;
    std::shared_ptr<Prompt> prompt;
    std::shared_ptr<FileDialogProvider> fileDialog;
    std::shared_ptr<PrinterCatalog> printers;
};

} // namespace tagora
