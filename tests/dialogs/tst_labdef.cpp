#include "dialogs/frmlabdef.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"

#include <QCheckBox>
#include <QComboBox>
#include <QLabel>
#include <QLineEdit>
#include <QProcess>
#include <QPushButton>
#include <QSignalSpy>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QTabWidget>
#include <QtTest>
#include <map>

using namespace tagora;

namespace {
// Keeps what the layout writes, so two layouts compare as their stored form.
class MemoryStore : public SettingsStore {
public:
    std::map<QString, QString> values;
    std::optional<QString> value(const QString&, const QString& section, const QString& key) const override
    {
        const auto it = values.find(section + QLatin1Char('/') + key);
        if (it == values.end())
            return std::nullopt;
        return it->second;
    }
    bool setValue(const QString&, const QString& section, const QString& key, const QString& text) override
    {
        values[section + QLatin1Char('/') + key] = text;
        return true;
    }
};

std::map<QString, QString> stored(DirectLabelLayout layout)
{
    MemoryStore s;
    SetGetLabelDefs(1, layout, s);
    return s.values;
}

QStringList captions()
{
    QStringList c;
    for (int k = 0; k < 10; ++k)
        c << QStringLiteral("שדה %1").arg(k);
    return c;
}

template <class T> T* c(QWidget& w, const QString& name)
{
    T* found = w.findChild<T*>(name);
    if (!found)
        qFatal("no control %s", qPrintable(name));
    return found;
}

QString row(const char* base, int i) { return QStringLiteral("%1(%2)").arg(QLatin1String(base)).arg(i); }

// A name line over a Code 128 barcode of field 1, shown at the picture's own size.
DirectLabelLayout twoLineLayout()
{
    DirectLabelLayout l;
    l.lines[0].UseCell = true;
    l.lines[0].FldID = 0;
    l.lines[0].ViewType = 0;
    l.lines[1].UseCell = true;
    l.lines[1].FldID = 1;
    l.lines[1].ViewType = 1;
    l.bar.BarType = 2;
    l.bar.DimX = 0.01f;
    l.bar.BarHeight = 0.3f;
    l.bar.UserResoX = 0;
    l.bar.UserResoY = 0;
    return l;
}

QVector<PreviewField> previewRecord(const QString& barcode)
{
    return {{QStringLiteral("VNItemName"), false, QStringLiteral("פריט לדוגמה")},
            {QStringLiteral("BarCode"), false, barcode}};
}
} // namespace

class TestLabDef : public QObject {
    Q_OBJECT
    std::shared_ptr<ScriptedPrompt> prompt = std::make_shared<ScriptedPrompt>(nullptr);

private slots:
    // The preview is the engine's own page as a browser draws it: its
    // barcode reads back as the record's value.
    void previewBarcodeReadsBack()
    {
        const QString zbarimg = QStandardPaths::findExecutable("zbarimg");
        if (QStandardPaths::findExecutable("chromium").isEmpty() || zbarimg.isEmpty())
            QSKIP("chromium or zbarimg is not installed");
        DirectLabelLayout layout = twoLineLayout();
        FrmLabDef d(layout, captions(), nullptr);
        d.setPreviewSource([] { return previewRecord(QStringLiteral("TAGORA-12345")); }, QString());
        QSignalSpy done(&d, &FrmLabDef::previewFinished);
        d.refreshPreview();
        QVERIFY(done.wait(120000));
        QVERIFY2(done.last().at(0).toBool(), qPrintable(c<QLabel>(d, "lblPreview")->text()));
        QVERIFY(!c<QLabel>(d, "lblPreview")->pixmap().isNull());

        QProcess reader;
        reader.start(zbarimg, {"-q", d.previewPicture()});
        QVERIFY(reader.waitForFinished(60000));
        QCOMPARE(QString::fromUtf8(reader.readAllStandardOutput()).trimmed(), QStringLiteral("CODE-128:TAGORA-12345"));
    }

    // Without a browser the preview says why, and the dialog goes on working.
    void previewWithoutBrowser()
    {
        QTemporaryDir empty;
        const QByteArray path = qgetenv("PATH");
        qputenv("PATH", empty.path().toUtf8());
        DirectLabelLayout layout = twoLineLayout();
        FrmLabDef d(layout, captions(), nullptr);
        d.setPreviewSource([] { return previewRecord(QStringLiteral("TAGORA-1")); }, QString());
        QSignalSpy done(&d, &FrmLabDef::previewFinished);
        d.refreshPreview();
        qputenv("PATH", path);
        QVERIFY(done.count() == 1 || done.wait(10000));
        QVERIFY(!done.last().at(0).toBool());
        QVERIFY(c<QLabel>(d, "lblPreview")->text().contains(QStringLiteral("Chromium")));
        c<QLineEdit>(d, row("txtPrefix", 0))->setText(QStringLiteral("שם:"));
        c<QPushButton>(d, "cmdClose")->click();
        QCOMPARE(layout.lines[0].Prefix, QStringLiteral("שם:"));
    }

