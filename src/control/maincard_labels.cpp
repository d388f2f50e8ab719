// The control's side of label printing through a label program: the label
// data query from the screen's settings, and the run.
#include "control/maincard.h"

#include "control/settingstable.h"
#include "erp/platelists.h"
#include "labels/itemquery.h"
#include "labels/labelfields.h"
#include "labels/labelrun.h"
#include "labels/programautomation.h"
#include "labels/bridges.h"
#include "labels/directlabels.h"
#include "labels/labelprograms.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include "ui_maincard.h"

#include <QApplication>
#include <QCheckBox>
#include <QLabel>
#include <QLineEdit>

namespace tagora {

namespace {

// The ticks and expressions of the label field table, read the same way for
// the query and for the fields a run sends, so the two agree on every column.
void readFieldRows(const MainCard& card, LabelQuerySettings& s, bool greySent = false)
{
    for (int row = 0; row < LabelFieldCount; ++row) {
        const Qt::CheckState state = card.control<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(row))->checkState();
        s.sent[size_t(row)] = state == Qt::Checked || (greySent && state == Qt::PartiallyChecked);
        if (auto* expr = card.control<QLineEdit>(QStringLiteral("txtFldExpr(%1)").arg(row)))
            s.expressions[size_t(row)] = expr->text();
    }
}
} // namespace

LabelQuerySettings MainCard::labelQuerySettings(bool greySent) const
{
    LabelQuerySettings s;
    readFieldRows(*this, s, greySent);
    s.useAccountKey = ui->ChkUseAccountKey->checkState() == Qt::Checked;
    s.accountKey = ui->txtAccountKey->text();
    s.companyName = ui->txtCompanyName->text();
    s.itemRangeCriteria = itemRangeCriteria();
    return s;
}

QVariant MainCard::BuildItemQuery(uchar pQueryType, uchar pOrderBy)
{
    return QVariant(tagora::BuildItemQuery(labelQuerySettings(false), pQueryType, pOrderBy));
}

QString MainCard::labelQueryProblem() const
{
    LabelQuerySettings s;
    readFieldRows(*this, s);
    return CheckItemQuery(s);
}

short MainCard::RunOLE(const QString& DefaultLabelName, short /*Copies*/, uchar pQueryType, short pServerType,
                       const QString& pDBName, bool pPrintHeadLab, bool ByPlate)
{
    // A label list's record fills the expression rows itself.
    if (!ByPlate) {
        if (const QString problem = labelQueryProblem(); !problem.isEmpty()) {
            m_services.prompt->critical(titles::Fault, problem);
            return 0;
        }
    }
    LabelRunRequest r;
    r.defaultLabel = DefaultLabelName;
    r.programCode = pServerType;
    r.dbPath = pDBName;
    r.printHeader = pPrintHeadLab;
    r.byPlate = ByPlate;
    r.delayText = ui->txtPrintDelay->text();
    r.sheets = control<QRadioButton>(QStringLiteral("OptPrinter(0)"))->isChecked();
    r.headerLabel = ui->txtLabelNameHead->text();
    r.priceFormat = ui->txtPriceFormat->text();
    // Roll printers take the labels last to first.
    const uchar order = control<QRadioButton>(QStringLiteral("OptPrinter(1)"))->isChecked() ? 2 : 1;
    r.sql = (ByPlate ? BuildItemQueryFromPlate(pQueryType, order) : BuildItemQuery(pQueryType, order)).toString();
    LabelQuerySettings rows;
    readFieldRows(*this, rows);
    const std::vector<PlateFieldRow> plateRows = ByPlate ? plateFieldRows() : std::vector<PlateFieldRow>();
    for (int row = 0; row < LabelFieldCount; ++row) {
        // The label list's record has a column for the rows that name a
        // parameter, an expression row included, and for no other.
        if (ByPlate ? !(plateRows[size_t(row)].sent && PlateVarNumber(plateRows[size_t(row)].varCaption) > 0)
                    : !RowIsSent(rows, row))
            continue;
        const auto* name = control<QLabel>(QStringLiteral("LblFldName(%1)").arg(row));
        const auto* desc = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(row));
        r.fields.push_back({name->text(), desc->property("Tag").toString(), name->property("Tag").toString() == QLatin1String("2")});
    }

    AutomationRegistry registry = m_services.automation ? *m_services.automation : AutomationRegistry();
    const QString journal = m_services.settings->value(kSettingsApp, kAutomationSection, kJournalKey).value_or(QString());
    if (!journal.trimmed().isEmpty())
        registry.setFallback(std::make_shared<JournalProvider>(journal.trimmed()));
    // A bridge the settings choose serves the program: its labels reach the
    // printer chosen on the general tab, or stay in the job folder.
    const QString progId = LabelProgram::progId(pServerType);
    const QString bridge = progId.isEmpty() ? QString() : ChosenBridge(*m_services.settings, progId);
    if (!bridge.isEmpty()) {
        const QString folder = directJobFolder();
        QString problem = IsKnownBridge(bridge) ? PrepareJobFolder(folder)
                                                : QStringLiteral("גשר ההדפסה '%1' אינו מוכר").arg(bridge);
        if (!problem.isEmpty()) {
            m_services.prompt->critical(QStringLiteral("תקלה במשלוח נתונים להדפסה"), problem);
            return 0;
        }
        const QString printer = ui->cmbPrinter->currentIndex() >= 0 ? ui->cmbPrinter->currentText() : QString();
        registry.add(progId, MakeBridgeProvider(bridge, BridgeOptionsFrom(*m_services.settings, printer, folder)));
    }

    const LabelRunResult result = RunLabelProgram(r, registry, this, [] { QCoreApplication::processEvents(); });
    switch (result.status) {
    case LabelRunResult::Status::Done:
        return -1;
    case LabelRunResult::Status::NoRecords:
        m_services.prompt->critical(titles::Fault, QStringLiteral("לא נבחרו פריטים להדפסה"));
        return 0;
    case LabelRunResult::Status::Failed:
        m_services.prompt->critical(QStringLiteral("תקלה במשלוח נתונים להדפסה"), result.message);
        return 0;
    }
    return 0;
}

} // namespace tagora
