#include "erp/democompany.h"

#include "erp/textconv.h"

#include <QFile>
#include <QStringList>

#include <algorithm>
#include <array>
#include <cmath>
#include <initializer_list>
#include <iterator>
#include <optional>
#include <vector>

namespace tagora {

namespace {

// ---------------------------------------------------------------- the model
//
// The company is generated row by row, connection-type neutral: texts in
// logical order, dates as QDate. Each row goes to a RowSink as soon as it is
// made, so no table is ever held whole: the SQLite writer inserts it at once,
// the script writer gathers the rows it prints. Each writer turns a cell into
// its stored form with storedValue(), so the SQLite file and the script can
// never drift apart.

enum class Kind { Int, Real, Text, Char, Date };

struct Column {
    QString name;
    Kind kind;
    int width = 0; // texts only
};

Column I(const char* name) { return {QLatin1String(name), Kind::Int}; }
Column R(const char* name) { return {QLatin1String(name), Kind::Real}; }
Column V(const char* name, int width) { return {QLatin1String(name), Kind::Text, width}; }
Column C(const char* name, int width) { return {QLatin1String(name), Kind::Char, width}; }
Column D(const char* name) { return {QLatin1String(name), Kind::Date}; }

// A table's shape; its rows go to a RowSink.
struct Table {
    QString name;
    std::vector<Column> columns;
    QStringList key;                  // primary key, empty when rows may repeat
    std::vector<QStringList> indexes; // further, non-unique indexes
};

// Where the rows go, table by table (the position in schema()), each row's
// cells in column order. A sink that fails keeps its first error and takes
// no more rows.
class RowSink {
public:
    virtual ~RowSink() = default;
    virtual void add(size_t table, const QVariant* cells, size_t count) = 0;
    virtual bool failed() const = 0;
};

// One table of the company as the builder fills it.
class Rows {
public:
    Rows(RowSink& sink, size_t table, size_t width)
        : m_sink(sink)
        , m_table(table)
        , m_width(width)
    {
    }
    void add(std::initializer_list<QVariant> row) const
    {
        Q_ASSERT(row.size() == m_width);
        m_sink.add(m_table, row.begin(), row.size());
    }
    void add(const std::vector<QVariant>& row) const
    {
        Q_ASSERT(row.size() == m_width);
        m_sink.add(m_table, row.data(), row.size());
    }

private:
    RowSink& m_sink;
    size_t m_table;
    size_t m_width;
};

const QDate kMinuteEpoch(1988, 1, 1);

QVariant storedValue(const Column& column, const QVariant& value, short connType)
{
    if (value.isNull())
        return QVariant();
    switch (column.kind) {
    case Kind::Date: {
        const QDate d = value.toDate();
        if (connType == 2)
            return QVariant(qlonglong(kMinuteEpoch.daysTo(d)) * 1440);
        return QVariant(d);
    }
    case Kind::Text:
    case Kind::Char: {
        const QString text = value.toString();
        // Type 0 is read like type 1, so anything but 2 gets visual order.
        if (connType != 2 && HasHebrewLetters(text))
            return VisualToLogical(text, 1);
        return text;
    }
    default: return value;
    }
}

// ------------------------------------------------------------------- tables

std::vector<Table> schema(bool labelLists)
{
    std::vector<Table> t;
    auto table = [&t](const char* name, std::vector<Column> columns, QStringList key,
                      std::vector<QStringList> indexes = {}) {
        t.push_back({QLatin1String(name), std::move(columns), std::move(key), std::move(indexes)});
    };
    table("CURRENCIES", {I("CURRENCY"), V("CODE", 3), V("NAME", 24)}, {"CURRENCY"});
    table("UNIT", {I("UNIT"), V("UNITNAME", 8)}, {"UNIT"});
    table("FAMILY", {I("FAMILY"), V("FAMILYNAME", 8), V("FAMILYDES", 32)}, {"FAMILY"});
    table("WAREHOUSES", {I("WARHS"), V("WARHSNAME", 4), V("LOCNAME", 16)}, {"WARHS"});
    table("PRICELIST", {I("PLIST"), V("PLNAME", 16), V("PLDES", 32)}, {"PLIST"});
    table("PART",
          {I("PART"), V("PARTNAME", 22), V("PARTDES", 48), I("FAMILY"), V("FAMILYNAME", 8), I("UNIT"),
           V("BARCODE", 16), C("TYPE", 1)},
          {"PART"}, {{"PARTNAME"}});
    table("PARTDES", {I("PART"), V("EPARTDES", 48)}, {"PART"});
    table("PARTPARAM", {I("PART"), I("WARHS"), I("SUP")}, {"PART"});
    // A list may price an item more than once (quantity breaks), so no key.
    table("PARTPRICE", {I("PART"), I("PLIST"), R("QUANT"), R("PRICE"), I("CURRENCY")}, {}, {{"PART"}, {"PLIST"}});
    table("CUSTOMERS",
          {I("CUST"), V("CUSTNAME", 16), V("CUSTDES", 48), V("ADDRESS", 48), V("PHONE", 20), I("MCUST")}, {"CUST"},
          {{"CUSTNAME"}});
    table("SUPPLIERS", {I("SUP"), V("SUPNAME", 16), V("SUPDES", 48), V("ADDRESS", 48), V("PHONE", 20)}, {"SUP"},
          {{"SUPNAME"}});
    table("CUSTPART", {I("CUST"), I("PART"), V("CUSTPARTNAME", 22)}, {}, {{"PART"}, {"CUST"}});
    table("SUPPART", {I("SUP"), I("PART"), V("SUPPARTNAME", 22)}, {}, {{"PART"}, {"SUP"}});
    table("CUSTPARTPRICE", {I("CUST"), I("PART"), R("PRICE"), I("CURRENCY"), D("FROMDATE"), D("EXPIRYDATE")}, {},
          {{"PART"}, {"CUST"}});

    table("ORDERS", {I("ORD"), V("ORDNAME", 16), I("CUST"), D("CURDATE"), V("REFERENCE", 16), V("DETAILS", 24)},
          {"ORD"});
    table("ORDERITEMS", {I("ORDI"), I("ORD"), I("LINE"), I("PART"), R("QUANT"), R("TQUANT"), I("NUMPACK")}, {"ORDI"},
          {{"ORD"}, {"PART"}});
    table("ORDERITEMSA", {I("ORDI"), I("NUMPACK")}, {"ORDI"});
    table("PORDERS", {I("ORD"), V("ORDNAME", 16), I("SUP"), D("CURDATE"), V("REFERENCE", 16), V("DETAILS", 24)},
          {"ORD"});
    table("PORDERITEMS", {I("ORDI"), I("ORD"), I("LINE"), I("PART"), R("QUANT"), R("TQUANT"), I("NUMPACK")},
          {"ORDI"}, {{"ORD"}, {"PART"}});
    table("PORDERITEMSA", {I("ORDI"), I("NUMPACK")}, {"ORDI"});
    table("DOCUMENTS",
          {I("DOC"), V("DOCNO", 16), C("TYPE", 1), I("CUST"), I("SUP"), D("CURDATE"), V("BOOKNUM", 16),
           V("DETAILS", 24), C("FINAL", 1)},
          {"DOC"});
    // Stock movements: the lines of DOCUMENTS, and (DOC = IV, LINE) the
    // package counts of invoice lines; the two id ranges never meet.
    table("TRANSORDER", {I("TRANS"), I("DOC"), I("LINE"), I("PART"), R("QUANT"), R("TQUANT"), I("NUMPACK")},
          {"TRANS"}, {{"DOC"}, {"PART"}});
    table("INVOICES",
          {I("IV"), V("IVNUM", 16), C("TYPE", 1), I("CUST"), D("IVDATE"), V("REFERENCE", 16), V("DETAILS", 24),
           C("FINAL", 1)},
          {"IV"});
    table("INVOICEITEMS", {I("KLINE"), I("IV"), I("LINE"), I("PART"), R("QUANT"), R("TQUANT"), I("NUMPACK")},
          {"KLINE"}, {{"IV"}, {"PART"}});

    table("PARTEXTFILE", {I("PART"), I("EXTFILENUM"), V("EXTFILENAME", 80), V("EXTFILEDES", 48)}, {}, {{"PART"}});
    table("PARTSPECTYPES", {I("NUMBER"), V("SPECDES", 20)}, {"NUMBER"});
    {
        // The item's ten property values, one column per property type number.
        std::vector<Column> specColumns{I("PART")};
        for (const char* name : {"SPEC1", "SPEC2", "SPEC3", "SPEC4", "SPEC5", "SPEC6", "SPEC7", "SPEC8", "SPEC9", "SPEC10"})
            specColumns.push_back({QLatin1String(name), Kind::Text, 32});
        table("PARTSPEC", std::move(specColumns), {"PART"});
    }
    table("PARTTEXT", {I("PART"), I("TEXTORD"), V("TEXT", 68)}, {"PART", "TEXTORD"});
    table("PARTTEXTLANG", {I("PART"), I("TEXTORD"), V("TEXT", 68)}, {"PART", "TEXTORD"});
    table("PARTALT", {I("PART"), I("ALT"), I("PARENT"), I("LN")}, {}, {{"PART"}});
    table("PARTARC", {I("PART"), I("SON"), R("COEF"), R("SONQUANT"), D("FROMDATE"), D("TILLDATE")}, {}, {{"PART"}});

    if (labelLists) {
        table("USERS", {I("USER"), V("USERLOGIN", 20)}, {"USER"});
        table("LABELSDEF", {I("LABELDEF"), V("LABELNAME", 32), V("LABELPATH", 80)}, {"LABELDEF"});
        std::vector<Column> labels{I("USER"), I("KLINE"), I("LABELQUANT"), I("LABELDEF"), I("Sort")};
        for (int n = 1; n <= 20; ++n)
            labels.push_back({QStringLiteral("PAR%1").arg(n), Kind::Text, 80});
        table("LABELS", std::move(labels), {"USER", "KLINE"});
    }
    return t;
}

// ------------------------------------------------------------------ helpers

// A fixed sequence (splitmix64), independent of the standard library's
// distributions, so the content is the same with every compiler. Its state
// is a counter, so a sequence can be resumed from a state kept earlier, or
// taken up any number of draws further on.
class Random {
public:
    explicit Random(quint64 seed)
        : m_state(seed)
    {
    }
    quint64 next()
    {
        quint64 z = (m_state += kStep);
        z = (z ^ (z >> 30)) * 0xBF58476D1CE4E5B9ULL;
        z = (z ^ (z >> 27)) * 0x94D049BB133111EBULL;
        return z ^ (z >> 31);
    }
    int below(int n) { return n <= 1 ? 0 : int(next() % quint64(n)); }
    int between(int lo, int hi) { return lo + below(hi - lo + 1); }
    bool chance(int percent) { return below(100) < percent; }
    template <typename T>
    const T& pick(const std::vector<T>& v) { return v[size_t(below(int(v.size())))]; }

