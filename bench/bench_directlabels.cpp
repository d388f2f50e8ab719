// A direct-label job at scale: the pictures of one Code 128 line and the page
// for 10,000 labels, next to the zint command in batch mode making the same
// BMP files. Both run alternately, five times, in the same process, once in
// a folder on the disk that holds the user's job folder and once on tmpfs, so
// the ratio compares runs that met the same machine state.
#include "labels/barcode.h"
#include "labels/directlabels.h"
#include "labels/directlayout.h"
#include "labels/itemquery.h"
#include "benchdata.h"

#include <QCoreApplication>
#include <QDir>
#include <QElapsedTimer>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QStandardPaths>
#include <QTemporaryDir>
#include <algorithm>
#include <functional>
#include <cstdio>
#include <sys/resource.h>
#include <vector>

using namespace tagora;

namespace {

constexpr int kRuns = 5;

struct Spread {
    double median = 0, min = 0, max = 0;
};

Spread spread(std::vector<double> v)
{
    std::sort(v.begin(), v.end());
    return {v[v.size() / 2], v.front(), v.back()};
}

// Counted by name, not by listing: a listing of 10,000 entries would be
// measured along with what it counts, and would count strays too.
int countExisting(const QString& folder, int labels, const std::function<QString(int)>& name)
{
    int n = 0;
    for (int i = 1; i <= labels; ++i)
        n += QFileInfo::exists(folder + QLatin1Char('/') + name(i)) ? 1 : 0;
    return n;
}

struct Job {
    QString docs, sql, input;
    DirectLabelLayout layout;
    int labels = 0;
};

// One place: kRuns of the job and of zint, alternating. False when any run
// failed or made the wrong number of pictures.
bool measure(const Job& job, const QString& root, const char* where)
{
    const QString folder = root + QStringLiteral("/tgrlab");
    const QString batchDir = root + QStringLiteral("/zint");
    std::vector<double> pictures, pages, floors, ratios;
    for (int run = 0; run < kRuns; ++run) {
        if (const QString e = PrepareJobFolder(folder); !e.isEmpty()) {
            std::fprintf(stderr, "%s: %s\n", where, qPrintable(e));
            return false;
        }
        QElapsedTimer t;
        t.start();
        ZintBarcodeLibrary library;
        LabelBarDef bar = job.layout.bar;
        QVector<BarcodeRefusal> refused;
        QString error = MakeBarcodeImages(folder, QStringLiteral("BarCode"), 4, job.docs, job.sql, bar, library, &refused);
        const double made = t.nsecsElapsed() / 1e9;
        if (error.isEmpty())
            error = CreateLabPage(folder + QStringLiteral("/tgrlab1.htm"), job.docs, job.sql, job.layout,
                                  QStringLiteral("0.00"), nullptr);
        const double page = t.nsecsElapsed() / 1e9 - made;
        if (!error.isEmpty() || !refused.isEmpty()) {
            std::fprintf(stderr, "%s: job failed: %s\n", where, qPrintable(error));
            return false;
        }
        const int ours = countExisting(folder, job.labels, [](int i) { return BarcodeImageName(4, i); });

        QDir(batchDir).removeRecursively();
        QDir().mkpath(batchDir);
        QProcess zint;
        t.restart();
        zint.start(QStandardPaths::findExecutable(QStringLiteral("zint")),
                   {QStringLiteral("--batch"), QStringLiteral("-b"), QStringLiteral("20"), QStringLiteral("--scale=1"),
                    QStringLiteral("--filetype=BMP"), QStringLiteral("-i"), job.input, QStringLiteral("-o"),
                    batchDir + QStringLiteral("/B~~~~~.bmp")});
        zint.waitForFinished(-1);
        const double floor = t.nsecsElapsed() / 1e9;
        const int theirs = countExisting(batchDir, job.labels,
                                         [](int i) { return QStringLiteral("B%1.bmp").arg(i, 5, 10, QLatin1Char('0')); });
        if (ours != job.labels || theirs != job.labels) {
            std::fprintf(stderr, "%s: %d pictures made, zint %d, %d expected\n", where, ours, theirs, job.labels);
            return false;
        }
        pictures.push_back(made);
        pages.push_back(page);
        floors.push_back(floor);
        ratios.push_back(made / floor);
    }
    const Spread p = spread(pictures), g = spread(pages), f = spread(floors), r = spread(ratios);
    std::printf("%s (%s), median of %d [min-max]:\n", where, qPrintable(root), kRuns);
    std::printf("  pictures     %.3f s [%.3f-%.3f]  %.1f us each\n", p.median, p.min, p.max, p.median * 1e6 / job.labels);
    std::printf("  page         %.3f s [%.3f-%.3f]\n", g.median, g.min, g.max);
    std::printf("  zint --batch %.3f s [%.3f-%.3f]\n", f.median, f.min, f.max);
    std::printf("  ratio        %.2f [%.2f-%.2f] times zint --batch\n", r.median, r.min, r.max);
    // One line for scripts (bench/acceptance.sh).
    std::printf("RESULT bench=directlabels place=%s labels=%d pictures_s=%.3f zint_s=%.3f ratio=%.3f ratio_min=%.3f "
                "ratio_max=%.3f\n",
                where, job.labels, p.median, f.median, r.median, r.min, r.max);
    QDir(folder).removeRecursively();
    QDir(batchDir).removeRecursively();
    return true;
}

} // namespace

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    Job job;
    job.labels = argc > 1 ? QString::fromLocal8Bit(argv[1]).toInt() : 10000;
    QTemporaryDir dir;
    job.docs = benchDataFolder(dir, job.labels, QStringLiteral(
        "INSERT INTO tItems (ItemKey, ItemName, BarCode, Price, Coin, Copies, PrintLabel)"
        " SELECT printf('IT%06d', i), 'פריט ' || i, printf('TG-%07d', i), i * 0.5, '$', 1, 1 FROM n"));
    if (job.docs.isEmpty())
        return 1;

    job.layout.lines[0].UseCell = true;
    job.layout.lines[0].FldID = 1;
    job.layout.lines[0].FieldName = QStringLiteral("ItemName");
    job.layout.lines[1].UseCell = true;
    job.layout.lines[1].FldID = 4;
    job.layout.lines[1].FieldName = QStringLiteral("BarCode");
    job.layout.lines[1].ViewType = 1;
    job.layout.bar.BarType = 2; // Code 128
    LabelQuerySettings q;
    q.sent[4] = true;
    job.sql = BuildItemQuery(q, QueryByItems, OrderAscending);

    job.input = dir.filePath(QStringLiteral("data.txt"));
    QFile input(job.input);
    input.open(QIODevice::WriteOnly);
    for (int i = 1; i <= job.labels; ++i)
        input.write(QStringLiteral("TG-%1\n").arg(i, 7, 10, QLatin1Char('0')).toLatin1());
    input.close();

    // Beside the user's job folder (same disk), never in it: the bench must
    // not clear the user's last page.
    const QString jobParent = QFileInfo(directJobFolder()).absolutePath();
    QDir().mkpath(jobParent);
    QTemporaryDir disk(jobParent + QStringLiteral("/bench-XXXXXX"));
    QTemporaryDir shm(QStringLiteral("/dev/shm/tagora-bench-XXXXXX"));
    std::printf("direct job: %d labels, one Code 128 line\n", job.labels);
    bool ok = disk.isValid() && measure(job, disk.path(), "disk");
    ok = ok && shm.isValid() && measure(job, shm.path(), "tmpfs");

    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    std::printf("peak RSS: %ld MiB\n", usage.ru_maxrss / 1024);
    std::printf("RESULT bench=directlabels place=all ok=%d rss_kib=%ld\n", ok ? 1 : 0, usage.ru_maxrss);
    return ok ? 0 : 1;
}
