// The document import against the demo company with documents of its own
// added, read through the SQLite ODBC driver as the ERP would be read.
#include "support/dbrows.h"
#include "support/erpfixture.h"

#include "erp/connparams.h"
#include "erp/docimport.h"
#include "erp/itemimport.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "platform/progress.h"

#include <QtTest>

using namespace tagora;

namespace {
const QString kDsn1 = QStringLiteral("TagoraDocs1");
const QString kDsn2 = QStringLiteral("TagoraDocs2");

// The day the dated documents fall on, and the ERP's minutes of a moment of it.
const QDate kDay = QDate::currentDate().addDays(-10);
qint64 minutesOf(const QDate& day, int minute = 0)
{
    return QDate(1988, 1, 1).daysTo(day) * 1440 + minute;
}

// Line quantities and what each rule makes of them: one order each, numbered QTnn.
struct QtyCase {
    const char* name;
    int rule;
    const char* factor;
    QVariant details;
    double quant;
    QVariant tquant;
    double quantity;
    int copies;
};
const std::vector<QtyCase>& qtyCases()
{
    static const std::vector<QtyCase> cases = {
        {"1000 prints 999", 0, "", {}, 1000, {}, 1000, 999},
        {"negative", 0, "", {}, -5, {}, -5, 5},
        {"fixed number", 4, "3", {}, 7, {}, 3, 3},
        {"factor not a number", 0, "x", {}, 7, {}, 7, 7},
        {"no rule chosen", -1, "2", QStringLiteral("12"), 7, 3.0, 14, 14},
        {"details number", 1, "2", QStringLiteral("12"), 5, {}, 24, 24},
        {"details letters", 1, "2", QStringLiteral("12 קרטונים"), 5, {}, 10, 10},
        {"details zero", 1, "", QStringLiteral("0"), 5, {}, 5, 5},
        {"details beyond 16 bits", 1, "", QStringLiteral("40000"), 5, {}, 40000, 999},
        {"factory unit null", 2, "", {}, 5, {}, 5, 5},
        {"factory unit rounded", 2, "2", {}, 5, 7.6, 16, 16},
    };
    return cases;
}

struct Recorder : ProgressSink {
    QStringList messages;
    double last = -1;
    void setMessage(const QString& text) override { messages << text; }
    void setProgress(double fraction) override { last = fraction; }
};

// Runs statements with values on a file, for the documents added to the ERP.
void execBound(Database& db, const QString& sql, const QVariantList& values)
{
    DbError e;
    Statement s = db.prepare(sql, &e);
    for (int i = 0; i < values.size() && !e; ++i)
        s.bind(i + 1, values[i]);
    if (!e)
        e = s.run();
    if (e)
        qFatal("%s: %s", qPrintable(sql), qPrintable(e.message));
}

} // namespace

class TestDocImport : public QObject {
    Q_OBJECT
    OdbcSandbox odbc;
    QTemporaryDir work;
    QString erp1, erp2;
    int fresh = 0;
    qint64 nextOrd = 90001, nextOrdi = 900001;

    // One order with its lines (part, quantity, factory quantity, package count or invalid).
    void addOrder(Database& db, bool minutes, const QString& number, int cust, const QVariant& date,
                  const QVariant& details, const std::vector<std::tuple<int, double, QVariant, QVariant>>& lines)
    {
        const qint64 ord = nextOrd++;
        const QVariant day = date.isValid() ? date
                                            : db.scalar(QStringLiteral("SELECT max(CURDATE) FROM ORDERS"));
        Q_UNUSED(minutes);
        execBound(db, QStringLiteral("INSERT INTO ORDERS (ORD, ORDNAME, CUST, CURDATE, REFERENCE, DETAILS)"
                                     " VALUES (?1, ?2, ?3, ?4, ?5, ?6)"),
                  {ord, number, cust, day, QStringLiteral("REF-") + number, details});
        int line = 0;
        for (const auto& [part, quant, tquant, packs] : lines) {
            const qint64 ordi = nextOrdi++;
            execBound(db, QStringLiteral("INSERT INTO ORDERITEMS (ORDI, ORD, LINE, PART, QUANT, TQUANT, NUMPACK)"
                                         " VALUES (?1, ?2, ?3, ?4, ?5, ?6, 0)"),
                      {ordi, ord, ++line, part, quant, tquant});
            if (packs.isValid())
                execBound(db, QStringLiteral("INSERT INTO ORDERITEMSA (ORDI, NUMPACK) VALUES (?1, ?2)"), {ordi, packs});
        }
    }

