#include "support/cardfixture.h"
#include "support/oldlayout.h"

#include "localdb/schema.h"
#include "platform/clicklabel.h"
#include "platform/controlbinding.h"
#include "platform/elidedlabel.h"
#include "platform/namedcontrols.h"

#include <QCheckBox>
#include <QDir>
#include <QGroupBox>
#include <QLabel>
#include <QLineEdit>
#include <QMetaMethod>
#include <QPushButton>
#include <QRadioButton>
#include <QTabWidget>
#include <QtTest>

using namespace tagora;

namespace {
// The tab a control sits on, or -1.
int tabOf(const CardFixture& f, QObject* c)
{
    auto* tabs = f.c<QTabWidget>("MainTab");
    for (QObject* p = c; p; p = p->parent())
        for (int i = 0; i < tabs->count(); ++i)
            if (p == tabs->widget(i))
                return i;
    return -1;
}
} // namespace

class TestMainCard : public QObject {
    Q_OBJECT
private slots:
    void initTestCase() { QStandardPaths::setTestModeEnabled(true); }

    // Hosts and scripts find controls by these names; each must be on its tab.
    void controlsOnTheirTabs_data()
    {
        QTest::addColumn<int>("tab");
        QTest::addColumn<QString>("names");
        QTest::newRow("0") << 0
                           << "lblLabelName(1) CmdDir(4) cmdSelectItems txtFromItem txtToItem txtFromSort txtToSort "
                              "ChkUseAccountKey txtAccountKey cmdPrintItmes cmdPreview(1) cmdSaveDef4 Image2 Image3 "
                              "Image4 Image5";
        QTest::newRow("1") << 1
                           << "lblLabelName(2) CmdDir(3) txtFromDate txtToDate LblToDate txtFromDocNum txtToDocNum "
                              "LblToRef txtRefPref chkReadDocItems chkWithSons chkPrintHeadLabel chkOnlyLine0 "
                              "cmdImportDocs cmdSelectDocItems cmdRanges cmdPrintDocButt cmdPreview(0) cmdSaveDef5 "
                              "Image6 Image7 Image8";
        QTest::newRow("2") << 2
                           << "txtFromItemSort txtToItemSort CmbItemNameType cmbPriceField txtCopies "
                              "ChkImportAlterKeys ChkImportAltKeySup ChkCleanAlterKeys ChkImportAlterPrices ChkClean "
                              "chkReadPriceList chkReadItemParam CmdImportItems cmdSaveDef2";
        QTest::newRow("3") << 3 << "txtAccKeyForPlate ChkUseAccKeyForPlate cmdLabByPlate cmdSaveDef3";
        QTest::newRow("4") << 4
                           << "txtCompanyName DDEorOLE OptOLE(0) OptOLE(1) OptOLE(2) OptOLE(3) OptOLE(4) txtLabelName "
                              "CmdDir(1) txtLabelName2 CmdDir(2) txtLabelNameHead CmdDir(0) txtDBPath PrinterType "
                              "OptPrinter(0) OptPrinter(1) cmbUser cmdLabDesign CmdConnect cmdSaveDef1";
        QTest::newRow("5") << 5 << "ChkFldSend(0) lblVarNum(32) LblFldName(16) LblFldDesc(31) txtPriceFormat CmdSaveFields";
        QTest::newRow("6") << 6 << "CmdDocType cmbQtyFrom txtQtyFactor SaveDef6";
        QTest::newRow("7") << 7 << "ChkFldSend(33) lblVarNum(37) LblFldName(35) LblFldDesc(34) txtFldExpr(37)";
        QTest::newRow("8") << 8 << "cmdAccDef cmdAlterKeys cmdEditItems chkItmRTL cmbPrinter txtPrintDelay";
        QTest::newRow("9") << 9 << "Image1 cmdUpgrade";
        QTest::newRow("outside") << -1 << "Message1 ProgressFrame ProgressFill ComDlg1";
    }
    void controlsOnTheirTabs()
    {
        QFETCH(int, tab);
        QFETCH(QString, names);
        CardFixture f;
        for (const QString& name : names.split(' ')) {
            QObject* c = f.c(name);
            QVERIFY2(c, qPrintable("missing " + name));
            QVERIFY2(tabOf(f, c) == tab, qPrintable(name + " on tab " + QString::number(tabOf(f, c))));
        }
        QCOMPARE(f.c<QTabWidget>("MainTab")->count(), 10);
    }