    void init() { prompt->clear(); }

    // No stored values: the defaults reach the boxes, and confirming them
    // untouched stores the layout as it was.
    void defaultsRoundTrip()
    {
        DirectLabelLayout layout;
        MemoryStore empty;
        SetGetLabelDefs(2, layout, empty);
        const auto before = stored(layout);
        FrmLabDef f(layout, captions(), prompt);
        QCOMPARE(c<QTabWidget>(f, "SSTab1")->currentIndex(), 0);
        for (int i = 0; i < kDirectLines; ++i) {
            QCOMPARE(c<QCheckBox>(f, row("chkXCell", i))->checkState(), Qt::Unchecked);
            QCOMPARE(c<QComboBox>(f, row("cmbXFld", i))->currentIndex(), -1);
            QCOMPARE(c<QComboBox>(f, row("cmbXFld", i))->count(), 10);
            QCOMPARE(c<QComboBox>(f, row("CmbAlign", i))->currentText(), QStringLiteral("מרכז"));
            QCOMPARE(c<QComboBox>(f, row("CmbDirection", i))->currentText(), QStringLiteral("מימין"));
            QCOMPARE(c<QLineEdit>(f, row("txtFontSize", i))->text(), QStringLiteral("9"));
        }
        const std::pair<const char*, const char*> texts[] = {
            {"txtXBarH", "0.4"}, {"txtDimX", "0.01"}, {"txtWideBarRatio", "2.2"}, {"txtUserResoX", "100"},
            {"txtUserResoY", "50"}, {"txtRows", "6"}, {"txtCols", "4"}};
        for (const auto& [name, text] : texts)
            QCOMPARE(c<QLineEdit>(f, name)->text(), QString::fromLatin1(text));
        QCOMPARE(c<QComboBox>(f, "cmbXBarType")->currentText(), QStringLiteral("CODE-39"));
        QVERIFY(c<QCheckBox>(f, "chkCDigit")->isChecked());
        QVERIFY(!c<QCheckBox>(f, "chkOpenPrintDlg")->isChecked());
        c<QPushButton>(f, "cmdClose")->click();
        QCOMPARE(f.result(), int(QDialog::Accepted));
        QVERIFY(stored(layout) == before);
    }

    void savesAsStored_data()
    {
        QTest::addColumn<QString>("control");
        QTest::addColumn<QString>("value");
        QTest::addColumn<QString>("key");
        QTest::addColumn<QString>("text");
        QTest::newRow("used line") << "chkXCell(2)" << "1" << "LabelDef2/UseCell" << "-1";
        QTest::newRow("narrow bar") << "txtDimX" << "0.01" << "LabelBar/DimX" << "0.01";
        QTest::newRow("ratio") << "txtWideBarRatio" << "2.5" << "LabelBar/WideBarRatio" << "2.5";
        QTest::newRow("rounded size") << "txtFontSize(4)" << " 9.6 " << "LabelDef4/FontSize" << "10";
        QTest::newRow("auto print") << "chkOpenPrintDlg" << "1" << "DirectLabel/PageAutoPrint" << "-1";
        QTest::newRow("field") << "cmbXFld(6)" << "9" << "LabelDef6/FldID" << "9";
    }
    void savesAsStored()
    {
        QFETCH(QString, control);
        QFETCH(QString, value);
        QFETCH(QString, key);
        QFETCH(QString, text);
        DirectLabelLayout layout;
        layout.bar.DimX = 0.3f;
        FrmLabDef f(layout, captions(), prompt);
        QWidget* w = f.findChild<QWidget*>(control);
        QVERIFY(w);
        if (auto* box = qobject_cast<QCheckBox*>(w))
            box->setChecked(value == QLatin1String("1"));
        else if (auto* list = qobject_cast<QComboBox*>(w))
            list->setCurrentIndex(value.toInt());
        else
            qobject_cast<QLineEdit*>(w)->setText(value);
        c<QPushButton>(f, "cmdClose")->click();
        QCOMPARE(stored(layout).at(key), text);
    }

