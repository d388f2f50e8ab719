// The control's side of the ERP: the connection, the price lists offered,
// the item import with its public readers, and the ERP's label lists.
#include "control/maincard.h"

#include "dialogs/frmlogon.h"
#include "erp/connparams.h"
#include "erp/docimport.h"
#include "erp/textconv.h"
#include "labels/labelfields.h"
#include "localdb/conversions.h"
#include "erp/itemimport.h"
#include "erp/odbc.h"
#include "erp/platelists.h"
#include "localdb/schema.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include "ui_maincard.h"

#include <QCheckBox>
#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFileInfo>
#include <QKeyEvent>
#include <QLabel>

#include <cmath>

namespace tagora {

namespace {
constexpr int kTestTimeout = 10;

short fromBool(bool ok)
{
    return ok ? -1 : 0;
}

QString text(const QVariant& v)
{
    return v.isValid() && !v.isNull() ? v.toString() : QString();
}
} // namespace

void MainCard::LoadConnParams()
{
    tagora::LoadConnParams(*m_services.settings);
}

bool MainCard::TestConnection()
{
    const QString conn = currentConnString();
    ErpConnection erp;
    QString error;
    if (conn.isEmpty())
        error = QStringLiteral("סוג ההתחברות אינו מוגדר");
    else if (erp.open(conn, kTestTimeout, &error))
        return true;
    m_services.prompt->critical(titles::Fault, error);
    return false;
}

void MainCard::FillCmbPriceField()
{
    QComboBox* list = ui->cmbPriceField;
    list->clear();
    QString error;
    for (const PriceField& f : ReadPriceFields(currentConnString(), &error))
        list->addItem(f.text, f.priceList);
}

int MainCard::priceListNumber() const
{
    const int i = ui->cmbPriceField->currentIndex();
    return i < 0 ? 0 : ui->cmbPriceField->itemData(i).toInt();
}

int MainCard::runDialog(QDialog& dialog)
{
    return m_services.dialogs->run(dialog);
}

bool MainCard::reportRead(bool ok, const ReadError& error)
{
    if (!ok)
        m_services.prompt->critical(error.title, error.message);
    return ok;
}

// ------------------------------------------------------------ public readers

short MainCard::ReadItemPriority(const QString& CompPath, const QString& pDBPath, const QVariant& pFromItemSort,
                                 const QVariant& pToItemSort, short GetForeign, short pCopies, int pPriceField,
                                 bool /*pImportPackUnits*/, bool pByDocs, bool pWithWhouseData)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadItemPriority(ctx, pDBPath, text(pFromItemSort), text(pToItemSort),
                                                         GetForeign != 0, pCopies, pPriceField, pByDocs,
                                                         pWithWhouseData, &e),
                               e));
}

short MainCard::ReadItemFName(const QString& CompPath, const QString& pDBPath, const QVariant& pFromItemSort,
                              const QVariant& pToItemSort, bool pByDocs)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(
        reportRead(tagora::ReadItemFName(ctx, pDBPath, text(pFromItemSort), text(pToItemSort), pByDocs, &e), e));
}

short MainCard::ReadAlterKeyPRIORITY(const QString& CompPath, const QString& pDBFullName, const QVariant&,
                                     const QVariant&, bool pByDocs, const QString& pTableName)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadAlterKeyPRIORITY(ctx, pDBFullName, pByDocs, pTableName, &e), e));
}

short MainCard::ReadAlterKeySupPRIORITY(const QString& CompPath, const QString& pDBFullName, const QVariant&,
                                        const QVariant&, bool pByDocs, const QString& pTableName)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadAlterKeySupPRIORITY(ctx, pDBFullName, pByDocs, pTableName, &e), e));
}

short MainCard::ReadAlterPricePRIORITY(const QString& CompPath, const QString& pDBFullName, const QVariant&,
                                       const QVariant&, bool pByDocs, const QString& pTableName)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadAlterPricePRIORITY(ctx, pDBFullName, pByDocs, pTableName, &e), e));
}

