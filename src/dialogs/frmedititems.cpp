#include "dialogs/frmedititems.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmedititems.h"

#include <algorithm>

namespace tagora {

namespace {
// Only these names reach the query text; what the user types goes in as a value.
const char* const kItemFields[] = {"ItemKey", "ItemName", "BarCode"};
constexpr int kItemFieldCount = 3;
const QString kNewItemKey = QStringLiteral("00000000");
} // namespace

BoundQuery editItemsQuery(int searchField, const QString& value, int sortField, bool descending)
{
    BoundQuery q;
    q.sql = QStringLiteral("SELECT ItemKey, ItemName, FName, ItemSort, Unit, Local, BarCode, Price, Coin FROM tItems Where (1>0)");
    if (searchField >= 0 && searchField < kItemFieldCount && !value.isEmpty()) {
        // LIKE's own wildcards in the typed text are escaped, so they match themselves.
        QString v = value;
        v.replace(QLatin1String("\\"), QLatin1String("\\\\"))
            .replace(QLatin1String("%"), QLatin1String("\\%"))
            .replace(QLatin1String("_"), QLatin1String("\\_"));
        q.sql += QStringLiteral(" And %1 LIKE ? ESCAPE '\\'").arg(QLatin1String(kItemFields[searchField]));
        q.params << QStringLiteral("%") + v + QStringLiteral("%");
    }
    if (sortField >= 0 && sortField < kItemFieldCount)
        q.sql += QStringLiteral(" Order By ") + QLatin1String(kItemFields[sortField])
            + (descending ? QStringLiteral(" DESC") : QString());
    else
        q.sql += QStringLiteral(" Order By ItemKey");
    return q;
}

FrmEditItems::FrmEditItems(const QString& dataFolder, bool itemTextRtl, std::shared_ptr<Prompt> prompt, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmEditItemsForm>())
    , m_model(new BoundTableModel(this))
    , m_itemTextRtl(itemTextRtl)
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
{
    ui->setupUi(this);
    using K = BoundColumn::Kind;
    const Qt::Alignment centre = Qt::AlignCenter;
    auto text = [&](const char* field, const QString& header) {
        return boundColumn(QString::fromLatin1(field), header, K::Text, true, centre);
    };
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Items), QStringLiteral("tItems"), {QStringLiteral("ItemKey")},
                       {boundColumn(QString(), QString(), K::Text),
                        text("ItemKey", QStringLiteral("מפתח פריט")),
                        text("ItemName", QStringLiteral("שם פריט")),
                        text("FName", QStringLiteral("שם לועזי")),
                        text("ItemSort", QStringLiteral("מיון")),
                        text("Unit", QStringLiteral("מידה")),
                        text("Local", QStringLiteral("איתור")),
                        text("BarCode", QStringLiteral("בר-קוד")),
                        text("Price", QStringLiteral("מחיר")),
                        text("Coin", QStringLiteral("מטבע"))});
    ui->VSEditItems->setBoundModel(m_model);
    ui->VSEditItems->setColumnHidden(0, true);
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->cmdShowItems, &QPushButton::clicked, this, &FrmEditItems::cmdShowItems_Click);
    connect(ui->cmdAddAccount, &QPushButton::clicked, this, &FrmEditItems::cmdAddAccount_Click);
    connect(ui->DelAccountDef, &QPushButton::clicked, this, &FrmEditItems::DelAccountDef_Click);
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    connect(ui->txtItmSearchValue, &QLineEdit::returnPressed, this, &FrmEditItems::cmdShowItems_Click);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    for (QComboBox* box : findChildren<QComboBox*>())
        box->setCurrentIndex(0);
    RearrangeItems();
}

FrmEditItems::~FrmEditItems() = default;

void FrmEditItems::RearrangeItems()
{
    ui->VSEditItems->setLayoutDirection(m_itemTextRtl ? Qt::RightToLeft : Qt::LeftToRight);
    ui->VSEditItems->sizeColumns();
}

void FrmEditItems::cmdShowItems_Click()
{
    const BoundQuery q = editItemsQuery(ui->cmbItmSearchBy->currentIndex(), ui->txtItmSearchValue->text(),
                                        ui->cmbItmSortBy->currentIndex(), ui->cmbItmSortOrder->currentIndex() == 1);
    if (m_model->setQuery(q.sql, q.params))
        RearrangeItems();
}

void FrmEditItems::cmdAddAccount_Click()
{
    cmdShowItems_Click();
    if (!m_model->addRecord({{QStringLiteral("ItemKey"), kNewItemKey},
                             {QStringLiteral("ItemName"), QStringLiteral("פריט חדש")},
                             {QStringLiteral("Coin"), 21}})) {
        if (m_model->lastWasDuplicateKey())
            m_prompt->message(PromptIcon::Exclamation, titles::Attention,
                              QStringLiteral("כבר קיים פריט חדש במפתח %1. יש לתת לו מפתח משלו לפני הוספת פריט נוסף.")
                                  .arg(kNewItemKey));
        else
            m_prompt->critical(titles::Error, QStringLiteral("הפריט לא נוסף: ") + m_model->lastError());
        return;
    }
    RearrangeItems();
    // The new item may sort anywhere among those shown; it is the one to type into.
    for (int r = 0; r < m_model->rowCount(); ++r)
        if (m_model->value(r, QStringLiteral("ItemKey")).toString() == kNewItemKey) {
            ui->VSEditItems->setCurrentRowIndex(r);
            return;
        }
    ui->VSEditItems->setCurrentRowIndex(m_model->rowCount() - 1);
}

void FrmEditItems::DelAccountDef_Click()
{
    DeleteCurrentRecord(*ui->VSEditItems, *m_model, *m_prompt, QStringLiteral("למחוק את הפריט?"), QStringLiteral("הפריט לא נמחק: "));
}

} // namespace tagora
