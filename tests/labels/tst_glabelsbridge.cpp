#include "labels/glabelsbridge.h"

#include <QDir>
#include <QFile>
#include <QProcess>
#include <QScopeGuard>
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

    void printsEveryCopyInOrder()
    {
        if (!haveTools())
            QSKIP("glabels-3-batch or poppler-utils or zbar-tools is not installed");
        const QString label = m_demo;
        QTemporaryDir jobs;
        // An earlier run's output in the folder is never overwritten.
        QVERIFY(writeFile(jobs.filePath(QStringLiteral("tgrlab-001.pdf")), "earlier"));
        BridgeOptions options;
        options.jobFolder = jobs.path();
        GlabelsSink sink(options);
        QString error;
        // A label opened over another sends the other's labels first; one
        // without records makes nothing.
        QVERIFY2(sink.openLabel(label, &error) && sink.printRecord(1, &error), qPrintable(error));
        QVERIFY2(sink.openLabel(label, &error) && sink.printRecord(0, &error), qPrintable(error));
        QVERIFY2(sink.closeLabel(&error), qPrintable(error));
        QVERIFY2(printItems(sink, label, &error), qPrintable(error));

        const QString first = jobs.filePath(QStringLiteral("tgrlab-002.pdf"));
        const QString pdf = jobs.filePath(QStringLiteral("tgrlab-003.pdf"));
        QCOMPARE(sink.keptFiles(), (QStringList{first, pdf}));
        QCOMPARE(filesIn(jobs.path()).size(), 3);
        QVERIFY(run(QStringLiteral("pdfinfo"), {first}).contains(QRegularExpression(QStringLiteral("Pages:\\s+1\\n"))));
        QVERIFY(run(QStringLiteral("pdfinfo"), {pdf}).contains(QRegularExpression(QStringLiteral("Pages:\\s+6\\n"))));

        // Each value on as many pages as copies, the name's quotes and comma kept;
        // the barcodes read page by page give the order.
        const QString text = plain(run(QStringLiteral("pdftotext"), {pdf, QStringLiteral("-")}));
        QStringList expectedCodes;
        for (const Item& item : kItems) {
            for (const QString& value : {item.name, item.key, item.price})
                QVERIFY2(text.count(plain(value)) == item.copies, qPrintable(value + QStringLiteral(" in ") + text));
            for (int c = 0; c < item.copies; ++c)
                expectedCodes << QStringLiteral("EAN-13:") + item.barcode;
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

    void failuresEndTheLabel_data()
    {
        QTest::addColumn<QByteArray>("content"); // of the label file; empty: the demo label, "-": no file
        QTest::addColumn<QString>("program");    // "real", "none", or a shell script standing in
        QTest::addColumn<QString>("printer");
        QTest::addColumn<QString>("failingCall"); // open, set, close
        QTest::addColumn<QString>("message");     // part of the error
        const auto row = [](const char* name, const QByteArray& content, const QString& program, const QString& call,
                            const QString& message, const QString& printer = {}) {
            QTest::newRow(name) << content << program << printer << call << message;
        };
        const QString real = QStringLiteral("real");
        // Fails both on a field the label lacks and on a case-blind match.
        row("field names differ in case", {}, real, "set", "itemkey");
        row("missing label file", "-", real, "open", "t.glabels");
        row("not XML", "<Glabels-document><Objects>", real, "open", "gLabels");
        row("another XML document", "<?xml version=\"1.0\"?><Glabels-templates/>", real, "open", "Glabels-templates");
        row("truncated gzip", gzip(QByteArray(4000, 'x')).left(30), real, "open", "t.glabels");
        row("glabels-3-batch missing", {}, "none", "open", "glabels-3-batch לא נמצא");
        // Stand-ins for the program's ways of failing: hung, exit 0 with nothing made, a wrong merge.
        row("program hangs", {}, "exec /bin/sleep 30", "close", "1 שניות");
        row("program makes no PDF", {}, "exit 0", "close", "PDF");
        row("program cannot merge", {},
            "echo 'cannot perform document merge with glabels file x' >&2; printf '%%PDF-1.5' > \"$2\"", "close",
            "cannot perform document merge");
        row("program makes too few pages", {},
            "printf '%%PDF-1.5\\n<< /Type /Pages /Kids [ 2 0 R ] /Count 1 >>' > \"$2\"", "close", "1 עמודים במקום 3");
        row("printer refuses the job", {}, real, "close", "tagora-no-such-queue", "tagora-no-such-queue");
    }

    void failuresEndTheLabel()
    {
        QFETCH(QByteArray, content);
        QFETCH(QString, program);
        QFETCH(QString, printer);
        QFETCH(QString, failingCall);
        QFETCH(QString, message);
        const bool standIn = program != u"real" && program != u"none";
        if (program == u"real" && QStandardPaths::findExecutable(QStringLiteral("glabels-3-batch")).isEmpty())
            QSKIP("glabels-3-batch is not installed");

        QTemporaryDir dir;
        const QString label = content.isEmpty() ? m_demo : dir.filePath(QStringLiteral("t.glabels"));
        if (!content.isEmpty() && content != "-")
            QVERIFY(writeFile(label, content));
        QTemporaryDir bin;
        if (standIn)
            QVERIFY(writeFile(bin.filePath(QStringLiteral("glabels-3-batch")), "#!/bin/sh\n" + program.toUtf8() + "\n",
                              QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner));
        const QByteArray path = qgetenv("PATH");
        const auto restore = qScopeGuard([&] { qputenv("PATH", path); });
        if (program != u"real")
            qputenv("PATH", bin.path().toLocal8Bit());

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
            const QString field = failingCall == u"set" ? QStringLiteral("itemkey") : QStringLiteral("ItemKey");
            ok = sink.setVariable(field, QStringLiteral("A-1"), &error) && sink.printRecord(3, &error);
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
        QCOMPARE(left, standIn ? work : QStringList());
        if (standIn)
            QVERIFY(error.contains(QStringLiteral("tgrlab-001.csv")));
    }

    // The copy gLabels runs: one merge source, the run's CSV; pictures still found.
    void mergeCopy_data()
    {
        QTest::addColumn<QByteArray>("objects");
        QTest::addColumn<QByteArray>("tail"); // after the objects: merge, data
        QTest::addColumn<QStringList>("fields");
        QTest::addColumn<QString>("imageSrc"); // "" none; else what the copy should hold ("@" = the labels folder)
        QTest::addColumn<bool>("compressed");

        QTest::newRow("own merge source replaced")
            << QByteArray("<Object-text><Span><Field name=\"ItemKey\"/> <Field name=\"ItemName\"/></Span></Object-text>")
            << QByteArray("<Merge type=\"Text/Colon\" src=\"/old/data.txt\"/>")
            << QStringList{"ItemKey", "ItemName"} << QString() << false;
        QTest::newRow("merge added before the data, gzip-compressed")
            << QByteArray("<Object-barcode field=\"BarCode\" color_field=\"Ink\"/><Object-text><Span>${Price} ₪ $x ${ Sp }</Span></Object-text>")
            << QByteArray("<Data><Pixdata name=\"logo.png\">AAAA</Pixdata></Data>")
            << QStringList{"BarCode", "Ink", "Price", " Sp "} << QString() << true;
        QTest::newRow("picture file next to the label")
            << QByteArray("<Object-image src=\"pics/logo.png\"/>") << QByteArray() << QStringList() << "@/pics/logo.png" << false;
        QTest::newRow("picture carried inside")
            << QByteArray("<Object-image src=\"logo.png\" field=\"Picture\"/>")
            << QByteArray("<Data><Pixdata name=\"logo.png\">AAAA</Pixdata></Data>") << QStringList{"Picture"}
            << "logo.png" << false;
    }

    void mergeCopy()
    {
        QFETCH(QByteArray, objects);
        QFETCH(QByteArray, tail);
        QFETCH(QStringList, fields);
        QFETCH(QString, imageSrc);
        QFETCH(bool, compressed);
        const QByteArray xml = "<?xml version=\"1.0\"?>\n<Glabels-document xmlns=\"http://glabels.org/xmlns/3.0/\">"
                               "<Template brand=\"T\" part=\"x\" size=\"Other\" width=\"90mm\" height=\"60mm\">"
                               "<Label-rectangle id=\"0\" width=\"45mm\" height=\"30mm\">"
                               "<Layout nx=\"2\" ny=\"2\" x0=\"0\" y0=\"0\" dx=\"45mm\" dy=\"30mm\"/></Label-rectangle>"
                               "</Template><Objects id=\"0\" rotate=\"False\">"
            + objects + "</Objects>" + tail + "</Glabels-document>";
        QTemporaryDir dir;
        const QString path = dir.filePath(QStringLiteral("t.glabels"));
        QVERIFY(writeFile(path, compressed ? gzip(xml) : xml));
        GlabelsDocument doc;
        QString error;
        QVERIFY2(ReadGlabelsDocument(path, &doc, &error), qPrintable(error));
        QCOMPARE(QSet<QString>(fields.begin(), fields.end()), doc.fields);
        QCOMPARE(doc.labelsPerSheet, 4);

        const QString csv = dir.filePath(QStringLiteral("jobs/tgrlab-001.csv"));
        QByteArray copy;
        QVERIFY2(GlabelsMergeCopy(doc, csv, &copy, &error), qPrintable(error));
        // The elements that matter, in order, with their type and source; all in the namespace.
        QXmlStreamReader r(copy);
        QStringList seen;
        while (!r.atEnd()) {
            if (r.readNext() != QXmlStreamReader::StartElement)
                continue;
            QVERIFY2(r.namespaceUri() == u"http://glabels.org/xmlns/3.0/", qPrintable(r.name().toString()));
            QStringList parts{r.name().toString(), r.attributes().value(QLatin1String("type")).toString(),
                              r.attributes().value(QLatin1String("src")).toString()};
            parts.removeAll(QString());
            if (QStringList{"Objects", "Object-image", "Merge", "Data"}.contains(parts.first()))
                seen << parts.join(QLatin1Char(' '));
        }
        QVERIFY2(!r.hasError(), qPrintable(r.errorString()));
        QStringList expected{QStringLiteral("Objects")};
        if (!imageSrc.isEmpty())
            expected << QStringLiteral("Object-image ") + imageSrc.replace(QLatin1Char('@'), QFileInfo(path).absolutePath());
        expected << QStringLiteral("Merge Text/Comma/Line1Keys ") + csv;
        if (tail.contains("<Data>"))
            expected << QStringLiteral("Data");
        QCOMPARE(seen, expected);
    }
};

QTEST_GUILESS_MAIN(TestGlabelsBridge)
#include "tst_glabelsbridge.moc"
