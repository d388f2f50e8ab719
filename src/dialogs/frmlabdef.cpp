#include "dialogs/frmlabdef.h"

#include "labels/barcode.h"
#include "platform/clicklabel.h"
#include "platform/prompt.h"

#include "ui_frmlabdef.h"

#include <QCheckBox>
#include <QComboBox>
#include <QGridLayout>
#include <QLineEdit>
#include <QPixmap>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QTimer>
#include <QUrl>
#include <cmath>
#include <limits>
#include <optional>
#include <type_traits>

namespace tagora {

namespace {
constexpr int kLastMovable = kDirectLines - 1;

QString indexed(const char* base, int i)
{
    return QStringLiteral("%1(%2)").arg(QLatin1String(base)).arg(i);
}

void fill(QComboBox* list, const QStringList& entries)
{
    list->clear();
    list->addItems(entries);
    // A list that the layout does not set has nothing chosen, so confirming
    // leaves its field as it was.
    list->setCurrentIndex(-1);
}

// A whole number of the field's type, rounded as the settings were typed
// ("9.6" is 10); nothing when the text is not a number or does not fit.
template <class Int> std::optional<Int> wholeNumber(const QString& text)
{
    bool ok = false;
    const double d = text.trimmed().toDouble(&ok);
    if (!ok || !std::isfinite(d))
        return std::nullopt;
    const double r = std::nearbyint(d);
    if (r < double(std::numeric_limits<Int>::min()) || r > double(std::numeric_limits<Int>::max()))
        return std::nullopt;
    return Int(r);
}

template <class Int> QString wholeRange()
{
    return QStringLiteral("מספר שלם בין %1 ל-%2")
        .arg(qlonglong(std::numeric_limits<Int>::min()))
        .arg(qlonglong(std::numeric_limits<Int>::max()));
}
} // namespace

FrmLabDef::FrmLabDef(DirectLabelLayout& layout, const QStringList& fieldCaptions, std::shared_ptr<Prompt> prompt,
                     QWidget* parent)
    : QDialog(parent)
    , ui(std::make_unique<Ui::FrmLabDefForm>())
    , m_layout(layout)
    , m_prompt(std::move(prompt))
{
    ui->setupUi(this);
    buildRows();
    // Barcode settings are Latin text and numbers; the prefix too.
    ui->txtXLeftPrefix->setLayoutDirection(Qt::LeftToRight);
    ui->cmbXBarType->setCurrentIndex(-1);
    connect(ui->cmdClose, &QPushButton::clicked, this, &FrmLabDef::cmdClose_Click);
    connect(ui->cmdCancel, &QPushButton::clicked, this, &QDialog::reject);
    connect(ui->lblDimX, &ClickLabel::clicked, this, [this] { ui->txtDimX->setText(QStringLiteral("0.01")); });
    connect(ui->lblWideBarRatio, &ClickLabel::clicked, this,
            [this] { ui->txtWideBarRatio->setText(QStringLiteral("2.2")); });
    connect(ui->SSTab1, &QTabWidget::currentChanged, this, &FrmLabDef::SSTab1_Click);

    ui->SSTab1->setCurrentIndex(0);
    m_fieldCaptions = fieldCaptions;
    FillXFld(fieldCaptions);
    FillCombos();
    GetSetFormLabDefs(1);

    // The preview follows the boxes, but only once the typing stops: each
    // drawing starts a browser.
    m_previewTimer = new QTimer(this);
    m_previewTimer->setSingleShot(true);
    m_previewTimer->setInterval(300);
    connect(m_previewTimer, &QTimer::timeout, this, [this] {
        if (ui->SSTab1->currentWidget() == ui->tabPreview)
            refreshPreview();
    });
    for (QComboBox* c : findChildren<QComboBox*>())
        connect(c, &QComboBox::currentIndexChanged, this, &FrmLabDef::schedulePreview);
    for (QLineEdit* e : findChildren<QLineEdit*>())
        connect(e, &QLineEdit::textChanged, this, &FrmLabDef::schedulePreview);
    for (QCheckBox* c : findChildren<QCheckBox*>())
        connect(c, &QCheckBox::stateChanged, this, &FrmLabDef::schedulePreview);
}

FrmLabDef::~FrmLabDef()
{
    if (m_browser) {
        m_browser->disconnect(this);
        m_browser->kill();
        m_browser->waitForFinished(2000);
    }
}

void FrmLabDef::setPreviewSource(PreviewSource source, const QString& priceFormat)
{
    m_previewSource = std::move(source);
    m_priceFormat = priceFormat;
    schedulePreview();
}

void FrmLabDef::schedulePreview()
{
    m_previewTimer->start();
}

void FrmLabDef::refreshPreview()
{
    const int generation = ++m_previewGeneration;
    m_previewPng.clear();
    // A drawing of an older layout is of no use any more.
    if (m_browser) {
        m_browser->disconnect(this);
        m_browser->kill();
        connect(m_browser, &QProcess::finished, m_browser, &QObject::deleteLater);
        m_browser = nullptr;
    }
    // The boxes as they stand, read quietly: a box still being typed in is no fault yet.
    DirectLabelLayout staged = m_layout;
    for (const Binding& b : bindings(staged)) {
        if (!GetSetFormLabDef(2, b.control, b.field))
            return previewDone(generation, false,
                               QStringLiteral("אין תצוגה מקדימה: הערך בשדה \"%1\" אינו תקין.").arg(b.description));
    }
    QVector<PreviewField> fields;
    if (m_previewSource)
        fields = m_previewSource();
    if (fields.isEmpty()) {
        for (int k = 0; k < m_fieldCaptions.size(); ++k)
            fields.push_back({QStringLiteral("F%1").arg(k), false, QStringLiteral("1234567890")});
    }
    if (!m_previewDir || !m_previewDir->isValid())
        m_previewDir = std::make_unique<QTemporaryDir>();
    if (!m_previewDir->isValid())
        return previewDone(generation, false, QStringLiteral("אין תצוגה מקדימה: לא ניתן ליצור תיקייה זמנית."));
    const QString folder = m_previewDir->filePath(QStringLiteral("page"));
    QString page;
    ZintBarcodeLibrary library;
    if (const QString why = WritePreviewPage(folder, staged, fields, m_priceFormat, library, &page); !why.isEmpty())
        return previewDone(generation, false, QStringLiteral("אין תצוגה מקדימה: ") + why);

    QString chromium;
    for (const char* name : {"chromium", "chromium-browser", "google-chrome"}) {
        chromium = QStandardPaths::findExecutable(QLatin1String(name));
        if (!chromium.isEmpty())
            break;
    }
    if (chromium.isEmpty())
        return previewDone(generation, false,
                           QStringLiteral("אין תצוגה מקדימה: הדפדפן Chromium אינו מותקן במחשב זה."));
    // Each drawing gets its own picture name: a picture still being written
    // by a browser that was stopped is never taken for the new one.
    const QString png = m_previewDir->filePath(QStringLiteral("preview%1.png").arg(generation));
    QFile::remove(png);
    ui->lblPreview->setText(QStringLiteral("התצוגה המקדימה נוצרת..."));
    m_browser = new QProcess(this);
    connect(m_browser, &QProcess::finished, this, [this, generation, png](int code, QProcess::ExitStatus status) {
        m_browser->deleteLater();
        m_browser = nullptr;
        const bool ok
            = status == QProcess::NormalExit && code == 0 && QFile::exists(png) && TrimPreviewPicture(png);
        if (ok)
            m_previewPng = png;
        previewDone(generation, ok, ok ? QString() : QStringLiteral("אין תצוגה מקדימה: הדפדפן לא הצליח לצייר את המדבקה."));
    });
    connect(m_browser, &QProcess::errorOccurred, this, [this, generation](QProcess::ProcessError error) {
        if (error != QProcess::FailedToStart)
            return;
        m_browser->deleteLater();
        m_browser = nullptr;
        previewDone(generation, false, QStringLiteral("אין תצוגה מקדימה: לא ניתן להפעיל את הדפדפן Chromium."));
    });
    // The window is larger than any label a sheet of one holds, so nothing is
    // cut off; the picture is trimmed to the label afterwards.
    m_browser->start(chromium, {QStringLiteral("--headless"), QStringLiteral("--no-sandbox"),
                                QStringLiteral("--disable-gpu"), QStringLiteral("--no-first-run"),
                                QStringLiteral("--disable-background-networking"),
                                QStringLiteral("--disable-component-update"), QStringLiteral("--disable-sync"),
                                QStringLiteral("--hide-scrollbars"),
                                QStringLiteral("--user-data-dir=") + m_previewDir->filePath(QStringLiteral("profile")),
                                QStringLiteral("--window-size=1200,1600"), QStringLiteral("--screenshot=") + png,
                                QUrl::fromLocalFile(page).toString()});
}

void FrmLabDef::previewDone(int generation, bool ok, const QString& why)
{
    if (generation != m_previewGeneration)
        return;
    if (ok)
        ui->lblPreview->setPixmap(QPixmap(m_previewPng));
    else
        ui->lblPreview->setText(why);
    emit previewFinished(ok);
}

// The seven line rows of the first and third tabs, under the column captions
// the form lays out.
void FrmLabDef::buildRows()
{
    m_rows.resize(kDirectLines);
    // The design columns stay together beside their field's caption.
    ui->gridDesign->setColumnStretch(8, 1);
    for (int i = 0; i < kDirectLines; ++i) {
        LineRow& r = m_rows[size_t(i)];
        QWidget* cells = ui->tabCells;
        r.chkXCell = new QCheckBox(cells);
        r.cmbXFld = new QComboBox(cells);
        r.cmbXFld->setMinimumContentsLength(18);
        r.cmbVType = new QComboBox(cells);
        r.CmbAlign = new QComboBox(cells);
        r.CmbDirection = new QComboBox(cells);
        r.txtPrefix = new QLineEdit(cells);
        r.lblAdd = new ClickLabel(cells);
        r.lblDel = new ClickLabel(cells);
        r.lblAdd->setText(QStringLiteral("הכנס"));
        r.lblDel->setText(QStringLiteral("הוצא"));
        for (ClickLabel* l : {r.lblAdd, r.lblDel}) {
            l->setCursor(Qt::PointingHandCursor);
            l->setStyleSheet(QStringLiteral("color: #0645ad; text-decoration: underline;"));
        }
        const std::pair<QWidget*, const char*> cellRow[] = {
            {r.chkXCell, "chkXCell"}, {r.cmbXFld, "cmbXFld"},     {r.cmbVType, "cmbVType"}, {r.CmbAlign, "CmbAlign"},
            {r.CmbDirection, "CmbDirection"}, {r.txtPrefix, "txtPrefix"}, {r.lblAdd, "lblAdd"}, {r.lblDel, "lblDel"},
        };
        int col = 0;
        for (const auto& [w, name] : cellRow) {
            w->setObjectName(indexed(name, i));
            ui->gridCells->addWidget(w, i + 1, col++);
        }

        QWidget* design = ui->tabDesign;
        r.lblFCap = new QLabel(QStringLiteral("תאור"), design);
        r.lblFCap->setTextFormat(Qt::PlainText);
        r.lblFCap->setMinimumWidth(140);
        r.CmbFont = new QComboBox(design);
        r.txtFontSize = new QLineEdit(design);
        r.txtFontSize->setMaximumWidth(50);
        r.CmbWeight = new QComboBox(design);
        r.ChkItalic = new QCheckBox(design);
        r.ChkUL = new QCheckBox(design);
        r.txtHeight = new QLineEdit(design);
        r.txtHeight->setMaximumWidth(60);
        r.ChkBorder = new QCheckBox(design);
        const std::pair<QWidget*, const char*> designRow[] = {
            {r.lblFCap, "lblFCap"}, {r.CmbFont, "CmbFont"}, {r.txtFontSize, "txtFontSize"}, {r.CmbWeight, "CmbWeight"},
            {r.ChkItalic, "ChkItalic"}, {r.ChkUL, "ChkUL"}, {r.txtHeight, "txtHeight"}, {r.ChkBorder, "ChkBorder"},
        };
        col = 0;
        for (const auto& [w, name] : designRow) {
            w->setObjectName(indexed(name, i));
            ui->gridDesign->addWidget(w, i + 1, col++);
        }

        connect(r.lblAdd, &ClickLabel::clicked, this, [this, i] { lblAdd_Click(i); });
        connect(r.lblDel, &ClickLabel::clicked, this, [this, i] { lblDel_Click(i); });
    }
}

void FrmLabDef::FillXFld(const QStringList& fieldCaptions)
{
    for (LineRow& r : m_rows)
        fill(r.cmbXFld, fieldCaptions);
}

void FrmLabDef::FillCombos()
{
    for (LineRow& r : m_rows) {
        fill(r.cmbVType, {QStringLiteral("טקסט:"), QStringLiteral("ברקוד")});
        fill(r.CmbFont, {QStringLiteral("Arial"), QStringLiteral("David"), QStringLiteral("Miriam")});
        fill(r.CmbWeight, {QStringLiteral("רגיל"), QStringLiteral("מודגש"), QStringLiteral("עבה")});
        fill(r.CmbAlign, {QStringLiteral("ימין"), QStringLiteral("מרכז"), QStringLiteral("שמאל")});
        fill(r.CmbDirection, {QStringLiteral("משמאל"), QStringLiteral("מימין")});
    }
}

// The controls and the fields of `layout` they show, in the order they are
// copied: the line rows, then the single controls.
std::vector<FrmLabDef::Binding> FrmLabDef::bindings(DirectLabelLayout& layout) const
{
    std::vector<Binding> out;
    for (int i = 0; i < kDirectLines; ++i) {
        const LineRow& r = m_rows[size_t(i)];
        LabelLineDef& l = layout.lines[size_t(i)];
        const QString line = QStringLiteral(" בשורה %1").arg(i + 1);
        out.push_back({r.chkXCell, &l.UseCell, QStringLiteral("תוכן המדבקה") + line, 0});
        out.push_back({r.cmbXFld, &l.FldID, QStringLiteral("תוכן המדבקה") + line, 0});
        out.push_back({r.cmbVType, &l.ViewType, QStringLiteral("אופן תצוגה") + line, 0});
        out.push_back({r.CmbFont, &l.Font, QStringLiteral("גופן") + line, 2});
        out.push_back({r.txtFontSize, &l.FontSize, QStringLiteral("גודל הגופן") + line, 2});
        out.push_back({r.CmbWeight, &l.FontWeight, QStringLiteral("עובי") + line, 2});
        out.push_back({r.ChkUL, &l.FontUL, QStringLiteral("קו תחתי") + line, 2});
        out.push_back({r.ChkItalic, &l.FontItalic, QStringLiteral("נטוי") + line, 2});
        out.push_back({r.CmbAlign, &l.Align, QStringLiteral("יישור") + line, 0});
        out.push_back({r.CmbDirection, &l.Direction, QStringLiteral("כיוון") + line, 0});
        out.push_back({r.txtPrefix, &l.Prefix, QStringLiteral("קידומת") + line, 0});
        out.push_back({r.txtHeight, &l.Height, QStringLiteral("גובה") + line, 2});
        out.push_back({r.ChkBorder, &l.Border, QStringLiteral("מסגרת") + line, 2});
    }
    LabelBarDef& b = layout.bar;
    LabelPageDef& p = layout.page;
    const std::vector<Binding> single = {
        {ui->cmbXBarType, &b.BarType, QStringLiteral("סוג הברקוד"), 1},
        {ui->txtXBarH, &b.BarHeight, QStringLiteral("גובה הברקוד"), 1},
        {ui->txtXBarLeftLen, &b.LeftLen, QStringLiteral("מס' תוים משמאל"), 1},
        {ui->txtXLeftPrefix, &b.LeftPrefix, QStringLiteral("קידומת משמאל"), 1},
        {ui->txtUserResoX, &b.UserResoX, QStringLiteral("רוחב בנקודות"), 1},
        {ui->txtUserResoY, &b.UserResoY, QStringLiteral("גובה בנקודות"), 1},
        {ui->chkCDigit, &b.CheckDigit, QStringLiteral("ספרת ביקורת"), 1},
        {ui->ChkShowDesc, &b.ShowDesc, QStringLiteral("הצג גם כטקסט"), 1},
        {ui->txtDimX, &b.DimX, QStringLiteral("עובי קו"), 1},
        {ui->txtWideBarRatio, &b.WideBarRatio, QStringLiteral("יחס עובי"), 1},
        {ui->txtCols, &p.PageCols, QStringLiteral("מדבקות בכל שורה"), 1},
        {ui->txtRows, &p.PageRows, QStringLiteral("שורות"), 1},
        {ui->chkOpenPrintDlg, &p.PageAutoPrint, QStringLiteral("פתיחה אוטומטית של חלון בחירת מדפסת"), 1},
        {ui->txtMaxTextLen, &p.MaxTextLen, QStringLiteral("מספר תוים מקסימלי לטקסט"), 1},
        {ui->txtLabTop, &p.LabTop, QStringLiteral("שוליים עליונים"), 1},
        {ui->txtLabBottom, &p.LabBottom, QStringLiteral("שוליים תחתונים"), 1},
    };
    out.insert(out.end(), single.begin(), single.end());
    return out;
}

bool FrmLabDef::GetSetFormLabDef(int action, QWidget* pObject, const FieldRef& pProperty, QString* wanted)
{
    if (auto* list = qobject_cast<QComboBox*>(pObject)) {
        if (action == 1) {
            const int value = std::visit([](auto* f) -> int {
                using T = std::remove_pointer_t<decltype(f)>;
                if constexpr (std::is_same_v<T, QString>)
                    return -1;
                else
                    return int(*f);
            }, pProperty);
            if (value < 0)
                return true;
            // A position the list does not hold (a field the control no
            // longer has): the list is left as it is.
            if (value >= list->count())
                return false;
            list->setCurrentIndex(value);
        } else if (action == 2 && list->currentIndex() >= 0) {
            const int pos = list->currentIndex();
            std::visit([pos](auto* f) {
                using T = std::remove_pointer_t<decltype(f)>;
                if constexpr (std::is_same_v<T, bool>)
                    *f = pos != 0;
                else if constexpr (!std::is_same_v<T, QString>)
                    *f = T(pos);
            }, pProperty);
        }
        return true;
    }
    if (auto* box = qobject_cast<QCheckBox*>(pObject)) {
        if (action == 1) {
            const bool on = std::visit([](auto* f) -> bool {
                using T = std::remove_pointer_t<decltype(f)>;
                if constexpr (std::is_same_v<T, QString>)
                    return false;
                else
                    return *f == T(1) || double(*f) == -1.0;
            }, pProperty);
            box->setCheckState(on ? Qt::Checked : Qt::Unchecked);
        } else if (action == 2) {
            // The grey state is not a yes.
            const bool on = box->checkState() == Qt::Checked;
            std::visit([on](auto* f) {
                using T = std::remove_pointer_t<decltype(f)>;
                if constexpr (std::is_same_v<T, bool>)
                    *f = on;
                else if constexpr (!std::is_same_v<T, QString>)
                    *f = on ? T(-1) : T(0);
            }, pProperty);
        }
        return true;
    }
    if (auto* edit = qobject_cast<QLineEdit*>(pObject)) {
        if (action == 1) {
            edit->setText(std::visit([](auto* f) -> QString {
                using T = std::remove_pointer_t<decltype(f)>;
                if constexpr (std::is_same_v<T, QString>)
                    return *f;
                else if constexpr (std::is_same_v<T, bool>)
                    return *f ? QStringLiteral("-1") : QStringLiteral("0");
                else if constexpr (std::is_same_v<T, float>)
                    return QString::number(double(*f));
                else
                    return QString::number(int(*f));
            }, pProperty));
            return true;
        }
        if (action != 2)
            return true;
        const QString text = edit->text();
        return std::visit([&](auto* f) -> bool {
            using T = std::remove_pointer_t<decltype(f)>;
            if constexpr (std::is_same_v<T, QString>) {
                *f = text;
                return true;
            } else if constexpr (std::is_same_v<T, float>) {
                bool ok = false;
                const double d = text.trimmed().toDouble(&ok);
                if (!ok || !std::isfinite(d) || std::abs(d) > double(std::numeric_limits<float>::max())) {
                    if (wanted)
                        *wanted = QStringLiteral("מספר");
                    return false;
                }
                *f = float(d);
                return true;
            } else if constexpr (std::is_same_v<T, bool>) {
                const auto n = wholeNumber<short>(text);
                if (!n) {
                    if (wanted)
                        *wanted = QStringLiteral("0 או -1");
                    return false;
                }
                *f = *n != 0;
                return true;
            } else {
                const auto n = wholeNumber<T>(text);
                if (!n) {
                    if (wanted)
                        *wanted = wholeRange<T>();
                    return false;
                }
                *f = *n;
                return true;
            }
        }, pProperty);
    }
    return true;
}

bool FrmLabDef::GetSetFormLabDefs(int action)
{
    if (action == 1) {
        // A value one control cannot show is skipped; the others still show theirs.
        for (const Binding& b : bindings(m_layout))
            GetSetFormLabDef(1, b.control, b.field);
        return true;
    }
    if (action != 2)
        return false;
    // Every box is read into a copy first, so that one wrong box leaves the
    // whole layout as it was instead of half of it changed.
    DirectLabelLayout staged = m_layout;
    for (const Binding& b : bindings(staged)) {
        QString wanted;
        if (GetSetFormLabDef(2, b.control, b.field, &wanted))
            continue;
        auto* edit = qobject_cast<QLineEdit*>(b.control);
        const QString text = edit ? edit->text() : QString();
        ui->SSTab1->setCurrentIndex(b.tab);
        b.control->setFocus();
        if (edit)
            edit->selectAll();
        if (m_prompt)
            m_prompt->critical(titles::Fault,
                               QStringLiteral("הערך \"%1\" בשדה \"%2\" אינו תקין: יש לרשום בו %3. "
                                              "הגדרות המדבקה לא עודכנו.")
                                   .arg(text, b.description, wanted));
        return false;
    }
    m_layout = staged;
    return true;
}

void FrmLabDef::MoveCell(int FromCell, int ToCell, bool WithClean)
{
    if (FromCell < 0 || FromCell >= kDirectLines || ToCell < 0 || ToCell >= kDirectLines)
        return;
    const LineRow& from = m_rows[size_t(FromCell)];
    LineRow& to = m_rows[size_t(ToCell)];
    to.chkXCell->setCheckState(from.chkXCell->checkState());
    to.cmbXFld->setCurrentIndex(from.cmbXFld->currentIndex());
    to.cmbVType->setCurrentIndex(from.cmbVType->currentIndex());
    to.CmbFont->setCurrentIndex(from.CmbFont->currentIndex());
    to.CmbWeight->setCurrentIndex(from.CmbWeight->currentIndex());
    to.CmbAlign->setCurrentIndex(from.CmbAlign->currentIndex());
    to.CmbDirection->setCurrentIndex(from.CmbDirection->currentIndex());
    to.txtFontSize->setText(from.txtFontSize->text());
    to.txtPrefix->setText(from.txtPrefix->text());
    to.txtHeight->setText(from.txtHeight->text());
    to.ChkUL->setCheckState(from.ChkUL->checkState());
    to.ChkItalic->setCheckState(from.ChkItalic->checkState());
    to.ChkBorder->setCheckState(from.ChkBorder->checkState());
    if (WithClean) {
        // Only what makes a line print is cleared; its design stays for reuse.
        from.chkXCell->setCheckState(Qt::Unchecked);
        from.cmbXFld->setCurrentIndex(-1);
        from.cmbVType->setCurrentIndex(0);
    }
}

void FrmLabDef::lblAdd_Click(int index)
{
    if (index < 0 || index >= kLastMovable)
        return;
    for (int k = kLastMovable - 1; k >= index; --k)
        MoveCell(k, k + 1, true);
}

void FrmLabDef::lblDel_Click(int index)
{
    if (index < 0 || index >= kLastMovable)
        return;
    for (int k = index; k < kLastMovable; ++k)
        MoveCell(k + 1, k, true);
}

// The design rows name the field each of them styles.
void FrmLabDef::SSTab1_Click(int tab)
{
    if (ui->SSTab1->widget(tab) == ui->tabPreview)
        schedulePreview();
    if (tab != 2)
        return;
    for (LineRow& r : m_rows)
        r.lblFCap->setText(r.cmbXFld->currentText());
}

void FrmLabDef::cmdClose_Click()
{
    if (GetSetFormLabDefs(2))
        accept();
}

} // namespace tagora