    // Random(state()) goes on exactly as this one would.
    quint64 state() const { return m_state; }
    // As if next() had been called `draws` times.
    void skip(quint64 draws) { m_state += draws * kStep; }

private:
    static constexpr quint64 kStep = 0x9E3779B97F4A7C15ULL;
    quint64 m_state;
};

QString u8(const char* s)
{
    return QString::fromUtf8(s);
}

std::vector<QString> list(std::initializer_list<const char*> items)
{
    std::vector<QString> out;
    for (const char* s : items)
        out.push_back(u8(s));
    return out;
}

double money(long long cents)
{
    return double(cents) / 100.0;
}

double roundedMoney(double amount)
{
    return money(std::llround(amount * 100.0));
}

QString ean13(const QString& twelveDigits)
{
    int sum = 0;
    for (int i = 0; i < 12; ++i)
        sum += (twelveDigits[i].unicode() - '0') * (i % 2 ? 3 : 1);
    return twelveDigits + QChar(u'0' + (10 - sum % 10) % 10);
}

const QVariant kNull;

// ------------------------------------------------------------------- items

struct Pattern {
    const char* he;
    const char* en;
    int unit;
    const char* a; // values for %1, '|' between them, "he=en" when they differ
    const char* b; // values for %2
};

struct FamilyDef {
    int id;
    const char* name;
    const char* des;
    const char* prefix;
    std::vector<Pattern> patterns;
};

// Units: 1 each, 2 kilogram, 3 metre, 4 litre, 5 carton, 6 pair.
const std::vector<FamilyDef>& families()
{
    static const std::vector<FamilyDef> f = {
        {1, "100", "ברגים ואומים", "SC",
         {{"בורג M%1 (נירוסטה) %2 מ\"מ", "Screw M%1 stainless %2 mm", 1, "3|4|5|6|8|10", "12|16|20|25|30|40|50"},
          {"אום M%1 מגולוון", "Nut M%1 galvanized", 1, "4|5|6|8|10|12", ""},
          {"דיבל %1 מ\"מ (100 יח')", "Wall plug %1 mm (100 pcs)", 5, "6|8|10|12", ""},
          {"דסקית M%1 [DIN 125]", "Washer M%1 DIN 125", 2, "4|5|6|8|10", ""}}},
        {2, "200", "אינסטלציה", "PL",
         {{"צינור PVC %1\" (%2 מטר)", "PVC pipe %1\" (%2 m)", 1, "1/2|3/4|1|2", "3|4|6"},
          {"ברז כדורי %1\" פליז", "Ball valve %1\" brass", 1, "1/2|3/4|1", ""},
          {"מחבר שן-חוץ %1\"", "Male adapter %1\"", 1, "1/2|3/4|1|2", ""},
          {"סיפון גמיש 40/50", "Flexible siphon 40/50", 1, "", ""}}},
        {3, "300", "כלי עבודה", "TL",
         {{"מברגה נטענת %1V", "Cordless drill %1V", 1, "12|18|20", ""},
          {"פטיש %1 גרם", "Hammer %1 g", 1, "300|500|800", ""},
          {"מפתח שוודי %1\"", "Adjustable wrench %1\"", 1, "6|8|10|12", ""},
          {"סט מקדחים (%1 חלקים)", "Drill bit set (%1 pcs)", 1, "10|19|25", ""}}},
        {4, "400", "חשמל ותאורה", "EL",
         {{"נורת LED %1W (אור חם)", "LED bulb %1W warm white", 1, "5|7|9|12|15", ""},
          {"כבל חשמל 3x%1 ממ\"ר", "Power cable 3x%1 mm2", 3, "1.5|2.5|4", ""},
          {"מפסק תאורה כפול 16A", "Double light switch 16A", 1, "", ""},
          {"שקע כוח 3 פאזות", "Three-phase socket", 1, "", ""}}},
        {5, "500", "צבעים וחומרי גמר", "PT",
         {{"צבע אקרילי %1 %2 ליטר", "Acrylic paint %1 %2 l", 1, "לבן=white|שמנת=cream|אפור=grey", "1|4|18"},
          {"מברשת צבע %1\"", "Paint brush %1\"", 1, "1|2|3|4", ""},
          {"טרפנטין %1 ליטר", "Turpentine %1 l", 4, "1|5", ""},
          {"שפכטל אקרילי 1.5 ק\"ג", "Acrylic filler 1.5 kg", 1, "", ""}}},
        {6, "600", "אריזה", "PK",
         {{"קרטון אריזה %1 ס\"מ", "Carton box %1 cm", 1, "40x30x20|60x40x40|30x20x10", ""},
          {"סרט הדבקה %1 מ\"מ שקוף", "Clear tape %1 mm", 5, "48|50|75", ""},
          {"ניילון נצמד %1 ס\"מ", "Stretch film %1 cm", 1, "45|50", ""},
          {"חומר ריפוד בתפזורת", "Loose fill", 2, "", ""}}},
        {7, "700", "ציוד בטיחות", "SF",
         {{"כפפות עבודה [מידה %1]", "Work gloves size %1", 6, "S|M|L|XL", ""},
          {"משקפי מגן EN166", "Safety glasses EN166", 1, "", ""},
          {"אטמי אוזניים (%1 זוגות)", "Ear plugs (%1 pairs)", 1, "10|50|200", ""},
          {"אפוד זוהר %1", "Hi-vis vest %1", 1, "צהוב=yellow|כתום=orange", ""}}},
        // A family without a description, for the odd and the non-stock items.
        {8, "900", "", "MS", {{"פריט כללי %1", "General item %1", 1, "A|B|C", ""}}},
    };
    return f;
}

// Unit names, by unit number from 1.
const std::vector<QString>& unitNames()
{
    static const auto units = list({"יח'", "ק\"ג", "מטר", "ליטר", "קרטון", "זוג"});
    return units;
}

struct Item {
    int id = 0;
    QString key;
    QString des;
    QVariant edes;
    int family = 1;
    int unit = 1;
    QVariant barcode;
    QChar type = u'R';
    long long cents = 0; // base price in shekels
};

std::pair<QString, QString> splitValue(const QString& v)
{
    const int eq = v.indexOf(QLatin1Char('='));
    if (eq < 0)
        return {v, v};
    return {v.left(eq), v.mid(eq + 1)};
}

// The values a pattern's %1 and %2 take (Hebrew, English), split once.
struct PatternValues {
    std::vector<std::pair<QString, QString>> a, b;
};

const std::vector<std::vector<PatternValues>>& patternValues()
{
    static const std::vector<std::vector<PatternValues>> all = [] {
        auto split = [](const char* values) {
            std::vector<std::pair<QString, QString>> out;
            for (const QString& v : u8(values).split(QLatin1Char('|'), Qt::SkipEmptyParts))
                out.push_back(splitValue(v));
            return out;
        };
        std::vector<std::vector<PatternValues>> out;
        for (const FamilyDef& f : families()) {
            out.emplace_back();
            for (const Pattern& p : f.patterns)
                out.back().push_back({split(p.a), split(p.b)});
        }
        return out;
    }();
    return all;
}

long long basePrice(Random& rng)
{
    static const int scale[] = {1, 10, 100, 1000};
    const long long digit = rng.between(1, 9);
    const long long magnitude = scale[rng.below(4)];
    const long long change = rng.between(0, 19) * 5;
    return digit * magnitude * 100 + change;
}

QString barcodeFor(int serial)
{
    return ean13(QStringLiteral("7290%1").arg(10000000 + serial, 8, 10, QLatin1Char('0')));
}

// The items of types R and P, made on demand instead of kept: item i is
// drawn again from the sequence's state before it. The draws of every item
// are taken once at the start, keeping the state every kStride items, so
// reaching any item draws at most kStride others (only the choices, no
// text), and walking them in order draws each once.
//
// The sequence (seed 0x1001) is, in order: for each item its family (but for
// the first six), pattern, %1 and %2 values, base price, type and foreign
// name kind; then one draw an item for its barcode; then three a service item
// for its price.
class ItemSource {
public:
    explicit ItemSource(int count)
        : m_count(count)
        , m_rng(kSeed)
    {
        m_marks.reserve(size_t(count / kStride + 1));
        Random rng(kSeed);
        for (int i = 0; i < count; ++i) {
            if (i % kStride == 0)
                m_marks.push_back(rng.state());
            draw(i, rng);
        }
        m_afterDraws = rng.state();
    }

