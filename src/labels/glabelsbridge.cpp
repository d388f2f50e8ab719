#include "labels/glabelsbridge.h"

#include "platform/printercatalog.h"

#include <QDeadlineTimer>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QRegularExpression>
#include <QSaveFile>
#include <QStandardPaths>
#include <QXmlStreamReader>
#include <QXmlStreamWriter>

#include <algorithm>

#include <zlib.h>

namespace tagora {

namespace {

const QString kBatchProgram = QStringLiteral("glabels-3-batch");

// A label document is a few kilobytes, tens of megabytes with pictures in
// it; more than this is not a label (or a compressed file that explodes).
constexpr qint64 kMaxDocumentBytes = 64 * 1024 * 1024;
// The labels one closing makes; beyond it a record's copies are a mistake
// that would fill the memory and the printer.
constexpr size_t kMaxLabelsPerFile = 200000;

QString native(const QString& path)
{
    return QDir::toNativeSeparators(path);
}

bool gunzip(const QByteArray& in, QByteArray* out)
{
    z_stream s{};
    if (inflateInit2(&s, 16 + MAX_WBITS) != Z_OK)
        return false;
    s.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(in.constData()));
    s.avail_in = uInt(in.size());
    char buffer[64 * 1024];
    int rc = Z_OK;
    while (rc != Z_STREAM_END) {
        s.next_out = reinterpret_cast<Bytef*>(buffer);
        s.avail_out = sizeof buffer;
        rc = inflate(&s, Z_NO_FLUSH);
        // Z_BUF_ERROR here means the input ended before the stream did.
        if (rc != Z_OK && rc != Z_STREAM_END)
            break;
        out->append(buffer, qsizetype(sizeof buffer - s.avail_out));
        if (out->size() > kMaxDocumentBytes)
            break;
    }
    inflateEnd(&s);
    return rc == Z_STREAM_END;
}

// One pass over a document: what it uses (fields, labels per page, pictures
// it carries inside) and, with out, the copy that merges csvPath.
struct Walk {
    const GlabelsDocument* source = nullptr; // for the copy: embedded pictures, folder
    QXmlStreamWriter* out = nullptr;
    QString csvPath;
    QSet<QString> fields;
    QSet<QString> embedded;
    int labelsPerSheet = 0;
};

void writeMerge(QXmlStreamWriter* out, const QString& ns, const QString& csvPath)
{
    if (ns.isEmpty())
        out->writeEmptyElement(QStringLiteral("Merge"));
    else
        out->writeEmptyElement(ns, QStringLiteral("Merge"));
    out->writeAttribute(QStringLiteral("type"), QStringLiteral("Text/Comma/Line1Keys"));
    out->writeAttribute(QStringLiteral("src"), csvPath);
}

bool isFieldAttribute(QStringView name)
{
    // A barcode's or picture's data field, and the colours that may come
    // from a field (color_field, line_color_field, fill_color_field, ...).
    return name == u"field" || name.endsWith(u"_field");
}

bool walk(const QByteArray& xml, Walk* w, QString* problem)
{
    // Text objects may name a field inline as ${Name} as well as with a Field element.
    static const QRegularExpression inlineField(QStringLiteral("\\$\\{([^}]+)\\}"));
    QXmlStreamReader in(xml);
    QXmlStreamWriter* out = w->out;
    int depth = 0;
    bool sawRoot = false;
    bool inObjects = false;
    bool inData = false;
    bool merged = false;
    QString rootNs;
    while (!in.atEnd()) {
        const QXmlStreamReader::TokenType token = in.readNext();
        if (token == QXmlStreamReader::Invalid)
            break;
        if (token == QXmlStreamReader::StartElement) {
            ++depth;
            const QStringView name = in.name();
            const QXmlStreamAttributes attributes = in.attributes();
            if (depth == 1) {
                if (name != u"Glabels-document") {
                    *problem = QStringLiteral("השורש הוא %1 ולא Glabels-document").arg(name.toString());
                    return false;
                }
                sawRoot = true;
                rootNs = in.namespaceUri().toString();
            } else if (depth == 2) {
                inObjects = name == u"Objects";
                inData = name == u"Data";
                if (name == u"Merge") {
                    // The document's own merge source gives way to the run's rows.
                    if (out && !merged)
                        writeMerge(out, rootNs, w->csvPath);
                    merged = true;
                    in.skipCurrentElement();
                    --depth;
                    continue;
                }
                if (inData && out && !merged) {
                    writeMerge(out, rootNs, w->csvPath);
                    merged = true;
                }
            }
            if (name == u"Field") {
                const QString field = attributes.value(QLatin1String("name")).toString();
                if (!field.isEmpty())
                    w->fields.insert(field);
            }
            for (const QXmlStreamAttribute& a : attributes) {
                if (isFieldAttribute(a.name()) && !a.value().isEmpty())
                    w->fields.insert(a.value().toString());
            }
            if (name == u"Layout" && !inObjects) {
                const int nx = attributes.value(QLatin1String("nx")).toInt();
                const int ny = attributes.value(QLatin1String("ny")).toInt();
                if (nx > 0 && ny > 0 && nx <= 10000 && ny <= 10000)
                    w->labelsPerSheet += nx * ny;
            }
            if (inData && (name == u"Pixdata" || name == u"File"))
                w->embedded.insert(attributes.value(QLatin1String("name")).toString());

            const QString src = attributes.value(QLatin1String("src")).toString();
            if (out && name == u"Object-image" && !src.isEmpty() && QDir::isRelativePath(src)
                && !w->source->embedded.contains(src)) {
                // The copy lives in the job folder; a picture file next to
                // the label must still be found.
                for (const QXmlStreamNamespaceDeclaration& ns : in.namespaceDeclarations()) {
                    if (ns.prefix().isEmpty())
                        out->writeDefaultNamespace(ns.namespaceUri().toString());
                    else
                        out->writeNamespace(ns.namespaceUri().toString(), ns.prefix().toString());
                }
                out->writeStartElement(in.namespaceUri().toString(), name.toString());
                for (const QXmlStreamAttribute& a : attributes) {
                    if (a.qualifiedName() == u"src")
                        out->writeAttribute(QStringLiteral("src"),
                                            QFileInfo(w->source->path).absoluteDir().absoluteFilePath(src));
                    else
                        out->writeAttribute(a);
                }
                continue;
            }
        } else if (token == QXmlStreamReader::EndElement) {
            if (depth == 1 && out && !merged) {
                writeMerge(out, rootNs, w->csvPath);
                merged = true;
            }
            if (depth == 2)
                inObjects = inData = false;
            --depth;
        } else if (token == QXmlStreamReader::Characters && inObjects && !in.isWhitespace()) {
            auto matches = inlineField.globalMatch(in.text());
            while (matches.hasNext())
                w->fields.insert(matches.next().captured(1));
        }
        if (out)
            out->writeCurrentToken(in);
    }
    if (in.hasError()) {
        *problem = QStringLiteral("%1 (שורה %2)").arg(in.errorString()).arg(in.lineNumber());
        return false;
    }
    if (!sawRoot) {
        *problem = QStringLiteral("אין בו רכיב Glabels-document");
        return false;
    }
    return true;
}

QString csvField(QString value)
{
    // Every field quoted: the program keeps spaces, commas, quotes and line
    // breaks inside quotes as they are.
    value.replace(QLatin1Char('"'), QLatin1String("\"\""));
    return QLatin1Char('"') + value + QLatin1Char('"');
}

// The pages of a PDF as its page tree counts them; -1 when it cannot be told.
int pdfPageCount(const QByteArray& pdf)
{
    int pages = -1;
    for (const QByteArray& type : {QByteArrayLiteral("/Type /Pages"), QByteArrayLiteral("/Type/Pages")}) {
        qsizetype at = 0;
        while ((at = pdf.indexOf(type, at)) >= 0) {
            const qsizetype begin = pdf.lastIndexOf("<<", at);
            const qsizetype end = pdf.indexOf(">>", at);
            at += type.size();
            if (begin < 0 || end < 0)
                continue;
            const QByteArray dict = pdf.mid(begin, end - begin);
            const qsizetype count = dict.indexOf("/Count");
            if (count < 0)
                continue;
            qsizetype i = count + 6;
            while (i < dict.size() && (dict[i] == ' ' || dict[i] == '\n' || dict[i] == '\r'))
                ++i;
            qsizetype j = i;
            while (j < dict.size() && dict[j] >= '0' && dict[j] <= '9')
                ++j;
            bool ok = false;
            const int n = dict.mid(i, j - i).toInt(&ok);
            if (ok)
                pages = std::max(pages, n);
        }
    }
    return pages;
}

// The lines of the program's output that tell of a failure it did not
// report by its exit status (it ends with 0 when it could not open the
// document or the merge source).
QString failureLines(const QString& output)
{
    static const char* const marks[] = {"cannot open glabels file", "cannot perform document merge",
                                        "gl_merge_text_open", "xmlParseFile error"};
    QStringList found;
    for (const QString& line : output.split(QLatin1Char('\n'))) {
        for (const char* mark : marks) {
            if (line.contains(QLatin1String(mark))) {
                found << line.trimmed();
                break;
            }
        }
    }
    return found.join(QLatin1String("; "));
}

QString outputTail(const QString& output)
{
    QString tail = output.trimmed();
    if (tail.size() > 400)
        tail = QStringLiteral("...") + tail.right(400);
    return tail;
}

bool writeFile(const QString& path, const QByteArray& bytes, QString* error)
{
    QSaveFile file(path);
    if (!file.open(QIODevice::WriteOnly) || file.write(bytes) != bytes.size() || !file.commit()) {
        *error = QStringLiteral("לא ניתן לכתוב את הקובץ '%1': %2").arg(native(path), file.errorString());
        return false;
    }
    return true;
}

} // namespace