    // The documents every test selects by their numbers, added to a demo company.
    void addDocuments(const QString& path, bool minutes)
    {
        nextOrd = 90001;
        nextOrdi = 900001;
        Database db;
        if (DbError e = db.open(path))
            qFatal("%s", qPrintable(e.message));
        db.begin();
        execBound(db, QStringLiteral("INSERT INTO CUSTOMERS (CUST, CUSTNAME, CUSTDES, ADDRESS, PHONE, MCUST)"
                                     " VALUES (900, 'SOLO-1', 'Solo', ' Main St 1 ', '', NULL)"),
                  {});
        const QVariant none;
        for (size_t i = 0; i < qtyCases().size(); ++i) {
            const QtyCase& c = qtyCases()[i];
            addOrder(db, minutes, QStringLiteral("QT%1").arg(i, 2, 10, QLatin1Char('0')), 1, {}, c.details,
                     {{6, c.quant, c.tquant, none}});
        }
        // Three lines and one whose item has a blank key; packages on the
        // first (3) and third (0) lines only.
        addOrder(db, minutes, QStringLiteral("FL01"), 1, {}, {},
                 {{6, 4, none, 3}, {7, 5, none, none}, {8, 6, none, 0}, {5, 2, none, 1}});
        // A branch under its chain's head office, another one, an account on its own.
        for (const auto& [number, cust] : {std::pair{"AC01", 2}, {"AC02", 3}, {"AC03", 900}})
            addOrder(db, minutes, QLatin1String(number), cust, {}, {}, {{6, 1, none, none}, {7, 1, none, none}});
        if (minutes) {
            const std::pair<const char*, qint64> dated[] = {{"DT01", minutesOf(kDay, 510)},
                                                            {"DT02", minutesOf(kDay)},
                                                            {"DT03", minutesOf(kDay.addDays(1))},
                                                            {"DT04", minutesOf(kDay, -1)}};
            for (const auto& [number, when] : dated)
                addOrder(db, minutes, QLatin1String(number), 1, when, {}, {{6, 1, none, none}});
        }
        const std::pair<const char*, int> numbered[] = {{"ZB-0001", 6}, {"ZB-0002", 7}, {"ZB-0003", 8},
                                                        {"ZB-0004", 9}, {"ZB-O'1", 6},
                                                        {"ZB-0005-LONGER-THAN-ITS-FIELD", 6}};
        for (const auto& [number, part] : numbered)
            addOrder(db, minutes, QString::fromUtf8(number), 4, {}, {}, {{part, 2, none, none}});
        if (DbError e = db.commit())
            qFatal("%s", qPrintable(e.message));
    }

    QString addCompany(const QString& dsn, short type)
    {
        DemoOptions o;
        o.connType = type;
        const QString path = odbc.addDemo(dsn, o);
        addDocuments(path, type == 2);
        return path;
    }

    // A new data folder: the supplied configuration with only the given
    // types included, and an empty items database.
    QString newFolder(const QString& includeTypes)
    {
        const QString folder = work.filePath(QStringLiteral("data%1").arg(++fresh));
        QDir().mkpath(folder);
        DbError e = InstallConfigDatabase(QDir(folder).filePath(dbfiles::Config));
        if (!e && CreateItemsDB(QDir(folder).filePath(dbfiles::Items), &e).isEmpty() && !e)
            e = DbError::other(QStringLiteral("no items database"));
        if (!e)
            e = execOn(QDir(folder).filePath(dbfiles::Config),
                       QStringLiteral("UPDATE tDocTypes SET Include = (DocType IN (%1))").arg(includeTypes));
        if (e)
            qFatal("%s", qPrintable(e.message));
        return folder;
    }