    int count() const { return m_count; }
    // Services and the like, numbered after the items.
    int otherCount() const { return 3 + m_count / 200; }

    Item item(int i)
    {
        static const char* const odd[] = {"AB\"12", "O'R-5", " LEAD-7", "TRAIL-8 ", "   ", "MK-482"};
        const Draw d = drawAt(i);
        const FamilyDef& f = families()[size_t(d.family)];
        const Pattern& p = f.patterns[size_t(d.pattern)];
        const PatternValues& values = patternValues()[size_t(d.family)][size_t(d.pattern)];
        QString he = u8(p.he);
        QString en = u8(p.en);
        if (d.a >= 0) {
            he.replace(QLatin1String("%1"), values.a[size_t(d.a)].first);
            en.replace(QLatin1String("%1"), values.a[size_t(d.a)].second);
        }
        if (d.b >= 0) {
            he.replace(QLatin1String("%2"), values.b[size_t(d.b)].first);
            en.replace(QLatin1String("%2"), values.b[size_t(d.b)].second);
        }
        Item it;
        it.id = i + 1;
        it.key = QStringLiteral("%1-%2").arg(QLatin1String(f.prefix)).arg(1000 + i);
        it.des = he;
        it.edes = en;
        it.family = f.id;
        it.unit = p.unit;
        it.cents = d.cents;
        // The keys readers trip over come first: quotes, blanks around the
        // key, a key that is nothing but blanks, a description without Hebrew.
        if (i < 6) {
            it.key = u8(odd[i]);
            if (i == 1) {
                it.type = u'P';
                it.des = u8("בורג M6 (נירוסטה) 20 מ\"מ");
                it.family = 1;
                it.unit = 1;
                it.edes = u8(""); // a foreign name left empty
            } else if (i == 2) {
                it.edes = kNull;
            } else if (i == 5) {
                it.des = u8("Makita DHP482 (18V)");
                it.edes = u8("Makita DHP482 (18V)");
                it.family = 3;
                it.unit = 1;
            }
        } else {
            if (d.typeP)
                it.type = u'P';
            if (d.foreignName < 8)
                it.edes = kNull;
            else if (d.foreignName < 12)
                it.edes = u8("");
        }
        Random rng(m_afterDraws);
        rng.skip(quint64(i));
        const int r = rng.below(100);
        if (i == 3 || (i > 5 && r < 7))
            it.barcode = kNull;
        else if (i == 5 || (i > 5 && r < 10))
            it.barcode = u8("");
        else
            it.barcode = barcodeFor(i + 1);
        return it;
    }

    long long cents(int i) { return drawAt(i).cents; }

    // Items the readers must leave out: services and the like.
    Item other(int j) const
    {
        static const auto services = list({"שירותי הובלה", "התקנה באתר", "אחריות מורחבת 3 שנים", "דמי טיפול", "פיקדון משטח"});
        Random rng(m_afterDraws);
        rng.skip(quint64(m_count) + 3 * quint64(j));
        Item it;
        it.id = m_count + j + 1;
        it.key = QStringLiteral("SRV-%1").arg(10 + j);
        it.des = services[size_t(j) % services.size()];
        it.edes = QStringLiteral("Service %1").arg(10 + j);
        it.family = 8;
        it.unit = 1;
        it.barcode = kNull;
        it.type = j % 3 == 2 ? u'S' : u'O';
        it.cents = basePrice(rng);
        return it;
    }

private:
    static constexpr quint64 kSeed = 0x1001;
    static constexpr int kStride = 256;

    // An item's choices, without its texts.
    struct Draw {
        int family = 0;  // index into families()
        int pattern = 0; // index into its patterns
        int a = -1, b = -1; // the values of %1 and %2, -1 for none
        long long cents = 0;
        bool typeP = false;
        int foreignName = 100; // below 8 none, below 12 empty
    };

    static Draw draw(int i, Random& rng)
    {
        Draw d;
        d.family = i < 6 ? i % 7 : rng.below(7);
        const FamilyDef& f = families()[size_t(d.family)];
        d.pattern = rng.below(int(f.patterns.size()));
        const PatternValues& values = patternValues()[size_t(d.family)][size_t(d.pattern)];
        if (!values.a.empty())
            d.a = rng.below(int(values.a.size()));
        if (!values.b.empty())
            d.b = rng.below(int(values.b.size()));
        d.cents = basePrice(rng);
        if (i >= 6) {
            d.typeP = rng.chance(35);
            d.foreignName = rng.below(100);
        }
        return d;
    }

    // Item i's draw, from the cursor when it is near, else from the mark before i.
    Draw drawAt(int i)
    {
        Q_ASSERT(i >= 0 && i < m_count);
        if (i < m_next || i - m_next >= kStride) {
            m_rng = Random(m_marks[size_t(i / kStride)]);
            m_next = i / kStride * kStride;
        }
        while (m_next < i)
            draw(m_next++, m_rng);
        ++m_next;
        return draw(i, m_rng);
    }

