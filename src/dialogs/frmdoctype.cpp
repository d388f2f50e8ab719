#include "dialogs/frmdoctype.h"

#include "dialogs/boundgrid.h"
#include "localdb/schema.h"
#include "platform/platformdefaults.h"
#include "platform/prompt.h"

#include "ui_frmdoctype.h"

namespace tagora {

FrmDocType::FrmDocType(const QString& dataFolder, std::shared_ptr<Prompt> prompt, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmDocTypeForm>())
    , m_model(new BoundTableModel(this))
    , m_prompt(prompt ? std::move(prompt) : std::make_shared<MessageBoxPrompt>(this))
{
    ui->setupUi(this);
    using K = BoundColumn::Kind;
    // Column 0 stands where the grid's fixed column was, so that cells keep
    // the numbers the screen's users and scripts know them by.
    m_model->setSource(joinDataPath(dataFolder, dbfiles::Config), QStringLiteral("tDocTypes"), {QStringLiteral("DocType")},
                       {boundColumn(QString(), QString(), K::Text),
                        boundColumn(QStringLiteral("DocDesc"), QStringLiteral("סוג מסמך"), K::Text),
                        boundColumn(QStringLiteral("Include"), QStringLiteral("לשאוב?"), K::Check, true),
                        boundColumn(QStringLiteral("IncludeDraft"), QStringLiteral("טיוטות?"), K::Check, true)});
    ui->VSDocTypes->setBoundModel(m_model);
    ui->VSDocTypes->stretchColumn(1);
    ui->VSDocTypes->setColumnHidden(0, true);
    connect(m_model, &BoundTableModel::writeFailed, this,
            [this](const QString& message) { m_prompt->critical(titles::Error, message); });
    connect(ui->cmdAllDocTypes, &QPushButton::clicked, this, [this] { markAll(true); });
    connect(ui->cmdNoDocTypes, &QPushButton::clicked, this, [this] { markAll(false); });
    connect(ui->cmdClose, &QPushButton::clicked, this, &QDialog::accept);
    for (QPushButton* b : findChildren<QPushButton*>())
        b->setAutoDefault(false);
    Form_Load();
}

FrmDocType::~FrmDocType() = default;

void FrmDocType::Form_Load()
{
    // A configuration database that cannot be read leaves the grid empty, as
    // the other steps of opening a dialog do.
    m_model->setQuery(QStringLiteral("SELECT * FROM qSelectDocTypes"));
    ui->VSDocTypes->setCurrentRowIndex(0);
}

void FrmDocType::markAll(bool on)
{
    // Only the fetch column: whether drafts come too stays the user's choice per type.
    m_model->setFieldInAllRows(QStringLiteral("Include"), on ? 1 : 0);
}

} // namespace tagora