short MainCard::ReadPriceListPriority(const QString& CompPath, const QString& pDBFullName,
                                      const QVariant& pFromItemSort, const QVariant& pToItemSort, bool pByDocs,
                                      const QString& pTableName)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadPriceListPriority(ctx, pDBFullName, text(pFromItemSort),
                                                              text(pToItemSort), pByDocs, pTableName, &e),
                               e));
}

short MainCard::ReadPriceListNamePriority(const QString& CompPath, const QString& pDBPath)
{
    ReadError e;
    const ErpReadContext ctx = docReadContext(CompPath);
    return fromBool(reportRead(tagora::ReadPriceListNamePriority(ctx, pDBPath, &e), e));
}

void MainCard::UpdateMainItemTables(const QString& pTempItemDB)
{
    QString error;
    if (!tagora::UpdateMainItemTables(pTempItemDB, &error))
        m_services.prompt->critical(titles::Error, error);
}

QString MainCard::BuildItemByDocCriteria(const QString& HeadTable, const QString& LineTable, const QString& FldID)
{
    return QStringLiteral(" And PART.PART In (SELECT DISTINCT ") + LineTable + QStringLiteral(".PART FROM ")
        + HeadTable + QStringLiteral(", ") + LineTable + QStringLiteral(" WHERE ") + LineTable + QLatin1Char('.')
        + FldID + QStringLiteral(" = ") + HeadTable + QLatin1Char('.') + FldID + m_currentDocCriteria
        + QLatin1Char(')');
}

// Long work on the screen's own thread: between rows the readers ask whether
// to stop, and that is when the screen catches up. Painting and moving the
// window go on; of the user's input only Esc gets through, as a cancel, so
// no command can start in the middle of another.
class MainCard::CancellableWork : public QObject {
public:
    explicit CancellableWork(MainCard* card)
        : m_card(card)
    {
        card->m_work = this;
    }
    ~CancellableWork() override { m_card->m_work = nullptr; }

    bool cancelRequested()
    {
        // Often enough for the bar and an Esc to feel immediate, rarely
        // enough to cost the import nothing.
        if (!m_polled.isValid() || m_polled.elapsed() >= 50) {
            m_polled.start();
            // Filtered only while the screen catches up, so a message box
            // the work shows afterwards takes its clicks as usual.
            qApp->installEventFilter(this);
            QCoreApplication::processEvents();
            qApp->removeEventFilter(this);
        }
        return m_cancelled;
    }

protected:
    bool eventFilter(QObject*, QEvent* event) override
    {
        switch (event->type()) {
        case QEvent::KeyPress:
            if (static_cast<QKeyEvent*>(event)->key() == Qt::Key_Escape)
                m_cancelled = true;
            return true;
        case QEvent::KeyRelease:
        case QEvent::MouseButtonPress:
        case QEvent::MouseButtonRelease:
        case QEvent::MouseButtonDblClick:
        case QEvent::Wheel:
        case QEvent::ShortcutOverride:
        case QEvent::Shortcut:
        case QEvent::TouchBegin:
        case QEvent::Close:
            return true;
        default:
            return false;
        }
    }

private:
    MainCard* m_card;
    QElapsedTimer m_polled;
    bool m_cancelled = false;
};

bool MainCard::cancelRequested()
{
    return m_work && m_work->cancelRequested();
}

std::optional<short> MainCard::defaultCopies() const
{
    bool ok = false;
    const double value = ui->txtCopies->text().trimmed().toDouble(&ok);
    if (!ok || value < -32768 || value > 32767)
        return std::nullopt;
    return short(std::nearbyint(value));
}

ErpReadContext MainCard::plainContext(const QString& conn)
{
    ErpReadContext ctx;
    ctx.connString = conn;
    ctx.progress = this;
    return ctx;
}

ErpReadContext MainCard::docReadContext(const QString& conn)
{
    ErpReadContext ctx = plainContext(conn);
    ctx.itemByDocCriteria = m_currentItemByDocCriteria.sql;
    ctx.itemByDocParams = m_currentItemByDocCriteria.params;
    return ctx;
}

void MainCard::UpdateDocsAlterKeys(const QString& pDBName)
{
    QString error;
    if (!tagora::UpdateDocsAlterKeys(pDBName, &error))
        m_services.prompt->critical(titles::Fault, error);
}

