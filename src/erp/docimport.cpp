#include "erp/docimport.h"

#include "erp/odbc.h"
#include "erp/textconv.h"
#include "erp/connparams.h"
#include "localdb/conversions.h"
#include "localdb/database.h"
#include "localdb/schema.h"
#include "platform/progress.h"

#include <QDir>
#include <QLocale>

#include <algorithm>
#include <cfenv>
#include <cmath>

namespace tagora {

namespace {
constexpr int kDocTimeout = 60;

const QString kReadTitle = QStringLiteral("תקלה בקריאת מסמכים");
const QString kRunTitle = QStringLiteral("תקלה");

QString dot(const QString& table, const QString& column)
{
    return table + QLatin1Char('.') + column;
}

// Whole numbers as the platform rounded them: halves to even.
double roundEven(double v)
{
    const int saved = std::fegetround();
    std::fesetround(FE_TONEAREST);
    const double r = std::nearbyint(v);
    std::fesetround(saved);
    return r;
}

// A number as the user or the ERP wrote it, blanks around it allowed.
bool readNumber(const QString& text, double* value)
{
    bool ok = false;
    const double v = QLocale::c().toDouble(text.trimmed(), &ok);
    if (ok && std::isfinite(v)) {
        *value = v;
        return true;
    }
    return false;
}

// A key as the item import keeps it (trimmed, double quotes made apostrophes,
// converted from visual order), so documents meet their items, accounts'
// definitions and alternate keys. Empty when there is none.
QString localKey(const QVariant& value)
{
    const QString trimmed = NullTrim(value);
    if (trimmed.isEmpty())
        return QString();
    return ConvertErpText(QuoteToApostrophe(trimmed), QString());
}

QString trimmedText(const QVariant& value)
{
    const QString t = NullTrim(value);
    return t.isEmpty() ? QString() : ConvertErpText(t, QString());
}

QVariant textOrNull(const QString& text)
{
    return text.isEmpty() ? QVariant() : QVariant(text);
}

// The header quantity of rule 1: DETAILS as a whole number above 0, else 0.
double detailsQuantity(const QVariant& details)
{
    double v = 0;
    if (details.isNull() || !readNumber(details.toString(), &v))
        return 0;
    return roundEven(v);
}
} // namespace

double QtyFactorOf(const QString& text)
{
    double v = 1;
    return readNumber(text, &v) ? v : 1;
}

QString LikeWildcardFor(const ErpConnection& erp)
{
    const QString dbms = erp.dbmsName();
    if (erp.isSqlite() || dbms.startsWith(QLatin1String("PostgreSQL"), Qt::CaseInsensitive)
        || dbms.contains(QLatin1String("SQL Server"), Qt::CaseInsensitive))
        return QStringLiteral("%");
    return erpDialect().likeWildcard;
}

DocTypeRecipe DocTypeRecipeFrom(const std::function<QVariant(const QString&)>& value)
{
    auto text = [&value](const char* column) { return value(QLatin1String(column)).toString(); };
    auto truth = [&value](const char* column) {
        const QVariant v = value(QLatin1String(column));
        return v.typeId() == QMetaType::Bool ? v.toBool() : v.toLongLong() != 0;
    };
    DocTypeRecipe r;
    r.docType = value(QStringLiteral("DocType")).toInt();
    r.docDesc = text("DocDesc");
    r.wizFileId = value(QStringLiteral("WizFileID")).toInt();
    r.vType = value(QStringLiteral("vTYPE"));
    r.include = truth("Include");
    r.includeDraft = truth("IncludeDraft");
    r.csTableId = value(QStringLiteral("CSTableID")).toInt();
    r.headTable = text("HeadTable");
    r.lineTable = text("LineTable");
    r.fldID = text("fldID");
    r.fldRef1 = text("fldRef1");
    r.fldRef2 = text("fldRef2");
    r.fldDate = text("fldDate");
    r.fldLineID = text("fldLineID");
    r.fldDocCSID = text("fldDocCSID");
    r.noDraft = text("NoDraft");
    r.csTableName = text("CSTableName");
    r.fldCSID = text("fldCSID");
    r.fldCSKey = text("fldCSKey");
    r.fldCSDesc = text("fldCSDesc");
    r.fldMerakezID = text("fldMerakezID");
    return r;
}

QVector<DocTypeRecipe> ReadDocTypes(const Database& tempDocs, DbError* error)
{
    QVector<DocTypeRecipe> types;
    DbError e;
    Statement s = tempDocs.prepare(QStringLiteral("Select * From qDocTypes Where Include Or IncludeDraft"), &e);
    if (e) {
        if (error)
            *error = e;
        return types;
    }
    Statement::Step step;
    while ((step = s.step()) == Statement::Step::Row) {
        DocTypeRecipe r = DocTypeRecipeFrom([&s](const QString& column) { return s.value(column); });
        types.push_back(r);
    }
    if (step == Statement::Step::Error && error)
        *error = s.error();
    return types;
}

ErpQuery BuildDocRangeCriteria(const DocTypeRecipe& rsDT, const QVariant& fromDate, const QVariant& toDate,
                               const QString& fromDocNum, const QString& toDocNum, qint64 indx, bool includeDraft,
                               const QString& likeWildcard, short connType)
{
    const QString& h = rsDT.headTable;
    ErpQuery q;
    if (!rsDT.vType.isNull()) {
        q.sql += QStringLiteral(" AND ") + dot(h, QStringLiteral("TYPE")) + QStringLiteral(" = ?");
        q.params << rsDT.vType.toString();
    }
    if (fromDocNum.isEmpty()) {
        q.sql += QStringLiteral(" AND ") + dot(h, rsDT.fldID) + QStringLiteral(" >= ?");
        q.params << indx;
    }
    if (fromDate.isValid() && !fromDate.isNull()) {
        q.sql += QStringLiteral(" And ") + dot(h, rsDT.fldDate) + QStringLiteral(" >= ?");
        q.params << DateToErp(QVariant(fromDate.toDate()), connType);
    }
    if (toDate.isValid() && !toDate.isNull()) {
        // Before the next day begins: a document stored with a time later on
        // the last day is still in the range.
        q.sql += QStringLiteral(" And ") + dot(h, rsDT.fldDate) + QStringLiteral(" < ?");
        q.params << DateToErp(QVariant(toDate.toDate().addDays(1)), connType);
    }
    if (!includeDraft && !rsDT.noDraft.isEmpty())
        q.sql += QStringLiteral(" And ") + dot(h, rsDT.noDraft);
    if (fromDocNum == toDocNum && !fromDocNum.isEmpty()) {
        q.sql += QStringLiteral(" And ") + dot(h, rsDT.fldRef1) + QStringLiteral(" LIKE ?");
        q.params << likeWildcard + fromDocNum;
    } else {
        if (!fromDocNum.isEmpty()) {
            q.sql += QStringLiteral(" And ") + dot(h, rsDT.fldRef1) + QStringLiteral(" >= ?");
            q.params << fromDocNum;
        }
        if (!toDocNum.isEmpty()) {
            q.sql += QStringLiteral(" And  ") + dot(h, rsDT.fldRef1) + QStringLiteral(" <= ?");
            q.params << toDocNum;
        }
    }
    return q;
}

QString CriteriaText(const ErpQuery& criteria, short connType)
{
    QString out;
    qsizetype next = 0;
    bool quoted = false;
    for (const QChar c : criteria.sql) {
        if (c == QLatin1Char('\''))
            quoted = !quoted;
        if (c != QLatin1Char('?') || quoted || next >= criteria.params.size()) {
            out += c;
            continue;
        }
        const QVariant& v = criteria.params[next++];
        const int type = v.typeId();
        if (v.isNull()) {
            out += QStringLiteral("NULL");
        } else if (type == QMetaType::QDate || type == QMetaType::QDateTime) {
            out += DateToErpLiteral(v, connType);
        } else if (type == QMetaType::QString) {
            QString t = v.toString();
            t.replace(QLatin1Char('\''), QStringLiteral("''"));
            out += QLatin1Char('\'') + t + QLatin1Char('\'');
        } else {
            out += v.toString();
        }
    }
    return out;
}

ErpQuery BuildItemByDocCriteria(const QString& headTable, const QString& lineTable, const QString& fldID,
                                const ErpQuery& docCriteria)
{
    return {QStringLiteral(" And PART.PART In (SELECT DISTINCT ") + lineTable + QStringLiteral(".PART FROM ")
                + headTable + QStringLiteral(", ") + lineTable + QStringLiteral(" WHERE ") + dot(lineTable, fldID)
                + QStringLiteral(" = ") + dot(headTable, fldID) + docCriteria.sql + QLatin1Char(')'),
            docCriteria.params};
}

ErpQuery docCountSql(const DocTypeRecipe& r, const ErpQuery& criteria)
{
    const QString& h = r.headTable;
    QString sql = QStringLiteral("SELECT COUNT(") + dot(h, r.fldID) + QStringLiteral(") As TotalCount FROM ") + h;
    if (r.accountJoin())
        sql += QStringLiteral(", ") + r.csTableName + QStringLiteral(" WHERE ") + dot(r.csTableName, r.fldCSID)
            + QStringLiteral(" = ") + dot(h, r.fldDocCSID);
    else
        sql += QStringLiteral(" WHERE (1 > 0)");
    return {sql + criteria.sql, criteria.params};
}

ErpQuery docHeaderSql(const DocTypeRecipe& r, int qtyRule, const ErpQuery& criteria)
{
    const QString& h = r.headTable;
    const QString& cs = r.csTableName;
    QString sql = QStringLiteral("SELECT ") + dot(h, r.fldID) + QStringLiteral(" As ID, ") + dot(h, r.fldRef1)
        + QStringLiteral(" As DocNumber, ") + dot(h, r.fldDate) + QStringLiteral(" As ValueDate, ")
        + dot(h, r.fldRef2) + QStringLiteral(" As Reference");
    if (r.accountJoin())
        sql += QStringLiteral(", ") + dot(cs, r.fldCSKey) + QStringLiteral(" As AccountKey, ") + dot(cs, r.fldCSDesc)
            + QStringLiteral(" As AccountName, ") + cs + QStringLiteral(".ADDRESS As Address, ") + cs
            + QStringLiteral(".PHONE As Phone");
    else
        sql += QStringLiteral(", '' As AccountKey");
    if (qtyRule == QtyHeaderDetails)
        sql += QStringLiteral(", ") + h + QStringLiteral(".DETAILS");
    if (r.accountJoin()) {
        // Taken by a subquery rather than joined, so a document whose account
        // has no consolidating account (or a missing one) is still read.
        if (r.consolidated())
            sql += QStringLiteral(", (SELECT MERAKEZ.") + r.fldCSKey + QStringLiteral(" FROM ") + cs
                + QStringLiteral(" MERAKEZ WHERE MERAKEZ.") + r.fldCSID + QStringLiteral(" = ")
                + dot(cs, r.fldMerakezID) + QStringLiteral(") As AssignKey");
        else
            sql += QStringLiteral(", '' As AssignKey");
    }
    sql += QStringLiteral(" FROM ") + h;
    if (r.accountJoin())
        sql += QStringLiteral(", ") + cs;
    sql += QStringLiteral(" WHERE ") + dot(h, r.fldID) + QStringLiteral(" > 0");
    if (r.accountJoin())
        sql += QStringLiteral(" AND ") + dot(cs, r.fldCSID) + QStringLiteral(" = ") + dot(h, r.fldDocCSID);
    // In ID order, so the last header read is the highest ID and the next
    // run starts after every document this one read.
    sql += criteria.sql + QStringLiteral(" ORDER BY ") + dot(h, r.fldID);
    return {sql, criteria.params};
}

ErpQuery docLineSql(const DocTypeRecipe& r, int qtyRule, qint64 headerId)
{
    const QString& l = r.lineTable;
    QString sql = QStringLiteral("SELECT ") + dot(l, r.fldID) + QStringLiteral(" As StockID,") + dot(l, r.fldLineID)
        + QStringLiteral(" As ID,") + l + QStringLiteral(".LINE, PART.PARTNAME As ItemKey, PART.PARTDES As ItemName,")
        + l + QStringLiteral(".QUANT As Quantity");
    if (qtyRule == QtyFactoryUnit)
        sql += QStringLiteral(",") + l + QStringLiteral(".TQUANT As TQuantity");
    sql += QStringLiteral(" FROM ") + l + QStringLiteral(", PART WHERE PART.PART = ") + l + QStringLiteral(".PART AND ")
        + dot(l, r.fldID) + QStringLiteral(" = ? ORDER BY ") + l + QStringLiteral(".LINE");
    return {sql, {headerId}};
}

ErpQuery docPackageSql(const DocTypeRecipe& r, qint64 headerId)
{
    QString ext, join;
    switch (r.wizFileId) {
    case 2:
        ext = QStringLiteral("ORDERITEMSA");
        join = QStringLiteral(" AND EX.ORDI=L.ORDI");
        break;
    case 3:
        ext = QStringLiteral("PORDERITEMSA");
        join = QStringLiteral(" AND EX.ORDI=L.ORDI");
        break;
    case 4:
        ext = QStringLiteral("TRANSORDER");
        join = QStringLiteral(" AND EX.DOC=L.IV AND EX.LINE=L.LINE");
        break;
    default:
        break;
    }
    QString sql = QStringLiteral("SELECT L.") + r.fldID + QStringLiteral(" As StockID, L.") + r.fldLineID
        + QStringLiteral(" As ID, L.LINE");
    sql += ext.isEmpty() ? QStringLiteral(", L.NUMPACK As Packs") : QStringLiteral(", EX.NUMPACK As Packs");
    sql += QStringLiteral(" FROM ") + r.lineTable + QStringLiteral(" L");
    if (!ext.isEmpty())
        sql += QStringLiteral(", ") + ext + QStringLiteral(" EX");
    sql += QStringLiteral(" WHERE L.") + r.fldID + QStringLiteral(" > 0 AND L.") + r.fldID + QStringLiteral(" = ?")
        + join + QStringLiteral(" ORDER BY L.LINE");
    return {sql, {headerId}};
}

namespace {

// One type's import: the ERP connections, the local database in one
// transaction, the prepared inserts.
class DocTypeRun {
public:
    DocTypeRun(const ErpReadContext& ctx, const DocTypeRecipe& r, const DocImportOptions& o)
        : m_ctx(ctx)
        , m_r(r)
        , m_rule(o.qtyFrom)
        , m_factor(QtyFactorOf(o.qtyFactor))
        , m_onlyLine0(o.onlyLine0)
        , m_headerInclude(o.fromDocNum == o.toDocNum)
    {
    }

