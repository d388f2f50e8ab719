#include "labels/zplbridge.h"

#include <QTcpServer>
#include <QTcpSocket>
#include <QTemporaryDir>
#include <QtTest>

using namespace tagora;

namespace {

struct Record {
    QList<QPair<QString, QString>> values; // set before the record, in order
    int copies;
};

void writeFile(const QString& path, const QByteArray& bytes)
{
    QFile f(path);
    QVERIFY(f.open(QIODevice::WriteOnly));
    f.write(bytes);
}

// A port on loopback where nothing listens.
quint16 closedPort()
{
    QTcpServer probe;
    probe.listen(QHostAddress::LocalHost, 0);
    return probe.serverPort();
}

// Everything one connection to the server carries, up to its close.
QByteArray receive(QTcpServer& server)
{
    if (!server.hasPendingConnections() && !server.waitForNewConnection(10000))
        return "no connection";
    QTcpSocket* s = server.nextPendingConnection();
    QByteArray got;
    while (s->state() == QAbstractSocket::ConnectedState && s->waitForReadyRead(10000))
        got += s->readAll();
    got += s->readAll();
    delete s;
    return got;
}

} // namespace

class TestZplBridge : public QObject {
    Q_OBJECT
private slots:
    void visualOrder_data()
    {
        QTest::addColumn<QString>("logical");
        QTest::addColumn<QString>("visual");
        QTest::newRow("decimal stays whole") << "מחיר 12.50" << "12.50 ריחמ";
        QTest::newRow("latin first, hebrew paragraph") << "LED נורה" << "הרונ LED";
        QTest::newRow("latin unchanged") << "Mug (blue) 3/4 -5" << "Mug (blue) 3/4 -5";
        QTest::newRow("each line alone") << "שלום\nעולם" << "םולש\nםלוע";
        QTest::newRow("marks dropped") << QString::fromUtf8("\u200Fא\u200Eב") << "בא";
        QTest::newRow("empty") << "" << "";
    }
    void visualOrder()
    {
        QFETCH(QString, logical);
        QFETCH(QString, visual);
        QCOMPARE(VisualOrder(logical), visual);
    }