bool ReadGlabelsDocument(const QString& path, GlabelsDocument* document, QString* error)
{
    const QFileInfo info(path);
    if (path.isEmpty() || !info.exists()) {
        *error = QStringLiteral("קובץ המדבקה '%1' לא נמצא").arg(native(path));
        return false;
    }
    if (!info.isFile()) {
        *error = QStringLiteral("'%1' אינו קובץ מדבקה").arg(native(path));
        return false;
    }
    if (info.size() > kMaxDocumentBytes) {
        *error = QStringLiteral("קובץ המדבקה '%1' גדול מדי").arg(native(path));
        return false;
    }
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) {
        *error = QStringLiteral("לא ניתן לקרוא את קובץ המדבקה '%1': %2").arg(native(path), file.errorString());
        return false;
    }
    QByteArray bytes = file.read(kMaxDocumentBytes + 1);
    if (file.error() != QFileDevice::NoError) {
        *error = QStringLiteral("לא ניתן לקרוא את קובץ המדבקה '%1': %2").arg(native(path), file.errorString());
        return false;
    }
    if (bytes.startsWith("\x1f\x8b")) {
        QByteArray plain;
        if (!gunzip(bytes, &plain)) {
            *error = QStringLiteral("קובץ המדבקה '%1' דחוס ואינו נפתח").arg(native(path));
            return false;
        }
        bytes = plain;
    }
    Walk w;
    QString problem;
    if (!walk(bytes, &w, &problem)) {
        *error = QStringLiteral("קובץ המדבקה '%1' אינו מסמך gLabels: %2").arg(native(path), problem);
        return false;
    }
    document->path = info.absoluteFilePath();
    document->xml = bytes;
    document->fields = w.fields;
    document->embedded = w.embedded;
    document->labelsPerSheet = std::max(1, w.labelsPerSheet);
    return true;
}

