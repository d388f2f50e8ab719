#include "labels/glabelsbridge.h"

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <QXmlStreamReader>
#include <QtTest>

using namespace tagora;

namespace {

struct Item {
    QString key, name, price, barcode;
    int copies;
};

// Hebrew names, one with the quotes and comma a CSV must keep; real EAN-13s.
const QList<Item> kItems = {
    {QStringLiteral("A-100"), QStringLiteral("שמן \"זית\", כתית"), QStringLiteral("12.50"),
     QStringLiteral("7290000000015"), 2},
    {QStringLiteral("B-20"), QStringLiteral("לחם אחיד"), QStringLiteral("5.90"), QStringLiteral("4006381333931"), 1},
    {QStringLiteral("C-3"), QStringLiteral("גבינה לבנה 5%"), QStringLiteral("4.00"), QStringLiteral("5901234123457"),
     3},
};

// What pdftotext gives, compared without the spaces it puts between
// letters of a word and without the direction marks around mixed runs.
QString plain(const QString& text)
{
    QString out;
    for (const QChar c : text) {
        const ushort u = c.unicode();
        if (c.isSpace() || u == 0x200E || u == 0x200F || (u >= 0x202A && u <= 0x202E) || (u >= 0x2066 && u <= 0x2069))
            continue;
        out += c;
    }
    return out;
}

QByteArray gzip(const QByteArray& data)
{
    QProcess p;
    p.start(QStringLiteral("gzip"), {QStringLiteral("-c")});
    p.write(data);
    p.closeWriteChannel();
    return p.waitForFinished(60000) ? p.readAllStandardOutput() : QByteArray();
}

bool writeFile(const QString& path, const QByteArray& bytes, QFileDevice::Permissions perms = {})
{
    QFile f(path);
    if (!f.open(QIODevice::WriteOnly) || f.write(bytes) != bytes.size())
        return false;
    f.close();
    return perms == QFileDevice::Permissions() || f.setPermissions(perms);
}

// Sets PATH for one test and puts it back.
class PathGuard {
public:
    explicit PathGuard(const QByteArray& path)
        : m_old(qgetenv("PATH"))
    {
        qputenv("PATH", path);
    }
    ~PathGuard() { qputenv("PATH", m_old); }

private:
    QByteArray m_old;
};

QStringList filesIn(const QString& folder)
{
    return QDir(folder).entryList(QDir::Files, QDir::Name);
}

} // namespace

class TestGlabelsBridge : public QObject {
    Q_OBJECT

    QTemporaryDir m_labels;
    QString m_demo;

    QString run(const QString& program, const QStringList& args)
    {
        QProcess p;
        p.start(QStandardPaths::findExecutable(program), args);
        if (!p.waitForFinished(120000))
            return QString();
        return QString::fromUtf8(p.readAllStandardOutput());
    }

    // Runs one label through a sink the way an adapter does.
    bool printItems(GlabelsSink& sink, const QString& label, QString* error)
    {
        if (!sink.openLabel(label, error))
            return false;
        for (const Item& item : kItems) {
            if (!sink.setVariable(QStringLiteral("ItemKey"), item.key, error)
                || !sink.setVariable(QStringLiteral("ItemName"), item.name, error)
                || !sink.setVariable(QStringLiteral("Price"), item.price, error)
                || !sink.setVariable(QStringLiteral("BarCode"), item.barcode, error)
                || !sink.printRecord(item.copies, error))
                return false;
        }
        return sink.closeLabel(error);
    }

    bool haveTools()
    {
        for (const char* tool : {"glabels-3-batch", "pdfinfo", "pdftotext", "pdftoppm", "zbarimg"})
            if (QStandardPaths::findExecutable(QLatin1String(tool)).isEmpty())
                return false;
        return true;
    }

private slots:
    void initTestCase()
    {
        QString error;
        m_demo = DemoGlabelsLabel(m_labels.path(), &error);
        QVERIFY2(!m_demo.isEmpty(), qPrintable(error));
    }