    // Three records through a listener: the values in visual order and
    // escaped for the field they stand in, ^CI28 and ^PQ per record.
    void sendsToHost_data()
    {
        QTest::addColumn<QByteArray>("label");
        QTest::addColumn<QByteArray>("expected"); // per record: %C copies, %N name, %K key, %B barcode, %P price

        QTest::newRow("bare template") << QByteArray(
            "^XA\n"
            "^FO10,10^A@N,30,30,E:DEJAVU.TTF^FD${ItemName}^FS\n"
            "^FO10,50^FDK\\ ${ItemKey}^FS\n"
            "^FO10,90^BY2^BCN,60,Y,N,N^FD${BarCode}^FS\n"
            "^FO10,170^FH_^FD${Price}^FS\n"
            "^FO10,200^FDa\\b^FS\n"
            "^XZ\n")
                                       << QByteArray(
            "^XA^CI28\n"
            "^FO10,10^A@N,30,30,E:DEJAVU.TTF^FH\\^FD%N^FS\n"
            "^FO10,50^FH\\^FDK\\5C %K^FS\n"
            "^FO10,90^BY2^BCN,60,Y,N,N^FH\\^FD%B^FS\n"
            "^FO10,170^FH_^FD%P^FS\n"
            "^FO10,200^FDa\\b^FS\n"
            "^PQ%C^XZ\n");
        // The template's own ^CI28 and ^PQ: the quantity is replaced, the
        // rest of ^PQ kept; a first format (a stored one) keeps its ^PQ.
        QTest::newRow("declared") << QByteArray(
            "^XA^DFR:X.ZPL^PQ9^FS^XZ"
            "^XA^CI28^PQ5,0,1,Y^FO1,1^FD${ItemName} ${ItemKey}^FS^FO1,2^BCN^FD${BarCode}^FS"
            "^FO1,3^FH^FD${Price}^FS^XZ")
                                  << QByteArray(
            "^XA^CI28^DFR:X.ZPL^PQ9^FS^XZ"
            "^XA^CI28^PQ%C,0,1,Y^FO1,1^FH\\^FD%N %K^FS^FO1,2^BCN^FH\\^FD%B^FS"
            "^FO1,3^FH^FD%P^FS^XZ");
    }
    void sendsToHost()
    {
        QFETCH(QByteArray, label);
        QFETCH(QByteArray, expected);
        QTemporaryDir dir;
        const QString file = dir.filePath("item.zpl");
        writeFile(file, label);

        QTcpServer server;
        QVERIFY(server.listen(QHostAddress::LocalHost, 0));
        BridgeOptions options;
        options.zplHost = QStringLiteral("127.0.0.1:%1").arg(server.serverPort());
        options.jobFolder = dir.path();
        options.timeoutSeconds = 10;
        ZplSink sink(options);

        const QList<Record> records = {
            {{{"ItemName", "שלום 12"}, {"ItemKey", "A'1"}, {"BarCode", "7290001"}, {"Price", "5_00"}}, 2},
            {{{"ItemName", "כוס (קטנה)"}, {"ItemKey", "B^2"}, {"BarCode", "72~9"}}, 1},
            {{}, 0}, // nothing printed
            {{{"ItemName", "Mug ~ blue"}, {"ItemKey", "C\\3"}, {"BarCode", "שלום"}, {"Price", "^7"}}, 3},
        };
        // By hand: Hebrew in visual order, ^ ~ and the indicator as hex
        // bytes, a barcode's data in its logical order, a price not set
        // again kept from the record before.
        const QList<QStringList> fills = {
            {"2", "12 םולש", "A'1", "7290001", "5_5F00"},
            {"1", "(הנטק) סוכ", "B\\5E2", "72\\7E9", "5_5F00"},
            {"3", "Mug \\7E blue", "C\\5C3", "שלום", "_5E7"},
        };

        QString error;
        QVERIFY2(sink.openLabel(file, &error), qPrintable(error));
        for (const Record& r : records) {
            for (const auto& v : r.values)
                QVERIFY2(sink.setVariable(v.first, v.second, &error), qPrintable(error));
            QVERIFY2(sink.printRecord(r.copies, &error), qPrintable(error));
        }
        QVERIFY2(sink.closeLabel(&error), qPrintable(error));

        QString want;
        for (const QStringList& f : fills)
            want += QString::fromUtf8(expected)
                        .replace("%C", f[0])
                        .replace("%N", f[1])
                        .replace("%K", f[2])
                        .replace("%B", f[3])
                        .replace("%P", f[4]);
        QCOMPARE(QString::fromUtf8(receive(server)), want);
        QVERIFY(QDir(dir.path()).entryList({"tgrlab-*"}).isEmpty());
    }

    // Without a host the job is kept in the job folder, one numbered file
    // per label file closed; a printer that cannot take it is an error. The
    // sample label takes the variables it is made for.
    void keepsOrPrintsFile()
    {
        QTemporaryDir dir;
        BridgeOptions options;
        options.jobFolder = dir.path();
        QString error;
        for (const QString key : {"1", "2", "3"}) {
            if (key == "3")
                options.printer = QStringLiteral("tagora-no-such-queue");
            ZplSink sink(options);
            QVERIFY2(sink.openLabel(QStringLiteral(TAGORA_DEMO_ZPL), &error), qPrintable(error));
            for (const char* name : {"ItemName", "Price", "BarCode", "ItemKey"})
                QVERIFY2(sink.setVariable(name, key, &error), qPrintable(error));
            QVERIFY(sink.printRecord(4, &error));
            QCOMPARE(sink.closeLabel(&error), key != "3");
        }
        QVERIFY2(error.contains("tagora-no-such-queue"), qPrintable(error));
        QFile second(dir.filePath("tgrlab-002.zpl"));
        QVERIFY(second.open(QIODevice::ReadOnly));
        const QByteArray bytes = second.readAll();
        QVERIFY(bytes.contains("^BCN,90,Y,N,N^FH\\^FD2^FS"));
        QVERIFY(bytes.endsWith("^PQ4^XZ\n"));
    }

