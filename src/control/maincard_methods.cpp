// The public methods and the hooks whose work belongs to the importers, the
// label engines and the dialogs. Until those parts are in, each returns the
// failure value a host expects from it and does nothing else.
#include "control/maincard.h"

namespace tagora {

short MainCard::RunOLE(const QString&, short, uchar, short, const QString&, bool, bool)
{
    return 0;
}

QVariant MainCard::BuildItemQuery(uchar, uchar)
{
    return QVariant(QString());
}

void MainCard::FillCmbPriceField() {}

short MainCard::ReadAlterKeyPRIORITY(const QString&, const QString&, const QVariant&, const QVariant&, bool,
                                     const QString&)
{
    return 0;
}

short MainCard::ReadAlterKeySupPRIORITY(const QString&, const QString&, const QVariant&, const QVariant&, bool,
                                        const QString&)
{
    return 0;
}

QString MainCard::BuildDocRangeCriteria(const QVariantMap&, const QVariant&, const QVariant&, const QString&,
                                        const QString&, int, bool)
{
    return QString();
}

QString MainCard::BuildItemByDocCriteria(const QString&, const QString&, const QString&)
{
    return QString();
}

short MainCard::ImportItemsByDocs(const QString&, const QString&, const QVariant&, const QVariant&, short, short,
                                  int, bool, bool)
{
    return 0;
}

short MainCard::ReadItemPriority(const QString&, const QString&, const QVariant&, const QVariant&, short, short,
                                 int, bool, bool, bool)
{
    return 0;
}

void MainCard::UpdateMainItemTables(const QString&) {}

void MainCard::FillCmbUser() {}

short MainCard::ReadLabelDefPriority(const QString&, const QString&)
{
    return 0;
}

int MainCard::GetUserNum()
{
    return 0;
}

short MainCard::ReadLabelDataPriority(const QString&, const QString&)
{
    return 0;
}

QVariant MainCard::BuildItemQueryFromPlate(uchar, uchar)
{
    return QVariant(QString());
}

short MainCard::ReadPriceListPriority(const QString&, const QString&, const QVariant&, const QVariant&, bool,
                                      const QString&)
{
    return 0;
}

int MainCard::ReadStockPriority(const QString&, const QString&, short, const QVariantMap&, const QVariant&,
                                const QVariant&, bool, bool)
{
    return 0;
}

short MainCard::ReadAlterPricePRIORITY(const QString&, const QString&, const QVariant&, const QVariant&, bool,
                                       const QString&)
{
    return 0;
}

void MainCard::CreateLabFile(const QString&, const QString&, uchar, uchar) {}

short MainCard::ReadPriceListNamePriority(const QString&, const QString&)
{
    return 0;
}

void MainCard::CreateListFile(const QString&, const QString&, uchar, uchar) {}

short MainCard::ReadItemFName(const QString&, const QString&, const QVariant&, const QVariant&, bool)
{
    return 0;
}

void MainCard::UpdateDocsAlterKeys(const QString&) {}

// ---- hooks

void MainCard::LoadConnParams() {}

bool MainCard::TestConnection()
{
    return false;
}

void MainCard::SetGetLabelDefs(int) {}

void MainCard::SetDefaultPrinter(const QString&) {}

void MainCard::SetBrowserPrinter(const QString&) {}

void MainCard::PrintDirectLabels(uchar, const QString&) {}

void MainCard::ShowItemList(uchar, const QString&) {}

void MainCard::ImportItems() {}

void MainCard::ImportDocuments() {}

void MainCard::PrintFromLabelList() {}

void MainCard::showDialog(const QString&) {}

} // namespace tagora
