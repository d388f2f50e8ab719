#include "dialogs/frmaccdef.h"

#include "dialogs/boundgrid.h"
#include "erp/odbc.h"
#include "erp/textconv.h"
#include "labels/labelprograms.h"
#include "localdb/schema.h"
#include "platform/filedialog.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmaccdef.h"

#include <QApplication>
#include <QMouseEvent>
#include <QPainter>

#include <functional>

namespace tagora {

namespace {
// Opening the dialog waits on the ERP for its price lists; a server that does
// not answer costs a short wait, then the column is simply typed.
constexpr int kPriceListTimeout = 10;
constexpr int kCellButtonWidth = 22;

// A text cell with a "..." button at its end: the text is typed as in any
// cell, the button asks for a file.
class FileCellDelegate : public BoundItemDelegate {
public:
    FileCellDelegate(QObject* parent, std::function<void(const QModelIndex&)> pressed)
        : BoundItemDelegate(parent), m_pressed(std::move(pressed))
    {
    }

    static QRect buttonRect(const QStyleOptionViewItem& option)
    {
        QRect r = option.rect.adjusted(1, 1, -1, -1);
        // At the cell's end in reading order: the left side on this right-to-left grid.
        return (option.widget && option.widget->isRightToLeft())
            ? QRect(r.left(), r.top(), kCellButtonWidth, r.height())
            : QRect(r.right() - kCellButtonWidth + 1, r.top(), kCellButtonWidth, r.height());
    }

    void paint(QPainter* painter, const QStyleOptionViewItem& option, const QModelIndex& index) const override
    {
        // The text keeps clear of the button.
        QStyleOptionViewItem text = option;
        const QRect button = buttonRect(option);
        if (button.left() <= option.rect.left() + 1)
            text.rect.setLeft(button.right() + 2);
        else
            text.rect.setRight(button.left() - 2);
        BoundItemDelegate::paint(painter, text, index);
        QStyleOptionButton b;
        b.rect = button;
        b.text = QStringLiteral("...");
        b.state = QStyle::State_Enabled | QStyle::State_Raised;
        QStyle* style = option.widget ? option.widget->style() : QApplication::style();
        style->drawControl(QStyle::CE_PushButton, &b, painter, option.widget);
    }

