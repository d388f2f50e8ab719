#include "support/cardfixture.h"

#include "control/settingstable.h"
#include "platform/controlbinding.h"

#include <QDialog>
#include <QLineEdit>
#include <QPushButton>
#include <QRadioButton>
#include <QSettings>
#include <QtTest>

using namespace tagora;

namespace {
QString get(const CardFixture& f, const QString& name)
{
    QObject* c = f.c(name);
    if (!c)
        return QStringLiteral("<missing %1>").arg(name);
    return readBound(c, *addressKind(c)).value_or(QStringLiteral("<none>"));
}

void set(const CardFixture& f, const QString& name, const QString& value)
{
    QObject* c = f.c(name);
    QVERIFY2(c, qPrintable(name));
    QVERIFY2(writeBound(c, *addressKind(c), value), qPrintable(name + " = " + value));
}

QStringList keysOf(const QString& path, const QString& group)
{
    QSettings s(path, QSettings::IniFormat);
    s.beginGroup(group);
    return s.childKeys();
}

QByteArray readAll(const QString& path)
{
    QFile f(path);
    return f.open(QIODevice::ReadOnly) ? f.readAll() : QByteArray("(missing)");
}

QString stored(const QString& path, const QString& group, const QString& key)
{
    QSettings s(path, QSettings::IniFormat);
    return s.value(group + '/' + key).toString();
}
} // namespace

class TestSettings : public QObject {
    Q_OBJECT
private slots:
    void initTestCase() { QStandardPaths::setTestModeEnabled(true); }

    // A first start chooses no printer though printers exist, and shows the
    // default label file as this run's.
    void firstStart()
    {
        CardFixture f({}, {"Office", "Zebra"});
        QCOMPARE(f.c<QComboBox>("cmbPrinter")->currentIndex(), -1);
        QVERIFY(!get(f, "txtLabelName").isEmpty());
        QCOMPARE(get(f, "lblLabelName(1)"), get(f, "txtLabelName"));
    }

    // A stored value the control refuses leaves it as it was, and the rows
    // after it in the section still load.
    void refusedValueIsSkipped_data()
    {
        QTest::addColumn<QByteArray>("ini");
        QTest::addColumn<QString>("refusing");
        QTest::addColumn<QString>("unchanged");
        QTest::addColumn<QString>("later");
        QTest::addColumn<QString>("laterValue");
        QTest::newRow("user beyond list") << QByteArray("[GeneralParams]\nUser=5\nPrintDelay=7\n") << "cmbUser"
                                          << "-1" << "txtPrintDelay" << "7";
        QTest::newRow("option not a truth")
            << QByteArray("[GeneralParams]\nOptOLE0=maybe\nOptOLE3=True\n") << "OptOLE(0)" << "False" << "OptOLE(3)"
            << "True";
        QTest::newRow("check box out of range")
            << QByteArray("[ImportItems]\nImportAlterKeys=7\nCleanItems=1\n") << "ChkImportAlterKeys" << "0"
            << "ChkClean" << "1";
        QTest::newRow("list position not a number")
            << QByteArray("[ImportDocs]\nQtyFrom=abc\nQtyFactor=12\n") << "cmbQtyFrom" << "0" << "txtQtyFactor"
            << "12";
        QTest::newRow("printer not installed")
            << QByteArray("[GeneralParams]\nDefPrinter=Nowhere\nItmRTL=0\n") << "cmbPrinter" << "" << "chkItmRTL"
            << "0";
    }
    void refusedValueIsSkipped()
    {
        QFETCH(QByteArray, ini);
        QFETCH(QString, refusing);
        QFETCH(QString, unchanged);
        QFETCH(QString, later);
        QFETCH(QString, laterValue);
        CardFixture f(ini, {"Office"});
        QCOMPARE(get(f, refusing), unchanged);
        QCOMPARE(get(f, later), laterValue);
    }

