#include "dialogs/frmselectdocitem.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/namedcontrols.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmselectdocitem.h"

#include <QItemSelectionModel>
#include <QPainter>
#include <QPixmap>

namespace tagora {

namespace {
// Grid columns of the documents, as the screen numbers them.
constexpr int kHeadInclude = 5;
constexpr int kHeadWizFileId = 7;
constexpr int kHeadNumber = 8;


// A document key as SQL: the number itself, or NULL (which equals nothing)
// for a text that is no whole number, so no grid text ever becomes SQL.
QString keyLiteral(const QString& text)
{
    bool ok = false;
    const qlonglong n = text.trimmed().toLongLong(&ok);
    return ok ? QString::number(n) : QStringLiteral("NULL");
}
} // namespace

FrmSelectDocItem::FrmSelectDocItem(const QString& dataFolder, ControlCommands* commands,
                                   std::shared_ptr<Prompt> prompt, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmSelectDocItemForm>())
    , m_headers(new BoundTableModel(this))
    , m_lines(new BoundTableModel(this))
    , m_commands(commands)
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
{
    ui->setupUi(this);
    renameIndexedControls(this);
    using K = BoundColumn::Kind;
    const QString db = joinDataPath(dataFolder, dbfiles::TempDocs);

    // Column 0 stands where the grid's fixed column was, so the documents'
    // columns keep their numbers (print box 5, keys 7 and 8).
    m_headers->setSource(db, QStringLiteral("tTempDocHeaders"), {QStringLiteral("WizFileID"), QStringLiteral("Number")},
                         {boundColumn(QString(), QString(), K::Text),
                          boundColumn(QStringLiteral("MyDocDesc"), QStringLiteral("סוג מסמך"), K::Text),
                          boundColumn(QStringLiteral("Reference1"), QStringLiteral("אסמכתא"), K::Text),
                          boundColumn(QStringLiteral("DocDateText"), QStringLiteral("תאריך"), K::Text),
                          boundColumn(QStringLiteral("AccountKey"), QStringLiteral("לקוח/ספק"), K::Text),
                          boundColumn(QStringLiteral("Include"), QStringLiteral("להדפיס?"), K::Check, true),
                          boundColumn(QStringLiteral("CardName"), QStringLiteral("שם לקוח/ספק"), K::Text),
                          boundColumn(QStringLiteral("WizFileID"), QString(), K::Number),
                          boundColumn(QStringLiteral("Number"), QString(), K::Number)});
    ui->VSDocHeaders->setBoundModel(m_headers);
    for (int c : {0, kHeadWizFileId, kHeadNumber})
        ui->VSDocHeaders->setColumnHidden(c, true);

    BoundColumn picture = boundColumn(QString(), QString(), K::Picture, false, Qt::AlignCenter);
    picture.icon = ItemCardIcon();
    // Copies are a 16-bit count; a negative one means nothing to a printer.
    BoundColumn copies = boundColumn(QStringLiteral("Copies"), QStringLiteral("עותקים"), K::Number, true);
    copies.minimum = 0;
    copies.maximum = 32767;
    m_lines->setSource(db, QStringLiteral("tTempDocLines"),
                       {QStringLiteral("WizFileID"), QStringLiteral("HeadNumber"), QStringLiteral("LineNum")},
                       {picture, boundColumn(QStringLiteral("LineNum"), QStringLiteral("שורה"), K::Number),
                        boundColumn(QStringLiteral("ItemKey"), QStringLiteral("מפתח פריט"), K::Text),
                        boundColumn(QStringLiteral("ItemNameSon"), QStringLiteral("שם פריט"), K::Text),
                        boundColumn(QStringLiteral("Quantity"), QStringLiteral("כמות"), K::Number),
                        boundColumn(QStringLiteral("Warehouse"), QStringLiteral("מחסן"), K::Number), copies,
                        boundColumn(QStringLiteral("Include"), QStringLiteral("להדפיס?"), K::Check, true)});
    ui->VSDocLines->setBoundModel(m_lines);
    ui->VSDocLines->stretchColumn(3);

    // A value typed into a cell and refused (or not written) is said at once;
    // the cell keeps what the file holds.
    for (BoundTableModel* m : {m_headers, m_lines})
        connect(m, &BoundTableModel::writeFailed, this,
                [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->VSDocHeaders->selectionModel(), &QItemSelectionModel::currentRowChanged, this,
            &FrmSelectDocItem::followCurrentDocument);
    connect(ui->VSDocLines, &BoundGrid::cellActivated, this, &FrmSelectDocItem::VSDocLines_Click);
    connect(ui->CmdAllHeaders, &QPushButton::clicked, this,
            [this] { m_headers->setFieldInAllRows(QStringLiteral("Include"), 1); });
    connect(ui->cmdNoneHeaders, &QPushButton::clicked, this,
            [this] { m_headers->setFieldInAllRows(QStringLiteral("Include"), 0); });
    // The lines grid holds the current document's lines only, so these never
    // touch another document's marks.
    connect(ui->CmdAllLines, &QPushButton::clicked, this,
            [this] { m_lines->setFieldInAllRows(QStringLiteral("Include"), 1); });
    connect(ui->cmdNoneLines, &QPushButton::clicked, this,
            [this] { m_lines->setFieldInAllRows(QStringLiteral("Include"), 0); });
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    Form_Load();
}

FrmSelectDocItem::~FrmSelectDocItem() = default;

QString FrmSelectDocItem::BuildDocLinesQuery(const QString& pWizFileID, const QString& pHeadNumber)
{
    // The keys come last: the grid does not show them, its writes find the line by them.
    return QStringLiteral("SELECT tTempDocLines.LineNum, tTempDocLines.ItemKey, tTempDocLines.ItemNameSon"
                          ", tTempDocLines.Quantity, tTempDocLines.Warehouse, tTempDocLines.Copies"
                          ", tTempDocLines.Include, tTempDocLines.WizFileID, tTempDocLines.HeadNumber"
                          " FROM tTempDocLines Where WizFileID=")
        + keyLiteral(pWizFileID) + QStringLiteral(" And HeadNumber=") + keyLiteral(pHeadNumber)
        + QStringLiteral(" ORDER BY tTempDocLines.HeadNumber, tTempDocLines.LineNum");
}

void FrmSelectDocItem::Form_Load()
{
    // No file yet (nothing imported) or one that cannot be read: both grids
    // stay empty, as every other step here goes on past a failure.
    m_headers->setQuery(QStringLiteral("SELECT * FROM qSelectDocHeaders"));
    // Moving to the first document shows its lines; with none there is no
    // move, and the lines grid is emptied here instead.
    if (m_headers->rowCount() > 0)
        ui->VSDocHeaders->setCurrentRowIndex(0, 1);
    else
        followCurrentDocument();
}

void FrmSelectDocItem::followCurrentDocument()
{
    const int row = ui->VSDocHeaders->currentRowIndex();
    m_lines->setQuery(BuildDocLinesQuery(ui->VSDocHeaders->text(row, kHeadWizFileId),
                                         ui->VSDocHeaders->text(row, kHeadNumber)));
    RearrangeDocLines();
}

void FrmSelectDocItem::RearrangeDocLines()
{
    // Lines that could not be read for this document must not stay in view
    // under it: they belong to the one before, and marks set here would land there.
    if (!m_lines->lastError().isEmpty())
        m_lines->clearRows();
    ui->VSDocLines->sizeColumns();
}

void FrmSelectDocItem::VSDocLines_Click(int row, int column)
{
    if (column != 0 || !m_commands)
        return;
    const QString key = m_lines->value(row, QStringLiteral("ItemKey")).toString();
    if (key.isEmpty())
        return;
    m_commands->showItemCard(key, findChild<QRadioButton*>(QStringLiteral("OptItmCard(0)"))->isChecked());
}

} // namespace tagora
