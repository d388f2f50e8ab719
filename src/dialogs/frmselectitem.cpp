#include "dialogs/frmselectitem.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/namedcontrols.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmselectitem.h"

#include <QPainter>
#include <QPixmap>

#include <cmath>

namespace tagora {

namespace {
constexpr int kDefaultPage = 500;

QString quoted(const QString& text)
{
    QString t = text;
    t.replace(QLatin1Char('\''), QLatin1String("''"));
    return t;
}

} // namespace

FrmSelectItem::FrmSelectItem(const QString& dataFolder, const QString& itemCriteria, ControlCommands* commands,
                             std::shared_ptr<Prompt> prompt, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmSelectItemForm>())
    , m_model(new BoundTableModel(this))
    , m_dataFolder(dataFolder)
    , m_criteria(itemCriteria)
    , m_commands(commands)
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
{
    ui->setupUi(this);
    renameIndexedControls(this);
    for (QLineEdit* e : {ui->txtToItemkey, ui->txtItemsNum, ui->txtAllCopis})
        e->setLayoutDirection(Qt::LeftToRight);

    using K = BoundColumn::Kind;
    BoundColumn picture = boundColumn(QString(), QString(), K::Picture, false, Qt::AlignCenter);
    picture.icon = ItemCardIcon();
    // Copies are a 16-bit count; a negative one means nothing to a printer.
    BoundColumn copies = boundColumn(QStringLiteral("Copies"), QStringLiteral("עותקים"), K::Number, true);
    copies.minimum = 0;
    copies.maximum = 32767;
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Items), QStringLiteral("tItems"), {QStringLiteral("ItemKey")},
                       {picture, boundColumn(QStringLiteral("ItemKey"), QStringLiteral("מפתח פריט"), K::Text),
                        boundColumn(QStringLiteral("PrintLabel"), QStringLiteral("להדפיס?"), K::Check, true, Qt::AlignCenter),
                        copies, boundColumn(QStringLiteral("ItemName"), QStringLiteral("שם פריט"), K::Text)});
    ui->VSSelectItems->setBoundModel(m_model);
    // A value typed into a cell and refused (or not written) is said at once;
    // the cell keeps what the file holds.
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });

    connect(ui->cmdFindKey, &QPushButton::clicked, this, &FrmSelectItem::cmdFindKey_Click);
    connect(ui->txtToItemkey, &QLineEdit::returnPressed, this, &FrmSelectItem::cmdFindKey_Click);
    connect(findChild<QPushButton*>(QStringLiteral("cmdFindByDesc(0)")), &QPushButton::clicked, this,
            [this] { cmdFindByDesc_Click(0); });
    connect(findChild<QPushButton*>(QStringLiteral("cmdFindByDesc(1)")), &QPushButton::clicked, this,
            [this] { cmdFindByDesc_Click(1); });
    connect(ui->txtToItemName, &QLineEdit::returnPressed, this, [this] { cmdFindByDesc_Click(0); });
    connect(ui->CmdAllItems, &QPushButton::clicked, this, [this] { markListed(true); });
    connect(ui->cmdNoneItems, &QPushButton::clicked, this, [this] { markListed(false); });
    connect(ui->CmdAllCopies, &QPushButton::clicked, this, &FrmSelectItem::CmdAllCopies_Click);
    connect(ui->cmdShowMarked, &QPushButton::clicked, this, &FrmSelectItem::cmdShowMarked_Click);
    connect(ui->cmdShowAll, &QPushButton::clicked, this, &FrmSelectItem::cmdShowAll_Click);
    connect(ui->cmdPrint, &QPushButton::clicked, this, &FrmSelectItem::cmdPrint_Click);
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    connect(ui->VSSelectItems, &BoundGrid::cellActivated, this, &FrmSelectItem::VSSelectItems_Click);
    // Enter in a search box searches; it must not close the dialog.
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    Form_Load();
}

FrmSelectItem::~FrmSelectItem() = default;

QString FrmSelectItem::BuildSelectItemsQuery(const QString& extraConditions, bool onlyMarked, int sortBy,
                                             int sortDirection) const
{
    // A page size that is not a whole number above 0 shows the usual page.
    bool ok = false;
    const double n = ui->txtItemsNum->text().trimmed().toDouble(&ok);
    const long long page = ok && std::isfinite(n) && n >= 1 && n < 1e9 ? std::llround(n) : kDefaultPage;

    QString sql = QStringLiteral("SELECT ItemKey, PrintLabel, Copies, ItemName FROM tItems WHERE tItems.ItemKey > ''");
    if (onlyMarked)
        sql += QStringLiteral(" And PrintLabel = True");
    // Marked items stay listed whatever the search: the And-conditions bind first.
    if (!extraConditions.isEmpty())
        sql += extraConditions + QStringLiteral(" Or PrintLabel = True");
    const QString direction = sortDirection == 0 ? QStringLiteral(" ASC") : sortDirection == 1 ? QStringLiteral(" DESC") : QString();
    // Marked first: true is 1 here, so the mark sorts descending.
    if (sortBy == 0)
        sql += QStringLiteral(" ORDER BY tItems.PrintLabel DESC, tItems.Itemkey") + direction;
    else if (sortBy == 1)
        sql += QStringLiteral(" ORDER BY tItems.ItemName") + direction;
    return sql + QStringLiteral(" LIMIT ") + QString::number(page);
}

