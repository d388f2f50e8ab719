#include "cards/cardpage.h"
#include "cards/priorityinfo.h"
#include "erp/demosetup.h"
#include "erp/textconv.h"
#include "labels/pagewriter.h"
#include "localdb/database.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"
#include "platform/settingsstore.h"
#include "support/erpfixture.h"
#include "support/recordingviewer.h"

#include <QImage>
#include <QRegularExpression>
#include <QStringDecoder>
#include <QtTest>

using namespace tagora;
using namespace Qt::Literals::StringLiterals;

namespace {

const QDate kToday(2026, 3, 15);
const QString kLongCode = QString(199, u'Z') + u'9';
const QString kScrew = u"O'R-5"_s;   // the demo's item with a picture named from the ERP's folder
const QString kDrill = u"MK-482"_s;  // the demo's item with a picture by a full path
const QString kEscapes = u"ESC-1"_s; // markup in its values
const QString kTitleRow = u" <tr><td class=Title1 colspan=2>כרטיס פריט - פריוריטי/זום</td></tr>"_s;

struct NoWindowViewer : RecordingViewer {
    bool showPage(const QString&, QString* error) override
    {
        *error = u"no browser"_s;
        return false;
    }
};

QString readPage(const QString& path)
{
    QFile f(path);
    if (!f.open(QIODevice::ReadOnly))
        return QString();
    QStringDecoder decode("windows-1255");
    return decode(f.readAll());
}

void exec(Database& db, const QString& sql, const QVariantList& values = {})
{
    DbError e;
    Statement s = db.prepare(sql, &e);
    QVERIFY2(!e, qPrintable(e.message));
    for (int i = 0; i < values.size(); ++i)
        s.bind(i + 1, values[i]);
    e = s.run();
    QVERIFY2(!e, qPrintable(e.message + u" in "_s + sql));
}

} // namespace

class TestPriorityInfo : public QObject {
    Q_OBJECT

    OdbcSandbox m_odbc;
    QTemporaryDir m_dir;
    std::shared_ptr<RecordingViewer> m_viewer = std::make_shared<RecordingViewer>();
    std::shared_ptr<ScriptedPrompt> m_prompt = std::make_shared<ScriptedPrompt>(nullptr);

    // The card of code from data source dsn, read back; empty with a failure.
    QString cardPage(const QString& dsn, short type, const QString& code, const QString& connPath = u"/co/erp"_s)
    {
        PriorityInfo info(m_viewer, m_prompt);
        info.setToday(kToday);
        const QString path = m_dir.filePath(u"card.htm"_s);
        QFile::remove(path);
        const QString error = info.CreateItemHTML(path, code, u"DSN="_s + dsn, type, connPath);
        if (!error.isEmpty())
            qWarning("card failed: %s", qPrintable(error));
        return error.isEmpty() ? readPage(path) : QString();
    }