    // A list filled from outside keeps, on save, what it cannot show now.
    void listsKeepWhatTheyCannotShow_data()
    {
        QTest::addColumn<QByteArray>("ini");
        QTest::addColumn<QString>("chosen");
        QTest::addColumn<QString>("key");
        QTest::addColumn<QString>("saved");
        QTest::newRow("printer not installed here") << QByteArray("[GeneralParams]\nDefPrinter=Nowhere\n") << ""
                                                    << "DefPrinter" << "Nowhere";
        QTest::newRow("another printer chosen") << QByteArray("[GeneralParams]\nDefPrinter=Nowhere\n") << "Office"
                                                << "DefPrinter" << "Office";
        QTest::newRow("user list empty now") << QByteArray("[GeneralParams]\nUser=5\n") << "" << "User" << "5";
    }
    void listsKeepWhatTheyCannotShow()
    {
        QFETCH(QByteArray, ini);
        QFETCH(QString, chosen);
        QFETCH(QString, key);
        QFETCH(QString, saved);
        CardFixture f(ini, {"Office"}, {"Base price"});
        if (!chosen.isEmpty())
            set(f, "cmbPrinter", chosen);
        f.c<QLineEdit>("txtPrintDelay")->setText("4");
        f.c<QPushButton>("cmdSaveDef1")->click();
        QCOMPARE(stored(f.settingsPath, "GeneralParams", key), saved);
        QCOMPARE(stored(f.settingsPath, "GeneralParams", "PrintDelay"), QString("4"));
    }

    void allOptionsClearMeansNoProgram()
    {
        CardFixture f("[GeneralParams]\nOptOLE0=False\nOptOLE1=False\nOptOLE2=False\nOptOLE3=False\nOptOLE4=False\n");
        for (int i = 0; i < 5; ++i)
            QVERIFY(!f.c<QRadioButton>(QStringLiteral("OptOLE(%1)").arg(i))->isChecked());
        QCOMPARE(f.card->GetOLEOption(), short(0));
    }

    // Without the ERP's price lists no save button may touch the store; with
    // them, each writes its own section and no other.
    void saveButtons()
    {
        const QString notSaved = QString::fromUtf8("ההגדרות לא נשמרו: רשימת המחירונים ריקה (אין חיבור לפריוריטי)");
        for (const SettingSection& s : settingSections()) {
            const QString button = s.saveButton, section = s.name;
            {
                CardFixture f;
                f.c<QPushButton>(button)->click();
                QVERIFY2(keysOf(f.settingsPath, section).isEmpty(), qPrintable(button));
                QCOMPARE(f.card->message(), notSaved);
            }
            CardFixture f({}, {}, {"Base price"});
            f.c<QPushButton>(button)->click();
            QCOMPARE(f.card->message(), QString::fromUtf8("ההגדרות נשמרו"));
            QCOMPARE(QSettings(f.settingsPath, QSettings::IniFormat).childGroups(), QStringList{section});
            QVERIFY2(!keysOf(f.settingsPath, section).isEmpty(), qPrintable(button));
        }
        // A host's save is refused the same way.
        CardFixture f;
        f.card->SetGetRegParams(1, 1);
        QVERIFY(keysOf(f.settingsPath, "GeneralParams").isEmpty());
        QCOMPARE(f.card->message(), notSaved);
    }

    // What one instance saves, the next one shows, whatever the text holds.
    void roundTrip()
    {
        const QList<std::pair<QString, QString>> values = {
            {"txtCompanyName", QString::fromUtf8("חברת \"אלף\", בע'מ = 100%")},
            {"OptOLE(3)", "True"},
            {"txtLabelName", "/srv/labels/it's a label.lbl"},
            {"txtPrintDelay", "  3"},
            {"chkItmRTL", "0"},
            {"CmbItemNameType", "1"},
            {"ChkImportAlterPrices", "1"},
            {"txtFromItemSort", "@start;#1"},
            {"lblVarNum(0)", "12"},
            {"txtFldExpr(35)", "tItems.ItemKey || ' - ' || tItems.ItemName"},
            {"txtPriceFormat", "#,##0.00"},
            {"txtAccountKey", "C'100"},
            {"txtFromDate", "15/03/2024"},
            {"cmbQtyFrom", "4"},
            {"ChkUseAccKeyForPlate", "1"},
            {"txtToDocNum", "\\\\server\\share"},
        };
        CardFixture first({}, {}, {"Base price", "Wholesale"});
        for (const auto& [name, value] : values)
            set(first, name, value);
        for (const SettingSection& s : settingSections())
            first.c<QPushButton>(s.saveButton)->click();

        first.store->flush();
        CardFixture second(readAll(first.settingsPath), {}, {"Base price"});
        for (const auto& [name, value] : values)
            QCOMPARE(get(second, name), value);
        QCOMPARE(second.card->GetOLEOption(), short(6));
    }

