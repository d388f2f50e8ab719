#include "labels/barcode.h"

#include "erp/textconv.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>
#include <QtEndian>

#include <cmath>
#include <optional>
#include <zint.h>

#ifdef Q_OS_UNIX
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#endif

// How the library's settings reach libzint.
//
// | library code | symbology              | zint symbology                   | CheckDigit                     | data accepted                         |
// |--------------|------------------------|----------------------------------|--------------------------------|---------------------------------------|
// | 0            | Code 39                | BARCODE_CODE39                   | mod-43 character (option_2 1)  | 0-9 A-Z space - . $ / + %             |
// | 0 + C39Ascii | Code 39 full ASCII     | BARCODE_EXCODE39                 | mod-43 character (option_2 1)  | ASCII 0-127                           |
// | 1            | Code 128, automatic    | BARCODE_CODE128                  | none (mod 103 always present)  | Latin-1                               |
// | 14           | Code 128 subset A      | BARCODE_CODE128B (no subset C)   | none (mod 103 always present)  | U+0000-U+005F (subset A's characters) |
// | 15           | Code 128 subset B      | BARCODE_CODE128B (no subset C)   | none (mod 103 always present)  | U+0020-U+007F (subset B's characters) |
// | 9            | EAN-8                  | BARCODE_EANX / BARCODE_EANX_CHK  | on: 7 digits get one added;    | 7 digits (check on) or 8 digits       |
// |              |                        |                                  | 8 digits: the last is verified |                                       |
// | 10           | EAN-13                 | BARCODE_EANX / BARCODE_EANX_CHK  | as EAN-8, with 12 and 13       | 12 digits (check on) or 13 digits     |
// | 4            | Interleaved 2 of 5     | BARCODE_C25INTER                 | mod-10 digit (option_2 1)      | digits, an even count with the check  |
// | other        | -                      | -                                | -                              | refused at output                     |
//
// | setting          | zint                                                                                   |
// |------------------|----------------------------------------------------------------------------------------|
// | Unit             | only 0 = inches; any other unit is refused at output                                   |
// | DimX, UserResoX  | module of round(DimX * resolution) pixels, at least 1: scale = pixels / 2              |
// |                  | (zint's raster draws 2 pixels per module at scale 1)                                   |
// | BarHeight, ResoY | height = BarHeight * resolution / module pixels (zint counts height in modules);       |
// |                  | 0 or less leaves zint's own default (50 modules); the text is drawn below, extra       |
// | resolution <= 0  | 200 dots per inch                                                                      |
// | ShowDesc         | show_hrt; zint draws no text when a module is 1 pixel                                  |
// | Data             | UTF-8 with input_mode UNICODE_MODE, so zint refuses what the symbology cannot hold     |
// | Rotation         | quarter turns 0-3 -> ZBarcode_Print's 0/90/180/270 degrees; other values refused       |
// | quiet zones      | BARCODE_QUIET_ZONES for Code 39, Code 128 and 2 of 5 (EAN has them always)             |
// | WideBarRatio     | not used: zint draws Code 39 and 2 of 5 wide bars at 3:1, within the 2:1-3:1 that the  |
// |                  | symbologies allow; the other symbologies have no wide bars                             |
// | Desc             | not used: zint prints the encoded text, which is what the page always passes as Desc   |
// | C128User, UPCEUser, MatchDesc, MatchFrame, MultiLine, HoriAlign, VertAlign | not used: the picture is the  |
// |                  | symbol and its quiet zones, with nothing to align or frame                             |