    void printsEveryCopyInOrder_data()
    {
        QTest::addColumn<bool>("compressed");
        QTest::newRow("plain document") << false;
        QTest::newRow("gzip-compressed document") << true;
    }

    void printsEveryCopyInOrder()
    {
        if (!haveTools())
            QSKIP("glabels-3-batch or poppler-utils or zbar-tools is not installed");
        QFETCH(bool, compressed);
        QString label = m_demo;
        if (compressed) {
            QFile demo(m_demo);
            QVERIFY(demo.open(QIODevice::ReadOnly));
            label = m_labels.filePath(QStringLiteral("demo-item-gz.glabels"));
            QVERIFY(writeFile(label, gzip(demo.readAll())));
        }
        QTemporaryDir jobs;
        // An earlier run's output in the folder is never overwritten.
        QVERIFY(writeFile(jobs.filePath(QStringLiteral("tgrlab-001.pdf")), "earlier"));
        BridgeOptions options;
        options.jobFolder = jobs.path();
        GlabelsSink sink(options);
        QString error;
        QVERIFY2(printItems(sink, label, &error), qPrintable(error));

        const QString pdf = jobs.filePath(QStringLiteral("tgrlab-002.pdf"));
        QCOMPARE(sink.keptFiles(), QStringList{pdf});
        QCOMPARE(filesIn(jobs.path()), (QStringList{QStringLiteral("tgrlab-001.pdf"), QStringLiteral("tgrlab-002.pdf")}));
        QVERIFY(run(QStringLiteral("pdfinfo"), {pdf}).contains(QRegularExpression(QStringLiteral("Pages:\\s+6\\n"))));

        QStringList expectedCodes;
        int page = 0;
        for (const Item& item : kItems) {
            for (int c = 0; c < item.copies; ++c) {
                ++page;
                const QString n = QString::number(page);
                const QString text = plain(run(QStringLiteral("pdftotext"),
                                               {QStringLiteral("-f"), n, QStringLiteral("-l"), n, pdf, QStringLiteral("-")}));
                for (const QString& expected : {item.name, item.key, item.price})
                    QVERIFY2(text.contains(plain(expected)),
                             qPrintable(QStringLiteral("page %1: %2 not in %3").arg(n, expected, text)));
                expectedCodes << QStringLiteral("EAN-13:") + item.barcode;
            }
        }
        run(QStringLiteral("pdftoppm"), {QStringLiteral("-r"), QStringLiteral("300"), QStringLiteral("-png"), pdf,
                                         jobs.filePath(QStringLiteral("page"))});
        QStringList pages = QDir(jobs.path()).entryList({QStringLiteral("page-*.png")}, QDir::Files, QDir::Name);
        QCOMPARE(pages.size(), 6);
        QStringList codes;
        for (const QString& png : pages)
            codes << run(QStringLiteral("zbarimg"), {QStringLiteral("-q"), jobs.filePath(png)}).trimmed();
        QCOMPARE(codes, expectedCodes);
    }

    // A label opened over another sends the other's labels first; a label
    // without records makes nothing.
    void eachLabelFileMakesItsOwnPdf()
    {
        if (!haveTools())
            QSKIP("glabels-3-batch or poppler-utils is not installed");
        QTemporaryDir jobs;
        BridgeOptions options;
        options.jobFolder = jobs.path();
        GlabelsSink sink(options);
        QString error;
        QVERIFY2(sink.openLabel(m_demo, &error), qPrintable(error));
        QVERIFY(sink.setVariable(QStringLiteral("ItemKey"), QStringLiteral("HEAD-1"), &error));
        QVERIFY(sink.printRecord(1, &error));
        QVERIFY2(sink.openLabel(m_demo, &error), qPrintable(error));
        QVERIFY(sink.printRecord(0, &error));
        QVERIFY(sink.closeLabel(&error));
        QVERIFY2(printItems(sink, m_demo, &error), qPrintable(error));
        const QStringList kept = sink.keptFiles();
        QCOMPARE(kept.size(), 2);
        QVERIFY(run(QStringLiteral("pdfinfo"), {kept[0]}).contains(QRegularExpression(QStringLiteral("Pages:\\s+1\\n"))));
        QVERIFY(plain(run(QStringLiteral("pdftotext"), {kept[0], QStringLiteral("-")})).contains(QStringLiteral("HEAD-1")));
        QVERIFY(run(QStringLiteral("pdfinfo"), {kept[1]}).contains(QRegularExpression(QStringLiteral("Pages:\\s+6\\n"))));
    }

