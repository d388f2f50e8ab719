// A label run through the journal: 20,000 marked items with every one of the
// 38 label fields sent. Prints records per second, and the time the run
// spends outside the journal's own writing (query, formatting, adapters).
#include "labels/itemquery.h"
#include "labels/labelfields.h"
#include "labels/labelrun.h"
#include "labels/programautomation.h"
#include "benchdata.h"

#include <QCoreApplication>
#include <QElapsedTimer>
#include <QTemporaryDir>
#include <cstdio>

using namespace tagora;

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

    auto journal = std::make_shared<JournalProvider>(dir.filePath(QStringLiteral("journal.txt")));
    AutomationRegistry registry;
    registry.setFallback(journal);
    QElapsedTimer t;
    t.start();
    const LabelRunResult result = RunLabelProgram(r, registry, nullptr, [] { QCoreApplication::processEvents(); });
    const double seconds = t.nsecsElapsed() / 1e9;
    if (result.status != LabelRunResult::Status::Done) {
        std::fprintf(stderr, "run failed: %s\n", qPrintable(result.message));
        return 1;
    }
    const double journalSeconds = journal->writingNanoseconds() / 1e9;
    std::printf("label run: %d records x %d fields in %.2f s = %.0f records/s\n", items, LabelFieldCount, seconds,
                items / seconds);
    std::printf("  journal writing %.2f s; the run itself %.2f s = %.0f records/s\n", journalSeconds,
                seconds - journalSeconds, items / (seconds - journalSeconds));
    return 0;
}