    ~DocTypeRun()
    {
        if (m_db.inTransaction())
            m_db.rollback();
    }

    qint64 run(const QString& dbPath, const QVariant& fromDate, const QVariant& toDate, bool draftDocs,
               const DocImportOptions& o, DocCriteriaState* state, ReadError* error)
    {
        const int timeout = m_ctx.timeout > 0 ? m_ctx.timeout : kDocTimeout;
        if (DbError e = m_db.open(dbPath))
            return fail(error, e.message);
        QString message;
        // Lines and package counts go through a connection of their own, so
        // no server needs two open results on one connection.
        if (!m_erp.open(m_ctx.connString, timeout, &message) || !m_erpLines.open(m_ctx.connString, timeout, &message))
            return fail(error, message);

        qint64 start = 0;
        {
            DbError e;
            Statement range = m_db.prepare(QStringLiteral("Select FromIndx From tWizFileRanges Where WizFileID=?1"), &e);
            if (e)
                return fail(error, e.message);
            range.bind(1, m_r.docType);
            const Statement::Step step = range.step();
            if (step == Statement::Step::Error)
                return fail(error, range.error().message);
            if (step != Statement::Step::Row)
                return fail(error, QStringLiteral("לסוג המסמך %1 אין שורה בטבלת טווחי הקליטה").arg(m_r.docType));
            start = range.value(0).toLongLong();
        }
        qint64 lastRead = -1;

        // An empty box is no bound, whatever the prefix.
        const QString from = o.fromDocNum.isEmpty() ? QString() : o.refPref + o.fromDocNum;
        const QString to = o.toDocNum.isEmpty() ? QString() : o.refPref + o.toDocNum;
        const ErpQuery criteria = BuildDocRangeCriteria(m_r, fromDate, toDate, from, to, start, draftDocs,
                                                        LikeWildcardFor(m_erp), erpConnType());
        if (state) {
            state->currentDocCriteria = criteria;
            state->currentItemByDocCriteria = BuildItemByDocCriteria(m_r.headTable, m_r.lineTable, m_r.fldID, criteria);
        }

        long long count = 0;
        {
            auto rs = m_erp.query(docCountSql(m_r, criteria), &message);
            if (!rs)
                return fail(error, message);
            if (rs->next())
                count = rs->value(QStringLiteral("TotalCount")).toLongLong();
            if (rs->failed())
                return fail(error, rs->error());
        }
        if (count <= 0) {
            if (m_ctx.progress)
                m_ctx.progress->setMessage(QStringLiteral("לא נמצאו מסמכים מתאימים"));
            return -1;
        }

        if (DbError e = m_db.begin())
            return fail(error, e.message);
        if (!prepareInserts(error))
            return 0;

        auto headers = m_erp.query(docHeaderSql(m_r, m_rule, criteria), &message);
        if (!headers)
            return fail(error, message);
        long long read = 0;
        while (headers->next()) {
            const qint64 id = headers->value(QStringLiteral("ID")).toLongLong();
            lastRead = std::max(lastRead, id);
            if (!writeHeader(*headers, id, error) || !readLines(id, error))
                return 0;
            if (m_rule == QtyPackages && !readPackages(id, error))
                return 0;
            ++read;
            if (read % 5 == 0 && m_ctx.progress) {
                m_ctx.progress->setProgress(std::min(1.0, double(read) / double(count)));
                if (m_ctx.progress->cancelRequested())
                    return fail(error, QStringLiteral("הקליטה בוטלה"));
            }
        }
        if (headers->failed())
            return fail(error, headers->error());
        headers.reset();

        if (o.toDocNum.isEmpty() && lastRead >= 0) {
            // Never back: a run by numbers may read only older documents.
            DbError e;
            Statement save = m_db.prepare(QStringLiteral("UPDATE tWizFileRanges SET LastIndx = ?1,"
                                                         " FromIndx = max(coalesce(FromIndx, 0), ?2) WHERE WizFileID = ?3"),
                                          &e);
            if (!e) {
                save.bind(1, lastRead);
                save.bind(2, lastRead + 1);
                save.bind(3, m_r.docType);
                e = save.run();
            }
            if (e)
                return fail(error, e.message);
        }

        // A document whose own account has label definitions is labelled as
        // that account, not as its consolidating account.
        if (DbError e = m_db.exec(QStringLiteral(
                "UPDATE tTempDocHeaders SET AccountKey = OrigAccountKey"
                " WHERE (OrigAccountKey In (select AccountKey From tAccountDef)) AND (AccountKey <> OrigAccountKey)")))
            return fail(error, e.message);
        if (m_rule == QtyPackages) {
            if (DbError e = m_db.exec(QStringLiteral(
                    "UPDATE tTempDocLines SET Quantity = m.Packs, Copies = min(m.Packs, 999)"
                    " FROM tTempLineMore m WHERE m.LineNum = tTempDocLines.LineNum"
                    " AND m.HeadNumber = tTempDocLines.HeadNumber AND m.WizFileID = tTempDocLines.WizFileID"
                    " AND m.Packs > 0")))
                return fail(error, e.message);
        }
        if (DbError e = m_db.commit())
            return fail(error, e.message);
        return lastRead >= 0 ? lastRead : start;
    }

private:
    qint64 fail(ReadError* error, const QString& message)
    {
        if (m_db.inTransaction())
            m_db.rollback();
        if (error)
            *error = {kReadTitle, message};
        return 0;
    }