    static QString config(const QString& folder) { return QDir(folder).filePath(dbfiles::Config); }
    static QString docs(const QString& folder) { return QDir(folder).filePath(dbfiles::TempDocs); }

    DocImportResult import(const QString& folder, DocImportOptions o, short type = 2, Recorder* sink = nullptr,
                           DocCriteriaState* state = nullptr)
    {
        o.dataFolder = folder;
        const ErpReadContext ctx{BuildConnString(type == 1 ? kDsn1 : kDsn2, "sa", QVariant(), "demo", type), sink};
        return ImportDocuments(ctx, o, state);
    }

    static DocImportOptions numbers(const QString& from, const QString& to, const QString& pref = QString())
    {
        DocImportOptions o;
        o.fromDocNum = from;
        o.toDocNum = to;
        o.refPref = pref;
        return o;
    }

    // Lines of one imported document by its number: item, quantity, include, copies.
    QStringList linesOf(const QString& folder, const QString& number)
    {
        return rows(docs(folder),
                    QStringLiteral("SELECT l.LineNum, l.ItemKey, l.Quantity, l.Include, l.Copies FROM tTempDocLines l"
                                   " JOIN tTempDocHeaders h ON h.WizFileID = l.WizFileID AND h.Number = l.HeadNumber"
                                   " WHERE h.Reference1 = ?1 ORDER BY l.LineNum"),
                    {number});
    }

    QString partName(int part)
    {
        return scalar(erp2, QStringLiteral("SELECT trim(PARTNAME) FROM PART WHERE PART = %1").arg(part)).toString();
    }

private slots:
    void initTestCase()
    {
        erp1 = addCompany(kDsn1, 1);
        erp2 = addCompany(kDsn2, 2);
    }

