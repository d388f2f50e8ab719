#include "labels/labelrun.h"

#include "labels/labelprograms.h"
#include "labels/numberformat.h"
#include "labels/programautomation.h"
#include "localdb/database.h"
#include "platform/progress.h"

#include <QDateTime>
#include <QElapsedTimer>
#include <QHash>
#include <QThread>
#include <cmath>

namespace tagora {

namespace {

// A per-account label definition.
struct AccountLabel {
    QString account;
    QString labelName;
    int fieldId = 0;
    int maxLength = 0;
    QVariant label2;
};

int wholeNumber(const QVariant& v)
{
    if (!v.isValid() || v.isNull())
        return 0;
    bool ok = false;
    const double d = v.toString().trimmed().toDouble(&ok);
    return ok && std::isfinite(d) ? int(std::nearbyint(d)) : 0;
}

QString text(const QVariant& v)
{
    return v.isValid() && !v.isNull() ? v.toString() : QString();
}

const char* secondLabelColumn(int fieldId)
{
    switch (fieldId) {
    case 1: return "ItemKey";
    case 2: return "BarCode";
    case 3: return "AlterKey";
    case 4: return "AlterBar";
    case 5: return "AlterNum";
    default: return nullptr;
    }
}

class Run {
public:
    Run(const LabelRunRequest& r, const AutomationRegistry& registry, ProgressSink* progress,
        const std::function<void()>& pump)
        : m_r(r)
        , m_registry(registry)
        , m_progress(progress)
        , m_pump(pump)
    {
    }

    LabelRunResult exec()
    {
        LabelRunResult result;
        if (!go(result) && result.status == LabelRunResult::Status::Failed)
            result.message = m_error + QStringLiteral(" In Line ") + QString::number(m_trace.step)
                + QStringLiteral(", LabelID = ") + QString::number(m_trace.labelId) + QStringLiteral(", Var = ")
                + m_trace.lastVar + QStringLiteral(", Value = ") + m_trace.lastValue;
        // The program's objects and the database go before the result does.
        m_program.reset();
        m_records = Statement();
        m_db.close();
        return result;
    }

private:
    bool fail(const QString& error)
    {
        m_error = error;
        return false;
    }

    bool dbFail(const DbError& e) { return fail(e.message); }