    const int m_count;
    std::vector<quint64> m_marks; // the state before item k * kStride
    quint64 m_afterDraws = 0;     // the state after the last item's draws
    Random m_rng;                 // the cursor: the state before item m_next
    int m_next = 0;
};

// ------------------------------------------------------------------ builder

class Builder {
public:
    Builder(const DemoOptions& options, const std::vector<Table>& tables, RowSink& sink)
        : m_options(options)
        , m_today(options.today.isValid() ? options.today : QDate(2024, 1, 1))
        , m_itemCount(std::max(options.items, 10))
        , m_tables(tables)
        , m_sink(sink)
        , m_items(m_itemCount)
    {
    }

    // Sends every row to the sink as it is made: each table's rows in their
    // order, the tables interleaved. Stops early when the sink fails.
    void build()
    {
        void (Builder::*const steps[])() = {&Builder::referenceTables, &Builder::accounts, &Builder::itemTables,
                                            &Builder::alternateKeys, &Builder::specialPrices, &Builder::orders,
                                            &Builder::purchaseOrders, &Builder::stockDocuments, &Builder::invoices,
                                            &Builder::itemCards};
        for (auto step : steps) {
            if (m_sink.failed())
                return;
            (this->*step)();
        }
        if (m_options.labelLists && !m_sink.failed())
            labelLists();
    }

private:
    enum Currency { Shekel = 1, Dollar = 2, Euro = 3, NoCode = 4 };
    static constexpr int kBlankKey = 4; // index of the item whose key is all blanks

    QDate day(int offset) const { return m_today.addDays(offset); }

    Rows rows(const char* name) const
    {
        for (size_t i = 0; i < m_tables.size(); ++i)
            if (m_tables[i].name == QLatin1String(name))
                return Rows(m_sink, i, m_tables[i].columns.size());
        qFatal("demo company: no table %s", name);
    }

    // Document lines pick items with a usable key: the item's index.
    int lineItem(Random& rng) const
    {
        int i = rng.below(m_itemCount - 1);
        if (i >= kBlankKey)
            ++i;
        return i;
    }

    void referenceTables()
    {
        const Rows cur = rows("CURRENCIES");
        cur.add({Shekel, u8("ש\"ח"), u8("שקל חדש")});
        cur.add({Dollar, u8("$"), u8("דולר ארה\"ב")});
        cur.add({Euro, u8("EUR"), u8("אירו")});
        cur.add({NoCode, u8(""), u8("מטבע ללא קוד")});

        const Rows unit = rows("UNIT");
        const auto& units = unitNames();
        for (size_t i = 0; i < units.size(); ++i)
            unit.add({int(i + 1), units[i]});

        const Rows fam = rows("FAMILY");
        for (const FamilyDef& f : families())
            fam.add({f.id, u8(f.name), u8(f.des)});

        const Rows wh = rows("WAREHOUSES");
        wh.add({1, u8("MAIN"), u8("A-01")});
        wh.add({2, u8("STR2"), u8("B-12")});
        wh.add({3, u8("SHOP"), u8("חנות")});
        wh.add({4, u8("RET"), u8("")});

        // 0 and -50 are not real lists; list 0 has neither name nor
        // description, which is how "no price list" reaches the user.
        const Rows pl = rows("PRICELIST");
        pl.add({0, u8(""), u8("")});
        pl.add({1, u8("BAS"), u8("מחירון בסיס")});
        pl.add({2, u8("WHS"), u8("סיטונאי")});
        pl.add({3, u8("USD"), u8("מחירון יצוא ($)")});
        pl.add({4, u8("מבצעים"), u8("")});
        pl.add({-50, u8("LPP"), u8("מחיר קנייה אחרון")});
    }

    void accounts()
    {
        Random rng(0x2002);
        const auto names = list({"אלון", "ברק", "גלבוע", "דקל", "הדס", "ורד", "זית", "חרמון", "טל", "יסמין", "כרמל",
                                 "לביא", "מורן", "נחל", "סער", "עומר", "פלג", "צור", "קשת", "רימון", "שקד", "תבור"});
        const auto trades = list({"חומרי בניין", "כלי בית", "אחזקה", "שיפוצים", "טכני", "מסחר", "הנדסה"});
        const auto suffixes = list({"בע\"מ", "ושות'", "(1998) בע\"מ", ""});
        const auto supTrades = list({"יבוא ושיווק", "תעשיות", "סחר", "מפעלי מתכת", "הפצה"});
        const auto cities = list({"תל אביב", "חיפה", "ירושלים", "באר שבע", "פתח תקווה", "אשדוד", "נתניה",
                                  "ראשון לציון", "קריית שמונה", "אילת"});
        const auto streets = list({"הרצל", "ז'בוטינסקי", "רוטשילד", "העצמאות", "דרך השלום", "המלאכה", "התעשייה",
                                   "הנביאים"});
        auto address = [&]() -> QVariant {
            const int r = rng.below(100);
            if (r < 6)
                return kNull;
            if (r < 14)
                return QStringLiteral("%1 %2, %3").arg(u8("ת.ד.")).arg(rng.between(10, 9999)).arg(rng.pick(cities));
            return QStringLiteral("%1 %2, %3").arg(rng.pick(streets)).arg(rng.between(1, 180)).arg(rng.pick(cities));
        };
        auto phone = [&]() -> QVariant {
            const int r = rng.below(100);
            if (r < 5)
                return kNull;
            if (r < 8)
                return u8("");
            static const char* areas[] = {"02", "03", "04", "08", "09", "050", "052", "054"};
            return QStringLiteral("%1-%2").arg(QLatin1String(areas[rng.below(8)])).arg(rng.between(2000000, 9999999));
        };

        const Rows cust = rows("CUSTOMERS");
        // Customer ids run from 1, in the order they are added.
        auto addCustomer = [&](const QString& key, const QString& des, int mcust) {
            const int id = ++m_customerCount;
            cust.add({id, key, des, address(), phone(), mcust ? mcust : id});
        };
        // A chain whose branches are consolidated under the head office.
        addCustomer(u8("CH-100"), u8("רשת השקמה - מטה"), 0);
        const int head = m_customerCount;
        addCustomer(u8("CH-101"), u8("רשת השקמה - סניף חיפה"), head);
        addCustomer(u8("CH-102"), u8("רשת השקמה - סניף באר שבע"), head);
        addCustomer(u8("SHIRAN'S"), u8("שירן'ס קייטרינג"), 0);
        addCustomer(u8("A\"B-2"), u8("א.ב. (2002) שיווק בע\"מ"), 0);
        const int generatedCustomers = 8 + m_itemCount / 100;
        for (int i = 0; i < generatedCustomers; ++i) {
            const QString des = QStringLiteral("%1 %2 %3")
                                    .arg(rng.pick(names))
                                    .arg(rng.pick(trades))
                                    .arg(rng.pick(suffixes))
                                    .trimmed();
            addCustomer(QString::number(10001 + i), des, 0);
        }

        const Rows sup = rows("SUPPLIERS");
        // Supplier ids run from 1, in the order they are added; supplierKey() gives their keys.
        auto addSupplier = [&](const QString& des) {
            const int id = ++m_supplierCount;
            sup.add({id, supplierKey(id), des, address(), phone()});
        };
        addSupplier(u8("ד'אור יבוא (1998) בע\"מ"));
        addSupplier(u8("מ.ת. אלקטרו-טק בע\"מ"));
        addSupplier(u8("Global Tools Ltd"));
        const int generatedSuppliers = 4 + m_itemCount / 200;
        for (int i = 0; i < generatedSuppliers; ++i) {
            const QString des = QStringLiteral("%1 %2 %3")
                                    .arg(rng.pick(names))
                                    .arg(rng.pick(supTrades))
                                    .arg(rng.pick(suffixes))
                                    .trimmed();
            addSupplier(des);
        }
    }

    // The supplier's key by its id.
    static QString supplierKey(int id)
    {
        static const char* const fixed[] = {"D'OR-1", "M\"T-2", "GTL"};
        return id <= 3 ? u8(fixed[id - 1]) : QString::number(50001 + id - 4);
    }