    void fieldRows_data()
    {
        QTest::addColumn<int>("row");
        QTest::addColumn<QString>("name");
        QTest::addColumn<QString>("kind");
        QTest::addColumn<QString>("column");
        QTest::newRow("price") << 6 << "Price" << "2" << "Price";
        QTest::newRow("alternate key") << 12 << "AltItemKey" << "1" << "AlterKey";
        QTest::newRow("pack units") << 31 << "PackUnits" << "1" << "SalPackUN";
        QTest::newRow("expression 1") << 33 << "EX1" << "5" << "EX1";
    }
    void fieldRows()
    {
        QFETCH(int, row);
        QFETCH(QString, name);
        QFETCH(QString, kind);
        QFETCH(QString, column);
        CardFixture f;
        auto* lname = f.c<QLabel>(QStringLiteral("LblFldName(%1)").arg(row));
        auto* ldesc = f.c<QLabel>(QStringLiteral("LblFldDesc(%1)").arg(row));
        QVERIFY(lname && ldesc);
        QCOMPARE(lname->text(), name);
        QCOMPARE(lname->property("Tag").toString(), kind);
        QCOMPARE(ldesc->property("Tag").toString(), column);
        const bool expression = kind == "5";
        QCOMPARE(f.c(QStringLiteral("txtFldExpr(%1)").arg(row)) != nullptr, expression);
        QCOMPARE(f.c(QStringLiteral("ChkFldSend(%1)").arg(row))->property("Tag").toString(),
                 expression ? column : QString());
    }

    // The published methods, in order, with their argument counts.
    void publicMethods()
    {
        const QList<std::pair<const char*, int>> methods = {
            {"cmdPrintItmes_Click", 0}, {"cmdSelectItems_Click", 0}, {"GetOLEOption", 0}, {"RunOLE", 7},
            {"SetGetRegPrm", 7}, {"SetGetRegParams", 2}, {"BuildItemQuery", 2}, {"ClearMessage", 0},
            {"FillCmbPriceField", 0}, {"ReadAlterKeyPRIORITY", 6}, {"ReadAlterKeySupPRIORITY", 6},
            {"BuildDocRangeCriteria", 7}, {"BuildItemByDocCriteria", 3}, {"ImportItemsByDocs", 9},
            {"ReadItemPriority", 10}, {"UpdateMainItemTables", 1}, {"FillCmbUser", 0}, {"ReadLabelDefPriority", 2},
            {"GetUserNum", 0}, {"ReadLabelDataPriority", 2}, {"BuildItemQueryFromPlate", 2},
            {"ReadPriceListPriority", 6}, {"ReadStockPriority", 8}, {"ReadAlterPricePRIORITY", 6},
            {"CreateLabFile", 4}, {"ReadPriceListNamePriority", 2}, {"CreateListFile", 4}, {"ReadItemFName", 5},
            {"UpdateDocsAlterKeys", 1},
        };
        QCOMPARE(methods.size(), 29);
        const QMetaObject& mo = MainCard::staticMetaObject;
        int lastIndex = -1;
        for (const auto& [name, count] : methods) {
            int found = -1;
            for (int i = mo.methodOffset(); i < mo.methodCount(); ++i) {
                const QMetaMethod m = mo.method(i);
                if (m.name() == name && m.parameterCount() == count && m.access() == QMetaMethod::Public)
                    found = i;
            }
            QVERIFY2(found >= 0, name);
            QVERIFY2(found > lastIndex, name);
            lastIndex = found;
        }
    }