bool GlabelsMergeCopy(const GlabelsDocument& document, const QString& csvPath, QByteArray* xml, QString* error)
{
    xml->clear();
    QXmlStreamWriter out(xml);
    Walk w;
    w.source = &document;
    w.out = &out;
    w.csvPath = csvPath;
    QString problem;
    if (!walk(document.xml, &w, &problem)) {
        *error = QStringLiteral("קובץ המדבקה '%1' אינו מסמך gLabels: %2").arg(native(document.path), problem);
        return false;
    }
    return true;
}

GlabelsSink::GlabelsSink(BridgeOptions options)
    : m_options(std::move(options))
{
}

// Records of a label that was never closed were not asked to go out: the
// run stopped before, and nothing of it is printed.
GlabelsSink::~GlabelsSink() = default;

bool GlabelsSink::openLabel(const QString& file, QString* error)
{
    // A file opened over another sends the other's labels first: they are never dropped.
    if (m_open && !closeLabel(error))
        return false;
    // Before any record is collected: labels that cannot be made are not collected.
    QString program;
    if (!canMakeLabels(&program, error))
        return false;
    GlabelsDocument document;
    if (!ReadGlabelsDocument(file, &document, error))
        return false;
    m_document = std::move(document);
    m_names.clear();
    m_column.clear();
    m_values.clear();
    m_rows.clear();
    m_open = true;
    return true;
}