    // A demo company of the type with this suite's own items on top.
    void addCompany(const QString& dsn, short type, const QString& dropTable = {})
    {
        DemoOptions o;
        o.connType = type;
        o.today = kToday;
        o.labelLists = false;
        const QString path = m_odbc.addDemo(dsn, o);
        Database db;
        QVERIFY(!db.open(path));
        const auto day = [&](int offset) { return DateToErp(QVariant(kToday.addDays(offset)), type); };
        int id = 9000;
        const auto item = [&](const QString& code, const QString& name) {
            exec(db, u"INSERT INTO PART (PART, PARTNAME, PARTDES, FAMILY, UNIT, BARCODE, TYPE) VALUES (?, ?, ?, 1, 1, 'B1', 'R')"_s,
                 {++id, code, name});
            exec(db, u"INSERT INTO PARTDES (PART, EPARTDES) VALUES (?, 'English')"_s, {id});
            exec(db, u"INSERT INTO PARTPARAM (PART, WARHS, SUP) VALUES (?, 1, 1)"_s, {id});
            return id;
        };
        for (const QString& code : {u"פריט-א"_s, u"<X>&1"_s, kLongCode})
            item(code, u"Plain"_s);
        const int esc = item(kEscapes, u"<i>A&B</i>"_s);
        exec(db, u"INSERT INTO PARTTEXT (PART, TEXTORD, TEXT) VALUES (?, 1, '<script>x</script>')"_s, {esc});
        exec(db, u"INSERT INTO PARTEXTFILE (PART, EXTFILENUM, EXTFILENAME, EXTFILEDES) VALUES (?, -1, '/pics/a''b.png', '')"_s,
             {esc});
        exec(db, u"INSERT INTO CUSTPART (CUST, PART, CUSTPARTNAME) VALUES (1, ?, 'K<1&2>')"_s, {esc});

        // Special prices and tree rows of the screw around today: only those valid today show.
        const int screw = 2;
        const std::pair<const char*, std::pair<int, int>> spans[] = {
            {"PAST", {-30, -1}}, {"NOW", {0, 0}}, {"FUTURE", {1, 30}}};
        for (const auto& [name, span] : spans) {
            const int son = item(u"TREE-"_s + QLatin1String(name), u"Son"_s);
            exec(db, u"INSERT INTO PARTARC (PART, SON, COEF, SONQUANT, FROMDATE, TILLDATE) VALUES (?, ?, 1, 2, ?, ?)"_s,
                 {screw, son, day(span.first), day(span.second)});
            exec(db, u"INSERT INTO CUSTOMERS (CUST, CUSTNAME, CUSTDES) VALUES (?, ?, 'Dated')"_s,
                 {son, u"CUST-"_s + QLatin1String(name)});
            exec(db, u"INSERT INTO CUSTPARTPRICE (CUST, PART, PRICE, CURRENCY, FROMDATE, EXPIRYDATE) "
                     u"VALUES (?, ?, 1234.5, 1, ?, ?)"_s,
                 {son, screw, day(span.first), day(span.second)});
        }
        if (!dropTable.isEmpty())
            exec(db, u"DROP TABLE "_s + dropTable);
    }

private slots:
    void initTestCase()
    {
        qputenv("Temp", m_dir.filePath(u"temp"_s).toUtf8());
        addCompany(u"Erp1"_s, 1);
        addCompany(u"Erp2"_s, 2);
        addCompany(u"NoLang"_s, 2, u"PARTTEXTLANG"_s);
        m_odbc.addDsn(u"GoneFile"_s, {{u"Driver"_s, u"SQLite3"_s}, {u"Database"_s, m_dir.filePath(u"none.sqlite"_s)}});
    }

    // Each row: the card of code from dsn holds every text of present and none of absent.
    void card_data()
    {
        QTest::addColumn<QString>("dsn");
        QTest::addColumn<QString>("code");
        QTest::addColumn<QStringList>("present");
        QTest::addColumn<QStringList>("absent");
        const auto row = [](const QString& dsn, const QString& name, const QString& code, const QStringList& present,
                            const QStringList& absent = {}) {
            QTest::addRow("%s: %s", qPrintable(dsn), qPrintable(name)) << dsn << code << present << absent;
        };
        const QString ended = kTitleRow + u"\r\n</table>\r\n<p class=Venmar"_s;
        // Keys are bound, whatever they hold; the two ERP types differ in their dates.
        for (const QString& code : {u"פריט-א"_s, u"<X>&1"_s, kLongCode})
            row(u"Erp2"_s, code.left(12), code, {u"<b>"_s + HtmlText(code) + u"</b>"_s}, {ended});
        // A code the ERP does not hold gives the card that ends after its title row.
        row(u"Erp2"_s, u"unknown"_s, u"O'R"_s, {ended}, {u"<b>"_s});
        row(u"Erp2"_s, u"empty parameters left out"_s, kDrill, {u"<td class=GCap>פרמטר 4:</td><td>Li-Ion</td>"_s},
            {u"מידה:"_s, u"חומר:"_s});
        row(u"Erp2"_s, u"described parameter"_s, kScrew, {u"<td class=GCap>צבע:</td><td>כסוף</td>"_s}, {u"פרמטר 4"_s});
        for (const QString& dsn : {u"Erp1"_s, u"Erp2"_s})
            row(dsn, u"valid today"_s, kScrew, {u"<b>"_s + HtmlText(kScrew) + u"</b>"_s, u"TREE-NOW"_s, u"CUST-NOW"_s,
                u"1,234.50"_s}, {u"TREE-PAST"_s, u"TREE-FUTURE"_s, u"CUST-PAST"_s, u"CUST-FUTURE"_s});
        const QString img = u"<img src='%1' border='0'></td>\r\n"_s;
        row(u"Erp2"_s, u"picture from the ERP's folder"_s, kScrew, {img.arg(u"/co/erp/../system/mail/pics/OR-5.jpg"_s)});
        row(u"Erp2"_s, u"picture by full path"_s, kDrill, {img.arg(u"c:\\pics\\makita-482.png"_s)});
        row(u"Erp2"_s, u"values escaped"_s, kEscapes,
            {img.arg(u"/pics/a&#39;b.png"_s), u"&lt;i&gt;A&amp;B&lt;/i&gt;"_s, u"&lt;script&gt;x&lt;/script&gt;"_s,
             u"K&lt;1&amp;2&gt;"_s},
            {u"<i>"_s, u"<script>"_s, u"K<1"_s});
        row(u"NoLang"_s, u"without the English texts' table"_s, kScrew,
            {u"תאור בעברית:"_s, u"מחירונים"_s, u"TREE-NOW"_s}, {u"תאור באנגלית:"_s, u"Hex head screw"_s});
    }
    void card()
    {
        QFETCH(QString, dsn);
        QFETCH(QString, code);
        QFETCH(QStringList, present);
        QFETCH(QStringList, absent);
        const QString page = cardPage(dsn, dsn == u"Erp1"_s ? 1 : 2, code);
        QVERIFY(!page.isEmpty());
        for (const QString& t : present)
            QVERIFY2(page.contains(t), qPrintable(t));
        for (const QString& t : absent)
            QVERIFY2(!page.contains(t), qPrintable(t));
    }