    void failuresEndTheLabel_data()
    {
        QTest::addColumn<QString>("document"); // a file under the labels folder; "demo": the demo label
        QTest::addColumn<QByteArray>("content");   // written to it unless empty
        QTest::addColumn<QString>("variable");
        QTest::addColumn<QString>("program");      // "real", "none", or a shell script standing in
        QTest::addColumn<QString>("printer");
        QTest::addColumn<QString>("failingCall");  // open, set, close
        QTest::addColumn<QString>("message");      // part of the error
        QTest::addColumn<bool>("workFilesKept");

        const QString real = QStringLiteral("real");
        QTest::newRow("variable the label has no field for")
            << "demo" << QByteArray() << "Colour" << real << QString() << "set" << "Colour" << false;
        QTest::newRow("field names differ in case")
            << "demo" << QByteArray() << "itemkey" << real << QString() << "set" << "itemkey" << false;
        QTest::newRow("missing label file")
            << "absent.glabels" << QByteArray() << "ItemKey" << real << QString() << "open" << "absent.glabels" << false;
        QTest::newRow("a folder named like a label")
            << "folder.glabels" << QByteArray() << "ItemKey" << real << QString() << "open" << "folder.glabels" << false;
        QTest::newRow("not XML") << "junk.glabels" << QByteArray("<Glabels-document><Objects>")
                                 << "ItemKey" << real << QString() << "open" << "gLabels" << false;
        QTest::newRow("another XML document")
            << "other.glabels" << QByteArray("<?xml version=\"1.0\"?><Glabels-templates/>")
            << "ItemKey" << real << QString() << "open" << "Glabels-templates" << false;
        QTest::newRow("truncated gzip") << "cut.glabels" << gzip(QByteArray(4000, 'x')).left(30)
                                        << "ItemKey" << real << QString() << "open" << "cut.glabels" << false;
        QTest::newRow("glabels-3-batch missing")
            << "demo" << QByteArray() << "ItemKey" << "none" << QString() << "open" << "glabels-3-batch לא נמצא"
            << false;
        // Stand-ins for the program's ways of failing: hung, exit 0 with nothing made, a wrong merge.
        QTest::newRow("program hangs") << "demo" << QByteArray() << "ItemKey"
                                       << "exec /bin/sleep 30" << QString() << "close" << "1 שניות" << true;
        QTest::newRow("program makes no PDF") << "demo" << QByteArray() << "ItemKey" << "exit 0" << QString()
                                              << "close" << "PDF" << true;
        QTest::newRow("program cannot merge")
            << "demo" << QByteArray() << "ItemKey"
            << "echo 'cannot perform document merge with glabels file x' >&2; printf '%%PDF-1.5' > \"$2\"" << QString()
            << "close" << "cannot perform document merge" << true;
        QTest::newRow("program makes too few pages")
            << "demo" << QByteArray() << "ItemKey"
            << "printf '%%PDF-1.5\\n<< /Type /Pages /Kids [ 2 0 R ] /Count 1 >>' > \"$2\"" << QString() << "close"
            << "1 עמודים במקום 3" << true;
        QTest::newRow("printer refuses the job")
            << "demo" << QByteArray() << "ItemKey" << real << "tagora-no-such-queue" << "close"
            << "tagora-no-such-queue" << false;
    }