bool GlabelsSink::setVariable(const QString& name, const QString& value, QString* error)
{
    if (!m_open) {
        *error = QStringLiteral("לא נפתח קובץ מדבקה לפני המשתנה %1").arg(name);
        return false;
    }
    if (!m_document.fields.contains(name)) {
        *error = QStringLiteral("במדבקה '%1' אין שדה מיזוג בשם %2").arg(native(m_document.path), name);
        return false;
    }
    const auto it = m_column.constFind(name);
    if (it != m_column.constEnd()) {
        m_values[it.value()] = value;
        return true;
    }
    m_column.insert(name, int(m_names.size()));
    m_names << name;
    m_values << value;
    return true;
}

bool GlabelsSink::printRecord(int copies, QString* error)
{
    if (!m_open) {
        *error = QStringLiteral("לא נפתח קובץ מדבקה להדפסה");
        return false;
    }
    if (copies <= 0)
        return true;
    if (size_t(copies) > kMaxLabelsPerFile - m_rows.size()) {
        *error = QStringLiteral("יותר מ-%1 מדבקות בקובץ מדבקה אחד").arg(kMaxLabelsPerFile);
        return false;
    }
    m_rows.insert(m_rows.end(), size_t(copies), m_values);
    return true;
}

bool GlabelsSink::closeLabel(QString* error)
{
    if (!m_open)
        return true;
    m_open = false;
    if (m_rows.empty())
        return true;
    const bool ok = makeLabels(error);
    m_rows.clear();
    return ok;
}

bool GlabelsSink::canMakeLabels(QString* program, QString* error) const
{
    *program = QStandardPaths::findExecutable(kBatchProgram);
    if (program->isEmpty()) {
        *error = QStringLiteral("glabels-3-batch לא נמצא: יש להתקין את gLabels (החבילה glabels) כדי להדפיס דרכו");
        return false;
    }
    if (m_options.jobFolder.isEmpty() || !QFileInfo(m_options.jobFolder).isDir()) {
        *error = QStringLiteral("תיקיית העבודה '%1' אינה קיימת").arg(native(m_options.jobFolder));
        return false;
    }
    return true;
}

QString GlabelsSink::nextStem()
{
    const QDir dir(m_options.jobFolder);
    for (;;) {
        const QString stem = QStringLiteral("tgrlab-%1").arg(++m_counter, 3, 10, QLatin1Char('0'));
        // A file of an earlier run in the same folder is somebody's output: never overwritten.
        bool taken = false;
        for (const char* ext : {".pdf", ".pdf.part", ".csv", ".glabels"})
            taken = taken || QFileInfo::exists(dir.filePath(stem + QLatin1String(ext)));
        if (!taken)
            return stem;
    }
}

bool GlabelsSink::makeLabels(QString* error)
{
    QString program;
    if (!canMakeLabels(&program, error))
        return false;
    const QDir dir(m_options.jobFolder);
    const QString stem = nextStem();
    const QString csvPath = dir.absoluteFilePath(stem + QStringLiteral(".csv"));
    const QString docPath = dir.absoluteFilePath(stem + QStringLiteral(".glabels"));
    const QString pdfPath = dir.absoluteFilePath(stem + QStringLiteral(".pdf"));

    QStringList names = m_names;
    const bool numbered = names.isEmpty();
    if (numbered) // rows without any variable still are labels to print
        names << QStringLiteral("TagoraLabel");
    QString csv;
    {
        QStringList header;
        for (const QString& n : names)
            header << csvField(n);
        csv += header.join(QLatin1Char(',')) + QLatin1String("\r\n");
        int number = 0;
        for (const QStringList& row : m_rows) {
            ++number;
            QStringList line;
            for (int i = 0; i < names.size(); ++i)
                line << csvField(numbered ? QString::number(number) : (i < row.size() ? row[i] : QString()));
            csv += line.join(QLatin1Char(',')) + QLatin1String("\r\n");
        }
    }
    QByteArray doc;
    if (!GlabelsMergeCopy(m_document, csvPath, &doc, error) || !writeFile(csvPath, csv.toUtf8(), error)
        || !writeFile(docPath, doc, error)) {
        QFile::remove(csvPath);
        QFile::remove(docPath);
        return false;
    }

    const int pages = int((m_rows.size() + size_t(m_document.labelsPerSheet) - 1) / size_t(m_document.labelsPerSheet));
    if (!runBatch(program, docPath, csvPath, pdfPath, pages, error)) {
        // The rows and the document as the program saw them, to find out why.
        *error += QStringLiteral(" (קובצי העבודה נשמרו: %1, %2)").arg(native(csvPath), native(docPath));
        return false;
    }
    QFile::remove(csvPath);
    QFile::remove(docPath);

    if (m_options.printer.isEmpty()) {
        m_kept << pdfPath;
        return true;
    }
    QString cupsError;
    const QString title = QStringLiteral("Tagora %1").arg(QFileInfo(m_document.path).completeBaseName());
    if (!PrintFileOnCups(m_options.printer, pdfPath, false, title, m_options.timeoutSeconds, &cupsError)) {
        m_kept << pdfPath;
        *error = QStringLiteral("המדפסת %1 לא קיבלה את המדבקות: %2 (הקובץ נשמר: %3)")
                     .arg(m_options.printer, cupsError, native(pdfPath));
        return false;
    }
    QFile::remove(pdfPath);
    return true;
}