    bool editorEvent(QEvent* event, QAbstractItemModel* model, const QStyleOptionViewItem& option,
                     const QModelIndex& index) override
    {
        if (event->type() == QEvent::MouseButtonRelease) {
            auto* me = static_cast<QMouseEvent*>(event);
            if (me->button() == Qt::LeftButton && buttonRect(option).contains(me->position().toPoint())) {
                m_pressed(index);
                return true;
            }
        }
        return BoundItemDelegate::editorEvent(event, model, option, index);
    }

private:
    std::function<void(const QModelIndex&)> m_pressed;
};
} // namespace

ChoiceList FillCmbPriceFieldInGrid(const QString& connString)
{
    ChoiceList out;
    if (connString.isEmpty())
        return out;
    ErpConnection erp;
    QString error;
    if (!erp.open(connString, kPriceListTimeout, &error))
        return out;
    auto rs = erp.query(QStringLiteral("SELECT PLIST, PLNAME, PLDES FROM PRICELIST WHERE PLIST <> 0"), &error);
    if (!rs)
        return out;
    while (rs->next()) {
        QString name = NullTrim(rs->value(QStringLiteral("PLDES")));
        if (name.isEmpty())
            name = NullTrim(rs->value(QStringLiteral("PLNAME")));
        if (!name.isEmpty())
            out.push_back({rs->value(QStringLiteral("PLIST")).toLongLong(), ConvertErpText(name, QString())});
    }
    // A list cut short by an error offers nothing rather than part of the lists.
    if (rs->failed())
        out.clear();
    return out;
}

ChoiceList FillCmbLabelFieldInGrid()
{
    return {{0, QStringLiteral("ללא")},
            {1, QStringLiteral("מפתח פריט")},
            {2, QStringLiteral("בר-קוד")},
            {3, QStringLiteral("מפתח חליפי")},
            {4, QStringLiteral("בר-קוד חליפי")},
            {5, QStringLiteral("חליפי משורת מסמך")}};
}

FrmAccDef::FrmAccDef(const QString& dataFolder, int labelProgram, const ChoiceList& priceLists,
                     std::shared_ptr<Prompt> prompt, std::shared_ptr<FileDialogProvider> files, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmAccDefForm>())
    , m_model(new BoundTableModel(this))
    , m_labelProgram(labelProgram)
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
    , m_files(files ? std::move(files) : std::make_shared<WidgetFileDialog>(this))
    , m_fileDialog(new CommonDialog(this))
{
    ui->setupUi(this);
    m_fileDialog->setObjectName(QStringLiteral("ComDlg1"));
    m_fileDialog->setProvider(m_files.get());
    using K = BoundColumn::Kind;
    // Keys and numbers centred, file names from their start.
    const Qt::Alignment centre = Qt::AlignCenter;
    const Qt::Alignment start = Qt::AlignLeft | Qt::AlignAbsolute | Qt::AlignVCenter;
    BoundColumn price = boundColumn(QStringLiteral("PriceList"), QStringLiteral("מחירון"), priceLists.isEmpty() ? K::Number : K::Choice, true, centre);
    price.choices = priceLists;
    BoundColumn field = boundColumn(QStringLiteral("FldID"), QStringLiteral("שדה בדיקה"), K::Choice, true, centre);
    field.choices = FillCmbLabelFieldInGrid();
    BoundColumn length = boundColumn(QStringLiteral("FldMaxLen"), QStringLiteral("אורך"), K::Number, true, centre);
    length.minimum = 0;
    length.maximum = 32767;
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Items), QStringLiteral("tAccountDef"), {QStringLiteral("DefID")},
                       {boundColumn(QString(), QString(), K::Text),
                        boundColumn(QStringLiteral("AccountKey"), QStringLiteral("קוד כרטיס"), K::Text, true, centre),
                        price,
                        boundColumn(QStringLiteral("LabelName"), QStringLiteral("קובץ מדבקה"), K::Text, true, start),
                        field,
                        length,
                        boundColumn(QStringLiteral("Label2Name"), QStringLiteral("קובץ מדבקה חלופי"), K::Text, true, start)});
    ui->VSAccountDef->setBoundModel(m_model);
    ui->VSAccountDef->setColumnHidden(0, true);
    for (int c : {3, 6})
        ui->VSAccountDef->setItemDelegateForColumn(
            c, new FileCellDelegate(ui->VSAccountDef, [this](const QModelIndex& i) { chooseLabelFile(i.row(), i.column()); }));
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->cmdAddAccount, &QPushButton::clicked, this, &FrmAccDef::cmdAddAccount_Click);
    connect(ui->DelAccountDef, &QPushButton::clicked, this, &FrmAccDef::DelAccountDef_Click);
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    // The key selected too: every edit and delete finds its row by it.
    m_model->setQuery(QStringLiteral("Select DefID, AccountKey,PriceList,LabelName, FldID, FldMaxLen, Label2Name From tAccountDef"
                                     " Order By DefID"));
    // Widths after the form's, kept over every refresh:
    // file names are long and the cells have their buttons to show.
    auto widths = [this] {
        const int w[] = {0, 90, 120, 260, 120, 50, 260};
        for (int c = 1; c < 7; ++c)
            ui->VSAccountDef->setColumnWidth(c, w[c]);
    };
    connect(m_model, &QAbstractItemModel::modelReset, this, widths);
    widths();
    ui->VSAccountDef->setCurrentRowIndex(0);
}

FrmAccDef::~FrmAccDef() = default;

void FrmAccDef::chooseLabelFile(int row, int column)
{
    if (column != 3 && column != 6)
        return;
    const QString file = ChooseLabelFile(m_labelProgram, m_fileDialog, false);
    if (!file.isEmpty())
        m_model->setData(m_model->index(row, column), file, Qt::EditRole);
}

void FrmAccDef::cmdAddAccount_Click()
{
    if (!m_model->addRecord({{QStringLiteral("AccountKey"), QStringLiteral("כרטיס חדש")},
                             {QStringLiteral("LabelName"), platformDefault(QStringLiteral("c:\\mylabel.lbl"))},
                             {QStringLiteral("FldID"), 0},
                             {QStringLiteral("FldMaxLen"), 0},
                             {QStringLiteral("Label2Name"), QVariant()}})) {
        m_prompt->critical(titles::Error, QStringLiteral("ההגדרה לא נוספה: ") + m_model->lastError());
        return;
    }
    ui->VSAccountDef->setCurrentRowIndex(m_model->rowCount() - 1);
}

void FrmAccDef::DelAccountDef_Click()
{
    DeleteCurrentRecord(*ui->VSAccountDef, *m_model, *m_prompt, QStringLiteral("למחוק את ההגדרה?"), QStringLiteral("ההגדרה לא נמחקה: "));
}

} // namespace tagora