    // Draws of the item tables (seed 0x3003): two for each item's PARTPARAM
    // row (warehouse, supplier), items first, then the others; then the prices.
    int itemSupplier(int index) const
    {
        Random rng(0x3003);
        rng.skip(2 * quint64(index) + 1);
        return rng.between(1, m_supplierCount);
    }

    void itemTables()
    {
        Random rng(0x3003);
        const Rows part = rows("PART");
        const Rows des = rows("PARTDES");
        const Rows param = rows("PARTPARAM");
        const Rows price = rows("PARTPRICE");
        const int supplierCount = m_supplierCount;

        auto addItem = [&](const Item& it) {
            const FamilyDef& f = families()[size_t(it.family - 1)];
            part.add({it.id, it.key, it.des, it.family, u8(f.name), it.unit, it.barcode, QString(it.type)});
            des.add({it.id, it.edes});
            param.add({it.id, rng.between(1, 4), rng.between(1, supplierCount)});
        };
        for (int i = 0; i < m_itemCount; ++i)
            addItem(m_items.item(i));
        for (int j = 0; j < m_items.otherCount(); ++j)
            addItem(m_items.other(j));

        auto addPrice = [&](int id, int plist, QVariant amount, int currency, double quant = 0) {
            price.add({id, plist, quant, amount, currency});
        };
        for (int i = 0; i < m_itemCount; ++i) {
            const int id = i + 1;
            const double base = money(m_items.cents(i));
            const bool odd = i < 6; // the odd items are priced in every list
            if (odd || rng.chance(92))
                addPrice(id, 1, base, Shekel);
            if (i == 1) // a quantity break: the same list prices the item twice
                addPrice(id, 1, roundedMoney(base * 0.9), Shekel, 100);
            if (i == 2)
                addPrice(id, 2, kNull, Shekel);
            else if (odd || rng.chance(60))
                addPrice(id, 2, roundedMoney(base * 0.85), Shekel);
            if (odd || rng.chance(40))
                addPrice(id, 3, roundedMoney(base / 3.7), Dollar);
            if (i == 0 || (!odd && rng.chance(15)))
                addPrice(id, 4, roundedMoney(base * 0.8), i == 0 || rng.chance(10) ? NoCode : Shekel);
            if (i == 0 || rng.chance(4))
                addPrice(id, 0, base, Shekel);
            if (i < 2 || rng.chance(25))
                addPrice(id, -50, roundedMoney(base * 0.55), rng.chance(20) ? Euro : Shekel);
        }
        for (int j = 0; j < m_items.otherCount(); ++j) {
            const Item it = m_items.other(j);
            addPrice(it.id, 1, money(it.cents), Shekel);
        }
    }

    void alternateKeys()
    {
        Random rng(0x4004);
        const Rows cp = rows("CUSTPART");
        for (int id = 1; id <= m_customerCount; ++id) {
            const int n = rng.between(1, 4);
            for (int k = 0; k < n; ++k)
                cp.add({id, lineItem(rng) + 1, QStringLiteral("K-%1").arg(rng.between(1000, 99999))});
        }
        // The same customer and item twice, an empty and a missing number,
        // and numbers with quotes (customer and item ids).
        cp.add({1, 1, u8("CH/77-1")});
        cp.add({1, 1, u8("CH/77-2")});
        cp.add({4, 2, u8("")});
        cp.add({4, 7, kNull});
        cp.add({5, 2, u8("X'12")});
        cp.add({5, 1, u8("Q\"7")});

        const Rows sp = rows("SUPPART");
        for (int i = 0; i < m_itemCount; ++i) {
            if (i == kBlankKey || !rng.chance(45))
                continue;
            const int sup = itemSupplier(i);
            sp.add({sup, i + 1, QStringLiteral("%1-%2").arg(supplierKey(sup)).arg(rng.between(100, 9999))});
        }
        sp.add({1, 1, u8("DOR-A1")});
        sp.add({1, 1, u8("DOR-A2")});
        sp.add({2, 2, u8("")});
        sp.add({3, 6, u8("DHP482Z")});
    }

    void specialPrices()
    {
        Random rng(0x5005);
        const Rows cpp = rows("CUSTPARTPRICE");
        auto add = [&](int cust, int item, int currency, int from, int till) {
            const double amount = roundedMoney(money(m_items.cents(item)) * (0.7 + rng.below(25) / 100.0));
            cpp.add({cust, item + 1, currency == Dollar ? roundedMoney(amount / 3.7) : amount, currency, day(from),
                     day(till)});
        };
        // One of each kind of validity around today (customer ids, item indexes).
        const int head = 1;
        add(head, 0, Shekel, -30, 60);  // valid
        add(head, 0, Shekel, -10, 90);  // the same customer and item again, also valid
        add(head, 1, Shekel, -10, 0);   // ends today
        add(head, 2, Shekel, 0, 30);    // starts today
        add(head, 3, Shekel, 1, 90);    // starts tomorrow
        add(head, 5, Shekel, -90, -1);  // ended yesterday
        add(head, 6, NoCode, -5, 25);   // currency without a code
        add(5, 1, Dollar, -365, 365);
        add(2, 6, Shekel, -20, 40);
        for (int c = 5; c < m_customerCount; ++c) {
            if (!rng.chance(50))
                continue;
            const int n = rng.between(1, 3);
            for (int k = 0; k < n; ++k) {
                // Mostly valid now; some ended, some end today, some not yet begun.
                const int it = lineItem(rng);
                const int currency = rng.chance(15) ? Dollar : Shekel;
                const int kind = rng.below(10);
                int from = -rng.between(0, 120);
                int till = rng.between(1, 180);
                if (kind == 7) {
                    from = -rng.between(60, 200);
                    till = from + rng.between(1, 50);
                } else if (kind == 8)
                    till = 0;
                else if (kind == 9) {
                    from = rng.between(1, 30);
                    till = from + rng.between(30, 90);
                }
                add(c + 1, it, currency, from, till);
            }
        }
    }

    // --------------------------------------------------------- documents

    struct DocLine {
        int part;
        double quant;
        QVariant tquant;
        int packs; // -1: no package row
    };

    // Quantities the readers must survive appear in the first lines of
    // every line table.
    std::vector<DocLine> docLines(Random& rng, int docIndex, int& lineCounter)
    {
        static const double forced[] = {0, 2.5, 1200, -5, 1000, 0.75, 1, 12};
        const int n = docIndex == 0 ? 4 : rng.between(1, rng.chance(20) ? 9 : 4);
        std::vector<DocLine> out;
        for (int k = 0; k < n; ++k) {
            DocLine l;
            l.part = lineItem(rng) + 1;
            const int r = rng.below(100);
            if (lineCounter < int(std::size(forced)))
                l.quant = forced[lineCounter];
            else if (r < 5)
                l.quant = 0;
            else if (r < 15)
                l.quant = rng.between(1, 40) / 4.0;
            else if (r < 20)
                l.quant = rng.between(1001, 5000);
            else if (r < 23)
                l.quant = -rng.between(1, 10);
            else
                l.quant = rng.between(1, 60);
            const int t = rng.below(100);
            if (t < 30)
                l.tquant = kNull;
            else if (t < 40)
                l.tquant = roundedMoney(l.quant / 3.0);
            else
                l.tquant = l.quant * 12;
            const int p = rng.below(100);
            l.packs = p < 15 ? -1 : p < 25 ? 0 : rng.between(1, 12);
            ++lineCounter;
            out.push_back(l);
        }
        return out;
    }

    QVariant details(Random& rng)
    {
        static const auto texts = list({"משלוח דחוף", "לאסוף מהמחסן", "קומה 2, כניסה ב'", "לתאם טלפונית",
                                        "Urgent", "12 קרטונים"});
        const int r = rng.below(100);
        if (r < 40)
            return kNull;
        if (r < 50)
            return u8("");
        if (r < 75)
            return QString::number(rng.between(0, 24));
        return rng.pick(texts);
    }