    void failuresEndTheLabel()
    {
        QFETCH(QString, document);
        QFETCH(QByteArray, content);
        QFETCH(QString, variable);
        QFETCH(QString, program);
        QFETCH(QString, printer);
        QFETCH(QString, failingCall);
        QFETCH(QString, message);
        QFETCH(bool, workFilesKept);
        if (program == u"real" && QStandardPaths::findExecutable(QStringLiteral("glabels-3-batch")).isEmpty())
            QSKIP("glabels-3-batch is not installed");

        QTemporaryDir dir;
        QString label = m_demo;
        if (document != u"demo") {
            label = dir.filePath(document);
            if (document.startsWith(u"folder"))
                QVERIFY(QDir().mkpath(label));
            else if (!content.isEmpty())
                QVERIFY(writeFile(label, content));
        }
        QTemporaryDir bin;
        QByteArray path = qgetenv("PATH");
        if (program == u"none") {
            path = bin.path().toLocal8Bit();
        } else if (program != u"real") {
            QVERIFY(writeFile(bin.filePath(QStringLiteral("glabels-3-batch")),
                              "#!/bin/sh\n" + program.toUtf8() + "\n",
                              QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner));
            path = bin.path().toLocal8Bit();
        }
        PathGuard guard(path);

        QTemporaryDir jobs;
        BridgeOptions options;
        options.jobFolder = jobs.path();
        options.printer = printer;
        // Short only for the hung stand-in: the real program takes its time on a busy machine.
        options.timeoutSeconds = program.contains(QLatin1String("sleep")) ? 1 : 120;
        GlabelsSink sink(options);
        QString error;
        bool ok = sink.openLabel(label, &error);
        QCOMPARE(ok, failingCall != u"open");
        if (ok) {
            ok = sink.setVariable(variable, QStringLiteral("A-1"), &error) && sink.printRecord(3, &error);
            QCOMPARE(ok, failingCall != u"set");
        }
        if (ok)
            QVERIFY(!sink.closeLabel(&error));
        QVERIFY2(error.contains(message), qPrintable(error));

        // Nothing that reads as made labels; what is left is there to find the cause.
        QStringList left = filesIn(jobs.path());
        if (!printer.isEmpty()) {
            QCOMPARE(left, QStringList{QStringLiteral("tgrlab-001.pdf")});
            QCOMPARE(sink.keptFiles(), QStringList{jobs.filePath(left.first())});
            QVERIFY(error.contains(left.first()));
            return;
        }
        QVERIFY(sink.keptFiles().isEmpty());
        const QStringList work{QStringLiteral("tgrlab-001.csv"), QStringLiteral("tgrlab-001.glabels")};
        QCOMPARE(left, workFilesKept ? work : QStringList());
        if (workFilesKept)
            QVERIFY(error.contains(QStringLiteral("tgrlab-001.csv")));
    }

    // The copy gLabels runs: one merge source, the run's CSV; pictures still found.
    void mergeCopy_data()
    {
        QTest::addColumn<QByteArray>("objects");
        QTest::addColumn<QByteArray>("tail"); // after the objects: merge, data
        QTest::addColumn<QStringList>("fields");
        QTest::addColumn<QString>("imageSrc"); // "" none; else what the copy should hold ("@" = the labels folder)

        QTest::newRow("own merge source replaced")
            << QByteArray("<Object-text><Span><Field name=\"ItemKey\"/> <Field name=\"ItemName\"/></Span></Object-text>")
            << QByteArray("<Merge type=\"Text/Colon\" src=\"/old/data.txt\"/>")
            << QStringList{"ItemKey", "ItemName"} << QString();
        QTest::newRow("merge added before the data")
            << QByteArray("<Object-barcode field=\"BarCode\" color_field=\"Ink\"/><Object-text><Span>${Price} ₪ $x ${ Sp }</Span></Object-text>")
            << QByteArray("<Data><Pixdata name=\"logo.png\">AAAA</Pixdata></Data>")
            << QStringList{"BarCode", "Ink", "Price", " Sp "} << QString();
        QTest::newRow("picture file next to the label")
            << QByteArray("<Object-image src=\"pics/logo.png\"/>") << QByteArray() << QStringList() << "@/pics/logo.png";
        QTest::newRow("picture carried inside")
            << QByteArray("<Object-image src=\"logo.png\" field=\"Picture\"/>")
            << QByteArray("<Data><Pixdata name=\"logo.png\">AAAA</Pixdata></Data>") << QStringList{"Picture"}
            << "logo.png";
    }

