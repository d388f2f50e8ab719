#include "dialogs/frmlogon.h"

#include "erp/connparams.h"
#include "erp/odbc.h"
#include "platform/controlbinding.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include "ui_frmlogon.h"

#include <QDir>

namespace tagora {

namespace {
constexpr int kCheckTimeout = 10;
}

FrmLogon::FrmLogon(const Services& services, QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmLogonForm>())
    , m_services(services)
{
    ui->setupUi(this);
    // Connection values are Latin text; keep them reading left to right.
    for (QLineEdit* e : {ui->txtConnServer, ui->txtConnUID, ui->txtConnPWD, ui->txtConnDatabase, ui->txtConnPath})
        e->setLayoutDirection(Qt::LeftToRight);
    connect(ui->CmdCheck, &QPushButton::clicked, this, &FrmLogon::CmdCheck_Click);
    connect(ui->cmdOK, &QPushButton::clicked, this, &FrmLogon::cmdOK_Click);
    connect(ui->cmdCancel, &QPushButton::clicked, this, &FrmLogon::cmdCancel_Click);
    connect(ui->lblConnPath, &ClickLabel::doubleClicked, this, &FrmLogon::lblConnPath_DblClick);
    Form_Load();
}

FrmLogon::~FrmLogon() = default;

void FrmLogon::Form_Load()
{
    const ConnParams& p = connParams();
    ui->txtConnServer->setText(p.server);
    ui->txtConnUID->setText(p.uid);
    ui->txtConnPWD->setText(p.pwd);
    ui->txtConnDatabase->setText(p.database);
    ui->CmbConnType->setCurrentIndex(p.type >= 1 && p.type <= 2 ? p.type - 1 : -1);
    ui->txtConnPath->setText(p.path);
}

short FrmLogon::chosenType() const
{
    return short(ui->CmbConnType->currentIndex() + 1);
}

void FrmLogon::SetGetRegConnParams(int action)
{
    const std::pair<const char*, QObject*> rows[] = {
        {"ConnServer", ui->txtConnServer}, {"ConnUID", ui->txtConnUID}, {"ConnPWD", ui->txtConnPWD},
        {"ConnDataBase", ui->txtConnDatabase}, {"ConnType", ui->CmbConnType}, {"ConnPath", ui->txtConnPath},
    };
    SettingsStore& store = *m_services.settings;
    // The values still serve this session; the user learns they were not kept.
    if (action == 1 && !store.refusal().isEmpty()) {
        m_services.prompt->message(PromptIcon::Exclamation, titles::Attention,
                                   QStringLiteral("פרטי החיבור לא נשמרו: ") + store.refusal());
        return;
    }
    bool saved = true;
    for (const auto& [key, control] : rows) {
        const BindKind kind = control == ui->CmbConnType ? BindKind::ListIndex : BindKind::Text;
        if (action == 1) {
            if (const auto text = readBound(control, kind))
                saved = store.setValue(kSettingsApp, kParamsSection, QLatin1String(key), *text) && saved;
        } else if (action == 2) {
            if (const auto text = store.value(kSettingsApp, kParamsSection, QLatin1String(key)))
                writeBound(control, kind, *text);
        }
    }
    if (action == 1 && !(store.flush() && saved))
        m_services.prompt->message(PromptIcon::Exclamation, titles::Attention,
                                   QStringLiteral("פרטי החיבור לא נשמרו: לא ניתן לכתוב לקובץ ההגדרות"));
}

void FrmLogon::CmdCheck_Click()
{
    const QString conn = BuildConnString(ui->txtConnServer->text(), ui->txtConnUID->text(), ui->txtConnPWD->text(),
                                         ui->txtConnDatabase->text(), chosenType());
    QString error;
    ErpConnection erp;
    bool ok = erp.open(conn, kCheckTimeout, &error);
    if (ok)
        ok = erp.query(QStringLiteral("SELECT PART FROM PART"), &error) != nullptr;
    if (!ok) {
        if (conn.isEmpty() && error.isEmpty())
            error = QStringLiteral("לא נבחר סוג בסיס נתונים");
        ui->LblMsg->setText(QStringLiteral("הבדיקה לא הסתיימה בהצלחה"));
        m_services.prompt->critical(titles::Fault, error);
        return;
    }
    // Looking into the company folder is part of the check only as far as
    // reading it goes; an empty or missing folder is not a failure.
    QDir(ui->txtConnPath->text()).entryList();
    ui->LblMsg->setText(QStringLiteral("הבדיקה הסתיימה בהצלחה"));
}

void FrmLogon::cmdOK_Click()
{
    ConnParams& p = connParams();
    p.server = ui->txtConnServer->text();
    p.uid = ui->txtConnUID->text();
    p.pwd = ui->txtConnPWD->text();
    p.database = ui->txtConnDatabase->text();
    p.type = chosenType();
    p.path = ui->txtConnPath->text();
    SetGetRegConnParams(1);
    accept();
}

void FrmLogon::cmdCancel_Click()
{
    reject();
}

void FrmLogon::lblConnPath_DblClick()
{
    if (chosenType() != 1) {
        m_services.prompt->info(QStringLiteral("הודעה"), QStringLiteral("Look at C:\\Windows\\Tabula.ini ---> Priority Directory"));
        return;
    }
    const QString conn = BuildConnString(ui->txtConnServer->text(), ui->txtConnUID->text(), ui->txtConnPWD->text(),
                                         ui->txtConnDatabase->text(), 1);
    ErpConnection erp;
    QString error;
    if (!erp.open(conn, kCheckTimeout, &error))
        return;
    const QString folder = erp.currentCatalog();
    if (!folder.isEmpty())
        ui->txtConnPath->setText(QDir::toNativeSeparators(folder));
}

} // namespace tagora