namespace tagora {

namespace {

struct SymbolDeleter {
    void operator()(zint_symbol* symbol) const { ZBarcode_Delete(symbol); }
};
using SymbolPtr = std::unique_ptr<zint_symbol, SymbolDeleter>;

constexpr int kDefaultResolution = 200;
// zint refuses a scale above 100, i.e. modules wider than 200 pixels.
constexpr double kMaxModulePixels = 200.0;

// The symbology as the designer's list names it, so the user knows it again.
QString symbologyName(int code, bool fullAscii)
{
    switch (code) {
    case 0: return fullAscii ? QStringLiteral("CODE-39 Ascii") : QStringLiteral("CODE-39");
    case 1: return QStringLiteral("CODE-128");
    case 14: return QStringLiteral("CODE-128A");
    case 15: return QStringLiteral("CODE-128B");
    case 9: return QStringLiteral("EAN-8");
    case 10: return QStringLiteral("EAN-13");
    case 4: return QStringLiteral("Interleaved 2 of 5");
    default: return QStringLiteral("מסוג %1").arg(code);
    }
}

// The characters of a value one by one: an emoji is one character, named
// whole in a message, never half of it.
template <class Visit> QString firstRefused(const QString& data, Visit refuses)
{
    for (qsizetype i = 0; i < data.size();) {
        const qsizetype units = CharUnitsAt(data, i);
        const char32_t u = units == 2 ? QChar::surrogateToUcs4(data[i], data[i + 1]) : data[i].unicode();
        const QString one = data.mid(i, units);
        i += units;
        if (refuses(u, one))
            return one;
    }
    return QString();
}

QString invalidCharacter(const QString& one, const QString& allowed)
{
    const char16_t u = one.size() == 1 ? one.front().unicode() : 0;
    const QString shown = one.size() == 1 && (u < 0x20 || u == 0x7F)
        ? QStringLiteral("תו הבקרה שקודו %1").arg(u)
        : QStringLiteral("התו '%1'").arg(one);
    return QStringLiteral("%1 אינו חוקי: %2").arg(shown, allowed);
}

// The first character of data that zint's symbology does not carry, with
// what it does carry; empty when every character is one it carries.
QString refusedCharacter(int symbology, const QString& data)
{
    QString allowed;
    const QString one = firstRefused(data, [&](char32_t u, const QString&) {
        switch (symbology) {
        case BARCODE_CODE39:
            allowed = QStringLiteral("מותרים רק ספרות, אותיות גדולות באנגלית, רווח והסימנים - . $ / + %");
            return !((u >= '0' && u <= '9') || (u >= 'A' && u <= 'Z') || (u < 0x80 && QStringLiteral(" -.$/+%").contains(QChar(u))));
        case BARCODE_EXCODE39:
            allowed = QStringLiteral("מותרים רק אותיות באנגלית, ספרות, סימנים ותווי בקרה");
            return u > 0x7F;
        case BARCODE_CODE128:
            allowed = QStringLiteral("מותרים רק אותיות לטיניות, ספרות וסימנים");
            return u > 0xFF;
        default: return false;
        }
    });
    return one.isEmpty() ? QString() : invalidCharacter(one, allowed);
}

// The check digit an EAN of full length should end with.
QChar eanCheckDigit(const QString& digits)
{
    int sum = 0;
    int weight = 3;
    for (int i = int(digits.size()) - 2; i >= 0; --i) {
        sum += (digits[i].unicode() - '0') * weight;
        weight = 4 - weight;
    }
    return QChar('0' + (10 - sum % 10) % 10);
}

// Why zint refused to encode, in words for the user.
QString encodeRefusal(int rc, const zint_symbol& symbol, const QString& data)
{
    switch (rc) {
    case ZINT_ERROR_TOO_LONG:
        return QStringLiteral("הערך ארוך מדי לסוג ברקוד זה (%1 תווים)").arg(data.size());
    case ZINT_ERROR_INVALID_DATA: {
        const QString character = refusedCharacter(symbol.symbology, data);
        return character.isEmpty() ? QStringLiteral("הערך מכיל תווים שסוג ברקוד זה אינו מקבל") : character;
    }
    case ZINT_ERROR_INVALID_CHECK:
        if (symbol.symbology == BARCODE_EANX_CHK && !data.isEmpty())
            return QStringLiteral("ספרת הביקורת שגויה: %1 במקום %2").arg(data.back()).arg(eanCheckDigit(data));
        return QStringLiteral("ספרת הביקורת שגויה");
    case ZINT_ERROR_INVALID_OPTION: return QStringLiteral("הגדרות הברקוד אינן מתאימות לסוג ברקוד זה");
    case ZINT_ERROR_ENCODING_PROBLEM: return QStringLiteral("תקלה פנימית בקידוד הערך");
    case ZINT_ERROR_FILE_ACCESS:
    case ZINT_ERROR_FILE_WRITE: return QStringLiteral("לא ניתן לכתוב את קובץ התמונה");
    case ZINT_ERROR_MEMORY: return QStringLiteral("אין די זיכרון");
    default: return QStringLiteral("ספריית הברקודים החזירה שגיאה %1").arg(rc);
    }
}

// What one picture asks of zint.
struct Recipe {
    int symbology = BARCODE_CODE128;
    int checkOption = 0;
    bool quietZones = true;
};

// Chooses zint's symbology for the data, or says why the data cannot be drawn.
// The checks here cover what zint would otherwise "fix" silently: it upper-cases
// Code 39, pads 2 of 5 with a leading zero, and turns EAN data of the wrong
// length into another EAN (7 digits under EAN-13 become an EAN-8).
bool chooseSymbology(int code, const QString& data, bool fullAscii, bool checkDigit, Recipe* recipe,
                     QString* why)
{
    auto refuse = [why](const QString& text) {
        *why = text;
        return false;
    };
    if (data.isEmpty())
        return refuse(QStringLiteral("אין ערך לקידוד"));
    auto firstOutside = [&data](char32_t first, char32_t last) {
        return firstRefused(data, [&](char32_t u, const QString&) { return u < first || u > last; });
    };
    auto firstNonDigit = [&firstOutside]() { return firstOutside('0', '9'); };
    switch (code) {
    case 0:
        if (fullAscii) {
            recipe->symbology = BARCODE_EXCODE39;
        } else {
            const QString lower = firstRefused(data, [](char32_t u, const QString&) { return QChar::isLower(u); });
            if (!lower.isEmpty())
                return refuse(invalidCharacter(lower, QStringLiteral("ב-CODE-39 אין אותיות קטנות (יש ב-CODE-39 Ascii)")));
            recipe->symbology = BARCODE_CODE39;
        }
        recipe->checkOption = checkDigit ? 1 : 0;
        return true;
    case 1:
        recipe->symbology = BARCODE_CODE128;
        return true;
    case 14:
        if (const QString c = firstOutside(0x00, 0x5F); !c.isEmpty())
            return refuse(invalidCharacter(c, QStringLiteral("מותרים רק אותיות גדולות באנגלית, ספרות, סימנים ותווי בקרה")));
        recipe->symbology = BARCODE_CODE128B;
        return true;
    case 15:
        if (const QString c = firstOutside(0x20, 0x7F); !c.isEmpty())
            return refuse(invalidCharacter(c, QStringLiteral("מותרים רק אותיות באנגלית, ספרות וסימנים")));
        recipe->symbology = BARCODE_CODE128B;
        return true;
    case 9:
    case 10: {
        const int full = code == 9 ? 8 : 13;
        if (const QString c = firstNonDigit(); !c.isEmpty())
            return refuse(invalidCharacter(c, QStringLiteral("מותרות ספרות בלבד")));
        recipe->quietZones = false;
        if (data.size() == full) {
            recipe->symbology = BARCODE_EANX_CHK; // the last digit is verified
            return true;
        }
        if (data.size() == full - 1 && checkDigit) {
            recipe->symbology = BARCODE_EANX; // zint adds the check digit
            return true;
        }
        if (checkDigit)
            return refuse(QStringLiteral("אורך שגוי: %1 ספרות, ונדרשות %2 ספרות, או %3 עם ספרת הביקורת")
                              .arg(data.size())
                              .arg(full - 1)
                              .arg(full));
        return refuse(QStringLiteral("אורך שגוי: %1 ספרות, ונדרשות %2 ספרות כולל ספרת הביקורת").arg(data.size()).arg(full));
    }
    case 4: {
        if (const QString c = firstNonDigit(); !c.isEmpty())
            return refuse(invalidCharacter(c, QStringLiteral("מותרות ספרות בלבד")));
        const int digits = int(data.size()) + (checkDigit ? 1 : 0);
        if (digits % 2 != 0) {
            return refuse(checkDigit
                              ? QStringLiteral("אורך שגוי: %1 ספרות, ונדרש מספר אי-זוגי של ספרות (ספרת הביקורת משלימה לזוגי)")
                                    .arg(data.size())
                              : QStringLiteral("אורך שגוי: %1 ספרות, ונדרש מספר זוגי של ספרות").arg(data.size()));
        }
        recipe->symbology = BARCODE_C25INTER;
        recipe->checkOption = checkDigit ? 1 : 0;
        return true;
    }
    default:
        return refuse(QStringLiteral("סוג הברקוד אינו נתמך"));
    }
}

// zint 2.11 writes the picture through stdio and looks at neither fwrite's
// nor fclose's result: a disk that fills up mid-picture leaves a cut file (or
// an empty one) and a success. The BMP header states the whole file's size,
// so a file of any other size was cut short.
bool wholeBitmap(const QString& path)
{
#ifdef Q_OS_UNIX
    // One descriptor for the header and the size: QFile would stat the file
    // again on open and on size(), and this runs once per picture.
    const int fd = ::open(QFile::encodeName(path).constData(), O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        return false;
    char head[6];
    struct stat st {};
    const bool whole = ::pread(fd, head, sizeof head, 0) == ssize_t(sizeof head) && head[0] == 'B' && head[1] == 'M'
                       && ::fstat(fd, &st) == 0 && qint64(st.st_size) == qint64(qFromLittleEndian<quint32>(head + 2));
    ::close(fd);
    return whole;
#else
    QFile f(path);
    if (!f.open(QIODevice::ReadOnly))
        return false;
    const QByteArray head = f.read(6);
    if (head.size() < 6 || !head.startsWith("BM"))
        return false;
    return f.size() == qint64(qFromLittleEndian<quint32>(head.constData() + 2));
#endif
}

// Removes what stands at path, a link included (not its target). The job
// folder was emptied beforehand, so "nothing there" is the usual answer and
// must cost no more than the one call.
bool removeStale(const QString& path)
{
#ifdef Q_OS_UNIX
    return ::unlink(QFile::encodeName(path).constData()) == 0 || errno == ENOENT;
#else
    if (QFile::remove(path))
        return true;
    const QFileInfo left(path);
    return !left.exists() && !left.isSymLink();
#endif
}

} // namespace

struct ZintBarcodeLibrary::Instance {
    SymbolPtr symbol;
    int unit = 0;
    int code = 1;
    QString data;
    float dimX = 0.01f;
    float barHeight = 0.4f;
    int rotation = 0;
    bool c39Ascii = false;
    bool checkDigit = false;
    bool showDesc = false;
    int resoX = kDefaultResolution;
    int resoY = kDefaultResolution;
    bool unwritten = false; // the last output failed for the file
};

ZintBarcodeLibrary::ZintBarcodeLibrary() = default;
ZintBarcodeLibrary::~ZintBarcodeLibrary() = default;

ZintBarcodeLibrary::Instance* ZintBarcodeLibrary::find(qint32 handle) const
{
    auto it = m_instances.find(handle);
    return it == m_instances.end() ? nullptr : it->second.get();
}

qint32 ZintBarcodeLibrary::A1OpenInstance()
{
    auto instance = std::make_unique<Instance>();
    instance->symbol.reset(ZBarcode_Create());
    if (!instance->symbol)
        return 0; // no handle: every output on it fails
    const qint32 handle = m_nextHandle++;
    m_instances[handle] = std::move(instance);
    return handle;
}

void ZintBarcodeLibrary::A1CloseInstance(qint32 handle)
{
    m_instances.erase(handle);
}

void ZintBarcodeLibrary::A1SetUnit(qint32 handle, int unit)
{
    if (Instance* in = find(handle))
        in->unit = unit;
}

void ZintBarcodeLibrary::A1SetBarType(qint32 handle, int code)
{
    if (Instance* in = find(handle))
        in->code = code;
}

void ZintBarcodeLibrary::A1SetData(qint32 handle, const QString& data)
{
    if (Instance* in = find(handle))
        in->data = data;
}

void ZintBarcodeLibrary::A1SetDimX(qint32 handle, float dimX)
{
    if (Instance* in = find(handle))
        in->dimX = dimX;
}

void ZintBarcodeLibrary::A1SetBarHeight(qint32 handle, float height)
{
    if (Instance* in = find(handle))
        in->barHeight = height;
}

void ZintBarcodeLibrary::A1SetRotation(qint32 handle, int rotation)
{
    if (Instance* in = find(handle))
        in->rotation = rotation;
}

void ZintBarcodeLibrary::A1SetC39Ascii(qint32 handle, bool on)
{
    if (Instance* in = find(handle))
        in->c39Ascii = on;
}

void ZintBarcodeLibrary::A1SetCheckDigit(qint32 handle, bool on)
{
    if (Instance* in = find(handle))
        in->checkDigit = on;
}

void ZintBarcodeLibrary::A1SetShowDesc(qint32 handle, bool on)
{
    if (Instance* in = find(handle))
        in->showDesc = on;
}

void ZintBarcodeLibrary::A1SetUserResoX(qint32 handle, int dpi)
{
    if (Instance* in = find(handle))
        in->resoX = dpi > 0 ? dpi : kDefaultResolution;
}

void ZintBarcodeLibrary::A1SetUserResoY(qint32 handle, int dpi)
{
    if (Instance* in = find(handle))
        in->resoY = dpi > 0 ? dpi : kDefaultResolution;
}

// Settings zint has no counterpart for (see the table above).
void ZintBarcodeLibrary::A1SetDesc(qint32, const QString&) {}
void ZintBarcodeLibrary::A1SetWideBarRatio(qint32, float) {}
void ZintBarcodeLibrary::A1SetHoriAlign(qint32, int) {}
void ZintBarcodeLibrary::A1SetVertAlign(qint32, int) {}
void ZintBarcodeLibrary::A1SetC128User(qint32, bool) {}
void ZintBarcodeLibrary::A1SetMatchDesc(qint32, bool) {}
void ZintBarcodeLibrary::A1SetMatchFrame(qint32, bool) {}
void ZintBarcodeLibrary::A1SetMultiLine(qint32, bool) {}
void ZintBarcodeLibrary::A1SetUPCEUser(qint32, bool) {}

bool ZintBarcodeLibrary::A1OutputBitmap(qint32 handle, const QString& path, QString* error)
{
    Instance* in = find(handle);
    QString shown = in ? in->data : QString();
    if (CharCount(shown) > 40)
        shown = LeftChars(shown, 40) + QStringLiteral("...");
    // The value, the barcode type and why: the user fixes the value or the type.
    const QString what = in ? QStringLiteral("ברקוד %1 לערך \"%2\": ").arg(symbologyName(in->code, in->c39Ascii), shown)
                            : QStringLiteral("ברקוד: ");
    auto fail = [&](const QString& why) {
        if (error)
            *error = what + why;
        return false;
    };
    if (in)
        in->unwritten = false;
    auto failFile = [&](const QString& why) {
        if (in)
            in->unwritten = true;
        return fail(why);
    };
    const QString shownPath = QDir::toNativeSeparators(path);

    // The page names this picture whether or not it is made, so a picture left
    // from an earlier job would be printed for this record.
    if (!removeStale(path))
        return failFile(QStringLiteral("לא ניתן למחוק את התמונה הקודמת '%1'").arg(shownPath));
    if (!in)
        return fail(QStringLiteral("מזהה ספריית הברקודים %1 אינו פתוח").arg(handle));

    if (in->unit != 0)
        return fail(QStringLiteral("יחידת המידה %1 אינה נתמכת (0 = אינצ'ים)").arg(in->unit));
    if (in->rotation < 0 || in->rotation > 3)
        return fail(QStringLiteral("סיבוב %1 אינו נתמך (0 עד 3 רבעי סיבוב)").arg(in->rotation));
    const double modulePixelsExact = double(in->dimX) * in->resoX;
    if (!(modulePixelsExact > 0) || modulePixelsExact > kMaxModulePixels)
        return fail(QStringLiteral("רוחב הפס הצר %1 מחוץ לתחום").arg(QString::number(double(in->dimX))));
    const int modulePixels = qMax(1, int(std::lround(modulePixelsExact)));
    const double heightModules = double(in->barHeight) * in->resoY / modulePixels;
    if (!std::isfinite(heightModules))
        return fail(QStringLiteral("גובה הפסים %1 מחוץ לתחום").arg(QString::number(double(in->barHeight))));

    Recipe recipe;
    QString why;
    if (!chooseSymbology(in->code, in->data, in->c39Ascii, in->checkDigit, &recipe, &why))
        return fail(why);

    // A fresh symbol for every picture: zint writes back into its settings
    // (height, text) while encoding, and nothing may carry over.
    in->symbol.reset(ZBarcode_Create());
    zint_symbol* symbol = in->symbol.get();
    if (!symbol)
        return fail(QStringLiteral("אין די זיכרון"));
    symbol->symbology = recipe.symbology;
    symbol->input_mode = UNICODE_MODE;
    symbol->option_2 = recipe.checkOption;
    symbol->scale = float(modulePixels) / 2.0f;
    if (heightModules > 0)
        symbol->height = float(heightModules);
    symbol->show_hrt = in->showDesc ? 1 : 0;
    if (recipe.quietZones)
        symbol->output_options |= BARCODE_QUIET_ZONES;

    const QByteArray utf8 = in->data.toUtf8();
    int rc = ZBarcode_Encode(symbol, reinterpret_cast<const unsigned char*>(utf8.constData()), int(utf8.size()));
    if (rc >= ZINT_ERROR)
        return fail(encodeRefusal(rc, *symbol, in->data));

    // zint chooses the format by the name's extension and keeps the name in a
    // fixed buffer; any other name is written in a scratch folder and moved.
    const QByteArray nativeName = QFile::encodeName(path);
    const bool direct = path.endsWith(QLatin1String(".bmp"), Qt::CaseInsensitive)
                        && nativeName.size() < qsizetype(sizeof symbol->outfile);
    // The scratch folder only for such names: made for every picture, it cost
    // more than drawing the picture.
    std::optional<QTemporaryDir> scratch;
    QString written = path;
    if (!direct) {
        scratch.emplace();
        if (!scratch->isValid())
            return failFile(QStringLiteral("אין תיקייה זמנית לתמונה"));
        written = scratch->filePath(QStringLiteral("picture.bmp"));
        if (QFile::encodeName(written).size() >= qsizetype(sizeof symbol->outfile))
            return failFile(QStringLiteral("שם התיקייה הזמנית ארוך מדי"));
    }
    const QByteArray outfile = QFile::encodeName(written);
    qstrncpy(symbol->outfile, outfile.constData(), sizeof symbol->outfile);

    rc = ZBarcode_Print(symbol, in->rotation * 90);
    if (rc >= ZINT_ERROR) {
        QFile::remove(written);
        const QString why = encodeRefusal(rc, *symbol, in->data);
        return rc == ZINT_ERROR_FILE_ACCESS || rc == ZINT_ERROR_FILE_WRITE ? failFile(why) : fail(why);
    }
    // A cut picture at the page's name would print as a broken barcode.
    if (!wholeBitmap(written)) {
        QFile::remove(written);
        return failFile(QStringLiteral("התמונה '%1' לא נכתבה במלואה (ייתכן שהדיסק מלא)").arg(shownPath));
    }
    if (!direct && !QFile::rename(written, path)) {
        QFile::remove(path);
        return failFile(QStringLiteral("לא ניתן לכתוב את התמונה אל '%1'").arg(shownPath));
    }
    // wholeBitmap opened the file at its name (or rename put it there): no
    // further look is needed to know the picture exists.
    return true;
}

bool ZintBarcodeLibrary::A1OutputUnwritten(qint32 handle) const
{
    const Instance* in = find(handle);
    return in && in->unwritten;
}

QString BarcodeImageName(int fieldIndex, int recordNumber)
{
    return QStringLiteral("B%1%2.BMP")
        .arg(fieldIndex, 2, 10, QLatin1Char('0'))
        .arg(recordNumber, 5, 10, QLatin1Char('0'));
}

int libraryBarType(short barType, LabelBarDef& workingCopy)
{
    switch (barType) {
    case 0: return 0;
    case 1:
        workingCopy.C39Ascii = true;
        return 0;
    case 2: return 1;
    case 3: return 14;
    case 4: return 15;
    case 5: return 9;
    case 6: return 10;
    case 7: return 4;
    default: return barType;
    }
}

bool DrawBarcode(const QString& data, const QString& file, const LabelBarDef& bar, int libraryCode,
                 BarcodeLibrary& lib, qint32 handle, QString* error, bool* unwritten)
{
    // The designer lets these boxes be cleared or hold nonsense; the library
    // would draw nothing readable from a zero width or ratio. A NaN counts
    // as nonsense too.
    const float dimX = bar.DimX > 0 ? bar.DimX : 0.01f;
    const float ratio = bar.WideBarRatio > 0 ? bar.WideBarRatio : 2.2f;

    lib.A1SetUnit(handle, 0);
    lib.A1SetBarType(handle, libraryCode);
    lib.A1SetData(handle, data);
    lib.A1SetDesc(handle, data);
    lib.A1SetDimX(handle, dimX);
    lib.A1SetWideBarRatio(handle, ratio);
    lib.A1SetBarHeight(handle, bar.BarHeight);
    lib.A1SetHoriAlign(handle, 1);
    lib.A1SetVertAlign(handle, 1);
    lib.A1SetRotation(handle, 0);
    lib.A1SetC128User(handle, bar.C128User);
    lib.A1SetC39Ascii(handle, bar.C39Ascii);
    lib.A1SetCheckDigit(handle, bar.CheckDigit);
    lib.A1SetMatchDesc(handle, false);
    lib.A1SetMatchFrame(handle, false);
    lib.A1SetMultiLine(handle, false);
    lib.A1SetShowDesc(handle, bar.ShowDesc);
    lib.A1SetUPCEUser(handle, false);
    // The picture's display size on the page is the page's business; the
    // library always draws at the printer resolution.
    lib.A1SetUserResoX(handle, 200);
    lib.A1SetUserResoY(handle, 200);
    const bool made = lib.A1OutputBitmap(handle, file, error);
    if (unwritten)
        *unwritten = !made && lib.A1OutputUnwritten(handle);
    return made;
}

} // namespace tagora
