// The public methods and the hooks whose work belongs to the importers, the
// label engines and the dialogs. Until those parts are in, each returns the
// failure value a host expects from it and does nothing else.
#include "control/maincard.h"

namespace tagora {

void MainCard::CreateListFile(const QString&, const QString&, uchar, uchar) {}

// ---- hooks

void MainCard::ShowItemList(uchar, const QString&) {}

void MainCard::showItemCard(const QString&, bool) {}

} // namespace tagora