    void moveLines_data()
    {
        QTest::addColumn<bool>("insert");
        QTest::addColumn<int>("at");
        QTest::addColumn<QString>("used");   // ticks of rows 0-6 after
        QTest::addColumn<QString>("fields"); // field positions of rows 0-6 after
        QTest::addColumn<QString>("sizes");  // font sizes of rows 0-6 after
        // Before: rows 0-2 used with fields 3, 4, 5; font sizes 10 to 16.
        QTest::newRow("insert at 6") << true << 6 << "1110000" << "3,4,5,-1,-1,-1,-1" << "10,11,12,13,14,15,16";
        QTest::newRow("remove at 6") << false << 6 << "1110000" << "3,4,5,-1,-1,-1,-1" << "10,11,12,13,14,15,16";
        QTest::newRow("remove at 0") << false << 0 << "1100000" << "4,5,-1,-1,-1,-1,-1" << "11,12,13,14,15,16,16";
        QTest::newRow("insert at 1") << true << 1 << "1011000" << "3,-1,4,5,-1,-1,-1" << "10,11,11,12,13,14,15";
    }
    void moveLines()
    {
        QFETCH(bool, insert);
        QFETCH(int, at);
        QFETCH(QString, used);
        QFETCH(QString, fields);
        QFETCH(QString, sizes);
        DirectLabelLayout layout;
        for (int i = 0; i < kDirectLines; ++i) {
            layout.lines[size_t(i)].FontSize = uchar(10 + i);
            if (i < 3) {
                layout.lines[size_t(i)].UseCell = true;
                layout.lines[size_t(i)].FldID = short(3 + i);
                layout.lines[size_t(i)].ViewType = 1;
            }
        }
        FrmLabDef f(layout, captions(), prompt);
        if (insert)
            f.lblAdd_Click(at);
        else
            f.lblDel_Click(at);
        QString u;
        QStringList fl, sz;
        for (int i = 0; i < kDirectLines; ++i) {
            u += c<QCheckBox>(f, row("chkXCell", i))->isChecked() ? '1' : '0';
            fl << QString::number(c<QComboBox>(f, row("cmbXFld", i))->currentIndex());
            sz << c<QLineEdit>(f, row("txtFontSize", i))->text();
            // A row left empty shows text, a moved one keeps its barcode view.
            const int view = c<QComboBox>(f, row("cmbVType", i))->currentIndex();
            QCOMPARE(view, u.endsWith('1') ? 1 : 0);
        }
        QCOMPARE(u, used);
        QCOMPARE(fl.join(','), fields);
        QCOMPARE(sz.join(','), sizes);
    }

    void listsAndChecks_data()
    {
        QTest::addColumn<QString>("control");
        QTest::addColumn<int>("state"); // list position, or check state
        QTest::addColumn<QString>("key");
        QTest::addColumn<QString>("text");
        QTest::newRow("no barcode type keeps the old") << "cmbXBarType" << -1 << "LabelBar/BarType" << "3";
        QTest::newRow("barcode type chosen") << "cmbXBarType" << 6 << "LabelBar/BarType" << "6";
        QTest::newRow("no font keeps the old") << "CmbFont(1)" << -1 << "LabelDef1/Font" << "2";
        QTest::newRow("grey line tick") << "chkXCell(0)" << int(Qt::PartiallyChecked) << "LabelDef0/UseCell" << "0";
        QTest::newRow("grey check digit") << "chkCDigit" << int(Qt::PartiallyChecked) << "LabelBar/CheckDigit" << "0";
        QTest::newRow("ticked frame") << "ChkBorder(5)" << int(Qt::Checked) << "LabelDef5/Border" << "-1";
    }
    void listsAndChecks()
    {
        QFETCH(QString, control);
        QFETCH(int, state);
        QFETCH(QString, key);
        QFETCH(QString, text);
        DirectLabelLayout layout;
        layout.bar.BarType = 3;
        layout.lines[0].UseCell = true;
        layout.lines[1].Font = 2;
        FrmLabDef f(layout, captions(), prompt);
        if (auto* list = f.findChild<QComboBox*>(control))
            list->setCurrentIndex(state);
        else
            c<QCheckBox>(f, control)->setCheckState(Qt::CheckState(state));
        c<QPushButton>(f, "cmdClose")->click();
        QCOMPARE(f.result(), int(QDialog::Accepted));
        QCOMPARE(stored(layout).at(key), text);
    }

