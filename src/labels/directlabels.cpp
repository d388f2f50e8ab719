#include "labels/directlabels.h"

#include "erp/textconv.h"
#include "labels/barcode.h"
#include "labels/numberformat.h"
#include "labels/pagewriter.h"
#include "localdb/database.h"
#include "platform/progress.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QSet>
#include <QRegularExpression>
#include <QSize>
#include <cmath>
#include <QStandardPaths>
#include <QThread>

#ifdef Q_OS_UNIX
#include <atomic>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <vector>
#endif

namespace tagora {

namespace {
const char* const kFonts[] = {"Arial (Hebrew)", "David", "Miriam"};
const char* const kWeights[] = {"Normal", "Bolder", "Bold"};
const char* const kAligns[] = {"Right", "Center", "Left"};
const char* const kDirections[] = {"ltr", "rtl"};

template <size_t N> QString nameOf(const char* const (&names)[N], int i)
{
    return i >= 0 && i < int(N) ? QLatin1String(names[i]) : QString();
}

QString escaped(const QString& text)
{
    return HtmlText(text);
}

QString pictureAttributes(const LabelBarDef& bar)
{
    QString a = QStringLiteral(" ");
    if (bar.UserResoX > 0)
        a += QStringLiteral(" width=") + QString::number(bar.UserResoX);
    if (bar.UserResoY > 0)
        a += QStringLiteral(" height=") + QString::number(bar.UserResoY);
    return a;
}

// The width and height of a BMP file as its header gives them, or nothing.
QSize bmpSize(const QString& path)
{
    QFile f(path);
    if (!f.open(QIODevice::ReadOnly))
        return {};
    const QByteArray head = f.read(26);
    if (head.size() < 26 || !head.startsWith("BM"))
        return {};
    auto int32 = [&](int at) {
        return qint32(quint32(uchar(head[at])) | quint32(uchar(head[at + 1])) << 8 | quint32(uchar(head[at + 2])) << 16
                      | quint32(uchar(head[at + 3])) << 24);
    };
    const qint32 w = int32(18);
    const qint32 h = int32(22);
    if (w <= 0 || h == 0 || w > 100000 || h > 100000 || h < -100000)
        return {};
    return QSize(w, h < 0 ? -h : h);
}

// What a barcode cell holds when its record has no picture (no value, or one
// the symbology refused): nothing, in the space a picture takes, so the
// label's other lines stay where they are. The space is the size the
// pictures are shown at, else that of a picture drawn for another record of
// the same line; with neither, the cell is simply empty.
QString emptyPictureCell(const LabelBarDef& bar, const QDir& folder, int fieldIndex)
{
    QSize size(bar.UserResoX > 0 ? bar.UserResoX : 0, bar.UserResoY > 0 ? bar.UserResoY : 0);
    if (size.width() == 0 || size.height() == 0) {
        const QString pattern = QStringLiteral("B%1*.BMP").arg(fieldIndex, 2, 10, QLatin1Char('0'));
        for (const QString& name : folder.entryList({pattern}, QDir::Files)) {
            const QSize drawn = bmpSize(folder.filePath(name));
            if (drawn.isEmpty())
                continue;
            // One side given: the other keeps the picture's proportions, as the browser scales it.
            if (size.width() > 0)
                size.setHeight(int(std::lround(double(drawn.height()) * size.width() / drawn.width())));
            else if (size.height() > 0)
                size.setWidth(int(std::lround(double(drawn.width()) * size.height() / drawn.height())));
            else
                size = drawn;
            break;
        }
    }
    if (size.width() <= 0 && size.height() <= 0)
        return QStringLiteral("&nbsp;");
    QString style;
    if (size.width() > 0)
        style += QStringLiteral("width:%1px;").arg(size.width());
    if (size.height() > 0)
        style += QStringLiteral(" height:%1px;").arg(size.height());
    return QStringLiteral("<div style='display:inline-block; ") + style.trimmed() + QStringLiteral("'></div>");
}

int copiesOf(const QVariant& v)
{
    // A record without copies prints none, and the job goes on.
    if (!v.isValid() || v.isNull())
        return 0;
    bool ok = false;
    const double d = v.toString().trimmed().toDouble(&ok);
    if (!ok || !std::isfinite(d) || d < 1)
        return 0;
    return d > 1e6 ? 1000000 : int(std::nearbyint(d));
}

// The opening of the one-row tables the name line is written in.
QString nameTableOpen(const QString& className)
{
    QString out = QStringLiteral("<table");
    if (!className.isEmpty())
        out += QStringLiteral(" class='") + className + QLatin1Char('\'');
    return out + QStringLiteral(" cellspacing='0' cellpadding='0' border='0' align='right' dir='rtl'><tr>");
}

// A connection of type 2 keeps the cell form in the text's own (logical)
// order. Cells from right to left would show it backwards, so it goes back to
// plain text, which the browser lays out as it reads. A value that is not in
// cell form (typed, not imported) is taken as it is.
QString logicalFromCells(const QString& value)
{
    if (!value.startsWith(kCellSeparator))
        return value;
    QString text;
    text.reserve(value.size() / 2);
    for (const QChar c : value)
        if (c != kCellSeparator)
            text += MirrorChar(c); // the cell form turned brackets around
    return text;
}

QString lineText(const LabelLineDef& line, int index, const Statement& record, int column, const QString& priceFormat,
                 int coinColumn, int maxTextLen, short connType)
{
    const bool nameLine = line.FieldName.compare(QLatin1String("VNItemName"), Qt::CaseInsensitive) == 0;
    const bool logical = nameLine && connType == 2;
    const QVariant value = column >= 0 ? record.value(column) : QVariant();
    QString text;
    if (value.isValid() && !value.isNull()) {
        if (line.IsPrice)
            text = FormatNumber(value, priceFormat) + QLatin1Char(' ')
                + (coinColumn >= 0 ? record.value(coinColumn).toString() : QString());
        else
            text = logical ? logicalFromCells(value.toString()) : value.toString();
    }
    if (!line.Prefix.isEmpty())
        text = line.Prefix + QLatin1Char(' ') + text;
    // Counted in characters: half an emoji would break the page's markup.
    if (maxTextLen > 0)
        text = LeftChars(text, maxTextLen);
    if (logical)
        return nameTableOpen(QStringLiteral("L%1").arg(index)) + QStringLiteral("<td nowrap>") + escaped(text)
            + QStringLiteral("</td></tr></table>");
    if (nameLine)
        return LetterTable(text, QStringLiteral("L%1").arg(index));
    return escaped(text);
}
} // namespace

QString cellPercent(int count)
{
    QString t = QString::number(100.0 / count, 'f', 1);
    if (t.indexOf(QLatin1Char('.')) < 2)
        t.prepend(QLatin1Char('0'));
    return t;
}

QString UserTempFolder()
{
    QString temp = qEnvironmentVariable("Temp");
#ifdef Q_OS_UNIX
    // The system's temporary folder is shared by every user here: a name
    // planted in it could turn our clean-up against someone else's files, or
    // swap a page before the browser reads it. A folder of the user's own
    // serves instead.
    if (temp.isEmpty()) {
        temp = qEnvironmentVariable("XDG_RUNTIME_DIR");
        if (temp.isEmpty())
            temp = QDir(QStandardPaths::writableLocation(QStandardPaths::GenericCacheLocation))
                       .filePath(QStringLiteral("tagora"));
    }
#else
    if (temp.isEmpty())
        temp = QDir::tempPath();
#endif
    return temp;
}

QString directJobFolder()
{
    return QDir(UserTempFolder()).filePath(QStringLiteral("tgrlab"));
}

namespace {
// What a job leaves in the folder: the page and the barcode pictures named by
// field and record (B0400012.BMP), the item list, the page's PDF and the
// bridges' numbered outputs. Nothing else there is ours to remove.
bool isJobFile(const QString& name)
{
    static const QRegularExpression picture(QStringLiteral("^B[0-9]{7,}\\.BMP$"));
    // A bridge's outputs and the work files it keeps after a failure.
    static const QRegularExpression bridge(QStringLiteral("^tgrlab-[0-9]{3,}\\.(pdf|zpl|csv|glabels)(\\.part)?$"));
    return name == QLatin1String("tgrlab1.htm") || name == QLatin1String("tgrlab2.htm")
        || name == QLatin1String("tgrlab1.pdf") || name == QLatin1String("tgrlab1.pdf.part")
        || picture.match(name).hasMatch() || bridge.match(name).hasMatch();
}

#ifdef Q_OS_UNIX
// The folder as it stands, not what a link there points to: ours, a folder,
// writable by nobody else. Empty text when it is.
QString unsafeJobFolder(const QString& folder, const struct stat& st)
{
    const QString shown = QDir::toNativeSeparators(folder);
    if (S_ISLNK(st.st_mode))
        return QStringLiteral("תיקיית העבודה '%1' היא קישור לתיקייה אחרת; ההדפסה לא תיכתב דרכו").arg(shown);
    if (!S_ISDIR(st.st_mode))
        return QStringLiteral("'%1' אינו תיקייה, ולכן לא ניתן להשתמש בו כתיקיית העבודה").arg(shown);
    if (st.st_uid != geteuid())
        return QStringLiteral("תיקיית העבודה '%1' שייכת למשתמש אחר; ההדפסה לא תיכתב בה").arg(shown);
    if (st.st_mode & (S_IWGRP | S_IWOTH))
        return QStringLiteral("תיקיית העבודה '%1' פתוחה לכתיבה למשתמשים אחרים; ההדפסה לא תיכתב בה").arg(shown);
    return QString();
}
#endif
} // namespace

QString PrepareJobFolder(const QString& folder)
{
    const QString shown = QDir::toNativeSeparators(folder);
    const QString parent = QFileInfo(folder).absolutePath();
    if (!QDir().mkpath(parent))
        return QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(QDir::toNativeSeparators(parent));
#ifdef Q_OS_UNIX
    const QByteArray native = QFile::encodeName(folder);
    // Made private from the start, and then taken only as it stands: a link
    // planted under the name is refused, never followed.
    if (::mkdir(native.constData(), 0700) != 0 && errno != EEXIST)
        return QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(shown);
    const int fd = ::open(native.constData(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
    struct stat st {};
    if (fd < 0) {
        if (::lstat(native.constData(), &st) == 0) {
            const QString why = unsafeJobFolder(folder, st);
            if (!why.isEmpty())
                return why;
        }
        return QStringLiteral("לא ניתן לפתוח את תיקיית העבודה '%1'").arg(shown);
    }
    if (::fstat(fd, &st) != 0) {
        ::close(fd);
        return QStringLiteral("לא ניתן לפתוח את תיקיית העבודה '%1'").arg(shown);
    }
    if (const QString why = unsafeJobFolder(folder, st); !why.isEmpty()) {
        ::close(fd);
        return why;
    }
    // Names are removed relative to the folder we checked, and a link is
    // removed as a link: nothing outside the folder is ever reached.
    DIR* entries = ::fdopendir(::dup(fd));
    QString error;
    if (!entries)
        error = QStringLiteral("לא ניתן לקרוא את תיקיית העבודה '%1'").arg(shown);
    while (entries && error.isEmpty()) {
        const dirent* entry = ::readdir(entries);
        if (!entry)
            break;
        const QString name = QFile::decodeName(entry->d_name);
        if (!isJobFile(name))
            continue;
        struct stat item {};
        if (::fstatat(fd, entry->d_name, &item, AT_SYMLINK_NOFOLLOW) != 0 || S_ISDIR(item.st_mode))
            continue;
        if (::unlinkat(fd, entry->d_name, 0) != 0 && errno != ENOENT)
            error = QStringLiteral("לא ניתן למחוק את הקובץ '%1'").arg(QDir::toNativeSeparators(QDir(folder).filePath(name)));
    }
    if (entries)
        ::closedir(entries);
    ::close(fd);
    return error;
#else
    QDir dir(folder);
    if (!dir.exists() && !QDir().mkpath(folder))
        return QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(shown);
    if (QFileInfo(folder).isSymLink())
        return QStringLiteral("תיקיית העבודה '%1' היא קישור לתיקייה אחרת; ההדפסה לא תיכתב דרכו").arg(shown);
    for (const QFileInfo& entry : dir.entryInfoList(QDir::Files | QDir::Hidden | QDir::System)) {
        if (!isJobFile(entry.fileName()))
            continue;
        if (!dir.remove(entry.fileName()))
            return QStringLiteral("לא ניתן למחוק את הקובץ '%1'").arg(QDir::toNativeSeparators(entry.filePath()));
    }
    return QString();
#endif
}

namespace {
// Only text makes a picture: a number or nothing leaves the cell empty.
bool makesPicture(const Statement& record, int column)
{
    if (column < 0)
        return false;
    const QVariant value = record.value(column);
    return value.metaType().id() == QMetaType::QString && !value.toString().isEmpty();
}
} // namespace

namespace {
// One record's picture: what was read in record order, then what drawing it gave.
struct PictureJob {
    int record = 0;
    int labels = 0;
    QString data;
    QString path;
    bool made = false;
    bool unwritten = false;
    QString reason;
};

// Draws jobs on up to `threads` handles at once, each handle on one thread,
// taking records in order. Returns the index of the first record whose
// picture the disk would not take (jobs.size() if none). Records after it
// were not drawn, or their pictures are removed again: the job stops there,
// as it would have one record at a time.
size_t drawPictures(std::vector<PictureJob>& jobs, const LabelBarDef& bar, int code, BarcodeLibrary& library,
                    int threads)
{
    std::vector<qint32> handles;
    for (int i = 0; i < threads; ++i)
        handles.push_back(library.A1OpenInstance());
    std::atomic<size_t> next{0};
    std::atomic<size_t> firstUnwritten{jobs.size()};
    auto work = [&](qint32 handle) {
        for (size_t i; (i = next.fetch_add(1)) < jobs.size();) {
            // Indices only grow: once past a failure, every later one is too.
            if (i > firstUnwritten.load())
                break;
            PictureJob& j = jobs[i];
            j.made = DrawBarcode(j.data, j.path, bar, code, library, handle, &j.reason, &j.unwritten);
            if (!j.made && j.unwritten) {
                size_t seen = firstUnwritten.load();
                while (i < seen && !firstUnwritten.compare_exchange_weak(seen, i)) {
                }
            }
        }
    };
    std::vector<std::thread> helpers;
    for (size_t t = 1; t < handles.size(); ++t)
        helpers.emplace_back(work, handles[t]);
    work(handles.front());
    for (std::thread& t : helpers)
        t.join();
    for (qint32 handle : handles)
        library.A1CloseInstance(handle);

    const size_t stop = firstUnwritten.load();
    for (size_t i = stop + 1; i < jobs.size(); ++i) {
        if (jobs[i].made)
            QFile::remove(jobs[i].path);
    }
    return stop;
}
} // namespace

QString MakeBarcodeImages(const QString& folder, const QString& column, int fieldIndex, const QString& dbPath,
                          const QString& sql, LabelBarDef& bar, BarcodeLibrary& library,
                          QVector<BarcodeRefusal>* refusals)
{
    Database db;
    DbError e = db.open(dbPath, Database::OpenMode::ReadOnly);
    Statement records;
    if (!e)
        records = db.prepare(sql, &e);
    if (e)
        return e.message;
    Statement::Step step = records.step();
    if (step == Statement::Step::Error)
        return records.error().message;
    if (step == Statement::Step::Done)
        return QString();
    const int col = records.columnIndex(column);
    if (col < 0)
        return QStringLiteral("העמודה %1 אינה ברשומת המדבקה").arg(column);
    const int copiesColumn = records.columnIndex(QStringLiteral("Copies"));
    const int code = libraryBarType(bar.BarType, bar);

    // The values are read first, in order (the database on one thread); the
    // pictures, each independent of the others, are then drawn in parallel.
    const QDir dir(folder);
    std::vector<PictureJob> jobs;
    int record = 0;
    for (; step == Statement::Step::Row; step = records.step()) {
        ++record;
        if (!makesPicture(records, col))
            continue;
        PictureJob j;
        j.record = record;
        j.labels = copiesOf(copiesColumn >= 0 ? records.value(copiesColumn) : QVariant());
        j.data = records.value(col).toString();
        if (bar.LeftLen > 0)
            j.data = j.data.left(bar.LeftLen);
        if (!bar.LeftPrefix.isEmpty())
            j.data = bar.LeftPrefix + j.data;
        j.path = dir.filePath(BarcodeImageName(fieldIndex, record));
        jobs.push_back(std::move(j));
    }

    // Too few pictures are not worth a thread's start.
    constexpr size_t kPicturesPerThread = 64;
    const size_t useful = qMax<size_t>(1, jobs.size() / kPicturesPerThread);
    const int threads = library.concurrentHandles()
                            ? int(qMin<size_t>(useful, size_t(qMax(1, QThread::idealThreadCount()))))
                            : 1;
    const size_t stop = jobs.empty() ? 0 : drawPictures(jobs, bar, code, library, threads);

    QString failure;
    // Refusals before the stop, in record order; a picture the disk would not
    // take is no reason to print labels without it: every record after it
    // would fail the same way.
    for (size_t i = 0; i < stop && i < jobs.size(); ++i) {
        const PictureJob& j = jobs[i];
        if (!j.made && refusals)
            refusals->push_back({j.record, j.labels, j.data, j.reason});
    }
    if (stop < jobs.size())
        failure = QStringLiteral("לא ניתן לכתוב את תמונות הברקוד בתיקייה '%1', ולכן לא הודפסו מדבקות.\n%2")
                      .arg(QDir::toNativeSeparators(folder), jobs[stop].reason);
    else if (step == Statement::Step::Error)
        failure = records.error().message;
    return failure;
}

QString BarcodeRefusalMessage(const QVector<BarcodeRefusal>& refused, long long labelsOnPage)
{
    // A record with no copies is not on the page; one refused on two lines
    // still lacks its barcode on the same labels.
    QVector<BarcodeRefusal> shown;
    QSet<int> records;
    long long lacking = 0;
    for (const BarcodeRefusal& r : refused) {
        if (r.labels <= 0)
            continue;
        shown.push_back(r);
        if (!records.contains(r.record)) {
            records.insert(r.record);
            lacking += r.labels;
        }
    }
    if (shown.isEmpty())
        return QString();
    std::stable_sort(shown.begin(), shown.end(),
                     [](const BarcodeRefusal& a, const BarcodeRefusal& b) { return a.record < b.record; });
    const long long total = qMax(labelsOnPage, lacking);
    const QString one = QStringLiteral(" תודפס בלי ברקוד, כי לא ניתן לקודד את הערך שלה בסוג הברקוד שנבחר:");
    const QString many = QStringLiteral(" יודפסו בלי ברקוד, כי לא ניתן לקודד את הערך שלהן בסוג הברקוד שנבחר:");
    QString head;
    if (total == 1)
        head = QStringLiteral("המדבקה שבדף") + one;
    else if (lacking == total)
        head = QStringLiteral("כל %1 המדבקות שבדף").arg(total) + many;
    else if (lacking == 1)
        head = QStringLiteral("מדבקה אחת מתוך %1 המדבקות שבדף").arg(total) + one;
    else
        head = QStringLiteral("%1 מתוך %2 המדבקות שבדף").arg(lacking).arg(total) + many;
    QStringList lines{head};
    constexpr int kListed = 10;
    for (const BarcodeRefusal& r : shown.mid(0, kListed)) {
        const QString count = r.labels == 1 ? QStringLiteral("מדבקה אחת") : QStringLiteral("%1 מדבקות").arg(r.labels);
        lines << QStringLiteral("רשומה %1 (%2): %3").arg(r.record).arg(count, r.reason);
    }
    if (shown.size() > kListed)
        lines << QStringLiteral("ועוד %1 ברקודים שלא נוצרו").arg(shown.size() - kListed);
    return lines.join(QLatin1Char('\n'));
}

QStringList WriteLabelStyles(const DirectLabelLayout& layout)
{
    QStringList out;
    for (int i = 0; i < kDirectLines; ++i) {
        const LabelLineDef& l = layout.lines[size_t(i)];
        if (!l.UseCell)
            continue;
        QString rule = QStringLiteral("       .L%1").arg(i);
        rule += QStringLiteral(" {font-family:") + nameOf(kFonts, l.Font);
        rule += QStringLiteral("; font-weight:") + nameOf(kWeights, l.FontWeight);
        rule += QStringLiteral("; font-size:%1pt").arg(l.FontSize);
        rule += QStringLiteral("; font-style:") + (l.FontItalic ? QStringLiteral("Italic") : QStringLiteral("Normal"));
        if (l.FontUL)
            rule += QStringLiteral("; text-decoration: underline");
        rule += QStringLiteral("; text-align:") + nameOf(kAligns, l.Align);
        rule += QStringLiteral("; direction:") + nameOf(kDirections, l.Direction);
        if (l.Height > 0)
            rule += QStringLiteral("; height: %1pt").arg(l.Height);
        if (l.Border)
            rule += QStringLiteral("; border: thin solid black");
        rule += QStringLiteral("; color:black;}");
        out << rule;
    }
    out << QStringLiteral("       TR {vertical-align: middle; }") << QStringLiteral("       TD {vertical-align: middle; }")
        << QStringLiteral("       TABLE {border: none; direction: rtl; padding: 0; word-spacing: 0; letter-spacing: 0}")
        << QStringLiteral("       .Lab {border: none; direction: rtl; padding: 1; word-spacing: 0; letter-spacing: 0; "
                          "margin-top: %1; margin-bottom: %2}")
               .arg(layout.page.LabTop)
               .arg(layout.page.LabBottom);
    return out;
}

QString LetterTable(const QVariant& value, const QString& className)
{
    const QString text = value.isValid() && !value.isNull() ? value.toString() : QString();
    QString out = nameTableOpen(className);
    QString previous;
    // A cell per character: a surrogate pair split over two cells is no character at all.
    for (qsizetype i = 0, units = 1; i < text.size(); i += units) {
        units = CharUnitsAt(text, i);
        const QChar c = text[i];
        if (c == kCellSeparator)
            continue;
        const QString cell = c == QLatin1Char(' ') ? QStringLiteral("&nbsp;") : escaped(text.mid(i, units));
        if (!(cell == QLatin1String("&nbsp;") && previous == QLatin1String("&nbsp;")))
            out += QStringLiteral("<td>") + cell + QStringLiteral("</td>");
        previous = cell;
    }
    return out + QStringLiteral("</tr></table>");
}

QString CreateLabPage(const QString& fileName, const QString& dbPath, const QString& sql,
                      const DirectLabelLayout& layout, const QString& priceFormat, ProgressSink* progress,
                      long long* labels)
{
    if (labels)
        *labels = 0;
    const LabelPageDef& page = layout.page;
    if (const QString why = CheckDirectLayout(layout); !why.isEmpty())
        return why;
    const QString height = QStringLiteral("height='") + cellPercent(page.PageRows) + QStringLiteral("%'");
    const QString width = QStringLiteral("width='") + cellPercent(page.PageCols) + QStringLiteral("%'");
    const QString picture = pictureAttributes(layout.bar);
    // The pictures sit beside the page; a record whose picture was not drawn
    // gets no reference to one.
    const QDir pictures = QFileInfo(fileName).absoluteDir();
    std::array<QString, kDirectLines> noPicture;
    for (int i = 0; i < kDirectLines; ++i) {
        const LabelLineDef& l = layout.lines[size_t(i)];
        if (l.UseCell && l.ViewType == 1)
            noPicture[size_t(i)] = emptyPictureCell(layout.bar, pictures, l.FldID);
    }
    const QString format = priceFormat.trimmed().isEmpty() ? QStringLiteral("0.00") : priceFormat.trimmed();

    const QString writeFailed = QStringLiteral("כתיבת הקובץ '%1' נכשלה (ייתכן שהדיסק מלא), ולכן לא הודפסו מדבקות")
                                    .arg(QDir::toNativeSeparators(fileName));
    PageWriter out(fileName);
    if (!out.open())
        return QStringLiteral("לא ניתן ליצור את הקובץ '%1'").arg(QDir::toNativeSeparators(fileName));
    out.line(QStringLiteral("<HTML>"));
    out.line(QStringLiteral("<HEAD>"));
    out.line(QStringLiteral("<TITLE>מדבקות פריטים</TITLE>"));
    out.line(QStringLiteral("<meta http-equiv='Content-Type' content='text/html; charset=windows-1255'>"));
    out.line(QStringLiteral("<style>"));
    for (const QString& rule : WriteLabelStyles(layout))
        out.line(rule);
    out.line(QStringLiteral("</style>"));
    out.line(QStringLiteral("</HEAD>"));
    out.write(QStringLiteral("<BODY"));
    if (page.PageAutoPrint)
        out.line(QStringLiteral(" onload='window.print()'"));
    out.line(QStringLiteral(" BGCOLOR='#FFFFFF'>"));

    Database db;
    DbError e = db.open(dbPath, Database::OpenMode::ReadOnly);
    // First pass: how many labels, for the number of pages.
    long long total = 0;
    bool anyRecord = false;
    if (!e) {
        Statement first = db.prepare(sql, &e);
        const int copies = first.columnIndex(QStringLiteral("Copies"));
        Statement::Step s;
        while (!e && (s = first.step()) == Statement::Step::Row) {
            anyRecord = true;
            total += copiesOf(copies >= 0 ? first.value(copies) : QVariant());
        }
        if (!e && s == Statement::Step::Error)
            e = first.error();
        if (!e && copies < 0 && first.columnCount() > 0)
            e = DbError::other(QStringLiteral("העמודה Copies אינה ברשומת המדבקה"));
    }
    // Returning without a commit drops what was written of the page.
    if (e)
        return e.message;
    // No records: the page ends after its body tag.
    if (!anyRecord)
        return out.commit() ? QString() : writeFailed;
    if (labels)
        *labels = total;
    const long long perPage = (long long)page.PageRows * page.PageCols;
    const long long pages = (total + perPage - 1) / perPage;

    Statement records = db.prepare(sql, &e);
    if (e)
        return e.message;
    if (progress)
        progress->setProgress(0);
    std::array<int, kDirectLines> columns{};
    for (int i = 0; i < kDirectLines; ++i)
        columns[size_t(i)] = records.columnIndex(layout.lines[size_t(i)].FieldName);
    const int copiesColumn = records.columnIndex(QStringLiteral("Copies"));
    const int coinColumn = records.columnIndex(QStringLiteral("CoinSign"));
    // The names were put in cell form for the connection in use.
    const short connType = erpConnType();

    // The current record, moved past records that print no label.
    bool more = false;
    int copies = 0;
    long long recordNumber = 0;
    auto next = [&] {
        for (;;) {
            const Statement::Step s = records.step();
            if (s != Statement::Step::Row) {
                if (s == Statement::Step::Error)
                    e = records.error();
                more = false;
                return;
            }
            ++recordNumber;
            copies = copiesOf(records.value(copiesColumn));
            if (copies > 0) {
                more = true;
                return;
            }
        }
    };
    next();
    int counter = 0;
    for (long long p = 1; p <= pages && !e && !out.failed(); ++p) {
        out.line(QStringLiteral("<table height='100%' width='100%' border='0'>"));
        for (int r = 1; r <= page.PageRows; ++r) {
            out.line(QStringLiteral("  <tr>"));
            for (int c = 1; c <= page.PageCols; ++c) {
                out.line(QStringLiteral("    <td ") + width + QLatin1Char(' ') + height + QStringLiteral(" align='center'>"));
                out.line(QStringLiteral("     <table class=Lab border='0'>"));
                if (!more) {
                    out.line(QStringLiteral("    <tr><td nowrap>&nbsp;</td></tr>"));
                } else {
                    for (int i = 0; i < kDirectLines; ++i) {
                        const LabelLineDef& l = layout.lines[size_t(i)];
                        if (!l.UseCell)
                            continue;
                        const QString pictureName = l.ViewType == 1 && makesPicture(records, columns[size_t(i)])
                            ? BarcodeImageName(l.FldID, int(recordNumber))
                            : QString();
                        if (l.ViewType == 1 && (pictureName.isEmpty() || !pictures.exists(pictureName)))
                            // Nothing drawn: an empty cell, not a broken picture on paper.
                            out.line(QStringLiteral("    <tr align='center'><td class='L%1'>").arg(i)
                                     + noPicture[size_t(i)] + QStringLiteral("</td></tr>"));
                        else if (l.ViewType == 1)
                            out.line(QStringLiteral("    <tr align='center'><td class='L%1'><img src='").arg(i)
                                     + pictureName + QLatin1Char('\'') + picture + QStringLiteral("></img></td></tr>"));
                        else if (l.ViewType == 0)
                            out.line(QStringLiteral("    <tr align='center'><td class='L%1'>").arg(i)
                                     + lineText(l, i, records, columns[size_t(i)], format, coinColumn, page.MaxTextLen,
                                                connType)
                                     + QStringLiteral("</td></tr>"));
                    }
                    if (++counter >= copies) {
                        counter = 0;
                        next();
                    }
                }
                out.line(QStringLiteral("     </table>"));
                out.line(QStringLiteral("    </td>"));
            }
            out.line(QStringLiteral("  </tr>"));
        }
        out.line(QStringLiteral("</table>"));
        if (progress && recordNumber % 5 == 0 && total > 0)
            progress->setProgress(double(recordNumber) / double(total));
    }
    if (progress)
        progress->setProgress(0);
    if (e)
        return e.message;
    out.line(QStringLiteral("</BODY>"));
    out.line(QStringLiteral("</HTML>"));
    return out.commit() ? QString() : writeFailed;
}

} // namespace tagora
