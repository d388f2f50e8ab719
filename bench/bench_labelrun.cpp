// A label run through the journal: 20,000 marked items with every one of the
// 38 label fields sent. Five runs; prints the median, least and most records
// per second, with and without the journal's own writing, against a floor
// measured in the same process: the same query's records read, every column
// of every row, with no label calls. Ends with the process's peak memory.
// "Without the journal's writing" is the same run through objects that take
// every call and answer it as the journal does (the line's number) but format
// and write nothing: the run's own cost, its calls into the program included.
#include "labels/itemquery.h"
#include "labels/labelfields.h"
#include "labels/labelrun.h"
#include "labels/programautomation.h"
#include "localdb/database.h"
#include "benchdata.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QFile>
#include <QTemporaryDir>
#include <algorithm>
#include <cstdio>
#include <sys/resource.h>
#include <vector>

using namespace tagora;

namespace {

constexpr int Runs = 5;

struct Spread {
    double median, least, most;
};

Spread spread(std::vector<double> v)
{
    std::sort(v.begin(), v.end());
    return {v[v.size() / 2], v.front(), v.back()};
}

// Seconds to step through the query and read every column of every row.
double readFloor(const QString& docs, const QString& sql)
{
    Database db;
    if (db.open(docs, Database::OpenMode::ReadOnly))
        return -1;
    QElapsedTimer t;
    t.start();
    DbError e;
    Statement s = db.prepare(sql, &e);
    if (e)
        return -1;
    const int columns = s.columnCount();
    qsizetype sink = 0;
    while (s.step() == Statement::Step::Row)
        for (int i = 0; i < columns; ++i)
            sink += s.value(i).toString().size();
    const double seconds = t.nsecsElapsed() / 1e9;
    return sink > 0 ? seconds : -1;
}

// Takes every call and answers it with the number the journal's line would
// have, without formatting or writing a line.
struct Counter {
    qint64 line = 0;
};

class CountingObject : public AutomationObject {
public:
    explicit CountingObject(std::shared_ptr<Counter> counter)
        : m_counter(std::move(counter))
    {
    }
    bool call(const QString&, const QVariantList&, QVariant* result, QString*) override
    {
        const qint64 line = ++m_counter->line;
        if (result)
            *result = QVariant(qlonglong(line));
        return true;
    }
    std::shared_ptr<AutomationObject> object(const QString&, const QVariantList&, QString*) override
    {
        ++m_counter->line;
        return std::make_shared<CountingObject>(m_counter);
    }
    bool setProperty(const QString&, const QVariant&, QString*) override
    {
        ++m_counter->line;
        return true;
    }

private:
    std::shared_ptr<Counter> m_counter;
};

class CountingProvider : public AutomationProvider {
public:
    std::shared_ptr<AutomationObject> create(const QString&, QString*) override
    {
        auto counter = std::make_shared<Counter>();
        counter->line = 1;
        return std::make_shared<CountingObject>(counter);
    }
};

// Seconds for one run through the provider.
double timeRun(const LabelRunRequest& r, std::shared_ptr<AutomationProvider> provider)
{
    AutomationRegistry registry;
    registry.setFallback(std::move(provider));
    QElapsedTimer t;
    t.start();
    const LabelRunResult result = RunLabelProgram(r, registry, nullptr, [] { QCoreApplication::processEvents(); });
    const double seconds = t.nsecsElapsed() / 1e9;
    if (result.status != LabelRunResult::Status::Done) {
        std::fprintf(stderr, "run failed: %s\n", qPrintable(result.message));
        return -1;
    }
    return seconds;
}

} // namespace

int main(int argc, char** argv)
{
    QCoreApplication app(argc, argv);
    const int items = argc > 1 ? QString::fromLocal8Bit(argv[1]).toInt() : 20000;
    QTemporaryDir dir;
    const QString docs = benchDataFolder(dir, items, QStringLiteral(
        "INSERT INTO tItems (ItemKey, ItemName, ItemSort, BarCode, Unit, Price, Coin, Copies, PrintLabel, VNItemName)"
        " SELECT printf('IT%06d', i), 'פריט ' || i, '10', printf('729%010d', i), 'יח''', i * 1.25, 'ILS', 1 + i % 3, 1,"
        " 'x' FROM n"));
    if (docs.isEmpty())
        return 1;

    LabelQuerySettings q;
    LabelRunRequest r;
    for (int row = 0; row < LabelFieldCount; ++row) {
        q.sent[size_t(row)] = true;
        if (row >= FirstExpressionRow)
            q.expressions[size_t(row)] = QStringLiteral("tItems.ItemKey || \"-%1\"").arg(row);
        const LabelField& f = labelField(row);
        r.fields.push_back({QLatin1String(f.name), QLatin1String(f.column), f.kind == '2'});
    }
    q.companyName = QStringLiteral("Acme");
    r.defaultLabel = QStringLiteral("/labels/item.lbl");
    r.programCode = 5;
    r.dbPath = docs;
    r.sql = BuildItemQuery(q, QueryByItems, OrderAscending);
    r.priceFormat = QStringLiteral("#,##0.00");

    std::vector<double> whole, own, floor;
    for (int run = 0; run < Runs; ++run) {
        const double f = readFloor(docs, r.sql);
        if (f <= 0) {
            std::fprintf(stderr, "floor: the query could not be read\n");
            return 1;
        }
        floor.push_back(f);

        const QString journalPath = dir.filePath(QStringLiteral("journal.txt"));
        QFile::remove(journalPath);
        const double seconds = timeRun(r, std::make_shared<JournalProvider>(journalPath));
        const double ownSeconds = timeRun(r, std::make_shared<CountingProvider>());
        if (seconds <= 0 || ownSeconds <= 0)
            return 1;
        whole.push_back(seconds);
        own.push_back(ownSeconds);
    }

    const auto rate = [items](std::vector<double> secs) {
        for (double& s : secs)
            s = items / s;
        return spread(secs);
    };
    const Spread withJournal = rate(whole), withoutJournal = rate(own), reading = rate(floor);
    const Spread secs = spread(whole), ownSecs = spread(own), floorSecs = spread(floor);
    std::printf("label run: %d records x %d fields, median of %d runs (least..most)\n", items, LabelFieldCount, Runs);
    std::printf("  with the journal's writing:    %8.0f records/s (%.0f..%.0f), %.3f s\n", withJournal.median,
                withJournal.least, withJournal.most, secs.median);
    std::printf("  without the journal's writing: %8.0f records/s (%.0f..%.0f), %.3f s\n", withoutJournal.median,
                withoutJournal.least, withoutJournal.most, ownSecs.median);
    std::printf("  floor, the query's rows read with no label calls: %.0f records/s (%.0f..%.0f), %.3f s\n",
                reading.median, reading.least, reading.most, floorSecs.median);
    std::printf("  run / floor: %.2f with the journal, %.2f without\n", secs.median / floorSecs.median,
                ownSecs.median / floorSecs.median);
    rusage usage{};
    getrusage(RUSAGE_SELF, &usage);
    std::printf("  peak RSS: %ld KiB\n", usage.ru_maxrss);
    // One line for scripts (bench/acceptance.sh): medians, records per second.
    std::printf("RESULT bench=labelrun records=%d with_journal_rps=%.0f without_journal_rps=%.0f floor_rps=%.0f "
                "rss_kib=%ld\n",
                items, withJournal.median, withoutJournal.median, reading.median, usage.ru_maxrss);
    return 0;
}
