// The control's side of direct labels: the layout, the job, the printers.
#include "control/maincard.h"

#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "labels/directlayout.h"
#include "labels/labelfields.h"
#include "labels/pagepdf.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "platform/pageviewer.h"
#include "platform/printercatalog.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include "ui_maincard.h"

#include <QCheckBox>
#include <QDir>
#include <QFileInfo>
#include <QLabel>

namespace tagora {

namespace {
// The store as the layout sees it, noting whether any write failed: the
// layout's own save reports nothing, but the save button must know.
class NotingStore : public SettingsStore {
public:
    NotingStore(SettingsStore& store, bool& failed)
        : m_store(store)
        , m_failed(failed)
    {
    }
    std::optional<QString> value(const QString& app, const QString& section, const QString& key) const override
    {
        return m_store.value(app, section, key);
    }
    bool setValue(const QString& app, const QString& section, const QString& key, const QString& text) override
    {
        const bool ok = m_store.setValue(app, section, key, text);
        m_failed = m_failed || !ok;
        return ok;
    }
    bool flush() override
    {
        const bool ok = m_store.flush();
        m_failed = m_failed || !ok;
        return ok;
    }
    QString refusal() const override { return m_store.refusal(); }

private:
    SettingsStore& m_store;
    bool& m_failed;
};
} // namespace

void MainCard::SetGetLabelDefs(int action)
{
    NotingStore store(*m_services.settings, m_saveFailed);
    tagora::SetGetLabelDefs(action, directLabelLayout(), store);
    if (action == 2)
        m_layoutLoaded = true;
    updateOutputLabel();
}

bool MainCard::SetDefaultPrinter(const QString& printer, QString* error)
{
    return tagora::SetDefaultPrinter(printer, error);
}

void MainCard::SetBrowserPrinter(const QString& printer)
{
    tagora::SetBrowserPrinter(printer, *m_services.settings);
}

// Each line in use learns its record column and whether it is a price, and
// its field is sent, so the label query carries it. This comes before the
// query is built, so the pictures' query has the column too.
bool MainCard::prepareDirectFields(QString* error)
{
    DirectLabelLayout& layout = directLabelLayout();
    for (int i = 0; i < kDirectLines; ++i) {
        LabelLineDef& line = layout.lines[size_t(i)];
        if (!line.UseCell)
            continue;
        if (line.FldID < 0 || line.FldID >= LabelFieldCount) {
            *error = QStringLiteral("שורה %1 של המדבקה הישירה אינה מוגדרת לשדה").arg(i + 1);
            return false;
        }
        line.FieldName = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(line.FldID))->property("Tag").toString();
        line.IsPrice = control<QLabel>(QStringLiteral("LblFldName(%1)").arg(line.FldID))->property("Tag").toString()
            == QLatin1String("2");
        control<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(line.FldID))->setChecked(true);
    }
    return true;
}

// A host learns from the result whether the page is there; the user sees why not.
bool MainCard::CreateLabFile(const QString& pFileName, const QString& pDBName, uchar pQueryType, uchar pOrderBy)
{
    QString error;
    if (prepareDirectFields(&error) && (error = labelQueryProblem()).isEmpty())
        error = CreateLabPage(pFileName, pDBName, BuildItemQuery(pQueryType, pOrderBy).toString(), directLabelLayout(),
                              ui->txtPriceFormat->text(), this);
    if (error.isEmpty())
        return true;
    m_services.prompt->critical(titles::Fault, error);
    return false;
}