    void getOleOption_data()
    {
        QTest::addColumn<int>("option");
        QTest::addColumn<int>("code");
        QTest::newRow("NiceLabel") << 0 << 5;
        QTest::newRow("CodeSoft") << 1 << 2;
        QTest::newRow("BarTender") << 2 << 4;
        QTest::newRow("Direct") << 3 << 6;
        QTest::newRow("FastLabel") << 4 << 7;
    }
    void getOleOption()
    {
        QFETCH(int, option);
        QFETCH(int, code);
        CardFixture f;
        f.c<QRadioButton>(QStringLiteral("OptOLE(%1)").arg(option))->click();
        QCOMPARE(int(f.card->GetOLEOption()), code);
        QCOMPARE(callMethod(f.card.get(), "GetOLEOption", {}).value.toInt(), code);
    }

    void varNumSteps_data()
    {
        QTest::addColumn<QString>("caption");
        QTest::addColumn<QString>("after");
        QTest::newRow("empty starts at 1") << "" << "1";
        QTest::newRow("counts up") << "7" << "8";
        QTest::newRow("20 clears") << "20" << "";
        QTest::newRow("21 wraps to 1") << "21" << "1";
        QTest::newRow("beyond stays") << "22" << "22";
        QTest::newRow("not a number counts as 0") << "x" << "1";
    }
    void varNumSteps()
    {
        QFETCH(QString, caption);
        QFETCH(QString, after);
        CardFixture f;
        auto* label = f.c<ClickLabel>("lblVarNum(9)");
        label->setText(caption);
        QVERIFY(clickControl(label));
        QCOMPARE(label->text(), after);
    }

    void varNumFullCycle()
    {
        CardFixture f;
        auto* label = f.c<ClickLabel>("lblVarNum(0)");
        QStringList seen;
        for (int i = 0; i < 21; ++i) {
            QTest::mouseClick(label, Qt::LeftButton);
            seen << label->text();
        }
        QCOMPARE(seen.first(), QString("1"));
        QCOMPARE(seen.at(19), QString("20"));
        QCOMPARE(seen.last(), QString());
    }

    // A file chosen for one run lasts until the tab is entered again.
    void runLabelFileRestoredOnTabChange()
    {
        CardFixture f;
        auto* tabs = f.c<QTabWidget>("MainTab");
        tabs->setCurrentIndex(0);
        f.files->queue("/labels/once.lbl");
        f.c<QPushButton>("CmdDir(4)")->click();
        QCOMPARE(f.c<QLabel>("lblLabelName(1)")->text(), QString("/labels/once.lbl"));
        f.card->setMessage("working");
        f.card->setProgress(0.5);
        tabs->setCurrentIndex(2);
        QCOMPARE(f.card->message(), QString());
        QCOMPARE(f.c<QWidget>("ProgressFill")->width(), 0);
        QCOMPARE(f.c<QLabel>("lblLabelName(1)")->text(), QString("/labels/once.lbl"));
        tabs->setCurrentIndex(0);
        QCOMPARE(f.c<QLabel>("lblLabelName(1)")->text(), f.c<QLineEdit>("txtLabelName")->text());
    }

    // A long label file path neither widens the control nor loses a
    // character: the caption elides it in the middle and tells it whole.
    void longLabelPath_data()
    {
        QTest::addColumn<QString>("how");
        QTest::addColumn<QString>("caption");
        QTest::addColumn<int>("tab");
        QTest::newRow("items, at show") << "LabelName" << "lblLabelName(1)" << 0;
        QTest::newRow("documents, at show") << "LabelName2" << "lblLabelName(2)" << 1;
        QTest::newRow("items, this run") << "CmdDir(4)" << "lblLabelName(1)" << 0;
        QTest::newRow("documents, this run") << "CmdDir(3)" << "lblLabelName(2)" << 1;
    }
    void longLabelPath()
    {
        QFETCH(QString, how);
        QFETCH(QString, caption);
        QFETCH(int, tab);
        const QString path = "/srv/labels/" + QString("a-long-folder-name/").repeated(20) + "item.lbl";
        CardFixture f(how.startsWith("Label") ? QString("[GeneralParams]\n%1=%2\n").arg(how, path).toUtf8()
                                              : QByteArray());
        f.c<QTabWidget>("MainTab")->setCurrentIndex(tab);
        if (how.startsWith("CmdDir")) {
            f.files->queue(path);
            f.c<QPushButton>(how)->click();
        }
        auto* label = f.c<ElidedLabel>(caption);
        QVERIFY(label);
        QCOMPARE(label->text(), path);
        QVERIFY(f.card->minimumSizeHint().width() < label->fontMetrics().horizontalAdvance(path));
        f.card->grab();
        QCOMPARE(label->toolTip(), path);
        QVERIFY2(label->shownText().contains(QChar(0x2026)), qPrintable(label->shownText()));
        QVERIFY(label->shownText().startsWith("/srv/labels/") && label->shownText().endsWith("/item.lbl"));
    }