namespace {
// A qDocTypes row as a host hands it over, its columns found without regard to case.
DocTypeRecipe recipeOf(const QVariantMap& row)
{
    return DocTypeRecipeFrom([&row](const QString& column) {
        for (auto it = row.cbegin(); it != row.cend(); ++it)
            if (it.key().compare(column, Qt::CaseInsensitive) == 0)
                return it.value();
        return QVariant();
    });
}

QVariant dateOrNull(const QVariant& value)
{
    if (value.typeId() == QMetaType::QDate || value.typeId() == QMetaType::QDateTime)
        return QVariant(value.toDate());
    const QString text = value.toString().trimmed();
    if (text.isEmpty())
        return QVariant();
    const auto d = ParseDayMonthYear(text);
    return d ? QVariant(*d) : QVariant();
}
} // namespace

QString MainCard::BuildDocRangeCriteria(const QVariantMap& rsDT, const QVariant& FromDate, const QVariant& ToDate,
                                        const QString& FromDocNum, const QString& ToDocNum, int Indx,
                                        bool pIncludeDraft)
{
    const short type = erpConnType();
    const ErpQuery criteria = tagora::BuildDocRangeCriteria(recipeOf(rsDT), dateOrNull(FromDate), dateOrNull(ToDate),
                                                            FromDocNum, ToDocNum, Indx, pIncludeDraft,
                                                            erpDialect().likeWildcard, type);
    m_currentDocCriteria = CriteriaText(criteria, type);
    return m_currentDocCriteria;
}

int MainCard::ReadStockPriority(const QString& CompPath, const QString& pDBName, short DocTypeID,
                                const QVariantMap& rsDT, const QVariant& FromDate, const QVariant& ToDate,
                                bool pDraftDocs, bool pWithExport)
{
    DocImportOptions o = docImportOptions();
    o.withExport = pWithExport;
    DocTypeRecipe recipe = recipeOf(rsDT);
    recipe.docType = DocTypeID;
    DocCriteriaState state;
    ReadError error;
    const qint64 read = tagora::ReadStockPriority(plainContext(CompPath), pDBName, recipe, dateOrNull(FromDate),
                                                  dateOrNull(ToDate), pDraftDocs, o, &state, &error);
    m_currentDocCriteria = state.currentDocCriteria.sql;
    m_currentItemByDocCriteria = state.currentItemByDocCriteria;
    if (read == 0) {
        m_services.prompt->critical(error.title, error.message);
        return 0;
    }
    return int(std::clamp<qint64>(read, std::numeric_limits<int>::min(), std::numeric_limits<int>::max()));
}

DocImportOptions MainCard::docImportOptions() const
{
    DocImportOptions o;
    o.dataFolder = ui->txtDBPath->text();
    o.fromDate = ui->txtFromDate->text();
    o.toDate = ui->txtToDate->text();
    o.fromDocNum = ui->txtFromDocNum->text();
    o.toDocNum = ui->txtToDocNum->text();
    o.refPref = ui->txtRefPref->text();
    o.qtyFrom = ui->cmbQtyFrom->currentIndex();
    o.qtyFactor = ui->txtQtyFactor->text();
    o.onlyLine0 = ui->chkOnlyLine0->isChecked();
    o.readDocItems = ui->chkReadDocItems->isChecked();
    if (auto* send = control<QCheckBox>(QStringLiteral("ChkFldSend(17)")))
        o.withExport = send->isChecked();
    return o;
}