    // One wrong box refuses the whole confirmation: nothing before or after it
    // changes, the dialog stays, and the message names the box.
    void badBoxAppliesNothing_data()
    {
        QTest::addColumn<QString>("box");
        QTest::addColumn<QString>("text");
        QTest::addColumn<QString>("named");
        QTest::addColumn<int>("tab");
        QTest::newRow("empty font size") << "txtFontSize(3)" << "" << "גודל הגופן בשורה 4" << 2;
        QTest::newRow("font size above a byte") << "txtFontSize(3)" << "256" << "גודל הגופן בשורה 4" << 2;
        QTest::newRow("font size not a number") << "txtFontSize(0)" << "abc" << "גודל הגופן בשורה 1" << 2;
        QTest::newRow("rows beyond a short") << "txtRows" << "40000" << "שורות" << 1;
        QTest::newRow("ratio not a number") << "txtWideBarRatio" << "2,2x" << "יחס עובי" << 1;
    }
    void badBoxAppliesNothing()
    {
        QFETCH(QString, box);
        QFETCH(QString, text);
        QFETCH(QString, named);
        QFETCH(int, tab);
        DirectLabelLayout layout;
        const auto before = stored(layout);
        FrmLabDef f(layout, captions(), prompt);
        f.show();
        c<QCheckBox>(f, "chkXCell(0)")->setChecked(true);
        c<QLineEdit>(f, "txtPrefix(0)")->setText(QStringLiteral("X"));
        c<QLineEdit>(f, "txtLabBottom")->setText(QStringLiteral("7"));
        c<QLineEdit>(f, box)->setText(text);
        c<QPushButton>(f, "cmdClose")->click();
        QVERIFY(f.isVisible());
        QVERIFY(stored(layout) == before);
        QCOMPARE(prompt->criticalCount(), 1);
        QCOMPARE(prompt->shown().front().title, QStringLiteral("תקלה"));
        QVERIFY2(prompt->shown().front().text.contains(named), qPrintable(prompt->shown().front().text));
        QCOMPARE(c<QTabWidget>(f, "SSTab1")->currentIndex(), tab);
        // Mended, the same confirmation goes through in full.
        c<QLineEdit>(f, box)->setText(QStringLiteral("12"));
        c<QPushButton>(f, "cmdClose")->click();
        QCOMPARE(f.result(), int(QDialog::Accepted));
        QVERIFY(layout.lines[0].UseCell);
        QCOMPARE(layout.page.LabBottom, short(7));
    }

    // A value a list cannot show is passed over; the controls after it still
    // get theirs, and confirming keeps the value.
    void unshowableValueSkipped()
    {
        DirectLabelLayout layout;
        layout.lines[0].FldID = 50;
        layout.lines[0].Font = 2;
        layout.lines[6].Prefix = QStringLiteral("מחיר");
        layout.bar.BarType = 20;
        layout.page.LabBottom = 9;
        FrmLabDef f(layout, captions(), prompt);
        QCOMPARE(c<QComboBox>(f, "cmbXFld(0)")->currentIndex(), -1);
        QCOMPARE(c<QComboBox>(f, "CmbFont(0)")->currentIndex(), 2);
        QCOMPARE(c<QLineEdit>(f, "txtPrefix(6)")->text(), QStringLiteral("מחיר"));
        QCOMPARE(c<QComboBox>(f, "cmbXBarType")->currentIndex(), -1);
        QCOMPARE(c<QLineEdit>(f, "txtLabBottom")->text(), QStringLiteral("9"));
        c<QPushButton>(f, "cmdClose")->click();
        QCOMPARE(layout.lines[0].FldID, short(50));
        QCOMPARE(layout.bar.BarType, short(20));
    }

    void captionsAndResets()
    {
        DirectLabelLayout layout;
        layout.lines[1].FldID = 4;
        FrmLabDef f(layout, captions(), prompt);
        c<QComboBox>(f, "cmbXFld(2)")->setCurrentIndex(7);
        c<QTabWidget>(f, "SSTab1")->setCurrentIndex(2);
        QCOMPARE(c<QLabel>(f, "lblFCap(1)")->text(), captions()[4]);
        QCOMPARE(c<QLabel>(f, "lblFCap(2)")->text(), captions()[7]);
        c<QLineEdit>(f, "txtDimX")->setText(QStringLiteral("0.3"));
        c<QLineEdit>(f, "txtWideBarRatio")->setText(QStringLiteral("3"));
        QMetaObject::invokeMethod(c<QLabel>(f, "lblDimX"), "clicked");
        QMetaObject::invokeMethod(c<QLabel>(f, "lblWideBarRatio"), "clicked");
        QCOMPARE(c<QLineEdit>(f, "txtDimX")->text(), QStringLiteral("0.01"));
        QCOMPARE(c<QLineEdit>(f, "txtWideBarRatio")->text(), QStringLiteral("2.2"));
        // Cancel leaves the layout as it was.
        c<QPushButton>(f, "cmdCancel")->click();
        QCOMPARE(layout.lines[2].FldID, short(-1));
    }
};

QTEST_MAIN(TestLabDef)
#include "tst_labdef.moc"