    void fileChoosers_data()
    {
        QTest::addColumn<int>("option");
        QTest::addColumn<int>("chooser");
        QTest::addColumn<QString>("target");
        QTest::addColumn<QString>("filter");
        QTest::newRow("NiceLabel header") << 0 << 0 << "txtLabelNameHead"
                                          << "All Files (*.*)|*.*|NiceLabel Files (*.lbl)|*.lbl";
        QTest::newRow("CodeSoft items") << 1 << 1 << "txtLabelName" << "All Files (*.*)|*.*|CodeSoft Files (*.lab)|*.lab";
        QTest::newRow("BarTender documents") << 2 << 2 << "txtLabelName2"
                                             << "All Files (*.*)|*.*|BarTender Files (*.btw)|*.btw";
        QTest::newRow("Direct document run") << 3 << 3 << "lblLabelName(2)" << "";
        QTest::newRow("FastLabel item run") << 4 << 4 << "lblLabelName(1)"
                                            << "All Files (*.*)|*.*|FastLabel Files (*.lbl)|*.lbl";
    }
    void fileChoosers()
    {
        QFETCH(int, option);
        QFETCH(int, chooser);
        QFETCH(QString, target);
        QFETCH(QString, filter);
        CardFixture f;
        f.c<QRadioButton>(QStringLiteral("OptOLE(%1)").arg(option))->click();
        QObject* t = f.c(target);
        const QString before = readBound(t, *naturalKind(t)).value();

        // Cancelled: nothing changes.
        f.c<QPushButton>(QStringLiteral("CmdDir(%1)").arg(chooser))->click();
        QCOMPARE(readBound(t, *naturalKind(t)).value(), before);

        f.files->queue("/labels/chosen file.x");
        f.c<QPushButton>(QStringLiteral("CmdDir(%1)").arg(chooser))->click();
        QCOMPARE(readBound(t, *naturalKind(t)).value(), QString("/labels/chosen file.x"));

        QCOMPARE(f.files->asked().size(), size_t(2));
        const FileRequest& asked = f.files->asked().back();
        QCOMPARE(asked.filter, filter);
        QCOMPARE(asked.filterIndex, 2);
        QCOMPARE(asked.flags, 4);
    }

    void convenienceMirrors()
    {
        CardFixture f;
        f.c<QLineEdit>("txtFromDate")->setText("02/02/2026");
        QVERIFY(clickControl(f.c("LblToDate")));
        QCOMPARE(f.c<QLineEdit>("txtToDate")->text(), QString("02/02/2026"));

        auto* from = f.c<QLineEdit>("txtFromDocNum");
        from->clear();
        QTest::keyClicks(from, "SO1234");
        QCOMPARE(f.c<QLineEdit>("txtToDocNum")->text(), QString("SO1234"));

        f.card->setMessage("done");
        f.card->setProgress(1);
        QFocusEvent out(QEvent::FocusOut);
        QApplication::sendEvent(f.c("cmdImportDocs"), &out);
        QCOMPARE(f.card->message(), QString());
        QCOMPARE(f.card->progress(), 0.0);
    }

