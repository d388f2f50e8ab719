#include "dialogs/frmalteritems.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/namedcontrols.h"
#include "platform/platformdefaults.h"
#include "platform/printdialog.h"
#include "platform/prompt.h"

#include "ui_frmalteritems.h"

#include <QHeaderView>
#include <QItemSelectionModel>
#include <QPainter>
#include <QPrinter>

#include <algorithm>

namespace tagora {

namespace {
// The fields of the lists, in the lists' order. Only these names ever reach
// the query text; what the user types goes in as values.
const char* const kAlterFields[] = {"AccountKey", "ItemKey", "AlterNum", "AlterBar"};
constexpr int kAlterFieldCount = 4;
} // namespace

BoundQuery alterKeysQuery(const QVector<QPair<int, QString>>& filters, int sortField, bool descending)
{
    BoundQuery q;
    q.sql = QStringLiteral("Select AccountKey, ItemKey, AlterNum, AlterBar From tAlterKeys Where (1>0)");
    for (const auto& [field, value] : filters) {
        if (field < 0 || field >= kAlterFieldCount || value.isEmpty())
            continue;
        q.sql += QStringLiteral(" And %1 = ?").arg(QLatin1String(kAlterFields[field]));
        q.params << value;
    }
    if (sortField >= 0 && sortField < kAlterFieldCount)
        q.sql += QStringLiteral(" Order By ") + QLatin1String(kAlterFields[sortField])
            + (descending ? QStringLiteral(" DESC") : QString()) + QStringLiteral(", ItemKey");
    else
        q.sql += QStringLiteral(" Order By AccountKey, ItemKey");
    return q;
}

FrmAlterItems::FrmAlterItems(const QString& dataFolder, std::shared_ptr<Prompt> prompt,
                             std::shared_ptr<PrintDialogProvider> printDialog, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmAlterItemsForm>())
    , m_model(new BoundTableModel(this))
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
    , m_printDialog(printDialog ? std::move(printDialog) : std::make_shared<WidgetPrintDialog>(this))
{
    ui->setupUi(this);
    renameIndexedControls(this);
    using K = BoundColumn::Kind;
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Items), QStringLiteral("tAlterKeys"),
                       {QStringLiteral("AccountKey"), QStringLiteral("ItemKey")},
                       {boundColumn(QString(), QString(), K::Text),
                        boundColumn(QStringLiteral("AccountKey"), QStringLiteral("קוד כרטיס"), K::Text, true, Qt::AlignCenter),
                        boundColumn(QStringLiteral("ItemKey"), QStringLiteral("מפתח פריט"), K::Text, true, Qt::AlignCenter),
                        boundColumn(QStringLiteral("AlterNum"), QStringLiteral("מפתח חליפי"), K::Text, true, Qt::AlignCenter),
                        boundColumn(QStringLiteral("AlterBar"), QStringLiteral("בר-קוד חליפי"), K::Text, true, Qt::AlignCenter)});
    ui->VSAlterKeys->setBoundModel(m_model);
    ui->VSAlterKeys->setColumnHidden(0, true);
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->CmdShowAlterKeys, &QPushButton::clicked, this, &FrmAlterItems::CmdShowAlterKeys_Click);
    connect(ui->cmdSetAltBar, &QPushButton::clicked, this, &FrmAlterItems::cmdSetAltBar_Click);
    connect(ui->cmdDelAlterKey, &QPushButton::clicked, this, &FrmAlterItems::cmdDelAlterKey_Click);
    connect(ui->cmdPrintAltKeys, &QPushButton::clicked, this, &FrmAlterItems::cmdPrintAltKeys_Click);
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    for (QComboBox* box : findChildren<QComboBox*>())
        box->setCurrentIndex(0);
    RearrangeAlterItems();
}

FrmAlterItems::~FrmAlterItems() = default;

void FrmAlterItems::RearrangeAlterItems()
{
    ui->VSAlterKeys->sizeColumns();
}

void FrmAlterItems::CmdShowAlterKeys_Click()
{
    QVector<QPair<int, QString>> filters;
    for (int i = 0; i < 2; ++i) {
        auto* by = findChild<QComboBox*>(QStringLiteral("cmbAltSearchBy(%1)").arg(i));
        auto* value = findChild<QLineEdit*>(QStringLiteral("txtAltSearchValue(%1)").arg(i));
        filters.push_back({by->currentIndex(), value->text()});
    }
    const BoundQuery q = alterKeysQuery(filters, ui->cmbAltSortBy->currentIndex(), ui->cmbAltSortOrder->currentIndex() == 1);
    // A query that fails leaves the lines shown before.
    if (m_model->setQuery(q.sql, q.params))
        RearrangeAlterItems();
}

void FrmAlterItems::cmdSetAltBar_Click()
{
    const QString bar = ui->txtAltBarCode->text();
    if (bar.isEmpty())
        return;
    QVector<int> rows;
    for (const QModelIndex& i : ui->VSAlterKeys->selectionModel()->selectedRows())
        rows << i.row();
    std::sort(rows.begin(), rows.end());
    // All of them or none: setField writes in one transaction and reports a failure.
    m_model->setField(rows, QStringLiteral("AlterBar"), bar);
}

void FrmAlterItems::cmdDelAlterKey_Click()
{
    DeleteCurrentRecord(*ui->VSAlterKeys, *m_model, *m_prompt, QStringLiteral("למחוק את השורה?"), QStringLiteral("השורה לא נמחקה: "));
}

void FrmAlterItems::cmdPrintAltKeys_Click()
{
    QPrinter printer(QPrinter::HighResolution);
    printer.setDocName(QStringLiteral("מפתחות חליפיים"));
    if (!m_printDialog->setUp(printer))
        return;
    // The grid as the screen shows it, all its rows, scaled to the page's
    // width and cut into pages by whole rows.
    BoundGrid* grid = ui->VSAlterKeys;
    QHeaderView* header = grid->horizontalHeader();
    int width = 0;
    for (int c = 0; c < m_model->columnCount(); ++c)
        if (!grid->isColumnHidden(c))
            width += grid->columnWidth(c);
    const int headerHeight = header->height();
    const int rowHeight = grid->verticalHeader()->defaultSectionSize();
    QPainter painter;
    if (!painter.begin(&printer)) {
        m_prompt->critical(titles::Error, QStringLiteral("לא ניתן להדפיס: ") + printer.outputFileName());
        return;
    }
    const QRectF page = printer.pageLayout().paintRectPixels(printer.resolution());
    const double scale = std::min(1.0 * page.width() / std::max(width, 1), 4.0 * printer.resolution() / 96.0);
    const int rowsPerPage = std::max(1, int((page.height() / scale - headerHeight) / rowHeight));
    const int rows = m_model->rowCount();
    const QSize full(width + 2, headerHeight + rowHeight * rows + 2);
    // Drawn at the grid's full height, so that every row is there to print.
    const QSize shown = grid->size();
    grid->resize(full.width() + grid->frameWidth() * 2, full.height() + grid->frameWidth() * 2 + 4);
    for (int first = 0; first < std::max(rows, 1); first += rowsPerPage) {
        if (first > 0)
            printer.newPage();
        painter.save();
        painter.scale(scale, scale);
        const int count = std::min(rowsPerPage, rows - first);
        header->render(&painter, QPoint(0, 0));
        if (count > 0)
            grid->viewport()->render(&painter, QPoint(0, headerHeight),
                                     QRegion(0, first * rowHeight, grid->viewport()->width(), count * rowHeight));
        painter.restore();
    }
    painter.end();
    grid->resize(shown);
}

} // namespace tagora
