// The item list: what a print run would produce, as a page in the browser.
#include "control/maincard.h"

#include "cards/priorityinfo.h"
#include "cards/tagorainfo.h"
#include "erp/connparams.h"
#include "localdb/schema.h"

#include "labels/directlabels.h"
#include "labels/itemlist.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"

#include "ui_maincard.h"

#include <QCheckBox>
#include <QDir>
#include <QLabel>
#include <QRadioButton>

namespace tagora {

// Every field the user has not cleared is listed, a grey one too; the query
// is built the same way, so each listed field has its column.
QString MainCard::writeItemList(const QString& fileName, const QString& dbPath, uchar queryType, uchar orderBy)
{
    const LabelQuerySettings settings = labelQuerySettings(true);
    if (const QString problem = CheckItemQuery(settings); !problem.isEmpty())
        return problem;
    QVector<ItemListColumn> columns;
    for (int row = 0; row < LabelFieldCount; ++row) {
        if (!RowIsSent(settings, row))
            continue;
        const auto* desc = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(row));
        const auto* name = control<QLabel>(QStringLiteral("LblFldName(%1)").arg(row));
        columns.push_back({desc->text(), desc->property("Tag").toString(), name->property("Tag").toString()});
    }
    return CreateItemListPage(fileName, dbPath, tagora::BuildItemQuery(settings, queryType, orderBy), columns,
                              ui->txtPriceFormat->text(), this);
}

void MainCard::CreateListFile(const QString& pFileName, const QString& pDBName, uchar pQueryType, uchar pOrderBy)
{
    if (const QString error = writeItemList(pFileName, pDBName, pQueryType, pOrderBy); !error.isEmpty())
        m_services.prompt->critical(titles::Fault, error);
}

// ---- hooks

void MainCard::ShowItemList(uchar queryType, const QString& dbPath)
{
    // Roll printers take the labels last to first; the list shows them in that order.
    const uchar order = control<QRadioButton>(QStringLiteral("OptPrinter(1)"))->isChecked() ? 2 : 1;
    const QString folder = directJobFolder();
    QString error = PrepareJobFolder(folder);
    const QString page = QDir(folder).filePath(QStringLiteral("tgrlab2.htm"));
    if (error.isEmpty())
        error = writeItemList(page, dbPath, queryType, order);
    if (error.isEmpty() && m_services.pages->showPage(page, &error))
        return;
    m_services.prompt->critical(titles::Fault, error);
}

// The card of an item row's picture: from the ERP over the stored connection,
// or from the local databases of the data folder, without an account.
void MainCard::showItemCard(const QString& itemKey, bool fromErp)
{
    if (fromErp) {
        const ConnParams& c = connParams();
        PriorityInfo(m_services.pages, m_services.prompt)
            .OpenItemHTML(itemKey, BuildConnString(c.server, c.uid, c.pwd, c.database, c.type), c.type, c.path);
        return;
    }
    TagoraInfo(m_services.pages, m_services.prompt).OpenItemHTML(itemKey, dataFile(dbfiles::TempDocs), QString());
}

} // namespace tagora