    void stepPictures_data()
    {
        QTest::addColumn<QString>("picture");
        QTest::addColumn<QString>("button");
        QTest::newRow("select items") << "Image3" << "cmdSelectItems";
        QTest::newRow("print items") << "Image5" << "cmdPrintItmes";
        QTest::newRow("import documents") << "Image6" << "cmdImportDocs";
        QTest::newRow("select documents") << "Image7" << "cmdSelectDocItems";
        QTest::newRow("print documents") << "Image8" << "cmdPrintDocButt";
    }
    void stepPictures()
    {
        QFETCH(QString, picture);
        QFETCH(QString, button);
        CardFixture f;
        // Point the data folder somewhere harmless: printing may create files there.
        f.c<QLineEdit>("txtDBPath")->setText(f.dir.path());
        QSignalSpy spy(f.c<QPushButton>(button), &QPushButton::clicked);
        QVERIFY(clickControl(f.c(picture)));
        QCOMPARE(spy.count(), 1);
        if (button == "cmdSelectItems")
            QCOMPARE(f.dialogs->opened, QStringList{"frmSelectItem"});
    }

    void printerListSkipsRenderingSubsystem()
    {
        CardFixture f({}, {"Office", "Rendering Subsystem", "Zebra ZT410"});
        auto* list = f.c<QComboBox>("cmbPrinter");
        QStringList names;
        for (int i = 0; i < list->count(); ++i)
            names << list->itemText(i);
        QCOMPARE(names, QStringList({"Office", "Zebra ZT410"}));
        QCOMPARE(list->currentIndex(), -1);
    }

    void upgradeWithoutItemsDatabase()
    {
        CardFixture f;
        f.c<QLineEdit>("txtDBPath")->setText(f.dir.filePath("nothing-here"));
        f.c<QPushButton>("cmdUpgrade")->click();
        QCOMPARE(f.card->message(), QString::fromUtf8("השדרוג נכשל"));
        QCOMPARE(f.card->progress(), 1.0);
        QVERIFY(f.prompt->shown().empty());
    }

    void upgradeTwice()
    {
        CardFixture f;
        const QString data = f.dir.filePath("data");
        QVERIFY(QDir().mkpath(data));
        DbError e;
        QVERIFY(!CreateItemsDB(data + "/" + dbfiles::Items, &e).isEmpty());
        f.c<QLineEdit>("txtDBPath")->setText(data);
        f.c<QPushButton>("cmdUpgrade")->click();
        QCOMPARE(f.card->message(), QString::fromUtf8("השדרוג הסתיים בהצלחה"));
        QVERIFY(f.prompt->shown().empty());
        f.c<QPushButton>("cmdUpgrade")->click();
        QCOMPARE(f.card->message(), QString::fromUtf8("השדרוג נכשל"));
        QCOMPARE(f.prompt->criticalCount(), 1);
        QCOMPARE(f.prompt->shown().front().title, QString::fromUtf8("תקלה"));
    }

    // An items database of an earlier version gets caseless keys when a command
    // first needs it, and the user hears where the clashing rows went.
    void olderItemsDatabaseUpgraded_data()
    {
        QTest::addColumn<QString>("button");
        QTest::addColumn<QString>("status");
        QTest::newRow("print by items") << "cmdPrintItmes" << QString::fromUtf8("הכנת המדבקות הסתיימה");
        QTest::newRow("upgrade button") << "cmdUpgrade" << QString::fromUtf8("השדרוג הסתיים בהצלחה");
        QTest::newRow("item selection") << "cmdSelectItems" << QString();
    }
    void olderItemsDatabaseUpgraded()
    {
        QFETCH(QString, button);
        QFETCH(QString, status);
        QTemporaryDir work;
        const QString data = work.filePath("data");
        QVERIFY(QDir().mkpath(data));
        const QString items = data + "/" + dbfiles::Items;
        QVERIFY(!makeOldItemsDb(items, "INSERT INTO tItems (ItemKey, Copies, PrintLabel) VALUES ('ab''12', 2, 1), ('AB''12', 5, 1)"));
        CardFixture f(QStringLiteral("[Automation]\nJournalFile=%1\n[GeneralParams]\nDBPath=%2\n")
                          .arg(work.filePath("journal.txt"), data)
                          .toUtf8());
        f.c<QPushButton>(button)->click();
        const QStringList shown = f.prompt->lines();
        QCOMPARE(shown.size(), 1);
        QVERIFY2(shown.first().startsWith(QString::fromUtf8("שימו לב: ")) && shown.first().contains("tItemsCaseDup"),
                 qPrintable(shown.first()));
        if (!status.isEmpty())
            QCOMPARE(f.card->message(), status);
        Database db;
        QVERIFY(!db.open(items));
        QCOMPARE(db.scalar("SELECT group_concat(ItemKey || '=' || Copies) FROM tItems").toString(), QString("ab'12=2"));
        QCOMPARE(db.scalar("SELECT group_concat(ItemKey || '=' || Copies) FROM tItemsCaseDup").toString(), QString("AB'12=5"));
    }