    // The demo company as set up for a user: its screw's card has every
    // section, and its picture is a picture where the page points.
    void demoCompany()
    {
        QTemporaryDir folder;
        IniSettingsStore store(folder.filePath(u"Tagora.ini"_s));
        DemoOptions o;
        o.today = kToday;
        QCOMPARE(SetupDemoCompany(folder.path(), o, store), QString());
        const QString page = cardPage(kDemoDsn, 2, kScrew, folder.filePath(u"erp"_s));
        for (const QString caption : {u"תאור באנגלית:"_s, u"מפתחות חליפיים ספקים"_s, u"פריטים חלופיים"_s})
            QVERIFY2(page.contains(caption), qPrintable(caption));
        const QRegularExpressionMatch src = QRegularExpression(u"<img src='([^']*)'"_s).match(page);
        QVERIFY(src.hasMatch());
        QVERIFY(!QImage(src.captured(1)).isNull());
    }

    // The window shows the waiting page, then the card, or the error page
    // when the ERP cannot be reached.
    void open_data()
    {
        QTest::addColumn<QString>("connStr");
        QTest::addColumn<QString>("page");
        QTest::addColumn<QString>("text");
        const QString error = CardPagePath(cardfiles::ErpError);
        QTest::newRow("file missing") << u"DSN=GoneFile"_s << error << u"התגלתה תקלה בקריאת הנתונים"_s;
        QTest::newRow("card, code trimmed") << u"DSN=Erp2"_s << CardPagePath(cardfiles::ErpCard)
                                            << u"<b>"_s + HtmlText(kScrew) + u"</b>"_s;
    }
    void open()
    {
        QFETCH(QString, connStr);
        QFETCH(QString, page);
        QFETCH(QString, text);
        m_viewer->shown.clear();
        m_prompt->clear();
        PriorityInfo info(m_viewer, m_prompt);
        info.setTimeout(5);
        info.OpenItemHTML(u"  "_s + kScrew + u" "_s, connStr, 2, u"/co/erp"_s);
        QCOMPARE(m_viewer->shown, (QStringList{CardPagePath(cardfiles::Wait), page}));
        QVERIFY(readPage(page).contains(text));
        QCOMPARE(m_prompt->criticalCount(), 0);
    }

    void noWindowTellsWhy()
    {
        m_prompt->clear();
        PriorityInfo(std::make_shared<NoWindowViewer>(), m_prompt).OpenItemHTML(kScrew, u"DSN=Erp2"_s, 2, u"/co/erp"_s);
        QCOMPARE(m_prompt->lines(), QStringList{titles::Fault + u": no browser"_s});
    }
};

QTEST_MAIN(TestPriorityInfo)
#include "tst_priorityinfo.moc"
