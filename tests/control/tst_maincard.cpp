#include "support/cardfixture.h"
#include "support/oldlayout.h"
#include "support/dbrows.h"
#include "support/labeldata.h"

#include "dialogs/frmlabdef.h"
#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "localdb/schema.h"
#include "platform/clicklabel.h"
#include "platform/elidedlabel.h"
#include "platform/namedcontrols.h"

#include <QAbstractItemView>
#include <QDir>
#include <QLabel>
#include <QLineEdit>
#include <QPushButton>
#include <QProcess>
#include <QRadioButton>
#include <QSignalSpy>
#include <QTabWidget>
#include <QtTest>

using namespace tagora;

class TestMainCard : public QObject {
    Q_OBJECT
private slots:
    void initTestCase() { QStandardPaths::setTestModeEnabled(true); }

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

    // A label file chooser offers the chosen program's files; cancelled, it changes nothing.
    void fileChooser()
    {
        CardFixture f;
        f.c<QRadioButton>("OptOLE(1)")->click();
        auto* target = f.c<QLineEdit>("txtLabelName");
        const QString before = target->text();
        f.c<QPushButton>("CmdDir(1)")->click();
        QCOMPARE(target->text(), before);
        f.files->queue("/labels/chosen file.x");
        f.c<QPushButton>("CmdDir(1)")->click();
        QCOMPARE(target->text(), QString("/labels/chosen file.x"));
        QCOMPARE(f.files->asked().size(), size_t(2));
        QVERIFY(f.files->asked().back().filter.endsWith("CodeSoft Files (*.lab)|*.lab"));
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

    // The document road's dialogs open on the data folder typed on the screen.
    void documentDialogs_data()
    {
        QTest::addColumn<QString>("button");
        QTest::addColumn<QString>("form");
        QTest::addColumn<QString>("grid");
        QTest::addColumn<int>("rows");
        QTest::newRow("document types") << "CmdDocType" << "frmDocType" << "VSDocTypes" << 6;
        QTest::newRow("import ranges") << "cmdRanges" << "frmEditRanges" << "VSEditRange" << 6;
        QTest::newRow("documents and lines") << "cmdSelectDocItems" << "frmSelectDocItem" << "VSDocLines" << 2;
    }
    void documentDialogs()
    {
        QFETCH(QString, button);
        QFETCH(QString, form);
        QFETCH(QString, grid);
        QFETCH(int, rows);
        CardFixture f;
        const QString data = f.dir.filePath("data");
        QVERIFY(!PrepareDataFolder(data));
        DbError e;
        QVERIFY(!CreateTempDocsDB(data + "/" + dbfiles::Config, data + "/" + dbfiles::Items,
                                  data + "/" + dbfiles::TempDocs, &e).isEmpty());
        QVERIFY(!execOn(data + "/" + dbfiles::TempDocs,
                        "INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, Include) VALUES (2, 7, 1, 1);"
                        "INSERT INTO tTempDocLines (WizFileID, HeadNumber, LineNum, ItemKey, Include) VALUES"
                        " (2, 7, 1, 'A', 1), (2, 7, 2, 'B', 1)"));
        f.c<QLineEdit>("txtDBPath")->setText(data);
        int shown = -1;
        f.dialogs->drive = [&](QDialog& d) {
            auto* view = d.findChild<QAbstractItemView*>(grid);
            shown = view ? view->model()->rowCount() : -2;
        };
        f.c<QPushButton>(button)->click();
        QCOMPARE(f.dialogs->opened, QStringList{form});
        QCOMPARE(shown, rows);
    }

    // The designer's preview shows the first marked item as the job would
    // print it; with no data folder yet, a sample of the field's kind.
    void designerPreviewRecord_data()
    {
        QTest::addColumn<bool>("withData");
        QTest::addColumn<QString>("decoded");
        QTest::newRow("first marked item") << true << "CODE-128:7290000000015";
        QTest::newRow("no data folder") << false << "CODE-128:1234567890";
    }
    void designerPreviewRecord()
    {
        QFETCH(bool, withData);
        QFETCH(QString, decoded);
        const QString zbarimg = QStandardPaths::findExecutable("zbarimg");
        if (QStandardPaths::findExecutable("chromium").isEmpty() || zbarimg.isEmpty())
            QSKIP("chromium or zbarimg is not installed");
        LabelData data;
        CardFixture f;
        f.c<QLineEdit>("txtDBPath")->setText(withData ? data.folder : f.dir.filePath("none"));
        DirectLabelLayout& layout = directLabelLayout();
        const DirectLabelLayout before = layout;
        layout = DirectLabelLayout();
        layout.lines[0].UseCell = true;
        layout.lines[0].FldID = 4; // the barcode field, not sent on this tab
        layout.lines[0].ViewType = 1;
        layout.bar.BarType = 2;
        layout.bar.DimX = 0.01f;
        layout.bar.BarHeight = 0.3f;
        layout.bar.UserResoX = 0;
        layout.bar.UserResoY = 0;
        // The dialog's pictures go with it; the test keeps a copy.
        const QString picture = f.dir.filePath("preview.png");
        f.dialogs->drive = [&](QDialog& d) {
            auto& designer = static_cast<FrmLabDef&>(d);
            QSignalSpy done(&designer, &FrmLabDef::previewFinished);
            designer.refreshPreview();
            if (done.wait(120000) && done.last().at(0).toBool())
                QFile::copy(designer.previewPicture(), picture);
        };
        f.c<QPushButton>("cmdLabDesign")->click();
        layout = before;
        QVERIFY(QFile::exists(picture));
        QProcess reader;
        reader.start(zbarimg, {"-q", picture});
        QVERIFY(reader.waitForFinished(60000));
        QCOMPARE(QString::fromUtf8(reader.readAllStandardOutput()).trimmed(), decoded);
    }

    // The picture beside a step clicks that step's button.
    void stepPicture()
    {
        CardFixture f;
        f.c<QLineEdit>("txtDBPath")->setText(f.dir.path());
        QSignalSpy spy(f.c<QPushButton>("cmdSelectItems"), &QPushButton::clicked);
        QVERIFY(clickControl(f.c("Image3")));
        QCOMPARE(spy.count(), 1);
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

    // No items database: a quiet failure; an upgraded one: a failure the user is told of.
    void upgradeButton()
    {
        CardFixture f;
        const QString data = f.dir.filePath("data");
        f.c<QLineEdit>("txtDBPath")->setText(data);
        f.c<QPushButton>("cmdUpgrade")->click();
        QCOMPARE(f.card->message(), QString::fromUtf8("השדרוג נכשל"));
        QCOMPARE(f.card->progress(), 1.0);
        QVERIFY(QDir().mkpath(data));
        DbError e;
        QVERIFY(!CreateItemsDB(data + "/" + dbfiles::Items, &e).isEmpty());
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

    // Each range box bounds its own end; what the bounds select is the label query's to test.
    void itemRangeBoxes()
    {
        CardFixture f;
        const QStringList bounds = {" A100 ", "O'Neil", "01", "09"};
        const char* names[] = {"txtFromItem", "txtToItem", "txtFromSort", "txtToSort"};
        for (int i = 0; i < 4; ++i)
            f.c<QLineEdit>(names[i])->setText(bounds[i]);
        QCOMPARE(f.card->itemRangeCriteria(), ItemRangeCriteria(bounds[0], bounds[1], bounds[2], bounds[3]));
    }
};

QTEST_MAIN(TestMainCard)
#include "tst_maincard.moc"
