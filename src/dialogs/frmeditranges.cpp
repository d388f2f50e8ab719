#include "dialogs/frmeditranges.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmeditranges.h"

#include <limits>

namespace tagora {

FrmEditRanges::FrmEditRanges(const QString& dataFolder, std::shared_ptr<Prompt> prompt, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmEditRangesForm>())
    , m_model(new BoundTableModel(this))
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
{
    ui->setupUi(this);
    using K = BoundColumn::Kind;
    // Movements are the ERP's internal document numbers: whole, never below 0,
    // and as wide as the columns that keep them.
    auto movement = [](const char* field, const QString& header) {
        BoundColumn c = boundColumn(QString::fromLatin1(field), header, K::Number, true);
        c.minimum = 0;
        c.maximum = std::numeric_limits<qint32>::max();
        return c;
    };
    // Column 0 stands where the grid's fixed column was (see the document types).
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Config), QStringLiteral("tWizFileRanges"),
                       {QStringLiteral("WizFileID")},
                       {boundColumn(QString(), QString(), K::Text),
                        boundColumn(QStringLiteral("DocDesc"), QStringLiteral("תאור"), K::Text),
                        movement("LastIndx", QStringLiteral("תנועה אחרונה שנמשכה")),
                        movement("FromIndx", QStringLiteral("משיכה הבאה החל מתנועה"))});
    ui->VSEditRange->setBoundModel(m_model);
    ui->VSEditRange->stretchColumn(1);
    ui->VSEditRange->setColumnHidden(0, true);
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->cmdNoneItems, &QPushButton::clicked, this, &FrmEditRanges::cmdNoneItems_Click);
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    Form_Load();
}

FrmEditRanges::~FrmEditRanges() = default;

void FrmEditRanges::Form_Load()
{
    m_model->setQuery(QStringLiteral("SELECT * FROM qWizFileRanges"));
    ui->VSEditRange->setCurrentRowIndex(0);
}

void FrmEditRanges::cmdNoneItems_Click()
{
    // The next import of every type starts from the beginning; what was read
    // last stays on record.
    m_model->setFieldInAllRows(QStringLiteral("FromIndx"), 0);
}

} // namespace tagora