    bool go(LabelRunResult& result)
    {
        int delay = 0;
        if (!m_r.delayText.isEmpty()) {
            bool ok = false;
            const double d = m_r.delayText.trimmed().toDouble(&ok);
            if (!ok || !std::isfinite(d) || d < 0 || d > 86400)
                return fail(QStringLiteral("ההשהיה בשניות אינה מספר: '%1'").arg(m_r.delayText));
            delay = int(std::nearbyint(d));
        }
        const QString priceFormat = m_r.priceFormat.trimmed().isEmpty() ? QStringLiteral("0.00") : m_r.priceFormat.trimmed();

        if (DbError e = m_db.open(m_r.dbPath, Database::OpenMode::ReadOnly))
            return dbFail(e);
        DbError e;
        const long long count = m_db.scalar(QStringLiteral("SELECT count(*) FROM (%1)").arg(m_r.sql), &e).toLongLong();
        if (e)
            return dbFail(e);
        m_records = m_db.prepare(m_r.sql, &e);
        if (e)
            return dbFail(e);
        if (count == 0) {
            result.status = LabelRunResult::Status::NoRecords;
            return false;
        }
        if (!readDefinitions())
            return false;

        m_trace.step = 1;
        report(0);
        m_program = LabelProgram::forCode(m_r.programCode, m_r.sheets);
        if (!m_program) {
            m_trace.step = 2;
            return fail(QStringLiteral("לא ניתן ליצור את האובייקט: קוד תוכנת המדבקות %1 אינו של תוכנה נתמכת")
                            .arg(m_r.programCode));
        }
        if (!m_program->start(m_registry, m_trace, &m_error))
            return false;
        if (m_progress)
            m_progress->setMessage(QStringLiteral("שולח מדבקות להדפסה..."));

        QString current;
        long long counter = 0;
        QElapsedTimer sincePump;
        qlonglong lastWiz = -1, lastNumber = -1;
        Statement::Step step;
        while ((step = m_records.step()) == Statement::Step::Row) {
            if (m_r.printHeader) {
                QVariant wiz, number;
                if (!column(QStringLiteral("WizFileID"), &wiz) || !column(QStringLiteral("Number"), &number))
                    return false;
                if (wiz.toLongLong() != lastWiz || number.toLongLong() != lastNumber) {
                    lastWiz = wiz.toLongLong();
                    lastNumber = number.toLongLong();
                    if (!current.isEmpty() && !m_program->switchOut(true, m_trace, &m_error))
                        return false;
                    if (!m_program->switchIn(m_r.headerLabel, true, m_trace, &m_error))
                        return false;
                    m_trace.step = 17;
                    if (!sendVariables(priceFormat))
                        return false;
                    if (!m_program->printHeader(m_trace, &m_error))
                        return false;
                    current = m_r.headerLabel;
                }
            }
            QString file;
            if (!labelFor(&file))
                return false;
            if (file != current) {
                if (!current.isEmpty() && !m_program->switchOut(false, m_trace, &m_error))
                    return false;
                if (!m_program->switchIn(file, false, m_trace, &m_error))
                    return false;
                current = file;
            }
            if (!m_program->beforeRecord(m_trace, &m_error))
                return false;
            m_trace.step = 7;
            if (!sendVariables(priceFormat))
                return false;
            // Often enough for the window to stay responsive, rarely enough
            // that a fast program is not held up by an empty event queue.
            if (m_pump && (!sincePump.isValid() || sincePump.elapsed() >= PumpIntervalMs)) {
                m_pump();
                sincePump.start();
            }
            QVariant copies;
            if (!column(QStringLiteral("Copies"), &copies, &m_copiesColumn))
                return false;
            // A record without copies prints none rather than stopping the run.
            if (!m_program->printRecord(wholeNumber(copies), m_trace, &m_error))
                return false;
            ++counter;
            report(double(counter) / double(count));
            if (delay > 0)
                WaitSeconds(delay);
        }
        if (step == Statement::Step::Error)
            return dbFail(m_records.error());
        if (!m_program->end(m_trace, &m_error))
            return false;
        if (m_progress)
            m_progress->setMessage(QStringLiteral("הכנת המדבקות הסתיימה"));
        result.status = LabelRunResult::Status::Done;
        return true;
    }

    // As column(name), with the index kept in *slot after the first record.
    bool column(const QString& name, QVariant* value, int* slot)
    {
        if (!resolve(name, slot))
            return false;
        *value = m_records.value(*slot);
        return true;
    }

    // The column's index in *slot, looked up for the first record only.
    bool resolve(const QString& name, int* slot)
    {
        if (*slot == Unresolved)
            *slot = columnIndex(name);
        if (*slot < 0)
            return fail(QStringLiteral("העמודה %1 אינה ברשומת המדבקה").arg(name));
        return true;
    }

    int columnIndex(const QString& name)
    {
        auto it = m_columns.constFind(name);
        if (it == m_columns.constEnd())
            it = m_columns.insert(name, m_records.columnIndex(name));
        return it.value();
    }

    bool column(const QString& name, QVariant* value)
    {
        // Looked up once per name: a run sends every field of every record.
        auto it = m_columns.constFind(name);
        if (it == m_columns.constEnd())
            it = m_columns.insert(name, m_records.columnIndex(name));
        const int i = it.value();
        if (i < 0)
            return fail(QStringLiteral("העמודה %1 אינה ברשומת המדבקה").arg(name));
        *value = m_records.value(i);
        return true;
    }

