#include "support/dbrows.h"

#include "dialogs/boundgrid.h"
#include "localdb/database.h"

#include <QAbstractItemModelTester>
#include <QFile>
#include <QSignalSpy>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

class TestBoundGrid : public QObject {
    Q_OBJECT
    QTemporaryDir dir;
    QString db;

    void makeModel(BoundTableModel& m)
    {
        using K = BoundColumn::Kind;
        BoundColumn kind = boundColumn("Kind", "kind", K::Choice, true);
        kind.choices = {{1, "one"}, {2, "two"}};
        BoundColumn copies = boundColumn("Copies", "copies", K::Number, true);
        copies.minimum = 0;
        copies.maximum = 32767;
        m.setSource(db, "t", {"A", "B"},
                    {boundColumn({}, {}, K::Picture), boundColumn("A", "a", K::Text), boundColumn("Mark", "mark", K::Check, true),
                     copies, kind, boundColumn("Name", "name", K::Text, true)});
    }

private slots:
    void init()
    {
        db = dir.filePath("grid.db");
        QFile::remove(db);
        Database d;
        QVERIFY(!d.open(db, Database::OpenMode::Create));
        QVERIFY(!d.exec("CREATE TABLE t (A TEXT NOT NULL, B INTEGER NOT NULL, Mark BOOLEAN, Copies SMALLINT, Kind INTEGER,"
                        " Name TEXT, CONSTRAINT PrimaryKey PRIMARY KEY (A, B));"
                        "INSERT INTO t VALUES ('x', 1, 0, 1, 1, 'first'), ('x', 2, 1, 3, 2, 'second'), ('y''s', 1, 0, 0, NULL, NULL)"));
    }

    // Loading, editing and reloading keep the model consistent for any view.
    void modelContract()
    {
        BoundTableModel m;
        QAbstractItemModelTester tester(&m, QAbstractItemModelTester::FailureReportingMode::QtTest);
        makeModel(m);
        QVERIFY(m.setQuery("SELECT A, B, Mark, Copies, Kind, Name FROM t ORDER BY A, B"));
        QCOMPARE(m.rowCount(), 3);
        QVERIFY(m.setData(m.index(0, 2), Qt::Checked, Qt::CheckStateRole));
        QVERIFY(m.refresh());
        QVERIFY(!m.setQuery("SELECT nothing FROM nowhere"));
        QCOMPARE(m.rowCount(), 3);
        QVERIFY(!m.lastError().isEmpty());
    }

    // Every edit reaches the row of its own key, at once.
    void edits_data()
    {
        QTest::addColumn<int>("row");
        QTest::addColumn<int>("column");
        QTest::addColumn<QVariant>("value");
        QTest::addColumn<int>("role");
        QTest::addColumn<QString>("stored");
        QTest::newRow("tick") << 0 << 2 << QVariant(int(Qt::Checked)) << int(Qt::CheckStateRole) << "x|1|1|1|1|first";
        QTest::newRow("untick") << 1 << 2 << QVariant(int(Qt::Unchecked)) << int(Qt::CheckStateRole) << "x|2|0|3|2|second";
        QTest::newRow("copies") << 1 << 3 << QVariant(" 7 ") << int(Qt::EditRole) << "x|2|1|7|2|second";
        QTest::newRow("copies at the top") << 1 << 3 << QVariant("32767") << int(Qt::EditRole) << "x|2|1|32767|2|second";
        QTest::newRow("no copies") << 1 << 3 << QVariant("0") << int(Qt::EditRole) << "x|2|1|0|2|second";
        QTest::newRow("choice stores the value") << 0 << 4 << QVariant(2) << int(Qt::EditRole) << "x|1|0|1|2|first";
        QTest::newRow("text with apostrophe") << 2 << 5 << QVariant("it's") << int(Qt::EditRole) << "y's|1|0|0|<null>|it's";
    }
    void edits()
    {
        QFETCH(int, row);
        QFETCH(int, column);
        QFETCH(QVariant, value);
        QFETCH(int, role);
        QFETCH(QString, stored);
        BoundTableModel m;
        makeModel(m);
        QVERIFY(m.setQuery("SELECT A, B, Mark, Copies, Kind, Name FROM t ORDER BY A, B"));
        QSignalSpy changed(&m, &QAbstractItemModel::dataChanged);
        QVERIFY(m.setData(m.index(row, column), value, role));
        QCOMPARE(changed.count(), 1);
        const QString key = m.value(row, "A").toString().replace("'", "''");
        QCOMPARE(rows(db, QStringLiteral("SELECT * FROM t WHERE A = '%1' AND B = %2").arg(key).arg(m.value(row, "B").toInt())),
                 QStringList{stored});
        QCOMPARE(rows(db, "SELECT count(*) FROM t"), QStringList{"3"});
    }