    bool prepareInserts(ReadError* error)
    {
        DbError e;
        m_header = m_db.prepare(
            QStringLiteral("INSERT INTO tTempDocHeaders (WizFileID, Number, DocType, Reference1, DocDate, AccountKey,"
                           " CardName, Address, Phone1, Copies, TotalCrates, Include, NumAtCard, OrigAccountKey)"
                           " VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, 1, 1, ?10, ?11, ?12)"),
            &e);
        if (!e)
            m_line = m_db.prepare(
                QStringLiteral("INSERT INTO tTempDocLines (WizFileID, Number, HeadNumber, LineNum, ItemKey, ItemKeySon,"
                               " ItemName, ItemNameSon, Quantity, Include, Copies)"
                               " VALUES (?1, ?2, ?3, ?4, ?5, ?5, ?6, ?6, ?7, ?8, ?9)"),
                &e);
        if (!e && m_rule == QtyPackages)
            m_pack = m_db.prepare(QStringLiteral("INSERT INTO tTempLineMore (WizFileID, Number, HeadNumber, LineNum, Packs)"
                                                 " VALUES (?1, ?2, ?3, ?4, ?5)"),
                                  &e);
        if (e) {
            fail(error, e.message);
            return false;
        }
        return true;
    }

    // A row that exists already (two types on one recipe selecting the same
    // document) is skipped; any other error ends the type.
    bool store(Statement& s, ReadError* error)
    {
        const DbError e = s.run();
        if (!e || e.isDuplicateKey())
            return true;
        fail(error, e.message);
        return false;
    }

