#include "control/maincard.h"

#include "control/outputchoice.h"
#include "control/settingstable.h"
#include "dialogs/frmaccdef.h"
#include "dialogs/frmalteritems.h"
#include "dialogs/frmdoctype.h"
#include "dialogs/frmeditranges.h"
#include "dialogs/frmedititems.h"
#include "dialogs/frmlabdef.h"
#include "dialogs/frmselectdocitem.h"
#include "dialogs/frmselectitem.h"
#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "labels/labelfields.h"
#include "labels/labelprograms.h"
#include "erp/connparams.h"
#include "localdb/schema.h"
#include "platform/clicklabel.h"
#include "platform/controlbinding.h"
#include "platform/filedialog.h"
#include "platform/namedcontrols.h"
#include "platform/pageviewer.h"
#include "platform/platformdefaults.h"
#include "platform/printercatalog.h"
#include "platform/printdialog.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include "ui_maincard.h"

#include <QCheckBox>
#include <QComboBox>
#include <QDir>
#include <QEvent>
#include <QFileInfo>
#include <QGridLayout>
#include <QHBoxLayout>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QShowEvent>

#include <iterator>
#include <vector>

namespace tagora {

namespace {
QString indexed(const char* base, int i)
{
    return QStringLiteral("%1(%2)").arg(QLatin1String(base)).arg(i);
}

// The leading whole number of a caption, as a variable number is read; 0 when none.
int leadingNumber(const QString& text)
{
    const QString t = text.trimmed();
    int i = 0;
    bool negative = false;
    if (i < t.size() && (t[i] == QLatin1Char('-') || t[i] == QLatin1Char('+'))) {
        negative = t[i] == QLatin1Char('-');
        ++i;
    }
    long long n = 0;
    for (; i < t.size() && t[i].isDigit() && n < 1000000; ++i)
        n = n * 10 + t[i].digitValue();
    return int(negative ? -n : n);
}

} // namespace

MainCard::MainCard(QWidget* parent, Services services)
    : QWidget(parent)
    , ui(std::make_unique<Ui::MainCardForm>())
    , m_services(std::move(services))
{
    if (!m_services.settings)
        m_services.settings = defaultSettingsStore();
    if (!m_services.prompt)
        m_services.prompt = std::make_shared<MessageBoxPrompt>(this);
    if (!m_services.fileDialog)
        m_services.fileDialog = std::make_shared<WidgetFileDialog>(this);
    if (!m_services.printers)
        m_services.printers = systemPrinterCatalog();
    if (!m_services.dialogs)
        m_services.dialogs = std::make_shared<DialogRunner>();
    if (!m_services.pages)
        m_services.pages = std::make_shared<DesktopPageViewer>(m_services.settings.get());

    ui->setupUi(this);
    setLayoutDirection(Qt::RightToLeft);
    renameIndexedControls(this);

    // Captions may show stored values (file names, numbers); never read them as markup.
    for (QLabel* label : findChildren<QLabel*>())
        label->setTextFormat(Qt::PlainText);
    // Text boxes hold what the user types in full; expressions and paths can be long.
    for (QLineEdit* edit : findChildren<QLineEdit*>())
        edit->setMaxLength(65535);

    buildFieldRows();

    m_fileDialog = new CommonDialog(this);
    m_fileDialog->setObjectName(QStringLiteral("ComDlg1"));
    m_fileDialog->setProvider(m_services.fileDialog.get());

    if (auto* version = findChild<QLabel*>(QStringLiteral("lblVersion")))
        version->setText(QStringLiteral("גרסה ") + QStringLiteral(TAGORA_VERSION));

    ui->ProgressFrame->installEventFilter(this);
    ui->cmdImportDocs->installEventFilter(this);
    connectHandlers();
    setProgress(0);

    UserControl_InitProperties();
}

MainCard::~MainCard() = default;

void MainCard::buildFieldRows()
{
    auto heading = [](const QString& text, QWidget* parent) {
        auto* l = new QLabel(text, parent);
        QFont f = l->font();
        f.setBold(true);
        l->setFont(f);
        return l;
    };

    auto addRow = [this](QGridLayout* grid, int gridRow, int colBase, const LabelField& field, QWidget* parent) {
        auto* send = new QCheckBox(parent);
        send->setObjectName(indexed("ChkFldSend", field.row));
        auto* varNum = new ClickLabel(parent);
        varNum->setObjectName(indexed("lblVarNum", field.row));
        varNum->setFrameShape(QFrame::Box);
        varNum->setAlignment(Qt::AlignCenter);
        varNum->setFixedWidth(30);
        varNum->setToolTip(QStringLiteral("מספר הפרמטר ברשימת המדבקות; לחיצה מקדמת אותו"));
        auto* name = new QLabel(QString::fromUtf8(field.name), parent);
        name->setObjectName(indexed("LblFldName", field.row));
        name->setProperty("Tag", QString(QChar::fromLatin1(field.kind)));
        auto* desc = new QLabel(QString::fromUtf8(field.description), parent);
        desc->setObjectName(indexed("LblFldDesc", field.row));
        desc->setProperty("Tag", QString::fromUtf8(field.column));
        if (isExpressionKind(field.kind))
            send->setProperty("Tag", QString::fromUtf8(field.column));
        for (QLabel* l : {static_cast<QLabel*>(varNum), name, desc})
            l->setTextFormat(Qt::PlainText);
        // The field name on the label is Latin text; keep it reading left to right.
        name->setLayoutDirection(Qt::LeftToRight);
        grid->addWidget(send, gridRow, colBase);
        grid->addWidget(varNum, gridRow, colBase + 1);
        grid->addWidget(desc, gridRow, colBase + 2);
        grid->addWidget(name, gridRow, colBase + 3);
        connect(varNum, &ClickLabel::clicked, this, [this, r = field.row] { lblVarNum_Click(r); });
        return gridRow;
    };

    // Rows 0..32: two blocks side by side so the tab needs no scrolling on a normal screen.
    if (QWidget* box = findChild<QWidget*>(QStringLiteral("FieldRows5"))) {
        auto* grid = new QGridLayout(box);
        grid->setHorizontalSpacing(8);
        grid->setVerticalSpacing(2);
        const int half = (FirstExpressionRow + 1) / 2;
        for (int block = 0; block < 2; ++block) {
            const int col = block * 5;
            grid->addWidget(heading(QStringLiteral("למלא"), box), 0, col, 1, 2);
            grid->addWidget(heading(QStringLiteral("תאור"), box), 0, col + 2);
            grid->addWidget(heading(QStringLiteral("שם במדבקה"), box), 0, col + 3);
        }
        grid->setColumnMinimumWidth(4, 24);
        grid->setColumnStretch(4, 1);
        for (int r = 0; r < FirstExpressionRow; ++r) {
            const int block = r < half ? 0 : 1;
            addRow(grid, 1 + (block == 0 ? r : r - half), block * 5, labelField(r), box);
        }
        grid->setRowStretch(half + 1, 1);
    }

    // Rows 33..37: the user expressions, each with its expression box.
    if (QWidget* box = findChild<QWidget*>(QStringLiteral("FieldRows7"))) {
        auto* grid = new QGridLayout(box);
        grid->setHorizontalSpacing(8);
        grid->addWidget(heading(QStringLiteral("למלא"), box), 0, 0, 1, 2);
        grid->addWidget(heading(QStringLiteral("תאור"), box), 0, 2);
        grid->addWidget(heading(QStringLiteral("במדבקה"), box), 0, 3);
        grid->addWidget(heading(QStringLiteral("ביטוי"), box), 0, 4);
        for (int r = FirstExpressionRow; r < LabelFieldCount; ++r) {
            const int gridRow = 1 + r - FirstExpressionRow;
            addRow(grid, gridRow, 0, labelField(r), box);
            auto* expr = new QLineEdit(box);
            expr->setObjectName(indexed("txtFldExpr", r));
            expr->setMaxLength(65535);
            // Expressions are SQL over English column names.
            expr->setLayoutDirection(Qt::LeftToRight);
            grid->addWidget(expr, gridRow, 4);
        }
        grid->setColumnStretch(4, 1);
        grid->setRowStretch(LabelFieldCount - FirstExpressionRow + 1, 1);
    }
}

void MainCard::connectHandlers()
{
    connect(ui->MainTab, &QTabWidget::currentChanged, this, &MainCard::MainTab_Click);

    for (int i = 0; i <= 4; ++i)
        if (auto* b = control<QAbstractButton>(indexed("CmdDir", i)))
            connect(b, &QAbstractButton::clicked, this, [this, i] { CmdDir_Click(i); });
    for (int i = 0; i <= 1; ++i)
        if (auto* b = control<QAbstractButton>(indexed("cmdPreview", i)))
            connect(b, &QAbstractButton::clicked, this, [this, i] { cmdPreview_Click(i); });

    const std::pair<QAbstractButton*, void (MainCard::*)()> buttons[] = {
        {ui->cmdPrintItmes, &MainCard::cmdPrintItmes_Click},
        {ui->cmdPrintDocButt, &MainCard::cmdPrintDocButt_Click},
        {ui->cmdSelectItems, &MainCard::cmdSelectItems_Click},
        {ui->cmdSelectDocItems, &MainCard::cmdSelectDocItems_Click},
        {ui->CmdDocType, &MainCard::CmdDocType_Click},
        {ui->cmdRanges, &MainCard::cmdRanges_Click},
        {ui->cmdAccDef, &MainCard::cmdAccDef_Click},
        {ui->cmdAlterKeys, &MainCard::cmdAlterKeys_Click},
        {ui->cmdEditItems, &MainCard::cmdEditItems_Click},
        {ui->cmdLabDesign, &MainCard::cmdLabDesign_Click},
        {ui->CmdConnect, &MainCard::CmdConnect_Click},
        {ui->CmdImportItems, &MainCard::CmdImportItems_Click},
        {ui->cmdImportDocs, &MainCard::cmdImportDocs_Click},
        {ui->cmdLabByPlate, &MainCard::cmdLabByPlate_Click},
        {ui->cmdUpgrade, &MainCard::cmdUpgrade_Click},
    };
    for (const auto& [button, handler] : buttons)
        connect(button, &QAbstractButton::clicked, this, handler);

    for (const SettingSection& section : settingSections())
        if (auto* b = control<QAbstractButton>(section.saveButton))
            connect(b, &QAbstractButton::clicked, this, [this, n = section.number] { cmdSaveDef_Click(n); });

    const std::pair<const char*, const char*> steps[] = {
        {"Image3", "cmdSelectItems"}, {"Image5", "cmdPrintItmes"}, {"Image6", "cmdImportDocs"},
        {"Image7", "cmdSelectDocItems"}, {"Image8", "cmdPrintDocButt"},
    };
    for (const auto& [picture, button] : steps)
        if (auto* l = control<ClickLabel>(QLatin1String(picture)))
            connect(l, &ClickLabel::clicked, this, [this, b = QString::fromLatin1(button)] { stepPicture_Click(b); });

    connect(ui->LblToDate, &ClickLabel::clicked, this, &MainCard::LblToDate_Click);
    // Choosing Direct after the control was shown reads the stored layout
    // first, so a save of the general settings cannot overwrite it with an
    // empty one.
    connect(control<QRadioButton>(QStringLiteral("OptOLE(3)")), &QRadioButton::toggled, this, [this](bool on) {
        if (on && !m_layoutLoaded && isVisible())
            SetGetLabelDefs(2);
    });
    connect(ui->txtFromDocNum, &QLineEdit::textChanged, this, &MainCard::txtFromDocNum_Change);
    for (int i = 0; i < 5; ++i)
        if (auto* option = control<QRadioButton>(indexed("OptOLE", i)))
            connect(option, &QRadioButton::toggled, this, [this](bool on) {
                if (on)
                    updateOutputLabel();
            });
    connect(ui->cmbPrinter, &QComboBox::currentIndexChanged, this, &MainCard::updateOutputLabel);
}

QObject* MainCard::control(const QString& name) const
{
    return findControl(this, name);
}

// ---------------------------------------------------------------- lifecycle

void MainCard::UserControl_InitProperties()
{
    LoadConnParams();
    FillPrinterList();
    ui->MainTab->setCurrentIndex(3);
}

void MainCard::UserControl_Show()
{
    if (TestConnection())
        FillErpLists();
    for (int section : showLoadOrder())
        SetGetRegParams(uchar(section), 2);
    if (control<QRadioButton>(QStringLiteral("OptOLE(3)"))->isChecked())
        SetGetLabelDefs(2);
    control<QLabel>(QStringLiteral("lblLabelName(1)"))->setText(ui->txtLabelName->text());
    control<QLabel>(QStringLiteral("lblLabelName(2)"))->setText(ui->txtLabelName2->text());
    updateOutputLabel();
}

void MainCard::updateOutputLabel()
{
    const int code = GetOLEOption();
    const QString printer = ui->cmbPrinter->currentIndex() >= 0 ? ui->cmbPrinter->currentText() : QString();
    ui->lblOutput->setText(OutputDescription(code, ReadOutputSettings(*m_services.settings, code), printer,
                                             directLabelLayout().page.PageAutoPrint));
}

int MainCard::automationTimeout() const
{
    return ReadOutputSettings(*m_services.settings, 0).timeoutSeconds;
}

void MainCard::showEvent(QShowEvent* event)
{
    QWidget::showEvent(event);
    if (!event->spontaneous())
        UserControl_Show();
    applyProgressGeometry();
}

bool MainCard::eventFilter(QObject* watched, QEvent* event)
{
    if (watched == ui->ProgressFrame && event->type() == QEvent::Resize)
        applyProgressGeometry();
    else if (watched == ui->cmdImportDocs && event->type() == QEvent::FocusOut)
        ClearMessage();
    return QWidget::eventFilter(watched, event);
}

void MainCard::FillPrinterList()
{
    QComboBox* list = ui->cmbPrinter;
    // Filled again after a new connection: the printer chosen stays chosen
    // while it is installed, so a save does not drop it.
    const QString chosen = list->currentIndex() >= 0 ? list->currentText() : QString();
    list->clear();
    for (const QString& name : m_services.printers->printerNames())
        if (name != QLatin1String("Rendering Subsystem"))
            list->addItem(name);
    list->setCurrentIndex(chosen.isEmpty() ? -1 : list->findText(chosen));
}

namespace {
// The lists whose entries come from the ERP.
const char* const kErpLists[] = {"cmbPriceField", "cmbUser"};
} // namespace

void MainCard::FillErpLists()
{
    FillCmbPriceField();
    FillCmbUser();
}

void MainCard::RefillErpLists()
{
    // What the user chose stays chosen; a list that was empty (no ERP at show
    // time) takes its stored position now, as the show step would have.
    std::vector<int> chosen;
    for (const char* name : kErpLists)
        chosen.push_back(control<QComboBox>(QLatin1String(name))->currentIndex());
    FillErpLists();
    for (size_t i = 0; i < std::size(kErpLists); ++i) {
        auto* list = control<QComboBox>(QLatin1String(kErpLists[i]));
        if (chosen[i] >= 0 && chosen[i] < list->count()) {
            list->setCurrentIndex(chosen[i]);
            continue;
        }
        for (const SettingSection& section : settingSections())
            for (const SettingRow& row : settingRows(section.number))
                if (row.control == QLatin1String(kErpLists[i]))
                    SetGetRegPrm(2, kSettingsApp, section.name, row.key, list, uchar(row.kind),
                                 QVariant(row.defaultText));
    }
}

// ---------------------------------------------------------- status and progress

void MainCard::setMessage(const QString& text)
{
    if (ui->Message1->text() == text)
        return;
    ui->Message1->setText(text);
    emit messageChanged(text);
    if (ui->Message1->isVisible())
        ui->Message1->repaint();
}

QString MainCard::message() const
{
    return ui->Message1->text();
}

void MainCard::setProgress(double fraction)
{
    m_progress = std::clamp(fraction, 0.0, 1.0);
    applyProgressGeometry();
    if (ui->ProgressFrame->isVisible())
        ui->ProgressFrame->repaint();
}

void MainCard::applyProgressGeometry()
{
    const QRect inner = ui->ProgressFrame->contentsRect();
    const int w = int(inner.width() * m_progress + 0.5);
    // The bar fills from the side where Hebrew text starts.
    const int x = layoutDirection() == Qt::RightToLeft ? inner.right() + 1 - w : inner.left();
    ui->ProgressFill->setGeometry(x, inner.top(), w, inner.height());
    ui->ProgressFill->setVisible(w > 0);
}

void MainCard::ClearMessage()
{
    setProgress(0);
    setMessage(QString());
}

// ------------------------------------------------------------------ settings

void MainCard::SetGetRegPrm(uchar Action, const QString& pRegApp, const QString& pRegSection,
                            const QString& pParName, QObject* pObjRef, uchar pObjType, const QVariant& pDefault)
{
    if (!pObjRef || !isBindKind(pObjType))
        return;
    const auto kind = BindKind(pObjType);
    if (Action == 1) {
        const auto text = readBound(pObjRef, kind);
        if (!text)
            return;
        // A list filled from outside (the printers here, the ERP's lists) may
        // lack what was stored: "nothing chosen" must not replace it.
        const auto stored = m_services.settings->value(pRegApp, pRegSection, pParName);
        if (stored && listLacksStored(pObjRef, kind, *stored))
            return;
        if (!m_services.settings->setValue(pRegApp, pRegSection, pParName, *text))
            m_saveFailed = true;
    } else if (Action == 2) {
        const auto stored = m_services.settings->value(pRegApp, pRegSection, pParName);
        writeBound(pObjRef, kind, stored ? *stored : variantText(pDefault));
    }
}

bool MainCard::saveBlocked()
{
    // No ERP at show time means the lists behind some settings are empty;
    // saving then would overwrite good stored positions with "nothing chosen".
    // Say so, or the user takes the save for done.
    if (ui->cmbPriceField->count() > 0)
        return false;
    setMessage(QStringLiteral("ההגדרות לא נשמרו: רשימת המחירונים ריקה (אין חיבור לפריוריטי)"));
    return true;
}

void MainCard::SetGetRegParams(uchar MySection, uchar Action)
{
    if (Action == 1 && saveBlocked())
        return;
    const SettingSection* section = settingSection(MySection);
    if (!section)
        return;
    for (const SettingRow& row : settingRows(MySection))
        SetGetRegPrm(Action, kSettingsApp, section->name, row.key, control(row.control), uchar(row.kind),
                     QVariant(row.defaultText));
    if (Action == 1 && !m_services.settings->flush())
        m_saveFailed = true;
}

void MainCard::cmdSaveDef_Click(int section)
{
    if (saveBlocked())
        return;
    // A store that refuses every write (a file it must not rewrite) is not
    // asked to; the user learns why instead.
    const QString refusal = m_services.settings->refusal();
    if (!refusal.isEmpty()) {
        setMessage(QStringLiteral("שמירת ההגדרות נכשלה: ") + refusal);
        return;
    }
    m_saveFailed = false;
    SetGetRegParams(uchar(section), 1);
    if (section == 1 && control<QRadioButton>(QStringLiteral("OptOLE(3)"))->isChecked())
        SetGetLabelDefs(1);
    updateOutputLabel();
    const bool saved = m_services.settings->flush() && !m_saveFailed;
    // The file may have been found foreign only now (another program saved it meanwhile).
    const QString why = m_services.settings->refusal();
    setMessage(saved ? QStringLiteral("ההגדרות נשמרו")
                     : QStringLiteral("שמירת ההגדרות נכשלה: ")
                           + (why.isEmpty() ? QStringLiteral("לא ניתן לכתוב לקובץ ההגדרות") : why));
}

// ---------------------------------------------------------------- tab and helpers

void MainCard::MainTab_Click(int tab)
{
    ClearMessage();
    if (tab == 0)
        control<QLabel>(QStringLiteral("lblLabelName(1)"))->setText(ui->txtLabelName->text());
    else if (tab == 1)
        control<QLabel>(QStringLiteral("lblLabelName(2)"))->setText(ui->txtLabelName2->text());
    updateOutputLabel();
}

void MainCard::lblVarNum_Click(int row)
{
    auto* label = control<QLabel>(indexed("lblVarNum", row));
    if (!label)
        return;
    const int n = leadingNumber(label->text()) + 1;
    if (n >= 1 && n <= 20)
        label->setText(QString::number(n));
    else if (n == 21)
        label->setText(QString());
    else if (n == 22)
        label->setText(QStringLiteral("1"));
}

void MainCard::LblToDate_Click()
{
    ui->txtToDate->setText(ui->txtFromDate->text());
}

void MainCard::txtFromDocNum_Change()
{
    ui->txtToDocNum->setText(ui->txtFromDocNum->text());
}

void MainCard::stepPicture_Click(const QString& buttonName)
{
    if (auto* b = control<QAbstractButton>(buttonName)) {
        b->setFocus(Qt::OtherFocusReason);
        b->click();
    }
}

void MainCard::CmdDir_Click(int index)
{
    const QString file = ChooseLabelFile(GetOLEOption(), m_fileDialog, false);
    if (file.isEmpty())
        return;
    switch (index) {
    case 0: ui->txtLabelNameHead->setText(file); break;
    case 1: ui->txtLabelName->setText(file); break;
    case 2: ui->txtLabelName2->setText(file); break;
    case 3: control<QLabel>(QStringLiteral("lblLabelName(2)"))->setText(file); break;
    case 4: control<QLabel>(QStringLiteral("lblLabelName(1)"))->setText(file); break;
    default: break;
    }
}

QString MainCard::dataFile(const QString& fileName) const
{
    return joinDataPath(ui->txtDBPath->text(), fileName);
}

QString MainCard::itemRangeCriteria() const
{
    return ItemRangeCriteria(ui->txtFromItem->text(), ui->txtToItem->text(), ui->txtFromSort->text(),
                             ui->txtToSort->text());
}

// ------------------------------------------------------------------ printing

short MainCard::GetOLEOption()
{
    auto on = [this](int i) { return control<QRadioButton>(indexed("OptOLE", i))->isChecked(); };
    if (on(0))
        return 5;
    if (on(1))
        return 2;
    short code = 0;
    if (on(2))
        code = 4;
    if (on(3))
        code = 6;
    if (on(4))
        code = 7;
    return code;
}

void MainCard::cmdPrintItmes_Click()
{
    printLabels(1);
}

void MainCard::cmdPrintDocButt_Click()
{
    printLabels(2);
}

// The label data ready for a query of this type: the data folder repaired
// and, for labels by items, the documents database that links the item
// tables. False once the user was told why not.
bool MainCard::prepareLabelData(int queryType)
{
    const QString tempDocs = dataFile(dbfiles::TempDocs);
    // A file whose creation was cut short (an earlier version made files in
    // place) is completed before the query trusts it.
    if (DbError error = RepairDataFolder(ui->txtDBPath->text())) {
        m_services.prompt->critical(titles::Fault, error.message);
        return false;
    }
    // Labels by items need the documents database only for its links to the
    // item tables; a first run on a new data folder gets the whole folder ready.
    if (queryType == 1 && !QFileInfo::exists(tempDocs)) {
        DbError error = PrepareDataFolder(ui->txtDBPath->text());
        if (!error)
            CreateTempDocsDB(dataFile(dbfiles::Config), dataFile(dbfiles::Items), tempDocs, &error);
        if (error) {
            m_services.prompt->critical(titles::Fault, error.message);
            return false;
        }
    }
    return caselessKeys(dataFile(dbfiles::Items)) && caselessKeys(tempDocs);
}

void MainCard::printLabels(int queryType)
{
    const short code = GetOLEOption();
    const QString tempDocs = dataFile(dbfiles::TempDocs);
    if (!prepareLabelData(queryType))
        return;
    const QString labelFile
        = control<QLabel>(queryType == 1 ? QStringLiteral("lblLabelName(1)") : QStringLiteral("lblLabelName(2)"))
              ->text()
              .trimmed();
    if (code == 6) {
        if (ui->cmbPrinter->currentIndex() >= 0) {
            const QString printer = ui->cmbPrinter->currentText();
            QString error;
            if (!SetDefaultPrinter(printer, &error)) {
                m_services.prompt->critical(titles::Fault, error);
                return;
            }
            SetBrowserPrinter(printer);
        }
        PrintDirectLabels(uchar(queryType), tempDocs);
        return;
    }
    const bool header = queryType == 2 && ui->chkPrintHeadLabel->isChecked();
    RunOLE(labelFile, 1, uchar(queryType), code, tempDocs, header, false);
}

// ------------------------------------------------------------------ upgrade

bool MainCard::caselessKeys(const QString& path, bool quiet, CaselessKeysReport* done)
{
    if (!QFileInfo::exists(path))
        return true;
    CaselessKeysReport local;
    CaselessKeysReport& report = done ? *done : local;
    if (DbError e = UpgradeCaselessKeys(path, &report)) {
        if (!quiet)
            m_services.prompt->critical(titles::Fault, e.message);
        return false;
    }
    if (report.setAside > 0)
        m_services.prompt->message(
            PromptIcon::Exclamation, titles::Attention,
            QStringLiteral("מעתה אין הבדל בין אותיות גדולות לקטנות במפתחות. בקובץ '%1' נמצאו %2 רשומות שמפתחן "
                           "זהה למפתח של רשומה אחרת פרט לגודל האותיות: מכל מפתח נשארה הרשומה הראשונה, והאחרות "
                           "הועברו בשלמותן אל %3.")
                .arg(QDir::toNativeSeparators(path))
                .arg(report.setAside)
                .arg(report.sideTables.join(QStringLiteral(", "))));
    return true;
}

void MainCard::cmdUpgrade_Click()
{
    const QString itemsDb = dataFile(dbfiles::Items);
    bool ok = false;
    CaselessKeysReport keys;
    if (QFileInfo::exists(itemsDb) && caselessKeys(itemsDb, false, &keys)) {
        // A file whose definitions were upgraded long ago and only lacked
        // caseless keys was upgraded now; that is not a second run.
        Database db;
        if (!keys.rebuilt.isEmpty() && !db.open(itemsDb)
            && db.prepare(QStringLiteral("SELECT FldID, FldMaxLen, Label2Name FROM tAccountDef")).isValid()) {
            ok = true;
        } else {
            db.close();
            DbError error;
            ok = !UpgradeAccountDef(itemsDb, &error).isEmpty();
            if (!ok)
                m_services.prompt->critical(titles::Fault, error.message);
        }
    }
    setProgress(1.0);
    setMessage(ok ? QStringLiteral("השדרוג הסתיים בהצלחה") : QStringLiteral("השדרוג נכשל"));
}

// ------------------------------------------------------------------ dispatch

void MainCard::cmdSelectItems_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    m_shared.itemRangeCriteria = itemRangeCriteria();
    m_shared.itemTextRtl = ui->chkItmRTL->isChecked();
    m_shared.objectRef = this;
    // The selection searches by key, so an older file gets caseless keys first;
    // like the rest of this sequence, a failure only leaves things as they were.
    caselessKeys(dataFile(dbfiles::Items), true);
    FrmSelectItem dialog(m_shared.dataFolder, m_shared.itemRangeCriteria, this, m_services.prompt, this);
    runDialog(dialog);
}

