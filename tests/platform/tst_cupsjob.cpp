// A job sent through the CUPS API reaches the private test server's queue
// byte for byte, and every way it can fail ends with the reason, not success.
#include "platform/printercatalog.h"
#include "support/cupsqueue.h"

#include <QTemporaryDir>
#include <QtTest>

#include <cups/cups.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

using namespace tagora;

class TstCupsJob : public QObject {
    Q_OBJECT
private slots:
    void reachesQueue_data();
    void reachesQueue();
    void refused_data();
    void refused();
    void silentServer();

private:
    QTemporaryDir m_dir;
};

void TstCupsJob::reachesQueue_data()
{
    QTest::addColumn<QByteArray>("bytes");
    QTest::addColumn<bool>("raw");
    QTest::newRow("pdf") << QByteArray("%PDF-1.4\n% not a real page\n%%EOF\n") << false;
    // A thermal printer's language: Hebrew as UTF-8, a caret and control codes untouched.
    QTest::newRow("raw zpl") << QStringLiteral("^XA^CI28^FDשלום ^ 'x'^FS\x01^XZ").toUtf8() << true;
}

void TstCupsJob::reachesQueue()
{
    if (const QString why = cupsqueue::unavailable(); !why.isEmpty())
        QSKIP(qPrintable(why));
    QFETCH(QByteArray, bytes);
    QFETCH(bool, raw);
    const QString path = m_dir.filePath(QStringLiteral("job.bin"));
    QFile f(path);
    QVERIFY(f.open(QIODevice::WriteOnly));
    f.write(bytes);
    f.close();
    cupsqueue::clear(cupsqueue::kPdfQueue);
    QString error;
    QVERIFY2(PrintFileOnCups(cupsqueue::kPdfQueue, path, raw, QStringLiteral("בדיקה"), 30, &error), qPrintable(error));
    const QString out = cupsqueue::waitForJob(cupsqueue::kPdfQueue);
    QVERIFY(!out.isEmpty());
    QFile got(out);
    QVERIFY(got.open(QIODevice::ReadOnly));
    QCOMPARE(got.readAll(), bytes);
}

void TstCupsJob::refused_data()
{
    QTest::addColumn<QString>("printer");
    QTest::addColumn<bool>("fileThere");
    QTest::newRow("rejecting queue") << QString::fromLatin1(cupsqueue::kRejectQueue) << true;
    QTest::newRow("file missing") << QString::fromLatin1(cupsqueue::kPdfQueue) << false;
}

void TstCupsJob::refused()
{
    if (const QString why = cupsqueue::unavailable(); !why.isEmpty())
        QSKIP(qPrintable(why));
    QFETCH(QString, printer);
    QFETCH(bool, fileThere);
    const QString path = m_dir.filePath(fileThere ? QStringLiteral("there.pdf") : QStringLiteral("gone.pdf"));
    if (fileThere) {
        QFile f(path);
        QVERIFY(f.open(QIODevice::WriteOnly));
        f.write("%PDF-1.4\n%%EOF\n");
    }
    QString error;
    QVERIFY(!PrintFileOnCups(printer, path, false, QStringLiteral("x"), 30, &error));
    QVERIFY(!error.isEmpty());
    if (fileThere) {
        QVERIFY2(error.contains(printer), qPrintable(error));
        // CUPS's own reason follows the framing.
        QVERIFY2(error.section(QStringLiteral(": "), 1).trimmed().size() > 0, qPrintable(error));
    }
}

// A server that takes the connection and never answers: the call gives up
// with a message naming the server instead of hanging.
void TstCupsJob::silentServer()
{
    const int fd = ::socket(AF_INET, SOCK_STREAM, 0);
    QVERIFY(fd >= 0);
    sockaddr_in addr {};
    addr.sin_family = AF_INET;
    addr.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    QCOMPARE(::bind(fd, reinterpret_cast<sockaddr*>(&addr), sizeof addr), 0);
    QCOMPARE(::listen(fd, 4), 0);
    socklen_t len = sizeof addr;
    QCOMPARE(::getsockname(fd, reinterpret_cast<sockaddr*>(&addr), &len), 0);
    const QByteArray server = "127.0.0.1:" + QByteArray::number(ntohs(addr.sin_port));
    cupsSetServer(server.constData());

    const QString path = m_dir.filePath(QStringLiteral("silent.pdf"));
    QFile f(path);
    QVERIFY(f.open(QIODevice::WriteOnly));
    f.write("%PDF-1.4\n%%EOF\n");
    f.close();
    QString error;
    const bool ok = PrintFileOnCups(QStringLiteral("tagora-pdf"), path, false, QStringLiteral("x"), 2, &error);
    cupsSetServer(nullptr);
    ::close(fd);
    QVERIFY(!ok);
    QVERIFY2(error.contains(QString::fromLatin1(server)), qPrintable(error));
}

QTEST_GUILESS_MAIN(TstCupsJob)
#include "tst_cupsjob.moc"