    bool writeHeader(const ErpRecordset& h, qint64 id, ReadError* error)
    {
        QString key;
        if (m_r.accountJoin())
            key = NullTrim(h.value(QStringLiteral("AssignKey")));
        if (key.isEmpty())
            key = NullTrim(h.value(QStringLiteral("AccountKey")));
        key = localKey(key);
        m_headerQty = m_rule == QtyHeaderDetails ? detailsQuantity(h.value(QStringLiteral("DETAILS"))) : 0;

        m_header.bind(1, m_r.wizFileId);
        m_header.bind(2, id);
        m_header.bind(3, m_r.docType);
        const QVariant number = h.value(QStringLiteral("DocNumber"));
        m_header.bind(4, number.isNull() ? QVariant() : QVariant(number.toString()));
        m_header.bind(5, ErpToDate(h.value(QStringLiteral("ValueDate"))));
        m_header.bind(6, key.isEmpty() ? QStringLiteral("?") : key);
        if (m_r.accountJoin()) {
            m_header.bind(7, textOrNull(trimmedText(h.value(QStringLiteral("AccountName")))));
            m_header.bind(8, textOrNull(trimmedText(h.value(QStringLiteral("Address")))));
            m_header.bind(9, textOrNull(NullTrim(h.value(QStringLiteral("Phone")))));
        } else {
            for (int i = 7; i <= 9; ++i)
                m_header.bind(i, QVariant());
        }
        m_header.bind(10, m_headerInclude);
        const QVariant reference = h.value(QStringLiteral("Reference"));
        m_header.bind(11, textOrNull(reference.isNull() ? QString() : reference.toString()));
        m_header.bind(12, textOrNull(localKey(h.value(QStringLiteral("AccountKey")))));
        return store(m_header, error);
    }