    bool readDefinitions()
    {
        DbError e;
        Statement defs = m_db.prepare(QStringLiteral("Select * From tAccountDef Where LabelName > ''"), &e);
        if (e)
            return dbFail(e);
        Statement::Step s;
        while ((s = defs.step()) == Statement::Step::Row) {
            AccountLabel d;
            d.account = text(defs.value(QStringLiteral("AccountKey")));
            d.labelName = text(defs.value(QStringLiteral("LabelName")));
            d.fieldId = wholeNumber(defs.value(QStringLiteral("FldID")));
            d.maxLength = wholeNumber(defs.value(QStringLiteral("FldMaxLen")));
            d.label2 = defs.value(QStringLiteral("Label2Name"));
            m_definitions.push_back(d);
        }
        if (s == Statement::Step::Error)
            return dbFail(defs.error());
        return true;
    }

    bool labelFor(QString* file)
    {
        QVariant account;
        if (!column(QStringLiteral("AccountKey"), &account, &m_accountColumn))
            return false;
        const QString key = text(account);
        QString label;
        if (!key.isEmpty() && !m_definitions.empty()) {
            for (const AccountLabel& d : m_definitions) {
                if (d.account.compare(key, Qt::CaseInsensitive) != 0)
                    continue;
                const char* longColumn = secondLabelColumn(d.fieldId);
                if (d.fieldId > 0 && d.maxLength > 0 && d.label2.isValid() && !d.label2.isNull() && longColumn) {
                    QVariant value;
                    if (!column(QLatin1String(longColumn), &value))
                        return false;
                    label = text(value).size() > d.maxLength ? text(d.label2) : d.labelName;
                } else {
                    label = d.labelName;
                }
                break;
            }
        } else if (m_r.byPlate) {
            QVariant path;
            if (!column(QStringLiteral("LabelPath"), &path))
                return false;
            label = text(path);
        }
        *file = label.isEmpty() ? m_r.defaultLabel : label;
        return true;
    }

    bool sendVariables(const QString& priceFormat)
    {
        if (m_fieldColumns.size() != m_r.fields.size())
            m_fieldColumns.assign(m_r.fields.size(), Unresolved);
        for (size_t i = 0; i < m_r.fields.size(); ++i) {
            const SentField& f = m_r.fields[i];
            int& c = m_fieldColumns[i];
            if (!resolve(f.column, &c))
                return false;
            m_trace.lastVar = f.name;
            // Only a price needs the value itself; other fields read as text.
            m_trace.lastValue = f.price ? FormatNumber(m_records.value(c), priceFormat) : m_records.text(c);
            if (!m_program->setVariable(f.name, m_trace.lastValue, m_trace, &m_error))
                return false;
        }
        return true;
    }

    void report(double fraction)
    {
        if (m_progress)
            m_progress->setProgress(fraction);
    }

    const LabelRunRequest& m_r;
    const AutomationRegistry& m_registry;
    ProgressSink* m_progress;
    const std::function<void()>& m_pump;
    Database m_db;
    Statement m_records;
    static constexpr int Unresolved = -2;
    static constexpr qint64 PumpIntervalMs = 25;
    QHash<QString, int> m_columns;
    std::vector<int> m_fieldColumns;
    int m_copiesColumn = Unresolved;
    int m_accountColumn = Unresolved;
    std::vector<AccountLabel> m_definitions;
    std::unique_ptr<LabelProgram> m_program;
    RunTrace m_trace;
    QString m_error;
};

} // namespace

LabelRunResult RunLabelProgram(const LabelRunRequest& request, const AutomationRegistry& registry,
                               ProgressSink* progress, const std::function<void()>& pumpEvents)
{
    return Run(request, registry, progress, pumpEvents).exec();
}

void WaitSeconds(int seconds)
{
    const qint64 start = QDateTime::currentSecsSinceEpoch();
    for (;;) {
        const qint64 nowMs = QDateTime::currentMSecsSinceEpoch();
        if (nowMs / 1000 - start >= seconds)
            return;
        // Sleep to the next whole-second boundary.
        QThread::msleep(static_cast<unsigned long>(1000 - nowMs % 1000));
    }
}

} // namespace tagora