bool GlabelsSink::runBatch(const QString& program, const QString& document, const QString& csv,
                           const QString& pdf, int expectedPages, QString* error)
{
    // Written aside: a PDF under its own name is always a whole one.
    const QString part = pdf + QStringLiteral(".part");
    QFile::remove(part);
    const int seconds = m_options.timeoutSeconds > 0 ? m_options.timeoutSeconds : 60;
    QDeadlineTimer deadline(qint64(seconds) * 1000);
    QProcess process;
    process.setProgram(program);
    process.setArguments({QStringLiteral("-o"), part, QStringLiteral("-i"), csv, document});
    process.setWorkingDirectory(m_options.jobFolder);
    process.setProcessChannelMode(QProcess::MergedChannels);
    process.setStandardInputFile(QProcess::nullDevice());
    process.start();
    if (!process.waitForStarted(int(std::max<qint64>(1, deadline.remainingTime())))) {
        *error = QStringLiteral("לא ניתן להפעיל את glabels-3-batch: %1").arg(process.errorString());
        return false;
    }
    if (!process.waitForFinished(int(std::max<qint64>(1, deadline.remainingTime())))) {
        process.kill();
        process.waitForFinished(5000);
        QFile::remove(part);
        *error = QStringLiteral("glabels-3-batch לא סיים בתוך %1 שניות ונעצר").arg(seconds);
        return false;
    }
    const QString output = QString::fromLocal8Bit(process.readAll());
    QString failure;
    if (process.exitStatus() != QProcess::NormalExit)
        failure = QStringLiteral("התוכנה קרסה: %1").arg(outputTail(output));
    else if (process.exitCode() != 0)
        failure = QStringLiteral("קוד יציאה %1: %2").arg(process.exitCode()).arg(outputTail(output));
    else
        failure = failureLines(output);
    QByteArray bytes;
    if (failure.isEmpty()) {
        QFile made(part);
        if (made.open(QIODevice::ReadOnly))
            bytes = made.readAll();
        if (!bytes.startsWith("%PDF-"))
            failure = QStringLiteral("לא נוצר קובץ PDF");
    }
    if (failure.isEmpty()) {
        const int pages = pdfPageCount(bytes);
        if (pages >= 0 && pages != expectedPages)
            failure = QStringLiteral("נוצרו %1 עמודים במקום %2").arg(pages).arg(expectedPages);
    }
    if (failure.isEmpty() && !QFile::rename(part, pdf))
        failure = QStringLiteral("לא ניתן לשמור את '%1'").arg(native(pdf));
    if (!failure.isEmpty()) {
        QFile::remove(part);
        *error = QStringLiteral("glabels-3-batch לא יצר את המדבקות של '%1': %2").arg(native(m_document.path), failure);
        return false;
    }
    return true;
}

QString DemoLabel(const QString& folder, const QString& fileName, QString* error)
{
    const QString path = QDir(folder).absoluteFilePath(fileName);
    if (QFileInfo::exists(path))
        return path;
    QFile supplied(QStringLiteral(":/tagora/labels/") + fileName);
    if (!supplied.open(QIODevice::ReadOnly)) {
        *error = QStringLiteral("מדבקת הדוגמה %1 חסרה בתוכנה").arg(fileName);
        return QString();
    }
    if (!QDir().mkpath(folder)) {
        *error = QStringLiteral("לא ניתן ליצור את התיקייה '%1'").arg(native(folder));
        return QString();
    }
    if (!writeFile(path, supplied.readAll(), error))
        return QString();
    return path;
}

QString DemoGlabelsLabel(const QString& folder, QString* error)
{
    return DemoLabel(folder, QStringLiteral("demo-item.glabels"), error);
}

} // namespace tagora