    QVariant reference(Random& rng)
    {
        const int r = rng.below(100);
        if (r < 30)
            return kNull;
        if (r < 38)
            return u8("");
        if (r < 48)
            return QStringLiteral("%1 %2").arg(u8("הזמנה")).arg(rng.between(100, 9999));
        if (r < 52)
            return QStringLiteral("P/O'%1").arg(rng.between(10, 99));
        return QStringLiteral("PO-%1").arg(rng.between(1000, 99999));
    }

    // Document dates spread over the last three months, in id order: count
    // days back drawn at once, handed out from the earliest, the last one
    // today. Kept as a count a day, not a list of dates.
    class DocDates {
    public:
        DocDates(Random& rng, int count, const QDate& today)
            : m_today(today)
        {
            for (int i = 0; i < count; ++i)
                ++m_left[size_t(rng.between(0, 89))];
            // The latest date drawn becomes today.
            for (size_t back = 0; back < m_left.size(); ++back)
                if (m_left[back] > 0) {
                    --m_left[back];
                    ++m_left[0];
                    break;
                }
        }
        bool done()
        {
            while (m_back >= 0 && m_left[size_t(m_back)] == 0)
                --m_back;
            return m_back < 0;
        }
        // The next date; not after done().
        QDate peek() { return done() ? QDate() : m_today.addDays(-m_back); }
        QDate next()
        {
            const QDate d = peek();
            --m_left[size_t(m_back)];
            return d;
        }

    private:
        QDate m_today;
        std::array<int, 90> m_left{}; // documents left, by days back
        int m_back = 89;
    };

    QString docNumber(const char* prefix, const QDate& date, int& counter)
    {
        return QStringLiteral("%1%2%3")
            .arg(QLatin1String(prefix))
            .arg(date.year() % 100, 2, 10, QLatin1Char('0'))
            .arg(++counter, 6, 10, QLatin1Char('0'));
    }

    // Documents 1 and 2 of a customer kind go to the consolidated branches,
    // 3 to a key with a double quote; the rest to anyone.
    int customerFor(Random& rng, int docIndex)
    {
        if (docIndex >= 1 && docIndex <= 3)
            return docIndex == 3 ? 5 : docIndex + 1;
        return rng.below(m_customerCount) + 1;
    }

    int supplierFor(Random& rng, int docIndex)
    {
        if (docIndex < 2)
            return docIndex + 1;
        return rng.between(1, m_supplierCount);
    }

    QVariant finalFlag(Random& rng, int docIndex)
    {
        if (docIndex == 1)
            return kNull;
        if (docIndex == 4)
            return u8("N");
        const int r = rng.below(100);
        return r < 10 ? kNull : r < 15 ? QVariant(u8("N")) : QVariant(u8("Y"));
    }

    // The first document of a kind also has a line with the blank-key item
    // and one with a service item.
    void oddLines(std::vector<DocLine>& lines, int docIndex)
    {
        if (docIndex != 0)
            return;
        lines.push_back({kBlankKey + 1, 3, kNull, 1});
        lines.push_back({m_itemCount + 1, 1, kNull, -1}); // the first service item
    }

    void orders()
    {
        Random rng(0x6006);
        const Rows head = rows("ORDERS");
        const Rows lines = rows("ORDERITEMS");
        const Rows ext = rows("ORDERITEMSA");
        DocDates dates(rng, 8 + m_itemCount / 40, m_today);
        int number = 0, ordi = 0, lineCounter = 0;
        for (int d = 0; !dates.done(); ++d) {
            const int ord = 1001 + d;
            const QDate date = dates.next();
            head.add({ord, docNumber("SO", date, number), customerFor(rng, d), date, reference(rng), details(rng)});
            auto ls = docLines(rng, d, lineCounter);
            oddLines(ls, d);
            for (size_t k = 0; k < ls.size(); ++k) {
                ++ordi;
                // The package count lives in the extension table only.
                lines.add({ordi, ord, int(k + 1), ls[k].part, ls[k].quant, ls[k].tquant, 0});
                if (ls[k].packs >= 0)
                    ext.add({ordi, ls[k].packs});
            }
        }
    }

    void purchaseOrders()
    {
        Random rng(0x7007);
        const Rows head = rows("PORDERS");
        const Rows lines = rows("PORDERITEMS");
        const Rows ext = rows("PORDERITEMSA");
        DocDates dates(rng, 5 + m_itemCount / 100, m_today);
        int number = 0, ordi = 0, lineCounter = 0;
        for (int d = 0; !dates.done(); ++d) {
            const int ord = 501 + d;
            const QDate date = dates.next();
            head.add({ord, docNumber("PO", date, number), supplierFor(rng, d), date, reference(rng), details(rng)});
            auto ls = docLines(rng, d, lineCounter);
            for (size_t k = 0; k < ls.size(); ++k) {
                ++ordi;
                lines.add({ordi, ord, int(k + 1), ls[k].part, ls[k].quant, ls[k].tquant, 0});
                if (ls[k].packs >= 0)
                    ext.add({ordi, ls[k].packs});
            }
        }
    }

    void stockDocuments()
    {
        Random rng(0x8008);
        const Rows head = rows("DOCUMENTS");
        const Rows lines = rows("TRANSORDER");
        // Delivery notes, goods receipts, warehouse transfers, and customer
        // returns, which no document type reads.
        struct Kind {
            char type;
            const char* prefix;
            int count;
        };
        const Kind kinds[] = {{'D', "SH", 8 + m_itemCount / 40},
                              {'P', "GR", 5 + m_itemCount / 100},
                              {'T', "WT", 4 + m_itemCount / 200},
                              {'C', "RT", 2 + m_itemCount / 400}};
        struct Pending {
            QDate date;
            int kind;
            int index;
        };
        // The four kinds' dates, all drawn first; the documents in date
        // order, the kinds in the order above on the same day (a stable sort
        // of the four lists one after another).
        std::vector<DocDates> dates;
        for (int k = 0; k < 4; ++k)
            dates.emplace_back(rng, kinds[k].count, m_today);
        int indexes[4] = {0, 0, 0, 0};
        auto nextPending = [&]() -> std::optional<Pending> {
            int first = -1;
            for (int k = 0; k < 4; ++k)
                if (!dates[size_t(k)].done() && (first < 0 || dates[size_t(k)].peek() < dates[size_t(first)].peek()))
                    first = k;
            if (first < 0)
                return std::nullopt;
            return Pending{dates[size_t(first)].next(), first, indexes[first]++};
        };
        int numbers[4] = {0, 0, 0, 0};
        int lineCounter[4] = {0, 0, 0, 0};
        int d = 0;
        for (std::optional<Pending> next; (next = nextPending()); ++d) {
            const Pending& p = *next;
            const Kind& kind = kinds[p.kind];
            const int doc = d + 1;
            int cust = 0, sup = 0;
            if (kind.type == 'D' || kind.type == 'C')
                cust = customerFor(rng, p.index);
            else if (kind.type == 'P')
                sup = supplierFor(rng, p.index);
            head.add({doc, docNumber(kind.prefix, p.date, numbers[p.kind]), QString(QLatin1Char(kind.type)), cust, sup,
                      p.date, reference(rng), details(rng), finalFlag(rng, p.index)});
            auto ls = docLines(rng, p.index, lineCounter[p.kind]);
            if (kind.type == 'D')
                oddLines(ls, p.index);
            for (size_t k = 0; k < ls.size(); ++k)
                lines.add({++m_trans, doc, int(k + 1), ls[k].part, ls[k].quant, ls[k].tquant,
                           ls[k].packs >= 0 ? QVariant(ls[k].packs) : kNull});
        }
        m_lastDoc = d;
    }