void MainCard::ImportDocuments()
{
    const DocImportOptions o = docImportOptions();

    if (const DbError e = PrepareDataFolder(o.dataFolder)) {
        m_services.prompt->critical(titles::Fault, e.message);
        return;
    }
    if (!caselessKeys(dataFile(dbfiles::Items)))
        return;
    const QString conn = currentConnString();
    const QString tempItems = dataFile(dbfiles::TempItems);
    const short copies = defaultCopies().value_or(0);
    const short foreign = ui->CmbItemNameType->currentIndex() == 1 ? -1 : 0;

    // The items of each type's documents, read with that type's criteria; a
    // failure asks whether the documents alone are worth going on with.
    const DocItemsStep items = [&](const DocTypeRecipe&, const DocCriteriaState& state) {
        m_currentDocCriteria = state.currentDocCriteria.sql;
        m_currentItemByDocCriteria = state.currentItemByDocCriteria;
        if (ImportItemsByDocs(conn, tempItems, ui->txtFromItemSort->text(), ui->txtToItemSort->text(), foreign, copies,
                              priceListNumber(), true, true)
            != 0)
            return true;
        return m_services.prompt->ask(PromptIcon::Question, titles::Attention, QStringLiteral("להמשיך בכל זאת?"));
    };
    DocCriteriaState state;
    DocImportResult result;
    {
        CancellableWork work(this);
        result = tagora::ImportDocuments(plainContext(conn), o, &state, items);
    }
    m_currentDocCriteria = state.currentDocCriteria.sql;
    m_currentItemByDocCriteria = state.currentItemByDocCriteria;
    for (const ReadError& e : result.errors)
        m_services.prompt->critical(e.title, e.message);
    if (result.completed)
        cmdSelectDocItems_Click();
}

short MainCard::ImportItemsByDocs(const QString& WizPath, const QString& MyDBName, const QVariant& pFromItemKey,
                                  const QVariant& pToItemKey, short UseFName, short pCopies, int pPriceField,
                                  bool pImportPackUnits, bool)
{
    setMessage(QStringLiteral("קורא פריטים..."));
    if (!ReadItemPriority(WizPath, MyDBName, pFromItemKey, pToItemKey, UseFName, pCopies, pPriceField,
                          pImportPackUnits, true, ui->chkReadItemParam->isChecked()))
        return 0;
    setMessage(QStringLiteral("קורא שמות לועזיים..."));
    if (!ReadItemFName(WizPath, MyDBName, pFromItemKey, pToItemKey, true))
        return 0;
    if (ui->ChkImportAlterKeys->isChecked()) {
        setMessage(QStringLiteral("קורא מפתחות חליפיים..."));
        if (!ReadAlterKeyPRIORITY(WizPath, MyDBName, pFromItemKey, pToItemKey, true, QStringLiteral("tTempAlterKeys")))
            return 0;
    }
    if (ui->ChkImportAlterPrices->isChecked()) {
        setMessage(QStringLiteral("קורא מחירים מיוחדים..."));
        if (!ReadAlterPricePRIORITY(WizPath, MyDBName, pFromItemKey, pToItemKey, true,
                                    QStringLiteral("tTempAlterPrices")))
            return 0;
    }
    if (ui->chkReadPriceList->isChecked()) {
        setMessage(QStringLiteral("קורא את המחירונים הנדרשים..."));
        return ReadPriceListPriority(WizPath, MyDBName, pFromItemKey, pToItemKey, true, QStringLiteral("tTempPriceList"));
    }
    return -1;
}

// ------------------------------------------------------------ the commands

void MainCard::CmdConnect_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    FrmLogon dialog(m_services, this);
    const bool connected = runDialog(dialog) == QDialog::Accepted;
    UserControl_InitProperties();
    if (connected)
        RefillErpLists();
}