    // A number the column cannot take is refused with the reason; the cell
    // and the file keep what they had.
    void refusedNumbers_data()
    {
        QTest::addColumn<QString>("typed");
        QTest::newRow("not a number") << "abc";
        QTest::newRow("too many") << "70000";
        QTest::newRow("negative") << "-3";
        QTest::newRow("a fraction") << "2.5";
        QTest::newRow("empty") << "";
    }
    void refusedNumbers()
    {
        QFETCH(QString, typed);
        BoundTableModel m;
        makeModel(m);
        QVERIFY(m.setQuery("SELECT A, B, Mark, Copies, Kind, Name FROM t ORDER BY A, B"));
        QSignalSpy failed(&m, &BoundTableModel::writeFailed);
        QVERIFY(!m.setData(m.index(1, 3), typed, Qt::EditRole));
        QCOMPARE(failed.count(), 1);
        const QString reason = failed.first().first().toString();
        QVERIFY2(reason.contains("copies") && reason.contains("0") && reason.contains("32767") && reason.contains(typed),
                 qPrintable(reason));
        QCOMPARE(m.data(m.index(1, 3)).toString(), QString("3"));
        QCOMPARE(rows(db, "SELECT group_concat(Copies) FROM t"), QStringList{"1,3,0"});
    }

    // Cells read from the side their text starts on, whatever the grid's
    // direction: Hebrew from the right, Latin from the left; numbers line up right.
    void alignmentAndDirection_data()
    {
        QTest::addColumn<int>("row");
        QTest::addColumn<int>("column");
        QTest::addColumn<int>("alignment");
        QTest::addColumn<int>("direction");
        const int right = Qt::AlignRight | Qt::AlignAbsolute | Qt::AlignVCenter;
        const int left = Qt::AlignLeft | Qt::AlignAbsolute | Qt::AlignVCenter;
        QTest::newRow("Hebrew text") << 0 << 5 << right << int(Qt::RightToLeft);
        QTest::newRow("Latin text") << 1 << 5 << left << int(Qt::LeftToRight);
        QTest::newRow("Latin key with a quote") << 2 << 1 << left << int(Qt::LeftToRight);
        QTest::newRow("number") << 0 << 3 << right << int(Qt::LeftToRight);
        QTest::newRow("check box") << 0 << 2 << int(Qt::AlignCenter) << -1;
    }
    void alignmentAndDirection()
    {
        QFETCH(int, row);
        QFETCH(int, column);
        QFETCH(int, alignment);
        QFETCH(int, direction);
        BoundTableModel m;
        makeModel(m);
        QVERIFY(m.setQuery(QString::fromUtf8("SELECT A, B, Mark, Copies, Kind, CASE WHEN A = 'x' AND B = 1 THEN 'בורג M6'"
                                             " ELSE 'Bolt M6' END AS Name FROM t ORDER BY A, B")));
        QCOMPARE(m.data(m.index(row, column), Qt::TextAlignmentRole).value<Qt::Alignment>(), Qt::Alignment(alignment));
        if (direction < 0)
            return;
        struct Open : BoundItemDelegate {
            using BoundItemDelegate::initStyleOption;
        } delegate;
        QStyleOptionViewItem option;
        option.direction = direction == Qt::RightToLeft ? Qt::LeftToRight : Qt::RightToLeft;
        delegate.initStyleOption(&option, m.index(row, column));
        QCOMPARE(int(option.direction), direction);
    }

    void shownTexts()
    {
        BoundTableModel m;
        makeModel(m);
        QVERIFY(m.setQuery("SELECT A, B, Mark, Copies, Kind, Name FROM t ORDER BY A, B"));
        BoundGrid grid;
        grid.setBoundModel(&m);
        QCOMPARE(grid.text(1, 4), QString("two"));
        QCOMPARE(grid.text(1, 2), QString("1"));
        QCOMPARE(grid.text(2, 5), QString());
        QVERIFY(!(m.flags(m.index(0, 1)) & Qt::ItemIsEditable));
        QVERIFY(m.flags(m.index(0, 2)) & Qt::ItemIsUserCheckable);
        QSignalSpy activated(&grid, &BoundGrid::cellActivated);
        grid.resize(400, 200);
        grid.show();
        QTest::mouseClick(grid.viewport(), Qt::LeftButton, {}, grid.visualRect(m.index(1, 0)).center());
        QCOMPARE(activated.count(), 1);
        QCOMPARE(activated.first().at(0).toInt(), 1);
    }

    // A write the database refuses changes nothing, on screen or on disk.
    void refusedWrite()
    {
        BoundTableModel m;
        makeModel(m);
        QVERIFY(m.setQuery("SELECT A, B, Mark, Copies, Kind, Name FROM t ORDER BY A, B"));
        QVERIFY(!execOn(db, "CREATE TRIGGER no_marks BEFORE UPDATE OF Mark ON t BEGIN SELECT RAISE(ABORT, 'marks are frozen'); END"));
        QSignalSpy failed(&m, &BoundTableModel::writeFailed);
        QVERIFY(!m.setField({0, 2}, "Mark", 1));
        QCOMPARE(failed.count(), 1);
        QVERIFY(failed.first().first().toString().contains("frozen"));
        QCOMPARE(m.data(m.index(0, 2), Qt::CheckStateRole).toInt(), int(Qt::Unchecked));
        QCOMPARE(rows(db, "SELECT group_concat(Mark) FROM t"), QStringList{"0,1,0"});
    }
};

QTEST_MAIN(TestBoundGrid)
#include "tst_boundgrid.moc"