    bool readLines(qint64 id, ReadError* error)
    {
        QString message;
        // Each document's lines are an operation of their own, with the whole
        // time-out: a type with many documents must not starve its last ones.
        m_erpLines.restartTimeout();
        auto rs = m_erpLines.query(docLineSql(m_r, m_rule, id), &message);
        if (!rs) {
            fail(error, message);
            return false;
        }
        while (rs->next()) {
            const QString itemKey = localKey(rs->value(QStringLiteral("ItemKey")));
            if (itemKey.isEmpty())
                continue;
            const QVariant line = rs->value(QStringLiteral("LINE"));
            double q = NullToDouble(rs->value(QStringLiteral("Quantity")));
            switch (m_rule) {
            case QtyHeaderDetails:
                if (m_headerQty > 0)
                    q = m_headerQty;
                break;
            case QtyFactoryUnit: {
                const double t = roundEven(NullToDouble(rs->value(QStringLiteral("TQuantity"))));
                if (t > 0)
                    q = t;
                break;
            }
            case QtyFixed:
                q = 1;
                break;
            default:
                break;
            }
            q *= m_factor;
            const double quantity = q;
            bool include = true;
            if (m_onlyLine0) {
                include = line.toLongLong() == 1;
                // One label of the first line, unless a rule chose the count.
                if (include && (m_rule == QtyLine || m_rule == -1))
                    q = 1;
            }
            m_line.bind(1, m_r.wizFileId);
            m_line.bind(2, rs->value(QStringLiteral("ID")));
            m_line.bind(3, rs->value(QStringLiteral("StockID")));
            m_line.bind(4, line);
            m_line.bind(5, itemKey);
            m_line.bind(6, textOrNull(ConvertErpText(rs->value(QStringLiteral("ItemName")), QString())));
            m_line.bind(7, quantity);
            m_line.bind(8, include);
            m_line.bind(9, int(QuantityToCopies(q)));
            if (!store(m_line, error))
                return false;
        }
        if (rs->failed()) {
            fail(error, rs->error());
            return false;
        }
        return true;
    }