    // Labels by items make the documents database (and a new data folder) ready; by documents do not.
    void printPreparesDataFolder_data()
    {
        QTest::addColumn<QString>("button");
        QTest::addColumn<bool>("created");
        QTest::addColumn<QString>("shown");
        // Nothing is marked in a new folder; by documents there is nothing to read at all.
        QTest::newRow("by items") << "cmdPrintItmes" << true << QString::fromUtf8("תקלה: לא נבחרו פריטים להדפסה");
        QTest::newRow("by documents") << "cmdPrintDocButt" << false << QString::fromUtf8("תקלה במשלוח נתונים להדפסה: ");
    }
    void printPreparesDataFolder()
    {
        QFETCH(QString, button);
        QFETCH(bool, created);
        QFETCH(QString, shown);
        CardFixture f;
        const QString data = f.dir.filePath("fresh");
        f.c<QLineEdit>("txtDBPath")->setText(data);
        f.c<QPushButton>(button)->click();
        QCOMPARE(QFile::exists(data + "/" + dbfiles::TempDocs), created);
        QCOMPARE(f.prompt->lines().size(), 1);
        QVERIFY2(f.prompt->lines().first().startsWith(shown), qPrintable(f.prompt->lines().first()));
        if (!created)
            return;
        Database db;
        QVERIFY(!db.open(data + "/" + dbfiles::TempDocs));
        QVERIFY(db.prepare("SELECT * FROM tItems").isValid());
    }

    void progressFill()
    {
        CardFixture f;
        auto* frame = f.c<QFrame>("ProgressFrame");
        auto* fill = f.c<QWidget>("ProgressFill");
        f.card->setProgress(0.5);
        QVERIFY(qAbs(fill->width() - frame->contentsRect().width() / 2) <= 1);
        f.card->setProgress(7);
        QCOMPARE(fill->width(), frame->contentsRect().width());
        QVERIFY(fill->isVisible());
        f.card->ClearMessage();
        QCOMPARE(fill->width(), 0);
        QCOMPARE(f.card->message(), QString());
    }

    void itemRangeCriteria_data()
    {
        QTest::addColumn<QStringList>("bounds");
        QTest::addColumn<QString>("criteria");
        QTest::newRow("none") << QStringList{"", "", "", ""} << "";
        QTest::newRow("open ended") << QStringList{" A100 ", "", "", ""} << " And ItemKey >= 'A100'";
        QTest::newRow("all four") << QStringList{"A", "B", "01", "09"}
                                  << " And ItemKey >= 'A' And ItemKey <= 'B' And ItemSort >= '01' And ItemSort <= '09'";
        QTest::newRow("apostrophe") << QStringList{"", "O'Neil", "", ""} << " And ItemKey <= 'O''Neil'";
    }
    void itemRangeCriteria()
    {
        QFETCH(QStringList, bounds);
        QFETCH(QString, criteria);
        CardFixture f;
        const char* names[] = {"txtFromItem", "txtToItem", "txtFromSort", "txtToSort"};
        for (int i = 0; i < 4; ++i)
            f.c<QLineEdit>(names[i])->setText(bounds[i]);
        QCOMPARE(f.card->itemRangeCriteria(), criteria);
    }
};

QTEST_MAIN(TestMainCard)
#include "tst_maincard.moc"