    // What an administrator might type, read as typed: Qt would take an
    // unquoted comma for a list and lose the blanks around it.
    void handWrittenValues_data()
    {
        QTest::addColumn<QString>("line");
        QTest::addColumn<QString>("value");
        QTest::newRow("Hebrew company") << QString::fromUtf8("PriceFormat=לקוח 7, סניף ב") << QString::fromUtf8("לקוח 7, סניף ב");
        QTest::newRow("blanks around commas") << "PriceFormat=a ,b ,  c  " << "a ,b ,  c";
        QTest::newRow("comment after it") << "PriceFormat=0,00 ; two places" << "0,00";
        QTest::newRow("quoted part") << "PriceFormat=\"x, y\", z" << "x, y, z";
        QTest::newRow("escapes") << "PriceFormat=c:\\\\labels,\\x5d" << "c:\\labels,]";
        QTest::newRow("no comma") << "PriceFormat= 0.0 " << "0.0";
    }
    void handWrittenValues()
    {
        QFETCH(QString, line);
        QFETCH(QString, value);
        CardFixture f(("[GeneralParams]\nPrintDelay=3\n\n[LabelVars]\n05VarNum=3\n" + line + "\n07VarNum=4\n").toUtf8());
        QCOMPARE(get(f, "txtPriceFormat"), value);
        QCOMPARE(get(f, "lblVarNum(7)"), QString("4"));
    }

    // A file this store did not write in its own form (another code page,
    // binary bytes) is left byte for byte through every path that saves:
    // each save button (the general one with the direct layout), the page
    // setup printer, the connection dialog's OK, the store's last flush. The
    // status line says why. A file that does not read at all gives the defaults.
    void foreignFileNeverRewritten_data()
    {
        QTest::addColumn<QByteArray>("bytes");
        QTest::addColumn<QString>("why");
        QByteArray cp1255("[GeneralParams]\r\nCompanyName=");
        cp1255 += QByteArray::fromHex("f9ece5ed"); // "שלום" in Windows-1255
        cp1255 += "\r\nPrintDelay=3\r\nOptOLE3=True\r\nOptOLE0=False\r\n";
        QTest::newRow("Windows-1255") << cp1255 << "UTF-8";
        QByteArray binary("[GeneralParams]\nPrintDelay=3\nOptOLE3=True\nOptOLE0=False\nLogo=");
        binary += QByteArray("\x89PNG\r\n\x1a\n\0\0\0\rIHDR", 16);
        binary += "\n";
        QTest::newRow("binary") << binary << "בינאריים";
        QByteArray garbage("[GeneralParams\n\x01\x02\xff\xfe=\n=====\n[\n");
        QTest::newRow("garbage") << garbage + QByteArray(2000, '\0') << "בינאריים";
    }
    void foreignFileNeverRewritten()
    {
        QFETCH(QByteArray, bytes);
        QFETCH(QString, why);
        CardFixture f(bytes, {}, {"Base price"});
        const QString path = f.settingsPath;
        QCOMPARE(get(f, "txtCopies"), QString("1"));
        f.c<QRadioButton>("OptOLE(3)")->setChecked(true);
        for (const SettingSection& section : settingSections()) {
            f.card->ClearMessage();
            f.c<QPushButton>(section.saveButton)->click();
            QVERIFY2(f.card->message().startsWith(QString::fromUtf8("שמירת ההגדרות נכשלה: ")), qPrintable(f.card->message()));
            QVERIFY2(f.card->message().contains(why), qPrintable(f.card->message()));
            QCOMPARE(readAll(path), bytes);
        }
        SetBrowserPrinter("Zebra", *f.store);
        QCOMPARE(readAll(path), bytes);
        f.dialogs->drive = [](QDialog& logon) {
            logon.findChild<QLineEdit*>("txtConnServer")->setText("Elsewhere");
            logon.findChild<QPushButton*>("cmdOK")->click();
        };
        f.c<QPushButton>("CmdConnect")->click();
        QCOMPARE(f.dialogs->opened.size(), 1);
        QVERIFY2(f.prompt->lines().join('\n').contains(why), qPrintable(f.prompt->lines().join('\n')));
        QCOMPARE(readAll(path), bytes);
        f.card.reset();
        f.store.reset();
        QCOMPARE(readAll(path), bytes);
    }