    void mergeCopy()
    {
        QFETCH(QByteArray, objects);
        QFETCH(QByteArray, tail);
        QFETCH(QStringList, fields);
        QFETCH(QString, imageSrc);
        const QByteArray xml = "<?xml version=\"1.0\"?>\n<Glabels-document xmlns=\"http://glabels.org/xmlns/3.0/\">"
                               "<Template brand=\"T\" part=\"x\" size=\"Other\" width=\"90mm\" height=\"60mm\">"
                               "<Label-rectangle id=\"0\" width=\"45mm\" height=\"30mm\">"
                               "<Layout nx=\"2\" ny=\"2\" x0=\"0\" y0=\"0\" dx=\"45mm\" dy=\"30mm\"/></Label-rectangle>"
                               "</Template><Objects id=\"0\" rotate=\"False\">"
            + objects + "</Objects>" + tail + "</Glabels-document>";
        QTemporaryDir dir;
        const QString path = dir.filePath(QStringLiteral("t.glabels"));
        QVERIFY(writeFile(path, xml));
        GlabelsDocument doc;
        QString error;
        QVERIFY2(ReadGlabelsDocument(path, &doc, &error), qPrintable(error));
        QCOMPARE(QSet<QString>(fields.begin(), fields.end()), doc.fields);
        QCOMPARE(doc.labelsPerSheet, 4);

        const QString csv = dir.filePath(QStringLiteral("jobs/tgrlab-001.csv"));
        QByteArray copy;
        QVERIFY2(GlabelsMergeCopy(doc, csv, &copy, &error), qPrintable(error));
        QXmlStreamReader r(copy);
        QStringList merges, order, images;
        while (!r.atEnd()) {
            if (r.readNext() != QXmlStreamReader::StartElement)
                continue;
            if (r.namespaceUri() != u"http://glabels.org/xmlns/3.0/")
                QFAIL(qPrintable(QStringLiteral("%1 lost its namespace").arg(r.name())));
            if (r.name() == u"Merge")
                merges << r.attributes().value(QLatin1String("type")).toString() + QLatin1Char('|')
                        + r.attributes().value(QLatin1String("src")).toString();
            if (r.name() == u"Object-image")
                images << r.attributes().value(QLatin1String("src")).toString();
            if (r.name() == u"Objects" || r.name() == u"Merge" || r.name() == u"Data")
                order << r.name().toString();
        }
        QVERIFY2(!r.hasError(), qPrintable(r.errorString()));
        QCOMPARE(merges, QStringList{QStringLiteral("Text/Comma/Line1Keys|") + csv});
        QCOMPARE(order.mid(0, 2), (QStringList{QStringLiteral("Objects"), QStringLiteral("Merge")}));
        QString expectedSrc = imageSrc;
        expectedSrc.replace(QLatin1Char('@'), QFileInfo(path).absolutePath());
        QCOMPARE(images, imageSrc.isEmpty() ? QStringList() : QStringList{expectedSrc});
    }
};

QTEST_GUILESS_MAIN(TestGlabelsBridge)
#include "tst_glabelsbridge.moc"