bool MainCard::PrintDirectLabels(uchar queryType, const QString& dbPath, bool byPlate)
{
    auto fail = [this](const QString& error) {
        m_services.prompt->critical(titles::Fault, error);
        return false;
    };
    QString error;
    // A label list's record carries no expressions to check.
    if (!prepareDirectFields(&error) || (!byPlate && !(error = labelQueryProblem()).isEmpty()))
        return fail(error);
    const DirectLabelLayout& layout = directLabelLayout();
    // Before the job folder is emptied: a layout no sheet can hold leaves the last job's page as it was.
    if (!(error = CheckDirectLayout(layout)).isEmpty())
        return fail(error);
    const uchar order = control<QRadioButton>(QStringLiteral("OptPrinter(1)"))->isChecked() ? 2 : 1;
    const QString sql = (byPlate ? BuildItemQueryFromPlate(queryType, order) : BuildItemQuery(queryType, order)).toString();
    const QString folder = directJobFolder();
    if (!(error = PrepareJobFolder(folder)).isEmpty())
        return fail(error);

    LabelBarDef bar = layout.bar;
    QVector<BarcodeRefusal> refused;
    if (bar.BarType >= 0) {
        ZintBarcodeLibrary library;
        for (const LabelLineDef& line : layout.lines) {
            if (line.ViewType != 1 || !line.UseCell || line.FldID < 0)
                continue;
            error = MakeBarcodeImages(folder, line.FieldName, line.FldID, dbPath, sql, bar, library, &refused);
            if (!error.isEmpty())
                return fail(error);
        }
    }
    const QString page = QDir(folder).filePath(QStringLiteral("tgrlab1.htm"));
    // Printed automatically on a chosen printer: the page goes to the printer
    // as a PDF, with no dialog for anyone to answer. The page written for it
    // must not call print on load, or headless Chromium writes no PDF.
    const bool straightToPrinter = layout.page.PageAutoPrint && ui->cmbPrinter->currentIndex() >= 0;
    DirectLabelLayout written = layout;
    if (straightToPrinter)
        written.page.PageAutoPrint = false;
    long long labels = 0;
    error = CreateLabPage(page, dbPath, sql, written, ui->txtPriceFormat->text(), this, &labels);
    if (!error.isEmpty())
        return fail(error);
    if (straightToPrinter) {
        const QString printer = ui->cmbPrinter->currentText();
        const int timeout = automationTimeout();
        const QString pdf = QDir(folder).filePath(QStringLiteral("tgrlab1.pdf"));
        if (!(error = RenderPageToPdf(page, pdf, timeout)).isEmpty())
            return fail(error);
        if (!PrintFileOnCups(printer, pdf, false, QStringLiteral("מדבקות פריטים"), timeout, &error))
            return fail(error);
    } else if (!m_services.pages->showPage(page, &error)) {
        return fail(error);
    }

    // A value the barcode cannot carry gets no picture rather than a wrong
    // one; the user learns which labels lack theirs.
    const QString lacking = BarcodeRefusalMessage(refused, labels);
    if (!lacking.isEmpty())
        m_services.prompt->message(PromptIcon::Exclamation, titles::Attention, lacking);
    return true;
}

QVector<PreviewField> MainCard::previewRecord() const
{
    QVector<PreviewField> fields;
    for (int k = 0; k < LabelFieldCount; ++k) {
        const QString name = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(k))->property("Tag").toString();
        const bool price
            = control<QLabel>(QStringLiteral("LblFldName(%1)").arg(k))->property("Tag").toString() == QLatin1String("2");
        QVariant sample = QStringLiteral("1234567890");
        if (price)
            sample = 12.5;
        else if (name.compare(QLatin1String("VNItemName"), Qt::CaseInsensitive) == 0)
            sample = QStringLiteral("פריט לדוגמה");
        fields.push_back({name, price, sample});
    }
    // Every field is read, sent or not: a line may be set to a field the tab
    // does not send yet, and the job will send it.
    LabelQuerySettings settings = labelQuerySettings(false);
    settings.sent.fill(true);
    const QString tempDocs = dataFile(dbfiles::TempDocs);
    // Only what is there is read: the preview never makes or repairs a file.
    if (!QFileInfo::exists(tempDocs) || !CheckItemQuery(settings).isEmpty())
        return fields;
    Database db;
    if (db.open(tempDocs, Database::OpenMode::ReadOnly))
        return fields;
    for (int queryType : {QueryByItems, QueryByDocuments}) {
        DbError e;
        Statement first = db.prepare(tagora::BuildItemQuery(settings, queryType, OrderAscending), &e);
        if (e || first.step() != Statement::Step::Row)
            continue;
        for (PreviewField& f : fields) {
            if (const int column = first.columnIndex(f.name); column >= 0)
                f.value = first.value(column);
        }
        break;
    }
    return fields;
}

} // namespace tagora