    // A save of which one write failed is reported as failed, even when the
    // last flush succeeds: here the store refuses the direct layout's keys.
    void partlyFailedSaveIsNotDone()
    {
        struct RefusingLayout : IniSettingsStore {
            using IniSettingsStore::IniSettingsStore;
            bool setValue(const QString& app, const QString& section, const QString& key, const QString& text) override
            {
                return !section.startsWith("LabelDef") && IniSettingsStore::setValue(app, section, key, text);
            }
        };
        CardFixture f("[GeneralParams]\nOptOLE3=True\nOptOLE0=False\n", {}, {"Base price"});
        auto store = std::make_shared<RefusingLayout>(f.settingsPath);
        Services s;
        s.settings = store;
        s.prompt = f.prompt;
        s.printers = std::make_shared<FixedPrinterCatalog>(QStringList());
        MainCard card(nullptr, s);
        card.control<QComboBox>("cmbPriceField")->addItem("Base price");
        card.show();
        QVERIFY(card.control<QRadioButton>("OptOLE(3)")->isChecked());
        card.control<QPushButton>("cmdSaveDef1")->click();
        QCOMPARE(card.message(), QString::fromUtf8("שמירת ההגדרות נכשלה: לא ניתן לכתוב לקובץ ההגדרות"));
        card.control<QPushButton>("cmdSaveDef2")->click();
        QCOMPARE(card.message(), QString::fromUtf8("ההגדרות נשמרו"));
    }

    void regPrmIgnoresUnknownKindAndAction_data()
    {
        QTest::addColumn<int>("action");
        QTest::addColumn<int>("kind");
        QTest::newRow("kind 4") << 1 << 4;
        QTest::newRow("kind 0") << 1 << 0;
        QTest::newRow("action 3") << 3 << 1;
        QTest::newRow("action 0") << 0 << 1;
    }
    void regPrmIgnoresUnknownKindAndAction()
    {
        QFETCH(int, action);
        QFETCH(int, kind);
        CardFixture f;
        f.card->SetGetRegPrm(uchar(action), "Tagora", "Extra", "Key", f.c("txtCopies"), uchar(kind), QVariant(9));
        f.card->SetGetRegPrm(uchar(action == 1 ? 2 : action), "Tagora", "Extra", "Key", f.c("txtCopies"),
                             uchar(kind), QVariant(9));
        f.store->flush();
        QVERIFY(keysOf(f.settingsPath, "Extra").isEmpty());
        QCOMPARE(get(f, "txtCopies"), QString("1"));
    }

    void regPrmOtherApplication()
    {
        CardFixture f;
        f.card->SetGetRegPrm(2, "OtherApp", "S", "K", f.c("txtCopies"), 1, QVariant(42));
        QCOMPARE(get(f, "txtCopies"), QString("42"));
        f.card->SetGetRegPrm(1, "OtherApp", "S", "K", f.c("txtCopies"), 1, QVariant());
        f.store->flush();
        QCOMPARE(stored(f.settingsPath, "OtherApp/S", "K"), QString("42"));
        QVERIFY(keysOf(f.settingsPath, "S").isEmpty());
    }
};

QTEST_MAIN(TestSettings)
#include "tst_settings.moc"