void FrmSelectItem::refresh(const QString& sql)
{
    m_model->setQuery(sql);
    ui->VSSelectItems->setCurrentRowIndex(0);
}

void FrmSelectItem::Form_Load()
{
    ui->cmbItmSortBy->setCurrentIndex(0);
    ui->cmbItmSortOrder->setCurrentIndex(0);
    refresh(BuildSelectItemsQuery(m_criteria, false, 0, 0));
}

QString FrmSelectItem::likePattern(const QString& text, bool anywhere) const
{
    // The user's text is matched as typed: LIKE's own wildcards in it are escaped.
    QString t = quoted(text);
    t.replace(QLatin1Char('\\'), QLatin1String("\\\\"));
    t.replace(QLatin1Char('%'), QLatin1String("\\%"));
    t.replace(QLatin1Char('_'), QLatin1String("\\_"));
    return QStringLiteral(" And ItemName LIKE '") + (anywhere ? QStringLiteral("%") : QString()) + t
        + QStringLiteral("%' ESCAPE '\\'");
}

void FrmSelectItem::cmdFindKey_Click()
{
    const QString key = ui->txtToItemkey->text();
    if (key.isEmpty())
        return;
    refresh(BuildSelectItemsQuery(m_criteria + QStringLiteral(" And ItemKey >= '") + quoted(key) + QLatin1Char('\''),
                                  false, ui->cmbItmSortBy->currentIndex(), ui->cmbItmSortOrder->currentIndex()));
    BoundGrid* grid = ui->VSSelectItems;
    for (int row = 0; row < m_model->rowCount(); ++row) {
        if (!grid->text(row, 1).startsWith(key, Qt::CaseInsensitive))
            continue;
        grid->setCurrentRowIndex(row);
        // Keys ignore case, as the items table does: el-1019 is item EL-1019.
        if (grid->text(row, 1).compare(key, Qt::CaseInsensitive) == 0)
            m_model->setData(m_model->index(row, 2), Qt::Checked, Qt::CheckStateRole);
        return;
    }
}

void FrmSelectItem::cmdFindByDesc_Click(int index)
{
    const QString text = ui->txtToItemName->text();
    if (text.isEmpty())
        return;
    m_model->setQuery(BuildSelectItemsQuery(m_criteria + likePattern(text, index == 1), false,
                                            ui->cmbItmSortBy->currentIndex(), ui->cmbItmSortOrder->currentIndex()));
    BoundGrid* grid = ui->VSSelectItems;
    const int rows = m_model->rowCount();
    const int from = std::max(grid->currentRowIndex(), 0);
    auto matches = [&](int row) {
        const QString name = grid->text(row, 4);
        return index == 0 ? name.startsWith(text, Qt::CaseInsensitive)
                          : !name.isEmpty() && name.contains(text, Qt::CaseSensitive);
    };
    // After the current row first, then again from the top.
    for (int pass = 0; pass < 2; ++pass) {
        for (int row = pass == 0 ? from + 1 : 0; row < rows; ++row) {
            if (matches(row)) {
                grid->setCurrentRowIndex(row);
                return;
            }
        }
    }
}

void FrmSelectItem::markListed(bool on)
{
    // Only the rows of the list: never an item the user does not see.
    QVector<int> rows;
    for (int row = 0; row < m_model->rowCount(); ++row)
        if ((m_model->value(row, QStringLiteral("PrintLabel")).toLongLong() != 0) != on)
            rows << row;
    // A write that failed was said by the grid, which still shows what the
    // file holds; reading the file again would only wait on it once more.
    if (!rows.isEmpty() && !m_model->setField(rows, QStringLiteral("PrintLabel"), on ? 1 : 0))
        return;
    refresh(m_model->query());
}

void FrmSelectItem::CmdAllCopies_Click()
{
    const QString text = ui->txtAllCopis->text();
    if (text.isEmpty())
        return;
    bool ok = false;
    const double d = text.trimmed().toDouble(&ok);
    const int copies = ok && std::fabs(d) < 32768 ? int(std::nearbyint(d)) : 0;
    QVector<int> rows;
    for (int row = 0; row < m_model->rowCount(); ++row)
        if (m_model->value(row, QStringLiteral("PrintLabel")).toLongLong() != 0)
            rows << row;
    if (!rows.isEmpty())
        m_model->setField(rows, QStringLiteral("Copies"), copies);
}

void FrmSelectItem::cmdShowMarked_Click()
{
    refresh(BuildSelectItemsQuery(m_criteria, true, ui->cmbItmSortBy->currentIndex(), ui->cmbItmSortOrder->currentIndex()));
}

void FrmSelectItem::cmdShowAll_Click()
{
    m_model->setQuery(BuildSelectItemsQuery(m_criteria, false, ui->cmbItmSortBy->currentIndex(),
                                            ui->cmbItmSortOrder->currentIndex()));
}

void FrmSelectItem::cmdPrint_Click()
{
    if (m_commands)
        m_commands->printMarkedItems();
}

void FrmSelectItem::VSSelectItems_Click(int row, int column)
{
    if (column != 0 || !m_commands)
        return;
    const QString key = ui->VSSelectItems->text(row, 1);
    m_commands->showItemCard(key, findChild<QRadioButton*>(QStringLiteral("OptItmCard(0)"))->isChecked());
}

} // namespace tagora