    void invoices()
    {
        Random rng(0x9009);
        const Rows head = rows("INVOICES");
        const Rows lines = rows("INVOICEITEMS");
        const Rows packs = rows("TRANSORDER");
        // Invoice ids start above every stock document id, so package rows
        // keyed by invoice never meet the lines of a stock document.
        const int firstIv = (m_lastDoc / 100000 + 1) * 100000 + 1;
        struct Kind {
            char type;
            const char* prefix;
            int count;
        };
        const Kind kinds[] = {{'A', "IN", 8 + m_itemCount / 40}, {'C', "IC", 2 + m_itemCount / 400}};
        int iv = firstIv, kline = 0;
        for (const Kind& kind : kinds) {
            DocDates dates(rng, kind.count, m_today);
            int number = 0, lineCounter = 0;
            for (int d = 0; d < kind.count; ++d, ++iv) {
                const QDate date = dates.next();
                head.add({iv, docNumber(kind.prefix, date, number), QString(QLatin1Char(kind.type)),
                          customerFor(rng, d), date, reference(rng), details(rng), finalFlag(rng, d)});
                auto ls = docLines(rng, d, lineCounter);
                if (kind.type == 'A')
                    oddLines(ls, d);
                for (size_t k = 0; k < ls.size(); ++k) {
                    lines.add({++kline, iv, int(k + 1), ls[k].part, ls[k].quant, ls[k].tquant, 0});
                    if (ls[k].packs >= 0)
                        packs.add({++m_trans, iv, int(k + 1), ls[k].part, ls[k].quant, kNull, ls[k].packs});
                }
            }
        }
    }

    // ---------------------------------------------------- item cards

    void itemCards()
    {
        Random rng(0xA00A);
        const Rows files = rows("PARTEXTFILE");
        const Rows specTypes = rows("PARTSPECTYPES");
        const Rows partSpecs = rows("PARTSPEC");
        const Rows text = rows("PARTTEXT");
        const Rows textLang = rows("PARTTEXTLANG");
        const Rows alt = rows("PARTALT");
        const Rows arc = rows("PARTARC");

        const auto specNames = list({"", "צבע", "חומר", "מידה", "", "משקל (גרם)", "תקן"});
        for (size_t n = 0; n < specNames.size(); ++n)
            specTypes.add({int(n), specNames[n]});

        // Item ids: the screw and the drill of the odd items, then four generated ones.
        struct Id {
            int id;
        };
        const Id screw{2}, drill{6}, g0{7}, g1{8}, g2{9}, g3{10};

        files.add({screw.id, -1, kDemoPictureName, u8("תמונה")});
        files.add({screw.id, 1, u8("..\\system\\mail\\docs\\OR-5.pdf"), u8("מפרט טכני")});
        files.add({drill.id, -1, u8("c:\\pics\\makita-482.png"), u8("Picture")});
        files.add({g0.id, -1, u8(""), u8("")});

        auto specRow = [&](int id, std::vector<QVariant> values) {
            values.resize(10);
            values.insert(values.begin(), id);
            partSpecs.add(values);
        };
        specRow(screw.id, {u8("כסוף"), u8("נירוסטה 304"), u8("M6x20"), u8(""), u8("8"), u8("DIN 933")});
        specRow(drill.id, {u8("טורקיז"), kNull, u8(""), u8("Li-Ion"), u8("1700"), u8("CE")});

        auto texts = [&](const Id& it, std::initializer_list<const char*> he, std::initializer_list<const char*> en) {
            int ord = 0;
            for (const char* t : he)
                text.add({it.id, ++ord, u8(t)});
            ord = 0;
            for (const char* t : en)
                textLang.add({it.id, ++ord, u8(t)});
        };
        texts(screw, {"בורג ראש משושה, הברגה מלאה.", "מתאים לעבודות חוץ (עמיד בפני חלודה).", "אריזה: 100 יח' בקופסה."},
              {"Hex head screw, fully threaded.", "Suitable for outdoor use."});
        texts(drill, {"מברגה/מקדחה רוטטת 18V, 2 מהירויות."}, {"18V LXT cordless hammer drill-driver."});

        alt.add({screw.id, g0.id, screw.id, 1});
        alt.add({screw.id, g1.id, g2.id, 2});
        alt.add({drill.id, g3.id, drill.id, 1});

        arc.add({screw.id, g0.id, 1.0, 4.0, day(-100), day(365)});   // valid
        arc.add({screw.id, g1.id, 1.0, 2.0, day(-400), day(-1)});    // ended yesterday
        arc.add({screw.id, g2.id, 1.0, 0.5, day(1), day(400)});      // starts tomorrow
        arc.add({screw.id, g3.id, 2.0, 1.0, day(0), day(0)});        // today only
        arc.add({drill.id, g0.id, 1.0, 1.0, day(-30), day(30)});

        // A sprinkling of further cards, so large companies have some too.
        for (int i = 10; i < m_itemCount; i += 25) {
            const Item it = m_items.item(i);
            specRow(it.id, {rng.chance(50) ? QVariant(u8("שחור")) : kNull, u8("פלדה"), QString::number(rng.between(1, 99))});
            text.add({it.id, 1, it.des});
            textLang.add({it.id, 1, it.edes.toString()});
            if (i % 50 == 10 && it.type == u'P')
                arc.add({it.id, lineItem(rng) + 1, 1.0, double(rng.between(1, 6)), day(-60), day(300)});
        }
    }

    // ---------------------------------------------------- label lists

    void labelLists()
    {
        Random rng(0xB00B);
        const Rows users = rows("USERS");
        users.add({0, u8("system")});
        users.add({1, u8("admin")});
        users.add({2, u8("avi")});
        users.add({3, u8("דנה")});
        users.add({4, u8("moshe.k")});
        users.add({5, u8("")}); // no login: left out of the user list
        users.add({6, u8("warehouse")});

        const Rows defs = rows("LABELSDEF");
        defs.add({1, u8("מדבקת מדף"), u8("c:\\labels\\shelf.lbl")});
        defs.add({2, u8("מדבקת קרטון"), u8("")});
        defs.add({3, u8("מדבקת מחיר (מבצע)"), kNull});
        defs.add({4, u8("Product 50x30"), u8("\\\\server\\labels\\product.lbl")});
        defs.add({5, u8(""), u8("c:\\labels\\plain.lbl")});

        const Rows labels = rows("LABELS");
        const auto& fams = families();
        int kline = 0;
        // User 3 has an empty list.
        for (const auto& [user, count] : {std::pair{1, 8}, std::pair{2, 3}, std::pair{4, 2}, std::pair{6, 12}}) {
            for (int n = 0; n < count; ++n) {
                const Item it = m_items.item(n == 0 && user == 1 ? 0 : lineItem(rng));
                std::vector<QVariant> row{user, ++kline, n == 2 ? 0 : rng.between(1, 10), rng.between(1, 5),
                                          rng.between(1, 4)};
                row.push_back(it.key);
                row.push_back(it.des);
                row.push_back(it.barcode);
                row.push_back(QString::number(money(it.cents), 'f', 2));
                row.push_back(unitNames()[size_t(it.unit - 1)]);
                row.push_back(kNull);
                row.push_back(u8(""));
                row.push_back(u8(fams[size_t(it.family - 1)].des));
                row.resize(5 + 20);
                labels.add(row);
            }
        }
        // A text too long for the label field in its cell form (2n + 1).
        std::vector<QVariant> longText{6, ++kline, 1, 1, 5, u8("LONG-1"),
                                       u8("מדבקה עם תאור ארוך במיוחד שאינו נכנס בשדה של מאה תווים")};
        longText.resize(5 + 20);
        labels.add(longText);
    }