    void quantities_data()
    {
        QTest::addColumn<int>("index");
        for (size_t i = 0; i < qtyCases().size(); ++i)
            QTest::newRow(qtyCases()[i].name) << int(i);
    }
    void quantities()
    {
        QFETCH(int, index);
        const QtyCase& c = qtyCases()[size_t(index)];
        const QString folder = newFolder(QStringLiteral("1"));
        const QString number = QStringLiteral("QT%1").arg(index, 2, 10, QLatin1Char('0'));
        DocImportOptions o = numbers(number, number);
        o.qtyFrom = c.rule;
        o.qtyFactor = QString::fromUtf8(c.factor);
        const DocImportResult r = import(folder, o);
        QVERIFY2(r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(linesOf(folder, number),
                 QStringList{QStringLiteral("1|%1|%2|1|%3").arg(partName(6)).arg(c.quantity).arg(c.copies)});
    }

    // The first line alone is marked; under the line rule it prints once.
    // A line whose item has no key is left out, its document is not.
    void firstLineOnly_data()
    {
        QTest::addColumn<int>("rule");
        QTest::addColumn<bool>("onlyLine0");
        QTest::addColumn<QStringList>("expected");
        const QString a = partName(6), b = partName(7), c = partName(8);
        QTest::newRow("first line, line rule") << 0 << true
                                               << QStringList{"1|" + a + "|4|1|1", "2|" + b + "|5|0|5", "3|" + c + "|6|0|6"};
        QTest::newRow("first line, fixed number") << 4 << true
                                                  << QStringList{"1|" + a + "|2|1|2", "2|" + b + "|2|0|2", "3|" + c + "|2|0|2"};
        QTest::newRow("packages: a count, none, zero") << 3 << false
                                                       << QStringList{"1|" + a + "|6|1|6", "2|" + b + "|10|1|10",
                                                                      "3|" + c + "|12|1|12"};
    }
    void firstLineOnly()
    {
        QFETCH(int, rule);
        QFETCH(bool, onlyLine0);
        QFETCH(QStringList, expected);
        const QString folder = newFolder(QStringLiteral("1"));
        DocImportOptions o = numbers(QStringLiteral("FL01"), QStringLiteral("FL01"));
        o.qtyFrom = rule;
        o.qtyFactor = QStringLiteral("2");
        if (rule == 0)
            o.qtyFactor.clear();
        o.onlyLine0 = onlyLine0;
        const DocImportResult r = import(folder, o);
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(linesOf(folder, QStringLiteral("FL01")), expected);
    }

    // Package counts from each extension table (and the line table's own for
    // stock documents) replace quantity and copies where they are above 0.
    void packagesOfEveryRecipe()
    {
        const QString folder = newFolder(QStringLiteral("1, 2, 3, 5"));
        execOn(config(folder), QStringLiteral("UPDATE tDocTypes SET IncludeDraft = TRUE"));
        DocImportOptions o;
        o.qtyFrom = QtyPackages;
        o.qtyFactor = QStringLiteral("2");
        const DocImportResult r = import(folder, o);
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT WizFileID, count(*) > 0, sum(Packs > 0) > 0, sum(Packs % 2)"
                                                   " FROM tTempLineMore GROUP BY WizFileID")),
                 (QStringList{"1|1|1|0", "2|1|1|0", "3|1|1|0", "4|1|1|0"}));
        QCOMPARE(scalar(docs(folder), QStringLiteral("SELECT count(*) FROM tTempDocLines l JOIN tTempLineMore m"
                                                     " USING (WizFileID, HeadNumber, LineNum) WHERE m.Packs > 0"
                                                     " AND (l.Quantity <> m.Packs OR l.Copies <> min(m.Packs, 999))"))
                     .toInt(),
                 0);
        // An invoice's package rows come from the stock movements keyed by the invoice.
        QCOMPARE(scalar(docs(folder), "SELECT count(*) FROM tTempLineMore WHERE WizFileID = 4").toInt(),
                 scalar(erp2, "SELECT count(*) FROM INVOICEITEMS L, TRANSORDER EX, INVOICES H WHERE EX.DOC = L.IV"
                              " AND EX.LINE = L.LINE AND H.IV = L.IV AND H.TYPE = 'A'")
                     .toInt());
    }

    // A branch is labelled as its head office unless it has definitions of
    // its own; an account without a consolidating one is read as itself.
    // Alternate numbers: the document's own account first, then the labelled one.
    void consolidatingAccount()
    {
        const QString folder = newFolder(QStringLiteral("1"));
        const QString items = QDir(folder).filePath(dbfiles::Items);
        const QString a = partName(6), b = partName(7);
        QVERIFY(!execOn(items, QStringLiteral("INSERT INTO tAccountDef (AccountKey, LabelName) VALUES ('ch-102', 'x');"
                                              "INSERT INTO tAlterKeys (AccountKey, ItemKey, AlterNum) VALUES"
                                              " ('CH-101', '%1', 'OWN-101'), ('CH-100', '%1', 'HEAD-100'),"
                                              " ('CH-100', '%2', 'HEAD-B')")
                                   .arg(a, b)));
        Recorder sink;
        const DocImportResult r = import(folder, numbers(QStringLiteral("AC01"), QStringLiteral("AC03")), 2, &sink);
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT Reference1, AccountKey, OrigAccountKey, CardName, Address,"
                                                   " Include FROM tTempDocHeaders ORDER BY Reference1")),
                 (QStringList{"AC01|CH-100|CH-101|" + scalar(erp2, "SELECT CUSTDES FROM CUSTOMERS WHERE CUST = 2").toString()
                                  + "|" + scalar(erp2, "SELECT trim(ADDRESS) FROM CUSTOMERS WHERE CUST = 2").toString() + "|0",
                              "AC02|CH-102|CH-102|" + scalar(erp2, "SELECT CUSTDES FROM CUSTOMERS WHERE CUST = 3").toString()
                                  + "|" + scalar(erp2, "SELECT trim(ADDRESS) FROM CUSTOMERS WHERE CUST = 3").toString() + "|0",
                              "AC03|SOLO-1|SOLO-1|Solo|Main St 1|0"}));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT h.Reference1, l.ItemKey, ifnull(l.AlterNum, '-') FROM tTempDocLines l"
                                                   " JOIN tTempDocHeaders h ON h.Number = l.HeadNumber ORDER BY 1, l.LineNum")),
                 (QStringList{"AC01|" + a + "|OWN-101", "AC01|" + b + "|HEAD-B", "AC02|" + a + "|-", "AC02|" + b + "|-",
                              "AC03|" + a + "|-", "AC03|" + b + "|-"}));
        QCOMPARE(sink.messages.last(), QStringLiteral("קריאת המסמכים הסתיימה"));
        QVERIFY(sink.messages.contains(QStringLiteral("קורא מסמכים")));
        QCOMPARE(sink.last, 1.0);
    }

    // What the number boxes select, how the headers are marked and whether
    // the type's start moves. An empty box is no bound, prefix or not.
    void numberBoxes_data()
    {
        QTest::addColumn<QString>("from");
        QTest::addColumn<QString>("to");
        QTest::addColumn<QString>("pref");
        QTest::addColumn<QString>("where"); // the orders expected, in the ERP's terms
        QTest::addColumn<bool>("include");
        QTest::addColumn<bool>("advances");
        QTest::addColumn<int>("connType");
        QTest::newRow("both empty") << "" << "" << "" << "1" << true << true << 2;
        QTest::newRow("both empty with a prefix") << "" << "" << "ZB-" << "1" << true << true << 2;
        QTest::newRow("the same number") << "0003" << "0003" << "ZB-" << "ORDNAME = 'ZB-0003'" << true << false << 2;
        QTest::newRow("the same number, its end") << "03" << "03" << "" << "ORDNAME LIKE '%03'" << true << false << 2;
        QTest::newRow("between") << "0002" << "0004" << "ZB-" << "ORDNAME BETWEEN 'ZB-0002' AND 'ZB-0004'" << false
                                 << false << 2;
        QTest::newRow("lower only") << "0004" << "" << "ZB-" << "ORDNAME >= 'ZB-0004'" << false << true << 2;
        QTest::newRow("upper only") << "" << "0002" << "ZB-" << "ORDNAME <= 'ZB-0002'" << false << false << 2;
        QTest::newRow("apostrophe") << "O'1" << "O'1" << "ZB-" << "ORDNAME = 'ZB-O''1'" << true << false << 2;
        QTest::newRow("apostrophes that end a literal")
            << "x' OR '1'='1" << "x' OR '1'='1" << "" << "0" << true << false << 2;
        // Kept whole, though longer than its local field.
        QTest::newRow("a long number") << "0005-LONGER-THAN-ITS-FIELD" << "0005-LONGER-THAN-ITS-FIELD" << "ZB-"
                                       << "ORDNAME = 'ZB-0005-LONGER-THAN-ITS-FIELD'" << true << false << 2;
        // The server behind connection type 1 knows the LIKE wildcard of SQL too.
        QTest::newRow("the same number, type 1") << "0003" << "0003" << "ZB-" << "ORDNAME = 'ZB-0003'" << true << false << 1;
    }
    void numberBoxes()
    {
        QFETCH(QString, from);
        QFETCH(QString, to);
        QFETCH(QString, pref);
        QFETCH(QString, where);
        QFETCH(bool, include);
        QFETCH(bool, advances);
        QFETCH(int, connType);
        const QString folder = newFolder(QStringLiteral("1"));
        const DocImportResult r = import(folder, numbers(from, to, pref), short(connType));
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        const QStringList expected = rows(connType == 1 ? erp1 : erp2,
                                          QStringLiteral("SELECT ORD, ORDNAME FROM ORDERS WHERE %1 ORDER BY ORD").arg(where));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT Number, Reference1 FROM tTempDocHeaders ORDER BY Number")),
                 expected);
        QCOMPARE(scalar(docs(folder), QStringLiteral("SELECT count(*) FROM tTempDocHeaders WHERE Include <> %1")
                                          .arg(include ? 1 : 0))
                     .toInt(),
                 0);
        const QString last = expected.isEmpty() ? QString() : expected.last().section(QLatin1Char('|'), 0, 0);
        QCOMPARE(rows(config(folder), QStringLiteral("SELECT LastIndx, FromIndx FROM tWizFileRanges WHERE WizFileID = 1")),
                 QStringList{advances ? last + "|" + QString::number(last.toLongLong() + 1) : QStringLiteral("0|0")});
    }

    // Drafts are left out unless the type takes them; a type included for
    // its drafts alone is not read.
    void drafts_data()
    {
        QTest::addColumn<bool>("include");
        QTest::addColumn<bool>("includeDraft");
        QTest::addColumn<QString>("where");
        QTest::newRow("final only") << true << false << "FINAL = 'Y'";
        QTest::newRow("with drafts") << true << true << "1";
        QTest::newRow("drafts alone") << false << true << "0";
    }
    void drafts()
    {
        QFETCH(bool, include);
        QFETCH(bool, includeDraft);
        QFETCH(QString, where);
        const QString folder = newFolder(QStringLiteral("3"));
        QVERIFY(!execOn(config(folder), QStringLiteral("UPDATE tDocTypes SET Include = %1, IncludeDraft = %2 WHERE DocType = 3")
                                            .arg(include ? 1 : 0)
                                            .arg(includeDraft ? 1 : 0)));
        const DocImportResult r = import(folder, {});
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT Number FROM tTempDocHeaders ORDER BY Number")),
                 rows(erp2, QStringLiteral("SELECT DOC FROM DOCUMENTS WHERE TYPE = 'D' AND %1 ORDER BY DOC").arg(where)));
    }

    // The upper day is taken whole, whatever time the ERP stored with it.
    void dateBounds_data()
    {
        QTest::addColumn<QString>("fromDate");
        QTest::addColumn<QString>("toDate");
        QTest::addColumn<QStringList>("expected");
        const QString day = kDay.toString(QStringLiteral("d/M/yy"));
        QTest::newRow("up to the day") << "" << day << QStringList{"DT01", "DT02", "DT04"};
        QTest::newRow("from the day") << day << "" << QStringList{"DT01", "DT02", "DT03"};
        QTest::newRow("the day") << day << day << QStringList{"DT01", "DT02"};
    }
    void dateBounds()
    {
        QFETCH(QString, fromDate);
        QFETCH(QString, toDate);
        QFETCH(QStringList, expected);
        const QString folder = newFolder(QStringLiteral("1"));
        DocImportOptions o = numbers(QStringLiteral("DT01"), QStringLiteral("DT04"));
        o.fromDate = fromDate;
        o.toDate = toDate;
        const DocImportResult r = import(folder, o);
        QVERIFY2(r.completed && r.errors.isEmpty(), qPrintable(r.errors.value(0).message));
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT Reference1 FROM tTempDocHeaders ORDER BY 1")), expected);
    }

    void badDateStopsFirst()
    {
        const QString folder = newFolder(QStringLiteral("1"));
        DocImportOptions o;
        o.toDate = QStringLiteral("31/x/26");
        const DocImportResult r = import(folder, o);
        QVERIFY(!r.completed);
        QCOMPARE(r.errors.size(), 1);
        QCOMPARE(r.errors[0].title, QStringLiteral("תקלה"));
        QVERIFY(!QFile::exists(docs(folder)));
    }

    // Each run reads the documents after the last one read, none twice, none
    // left out, and a run by numbers never moves the start back.
    void incrementalRead()
    {
        const QString company = odbc.dir.filePath(QStringLiteral("incremental.sqlite"));
        QVERIFY(QFile::copy(erp2, company));
        // A server may return rows in any order: this one gives the newest first.
        QVERIFY(!execOn(company, QStringLiteral("ALTER TABLE ORDERS RENAME TO ORDERS_T;"
                                                "CREATE VIEW ORDERS AS SELECT * FROM ORDERS_T ORDER BY ORD DESC LIMIT -1")));
        odbc.addDsn(QStringLiteral("TagoraIncremental"),
                    {{QStringLiteral("Driver"), QStringLiteral("SQLite3")}, {QStringLiteral("Database"), company}});
        const QString folder = newFolder(QStringLiteral("1"));
        auto run = [&](const DocImportOptions& o) {
            DocImportOptions with = o;
            with.dataFolder = folder;
            const ErpReadContext ctx{BuildConnString(QStringLiteral("TagoraIncremental"), "sa", QVariant(), "demo", 2)};
            const DocImportResult r = ImportDocuments(ctx, with, nullptr);
            if (!r.completed || !r.errors.isEmpty())
                qWarning() << r.errors.value(0).message;
            return rows(docs(folder), QStringLiteral("SELECT Number FROM tTempDocHeaders ORDER BY Number"));
        };
        auto range = [&] { return rows(config(folder), QStringLiteral("SELECT LastIndx, FromIndx FROM tWizFileRanges WHERE WizFileID = 1")); };

        QCOMPARE(run({}), rows(company, QStringLiteral("SELECT ORD FROM ORDERS ORDER BY ORD")));
        const qint64 top = scalar(company, QStringLiteral("SELECT max(ORD) FROM ORDERS")).toLongLong();
        QCOMPARE(range(), QStringList{QStringLiteral("%1|%2").arg(top).arg(top + 1)});
        QCOMPARE(run({}), QStringList());
        QCOMPARE(range(), QStringList{QStringLiteral("%1|%2").arg(top).arg(top + 1)});

        // New documents, the higher ID on an account that a join may visit first.
        QVERIFY(!execOn(company, QStringLiteral("INSERT INTO ORDERS_T (ORD, ORDNAME, CUST, CURDATE) SELECT %1, 'NEW-A', 900,"
                                                " max(CURDATE) FROM ORDERS; INSERT INTO ORDERS_T (ORD, ORDNAME, CUST, CURDATE)"
                                                " SELECT %2, 'NEW-B', 1, max(CURDATE) FROM ORDERS;")
                                     .arg(top + 2)
                                     .arg(top + 1)));
        QCOMPARE(run({}), (QStringList{QString::number(top + 1), QString::number(top + 2)}));
        QCOMPARE(range(), QStringList{QStringLiteral("%1|%2").arg(top + 2).arg(top + 3)});

        // Older documents by their numbers: the start stays where it was.
        QCOMPARE(run(numbers(QStringLiteral("ZB-0004"), QString())).size(), 3);
        QCOMPARE(range().value(0).section(QLatin1Char('|'), 1), QString::number(top + 3));
        QCOMPARE(run({}), QStringList());
    }

    // A type without documents says so and the run goes on; a recipe the
    // ERP rejects keeps nothing of its type and ends the run.
    // The criteria as text for a host: values in the ERP's literal forms,
    // apostrophes doubled, "?" inside a literal left alone.
    void criteriaAsText_data()
    {
        QTest::addColumn<int>("connType");
        QTest::addColumn<QString>("from");
        QTest::addColumn<QString>("to");
        QTest::addColumn<QString>("text");
        QTest::newRow("type 1, numbers and days")
            << 1 << "A'1" << "B?"
            << " AND H.TYPE = 'O' And H.DT >= #01/02/2026# And H.DT < #04/02/2026# And H.REF >= 'A''1' And  H.REF <= 'B?'";
        QTest::newRow("type 2, one number by its end")
            << 2 << "7" << "7" << " AND H.TYPE = 'O' And H.DT >= 20031840 And H.DT < 20036160 And H.REF LIKE '*7'";
    }
    void criteriaAsText()
    {
        QFETCH(int, connType);
        QFETCH(QString, from);
        QFETCH(QString, to);
        QFETCH(QString, text);
        DocTypeRecipe r;
        r.headTable = "H";
        r.fldID = "ID";
        r.fldDate = "DT";
        r.fldRef1 = "REF";
        r.vType = "O";
        const ErpQuery q = BuildDocRangeCriteria(r, QDate(2026, 2, 1), QDate(2026, 2, 3), from, to, 5, true, "*",
                                                 short(connType));
        QCOMPARE(CriteriaText(q, short(connType)), text);
    }

    void faultyAndEmptyTypes_data()
    {
        QTest::addColumn<QString>("types");
        QTest::addColumn<QString>("change");
        QTest::addColumn<bool>("completed");
        QTest::addColumn<QStringList>("read");
        QTest::newRow("a type without documents goes on") << "3, 6" << "UPDATE tDocTypes SET vTYPE = 'Z' WHERE DocType = 3"
                                                          << true << QStringList{"6|1|?|?|0"};
        QTest::newRow("a refused type ends the run") << "1, 3, 6" << "UPDATE tDocTypes SET vTYPE = 'X' WHERE DocType = 1"
                                                     << false << QStringList{};
    }
    void faultyAndEmptyTypes()
    {
        QFETCH(QString, types);
        QFETCH(QString, change);
        QFETCH(bool, completed);
        QFETCH(QStringList, read);
        const QString folder = newFolder(types);
        QVERIFY(!execOn(config(folder), change));
        Recorder sink;
        const DocImportResult r = import(folder, {}, 2, &sink);
        QCOMPARE(r.completed, completed);
        QCOMPARE(r.errors.size(), completed ? 0 : 1);
        if (!completed) {
            QCOMPARE(r.errors[0].title, QStringLiteral("תקלה בקריאת מסמכים"));
            QVERIFY2(r.errors[0].message.contains(QLatin1String("TYPE")), qPrintable(r.errors[0].message));
        } else {
            QVERIFY(sink.messages.contains(QStringLiteral("לא נמצאו מסמכים מתאימים")));
        }
        // Transfers have no account: "?" and no own key.
        QCOMPARE(rows(docs(folder), QStringLiteral("SELECT DocType, count(*) > 0, min(AccountKey), max(AccountKey),"
                                                   " count(OrigAccountKey) FROM tTempDocHeaders GROUP BY DocType")),
                 read);
        QCOMPARE(rows(config(folder), QStringLiteral("SELECT WizFileID FROM tWizFileRanges WHERE FromIndx > 0")),
                 completed ? QStringList{"6"} : QStringList{});
    }

    // With the related items asked for, each type's items are read by its
    // documents' criteria; a step that fails ends the run.
    void relatedItems_data()
    {
        QTest::addColumn<bool>("stepSucceeds");
        QTest::newRow("items read") << true;
        QTest::newRow("items failed") << false;
    }
    void relatedItems()
    {
        QFETCH(bool, stepSucceeds);
        const QString folder = newFolder(QStringLiteral("1"));
        DocImportOptions o = numbers(QStringLiteral("0001"), QStringLiteral("0003"), QStringLiteral("ZB-"));
        o.readDocItems = true;
        o.dataFolder = folder;
        const ErpReadContext base{BuildConnString(kDsn2, "sa", QVariant(), "demo", 2)};
        int steps = 0;
        const QString tempItems = QDir(folder).filePath(dbfiles::TempItems);
        const DocImportResult r = ImportDocuments(base, o, nullptr, [&](const DocTypeRecipe& type, const DocCriteriaState& state) {
            ++steps;
            ErpReadContext ctx = base;
            ctx.itemByDocCriteria = state.currentItemByDocCriteria.sql;
            ctx.itemByDocParams = state.currentItemByDocCriteria.params;
            ReadError error;
            const bool ok = ReadItemPriority(ctx, tempItems, {}, {}, false, 1, 0, true, false, &error);
            return ok && type.docType == 1 && stepSucceeds;
        });
        QCOMPARE(steps, 1);
        QCOMPARE(r.completed, stepSucceeds);
        QCOMPARE(r.tempItemsPath, tempItems);
        if (stepSucceeds) {
            QStringList expected{partName(6), partName(7), partName(8)};
            expected.sort();
            QCOMPARE(rows(QDir(folder).filePath(dbfiles::Items), QStringLiteral("SELECT ItemKey FROM tItems ORDER BY ItemKey")),
                     expected);
        }
    }

    // A cancel ends the run with nothing of the type kept.
    void cancel()
    {
        struct Cancelling : Recorder {
            bool cancelRequested() override { return true; }
        } sink;
        const QString folder = newFolder(QStringLiteral("1, 3"));
        const DocImportResult r = import(folder, {}, 2, &sink);
        QVERIFY(!r.completed);
        QCOMPARE(r.errors.size(), 1);
        QCOMPARE(scalar(docs(folder), QStringLiteral("SELECT count(*) FROM tTempDocHeaders")).toInt(), 0);
        QCOMPARE(rows(config(folder), QStringLiteral("SELECT count(*) FROM tWizFileRanges WHERE FromIndx > 0")),
                 QStringList{"0"});
    }
};

QTEST_GUILESS_MAIN(TestDocImport)
#include "tst_docimport.moc"