void MainCard::cmdSelectDocItems_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    showDialog(QStringLiteral("frmSelectDocItem"));
}

void MainCard::CmdDocType_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    showDialog(QStringLiteral("frmDocType"));
}

void MainCard::cmdRanges_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    showDialog(QStringLiteral("frmEditRanges"));
}

void MainCard::cmdAccDef_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    m_shared.labelProgram = GetOLEOption();
    showDialog(QStringLiteral("frmAccDef"));
}

void MainCard::cmdAlterKeys_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    showDialog(QStringLiteral("frmAlterItems"));
}

void MainCard::cmdEditItems_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    m_shared.itemTextRtl = ui->chkItmRTL->isChecked();
    showDialog(QStringLiteral("frmEditItems"));
}

void MainCard::cmdLabDesign_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    m_shared.objectRef = this;
    showDialog(QStringLiteral("frmLabDef"));
    m_shared.objectRef = nullptr;
}

QStringList MainCard::fieldCaptions() const
{
    QStringList captions;
    while (const auto* desc = control<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(captions.size())))
        captions << desc->text();
    return captions;
}

// The dialogs that take only the shared state, by their form names. A name
// without a dialog yet opens nothing.
void MainCard::showDialog(const QString& formName)
{
    std::unique_ptr<QDialog> dialog;
    if (formName == QLatin1String("frmDocType"))
        dialog = std::make_unique<FrmDocType>(m_shared.dataFolder, m_services.prompt, this);
    else if (formName == QLatin1String("frmEditRanges"))
        dialog = std::make_unique<FrmEditRanges>(m_shared.dataFolder, m_services.prompt, this);
    else if (formName == QLatin1String("frmSelectDocItem"))
        dialog = std::make_unique<FrmSelectDocItem>(m_shared.dataFolder, this, m_services.prompt, this);
    else if (formName == QLatin1String("frmAccDef"))
        dialog = std::make_unique<FrmAccDef>(m_shared.dataFolder, m_shared.labelProgram,
                                             FillCmbPriceFieldInGrid(currentConnString()), m_services.prompt,
                                             m_services.fileDialog, this);
    else if (formName == QLatin1String("frmAlterItems"))
        dialog = std::make_unique<FrmAlterItems>(
            m_shared.dataFolder, m_services.prompt,
            m_services.printDialog ? m_services.printDialog : std::make_shared<WidgetPrintDialog>(this), this);
    else if (formName == QLatin1String("frmEditItems"))
        dialog = std::make_unique<FrmEditItems>(m_shared.dataFolder, m_shared.itemTextRtl, m_services.prompt, this);
    else if (formName == QLatin1String("frmLabDef")) {
        auto labDef = std::make_unique<FrmLabDef>(directLabelLayout(), fieldCaptions(), m_services.prompt, this);
        // The selection does not change while the designer is open: its first record is read once.
        QVector<PreviewField> fields = previewRecord();
        labDef->setPreviewSource([fields = std::move(fields)] { return fields; }, ui->txtPriceFormat->text());
        dialog = std::move(labDef);
    }
    if (dialog)
        runDialog(*dialog);
}

void MainCard::CmdImportItems_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    ImportItems();
}

void MainCard::cmdImportDocs_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    ImportDocuments();
}

void MainCard::cmdLabByPlate_Click()
{
    m_shared.dataFolder = ui->txtDBPath->text();
    PrintFromLabelList();
}

void MainCard::cmdPreview_Click(int index)
{
    const int queryType = index == 0 ? 2 : 1;
    // The list reads what printing would: the same data, made ready the same way.
    if (prepareLabelData(queryType))
        ShowItemList(uchar(queryType), dataFile(dbfiles::TempDocs));
}

} // namespace tagora