void MainCard::ImportItems()
{
    if (ui->ChkCleanAlterKeys->isChecked()
        && !m_services.prompt->ask(PromptIcon::Question, titles::Attention,
                                   QStringLiteral("אתה בטוח שברצונך לדרוס את המפתחות והברקודים החליפיים?")))
        return;

    auto fail = [this](const QString& message) { m_services.prompt->critical(titles::Error, message); };
    const QString conn = currentConnString();
    const int priceList = priceListNumber();
    const std::optional<short> defaultCount = defaultCopies();
    if (!defaultCount)
        return fail(QStringLiteral("ברירת המחדל לעותקים אינה מספר: '%1'").arg(ui->txtCopies->text()));
    const short copies = *defaultCount;

    const QString folder = ui->txtDBPath->text();
    const QString itemsDb = dataFile(dbfiles::Items);
    const QString tempItemsDb = dataFile(dbfiles::TempItems);
    const QString tempDocsDb = dataFile(dbfiles::TempDocs);
    const bool cleanItems = ui->ChkClean->isChecked();
    const bool cleanAlter = ui->ChkCleanAlterKeys->isChecked();

    DbError e;
    if (cleanItems && cleanAlter && QFileInfo::exists(itemsDb)) {
        if (CreateItemsDB(itemsDb, &e).isEmpty() || UpgradeAccountDef(itemsDb, &e).isEmpty())
            return fail(e.message);
    }
    if ((e = PrepareDataFolder(folder)))
        return fail(e.message);
    if (!caselessKeys(itemsDb))
        return;
    if (CreateTempItemsDB(tempItemsDb, itemsDb, &e).isEmpty())
        return fail(e.message);
    const short foreign = ui->CmbItemNameType->currentIndex() == 1 ? -1 : 0;

    // Nothing is emptied here: each table is emptied in the transaction that
    // refills it (the items by their reader, the alternate keys and special
    // prices by the merge), so a crash or a failure part way leaves the old rows.
    QStringList emptiedByMerge;
    if (cleanItems) {
        setMessage(QStringLiteral("מנקה פריטים..."));
        if (ui->ChkImportAlterPrices->isChecked())
            emptiedByMerge << QStringLiteral("tAlterPrices");
    }
    if (cleanAlter) {
        setMessage(QStringLiteral("מנקה מקטים חליפיים..."));
        emptiedByMerge << QStringLiteral("tAlterKeys");
    }

    const QString fromSort = ui->txtFromItemSort->text();
    const QString toSort = ui->txtToItemSort->text();
    CancellableWork work(this);
    setMessage(QStringLiteral("קורא פריטים..."));
    {
        ReadError readError;
        const ErpReadContext ctx = docReadContext(conn);
        if (!reportRead(tagora::ReadItemPriority(ctx, itemsDb, fromSort, toSort, foreign != 0, copies, priceList,
                                                 false, ui->chkReadItemParam->isChecked(), &readError, cleanItems),
                        readError))
            return;
    }
    setMessage(QStringLiteral("קורא שמות לועזיים..."));
    if (!ReadItemFName(conn, itemsDb, fromSort, toSort, false))
        return;
    const QString tempAlterKeys = QStringLiteral("tTempAlterKeys");
    if (ui->ChkImportAlterKeys->isChecked()) {
        setMessage(QStringLiteral("קורא מפתחות חליפיים לקוחות..."));
        if (!ReadAlterKeyPRIORITY(conn, tempItemsDb, fromSort, toSort, false, tempAlterKeys))
            return;
    }
    if (ui->ChkImportAltKeySup->isChecked()) {
        setMessage(QStringLiteral("קורא מפתחות חליפיים ספקים..."));
        if (!ReadAlterKeySupPRIORITY(conn, tempItemsDb, fromSort, toSort, false, tempAlterKeys))
            return;
    }
    if (ui->ChkImportAlterPrices->isChecked()) {
        setMessage(QStringLiteral("קורא מחירים מיוחדים..."));
        if (!ReadAlterPricePRIORITY(conn, tempItemsDb, fromSort, toSort, false, QStringLiteral("tTempAlterPrices")))
            return;
    }
    if (ui->chkReadPriceList->isChecked()) {
        setMessage(QStringLiteral("קורא את כל המחירונים..."));
        if (!ReadPriceListPriority(conn, tempItemsDb, fromSort, toSort, false, QStringLiteral("tTempPriceList")))
            return;
    }
    setMessage(QStringLiteral("מעדכן נתוני פריטים בטבלאות ראשיות..."));
    QString mergeError;
    if (!tagora::UpdateMainItemTables(tempItemsDb, &mergeError, emptiedByMerge))
        return fail(mergeError);
    if (!QFileInfo::exists(tempDocsDb)) {
        setMessage(QStringLiteral("מכין את בסיס הנתונים..."));
        if (CreateTempDocsDB(dataFile(dbfiles::Config), itemsDb, tempDocsDb, &e).isEmpty())
            return fail(e.message);
    }
    if (ui->chkReadPriceList->isChecked()) {
        setMessage(QStringLiteral("קורא את שמות המחירונים..."));
        if (!ReadPriceListNamePriority(conn, tempDocsDb))
            return;
    }
    setProgress(1.0);
    setMessage(QStringLiteral("הייבוא הסתיים בהצלחה"));
}