    // Each failure ends the step that meets it, naming what is wrong.
    void failures_data()
    {
        QTest::addColumn<QByteArray>("label"); // empty: no file
        QTest::addColumn<QString>("host");
        QTest::addColumn<QString>("value");    // of the variable Weight
        QTest::addColumn<QString>("step");     // the call that fails
        QTest::addColumn<QString>("named");    // what the error names
        QTest::addColumn<int>("records");

        const QByteArray ok = "^XA^FO1,1^FD${Weight}^FS^XZ";
        QTest::newRow("missing template") << QByteArray() << "" << "v" << "open" << "item.zpl" << 1;
        QTest::newRow("not zpl") << QByteArray("${Weight}") << "" << "v" << "open" << "item.zpl" << 1;
        QTest::newRow("other character set") << QByteArray("^XA^CI0^FD${Weight}^FS^XZ") << "" << "v" << "open" << "^CI0" << 1;
        QTest::newRow("variable not in template") << QByteArray("^XA^FD${Y}^FS^XZ") << "" << "v" << "set" << "Weight" << 1;
        QTest::newRow("prefix in a parameter") << QByteArray("^XA^FO${Weight},1^FDa^FS^XZ") << "" << "1^XZ" << "print"
                                               << "Weight" << 1;
        const QString refused = QStringLiteral("127.0.0.1:%1").arg(closedPort());
        QTest::newRow("host refuses") << ok << refused << "v" << "close" << refused << 1;
        QTest::newRow("host without a port number") << ok << "printer:port" << "v" << "close" << "host:port" << 1;
        // A printer that takes the connection and never reads: more than
        // the sockets can hold must not count as sent.
        const QByteArray big = "^XA^FO1,1^FD${Weight}" + QByteArray(1 << 20, 'a') + "^FS^XZ";
        QTest::newRow("host never reads") << big << "listener" << "v" << "close" << "127.0.0.1" << 64;
    }
    void failures()
    {
        QFETCH(QByteArray, label);
        QFETCH(QString, host);
        QFETCH(QString, value);
        QFETCH(QString, step);
        QFETCH(QString, named);
        QFETCH(int, records);
        QTemporaryDir dir;
        const QString file = dir.filePath("item.zpl");
        if (!label.isEmpty())
            writeFile(file, label);
        QTcpServer silent;
        if (host == "listener") {
            QVERIFY(silent.listen(QHostAddress::LocalHost, 0));
            host = QStringLiteral("127.0.0.1:%1").arg(silent.serverPort());
        }
        BridgeOptions options;
        options.jobFolder = dir.path();
        options.zplHost = host;
        options.timeoutSeconds = 2;
        ZplSink sink(options);

        QString error;
        const bool opened = sink.openLabel(file, &error);
        QCOMPARE(opened, step != "open");
        const bool set = opened && sink.setVariable("Weight", value, &error);
        QCOMPARE(set, opened && step != "set");
        bool printed = set;
        for (int i = 0; printed && i < records; ++i)
            printed = sink.printRecord(1, &error);
        QCOMPARE(printed, set && step != "print");
        const bool closed = printed && sink.closeLabel(&error);
        QCOMPARE(closed, false);
        QVERIFY2(error.contains(named), qPrintable(error));
        QVERIFY(QDir(dir.path()).entryList({"tgrlab-*"}).isEmpty());
    }
};

QTEST_GUILESS_MAIN(TestZplBridge)
#include "tst_zplbridge.moc"