    const DemoOptions m_options;
    const QDate m_today;
    const int m_itemCount;
    const std::vector<Table>& m_tables;
    RowSink& m_sink;
    ItemSource m_items;
    int m_customerCount = 0; // ids 1 to this
    int m_supplierCount = 0; // ids 1 to this
    int m_trans = 0;
    int m_lastDoc = 0;
};

// ------------------------------------------------------------------ writers

enum class Dialect { Sqlite, Postgres };

// USER is reserved in PostgreSQL; there the label lists keep it quoted in its
// folded spelling, so the script still loads.
QString identifier(const QString& name, Dialect dialect)
{
    if (dialect == Dialect::Postgres && name.compare(QLatin1String("USER"), Qt::CaseInsensitive) == 0)
        return QStringLiteral("\"user\"");
    return name;
}

QString columnType(const Column& c, short connType, Dialect dialect)
{
    switch (c.kind) {
    case Kind::Int: return QStringLiteral("INTEGER");
    case Kind::Real: return dialect == Dialect::Postgres ? QStringLiteral("DOUBLE PRECISION") : QStringLiteral("REAL");
    case Kind::Text: return QStringLiteral("VARCHAR(%1)").arg(c.width);
    case Kind::Char: return QStringLiteral("CHAR(%1)").arg(c.width);
    case Kind::Date: return connType == 2 ? QStringLiteral("INTEGER") : QStringLiteral("DATE");
    }
    return QString();
}

QString createTableSql(const Table& t, short connType, Dialect dialect)
{
    QStringList parts;
    for (const Column& c : t.columns) {
        QString def = identifier(c.name, dialect) + QLatin1Char(' ') + columnType(c, connType, dialect);
        if (t.key.contains(c.name))
            def += QLatin1String(" NOT NULL");
        parts << def;
    }
    if (!t.key.isEmpty()) {
        QStringList key;
        for (const QString& k : t.key)
            key << identifier(k, dialect);
        parts << QStringLiteral("CONSTRAINT PK_%1 PRIMARY KEY (%2)").arg(t.name, key.join(QLatin1String(", ")));
    }
    return QStringLiteral("CREATE TABLE %1 (\n  %2\n)").arg(t.name, parts.join(QLatin1String(",\n  ")));
}

QStringList createIndexSql(const Table& t, Dialect dialect)
{
    QStringList out;
    int n = 0;
    for (const QStringList& index : t.indexes) {
        QStringList cols;
        for (const QString& c : index)
            cols << identifier(c, dialect);
        out << QStringLiteral("CREATE INDEX IX_%1_%2 ON %1 (%3)").arg(t.name).arg(++n).arg(cols.join(QLatin1String(", ")));
    }
    return out;
}

QString columnList(const Table& t, Dialect dialect)
{
    QStringList cols;
    for (const Column& c : t.columns)
        cols << identifier(c.name, dialect);
    return cols.join(QLatin1String(", "));
}

QString sqlLiteral(const QVariant& v)
{
    if (v.isNull())
        return QStringLiteral("NULL");
    switch (v.metaType().id()) {
    case QMetaType::Int:
    case QMetaType::LongLong: return QString::number(v.toLongLong());
    case QMetaType::Double: return QString::number(v.toDouble(), 'g', QLocale::FloatingPointShortest);
    case QMetaType::QDate: return QLatin1Char('\'') + v.toDate().toString(Qt::ISODate) + QLatin1Char('\'');
    default: {
        QString t = v.toString();
        t.replace(QLatin1Char('\''), QLatin1String("''"));
        return QLatin1Char('\'') + t + QLatin1Char('\'');
    }
    }
}

// The SQLite writer: each row inserted as it comes, through one prepared
// statement a table, all in the one transaction.
class SqliteRows : public RowSink {
public:
    SqliteRows(const std::vector<Table>& tables, short connType)
        : m_tables(tables)
        , m_connType(connType)
    {
    }

    DbError prepare(Database& db)
    {
        for (const Table& t : m_tables) {
            QStringList marks;
            for (size_t i = 1; i <= t.columns.size(); ++i)
                marks << QStringLiteral("?%1").arg(i);
            DbError e;
            m_inserts.push_back(db.prepare(QStringLiteral("INSERT INTO %1 (%2) VALUES (%3)")
                                               .arg(t.name, columnList(t, Dialect::Sqlite), marks.join(QLatin1String(", "))),
                                           &e));
            if (e)
                return e;
        }
        return {};
    }

    void add(size_t table, const QVariant* cells, size_t count) override
    {
        if (m_error)
            return;
        Statement& insert = m_inserts[table];
        const std::vector<Column>& columns = m_tables[table].columns;
        for (size_t c = 0; c < count; ++c)
            if (!insert.bind(int(c + 1), storedValue(columns[c], cells[c], m_connType))) {
                m_error = insert.error();
                return;
            }
        m_error = insert.run();
    }
    bool failed() const override { return m_error.isError(); }
    const DbError& error() const { return m_error; }

private:
    const std::vector<Table>& m_tables;
    const short m_connType;
    std::vector<Statement> m_inserts;
    DbError m_error;
};

// The script writer gathers every table's rows, in order, to print them
// table after table.
class GatheredRows : public RowSink {
public:
    explicit GatheredRows(size_t tables)
        : m_cells(tables)
    {
    }
    void add(size_t table, const QVariant* cells, size_t count) override
    {
        m_cells[table].insert(m_cells[table].end(), cells, cells + count);
    }
    bool failed() const override { return false; }
    // Row after row.
    const std::vector<QVariant>& cells(size_t table) const { return m_cells[table]; }

private:
    std::vector<std::vector<QVariant>> m_cells;
};

} // namespace

DbError CreateDemoErp(const QString& path, const DemoOptions& options)
{
    const std::vector<Table> tables = schema(options.labelLists);

    if (QFile::exists(path) && !QFile::remove(path))
        return DbError::other(QStringLiteral("cannot replace %1").arg(path));
    DbError result;
    {
        Database db;
        if (DbError e = db.open(path, Database::OpenMode::Create))
            return e;
        Transaction tx(db);
        if (tx.error())
            return tx.error();
        result = [&]() -> DbError {
            for (const Table& t : tables)
                if (DbError e = db.exec(createTableSql(t, options.connType, Dialect::Sqlite)))
                    return e;
            SqliteRows sink(tables, options.connType);
            if (DbError e = sink.prepare(db))
                return e;
            Builder(options, tables, sink).build();
            if (sink.failed())
                return sink.error();
            // Indexes after the rows: cheaper than keeping them up to date.
            for (const Table& t : tables)
                for (const QString& sql : createIndexSql(t, Dialect::Sqlite))
                    if (DbError e = db.exec(sql))
                        return e;
            return {};
        }();
        if (!result)
            result = tx.commit();
    }
    if (result)
        QFile::remove(path);
    return result;
}

QString DemoErpScript(const DemoOptions& options)
{
    const std::vector<Table> tables = schema(options.labelLists);
    GatheredRows gathered(tables.size());
    Builder(options, tables, gathered).build();
    const Dialect pg = Dialect::Postgres;
    QString out;
    out += QLatin1String("-- Tagora demo ERP company (connection type ") + QString::number(options.connType)
        + QLatin1String(", ") + options.today.toString(Qt::ISODate) + QLatin1String(")\n");
    out += QLatin1String("SET client_encoding = 'UTF8';\nSET standard_conforming_strings = on;\n"
                          "SET client_min_messages = warning;\nBEGIN;\n");
    for (auto it = tables.rbegin(); it != tables.rend(); ++it)
        out += QLatin1String("DROP TABLE IF EXISTS ") + it->name + QLatin1String(";\n");
    for (size_t ti = 0; ti < tables.size(); ++ti) {
        const Table& t = tables[ti];
        const std::vector<QVariant>& cells = gathered.cells(ti);
        const size_t width = t.columns.size();
        out += QLatin1Char('\n') + createTableSql(t, options.connType, pg) + QLatin1String(";\n");
        const int rows = int(cells.size() / width);
        const QString head = QLatin1String("INSERT INTO ") + t.name + QLatin1String(" (") + columnList(t, pg)
            + QLatin1String(") VALUES\n");
        // Several hundred rows a statement keeps the load quick without
        // making any one statement huge.
        for (int r = 0; r < rows; ++r) {
            out += r % 500 == 0 ? head : QStringLiteral(",\n");
            out += QLatin1Char('(');
            for (size_t c = 0; c < width; ++c) {
                if (c)
                    out += QLatin1String(", ");
                out += sqlLiteral(storedValue(t.columns[c], cells[size_t(r) * width + c], options.connType));
            }
            out += QLatin1Char(')');
            if (r % 500 == 499 || r == rows - 1)
                out += QLatin1String(";\n");
        }
        for (const QString& sql : createIndexSql(t, pg))
            out += sql + QLatin1String(";\n");
    }
    out += QLatin1String("COMMIT;\n");
    return out;
}

} // namespace tagora