// ------------------------------------------------------------ label lists

void MainCard::FillCmbUser()
{
    QString error;
    const QVector<ErpUser> users = ReadErpUsers(currentConnString(), &error);
    // No users read (no ERP, or none there): the list keeps what it offered.
    if (users.isEmpty())
        return;
    QComboBox* list = ui->cmbUser;
    list->clear();
    for (const ErpUser& u : users)
        list->addItem(u.login, u.user);
}

int MainCard::GetUserNum()
{
    const int i = ui->cmbUser->currentIndex();
    return i == -1 ? 1 : ui->cmbUser->itemData(i).toInt();
}

short MainCard::ReadLabelDefPriority(const QString& CompPath, const QString& pDBPath)
{
    ReadError e;
    return fromBool(reportRead(tagora::ReadLabelDefPriority(plainContext(CompPath), pDBPath, ui->txtLabelName->text(), &e), e));
}

short MainCard::ReadLabelDataPriority(const QString& CompPath, const QString& pDBPath)
{
    ReadError e;
    return fromBool(reportRead(tagora::ReadLabelDataPriority(plainContext(CompPath), pDBPath, GetUserNum(), &e), e));
}

std::vector<PlateFieldRow> MainCard::plateFieldRows() const
{
    std::vector<PlateFieldRow> rows;
    for (int row = 0; row < LabelFieldCount; ++row) {
        const auto* send = control<QCheckBox>(QStringLiteral("ChkFldSend(%1)").arg(row));
        const auto* var = control<QLabel>(QStringLiteral("lblVarNum(%1)").arg(row));
        const auto* desc = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(row));
        rows.push_back({send && send->checkState() == Qt::Checked, var ? var->text() : QString(),
                        desc ? desc->property("Tag").toString() : QString()});
    }
    return rows;
}

QVariant MainCard::BuildItemQueryFromPlate(uchar, uchar pOrderBy)
{
    const QString key = ui->txtAccKeyForPlate->text();
    const bool useKey = ui->ChkUseAccKeyForPlate->checkState() == Qt::Checked && !key.isEmpty();
    return QVariant(PlateItemQuery(useKey ? key : QString(), plateFieldRows(), pOrderBy));
}

void MainCard::PrintFromLabelList()
{
    auto fail = [this](const QString& message) { m_services.prompt->critical(titles::Fault, message); };
    if (const DbError e = PrepareDataFolder(ui->txtDBPath->text()))
        return fail(e.message);
    DbError e;
    const QString db = CreateTempDocsDB(dataFile(dbfiles::Config), dataFile(dbfiles::Items), dataFile(dbfiles::TempDocs), &e);
    if (db.isEmpty())
        return fail(e.message);
    const QString conn = currentConnString();
    // A list read in part would print labels the ERP never asked for, or miss
    // some without a word: a failed read ends the run.
    setMessage(QStringLiteral("קורא רשימת מדבקות"));
    if (!ReadLabelDefPriority(conn, db))
        return ClearMessage();
    setMessage(QStringLiteral("קורא נתונים מהמשטח"));
    if (!ReadLabelDataPriority(conn, db))
        return ClearMessage();
    const short program = GetOLEOption();
    setMessage(QStringLiteral("שולח מדבקות להדפסה"));
    // The direct engine (code 6) draws the labels itself, on the printer
    // chosen as the print buttons set it; no label program is driven.
    if (program == 6 && ui->cmbPrinter->currentIndex() >= 0) {
        QString error;
        if (!SetDefaultPrinter(ui->cmbPrinter->currentText(), &error)) {
            fail(error);
            return ClearMessage();
        }
        SetBrowserPrinter(ui->cmbPrinter->currentText());
    }
    const bool printed = program == 6 ? PrintDirectLabels(2, db, true)
                                                   : RunOLE(ui->txtLabelName->text(), 1, 2, program, db, false, true) != 0;
    if (!printed)
        return ClearMessage();
    setProgress(1.0);
    setMessage(QStringLiteral("סריקת המשטח והדפסת המדבקות הסתיימה"));
}

} // namespace tagora