    bool readPackages(qint64 id, ReadError* error)
    {
        QString message;
        auto rs = m_erpLines.query(docPackageSql(m_r, id), &message);
        if (!rs) {
            fail(error, message);
            return false;
        }
        while (rs->next()) {
            const QVariant packs = rs->value(QStringLiteral("Packs"));
            m_pack.bind(1, m_r.wizFileId);
            m_pack.bind(2, rs->value(QStringLiteral("ID")));
            m_pack.bind(3, rs->value(QStringLiteral("StockID")));
            m_pack.bind(4, rs->value(QStringLiteral("LINE")));
            m_pack.bind(5, packs.isNull() ? QVariant() : QVariant(qint64(roundEven(NullToDouble(packs) * m_factor))));
            if (!store(m_pack, error))
                return false;
        }
        if (rs->failed()) {
            fail(error, rs->error());
            return false;
        }
        return true;
    }

    const ErpReadContext& m_ctx;
    const DocTypeRecipe& m_r;
    int m_rule;
    double m_factor;
    bool m_onlyLine0;
    bool m_headerInclude;
    double m_headerQty = 0;
    Database m_db;
    ErpConnection m_erp;
    ErpConnection m_erpLines;
    Statement m_header;
    Statement m_line;
    Statement m_pack;
};

} // namespace

qint64 ReadStockPriority(const ErpReadContext& ctx, const QString& dbPath, const DocTypeRecipe& rsDT,
                         const QVariant& fromDate, const QVariant& toDate, bool draftDocs,
                         const DocImportOptions& options, DocCriteriaState* state, ReadError* error)
{
    if (ctx.progress) {
        ctx.progress->setProgress(0);
        ctx.progress->setMessage(QStringLiteral("קורא מסמכים"));
    }
    qint64 result = 0;
    {
        DocTypeRun run(ctx, rsDT, options);
        result = run.run(dbPath, fromDate, toDate, draftDocs, options, state, error);
    }
    if (ctx.progress)
        ctx.progress->setProgress(0);
    return result;
}

bool UpdateDocsAlterKeys(const QString& tempDocsPath, QString* error)
{
    Database db;
    DbError e = db.open(tempDocsPath);
    // The document's own account first; the account the label is for fills
    // what is left.
    for (const char* account : {"OrigAccountKey", "AccountKey"}) {
        if (e)
            break;
        e = db.exec(QStringLiteral("UPDATE tTempDocLines SET AlterNum = tAlterKeys.AlterNum"
                                   " FROM tTempDocHeaders INNER JOIN tAlterKeys"
                                   " ON tTempDocHeaders.%1 = tAlterKeys.AccountKey"
                                   " WHERE tTempDocHeaders.WizFileID = tTempDocLines.WizFileID"
                                   " AND tTempDocHeaders.Number = tTempDocLines.HeadNumber"
                                   " AND tTempDocLines.ItemKey = tAlterKeys.ItemKey"
                                   " AND (tTempDocLines.AlterNum Is Null Or tTempDocLines.AlterNum = '')")
                        .arg(QLatin1String(account)));
    }
    if (e && error)
        *error = e.message;
    return !e;
}

DocImportResult ImportDocuments(const ErpReadContext& ctx, const DocImportOptions& o, DocCriteriaState* state,
                                const DocItemsStep& itemsStep)
{
    DocImportResult result;
    auto message = [&ctx](const QString& text) {
        if (ctx.progress)
            ctx.progress->setMessage(text);
    };
    auto runFault = [&result](const QString& text) {
        result.errors.push_back({kRunTitle, text});
        return result;
    };
    const QString configPath = QDir(o.dataFolder).filePath(dbfiles::Config);
    const QString itemsPath = QDir(o.dataFolder).filePath(dbfiles::Items);
    const QString tempDocsPath = QDir(o.dataFolder).filePath(dbfiles::TempDocs);

    // The dates first: a text that is no date ends the run before anything
    // is replaced or read.
    message(QStringLiteral("בודק את טווח התאריכים"));
    QVariant fromDate, toDate;
    for (const auto& [text, date] : {std::pair{&o.fromDate, &fromDate}, {&o.toDate, &toDate}}) {
        if (text->trimmed().isEmpty())
            continue;
        const auto d = ParseDayMonthYear(text->trimmed());
        if (!d)
            return runFault(QStringLiteral("התאריך \"%1\" אינו תאריך חוקי").arg(*text));
        *date = QVariant(*d);
    }

    message(QStringLiteral("מכין את בסיס הנתונים הזמני"));
    DbError e;
    result.tempDocsPath = CreateTempDocsDB(configPath, itemsPath, tempDocsPath, &e);
    if (result.tempDocsPath.isEmpty())
        return runFault(e.message);

    if (o.readDocItems) {
        message(QStringLiteral("מכין בסיס נתונים זמני לנתוני פריטים"));
        result.tempItemsPath = CreateTempItemsDB(QDir(o.dataFolder).filePath(dbfiles::TempItems), itemsPath, &e);
        if (result.tempItemsPath.isEmpty())
            return runFault(e.message);
    }

    DocCriteriaState own;
    if (!state)
        state = &own;
    QVector<DocTypeRecipe> types;
    {
        Database db;
        e = db.open(result.tempDocsPath);
        if (!e)
            types = ReadDocTypes(db, &e);
        if (e)
            return runFault(e.message);
    }
    for (const DocTypeRecipe& type : types) {
        if (!type.include)
            continue;
        ReadError error;
        const qint64 read = ReadStockPriority(ctx, result.tempDocsPath, type, fromDate, toDate, type.includeDraft,
                                              o, state, &error);
        if (read == 0) {
            // The run ends with the type that failed (nothing of it is kept);
            // the types read before it stay for the user to see.
            if (error.message.isEmpty())
                error.message = QStringLiteral("קריאת המסמכים נכשלה");
            result.errors.push_back(error);
            return result;
        }
        if (o.readDocItems && itemsStep) {
            message(QStringLiteral("קורא נתוני פריטים קשורים"));
            if (!itemsStep(type, *state))
                return result;
        }
    }

    if (o.readDocItems && !result.tempItemsPath.isEmpty()) {
        message(QStringLiteral("מעדכן נתוני פריטים בטבלאות ראשיות..."));
        QString error;
        if (!UpdateMainItemTables(result.tempItemsPath, &error))
            return runFault(error);
    }
    message(QStringLiteral("מעדכן מפתחות חליפיים בשורות המסמכים..."));
    QString error;
    if (!UpdateDocsAlterKeys(result.tempDocsPath, &error))
        return runFault(error);
    if (ctx.progress)
        ctx.progress->setProgress(1);
    message(QStringLiteral("קריאת המסמכים הסתיימה"));
    result.completed = true;
    return result;
}

} // namespace tagora
