#pragma once

#include <QSaveFile>
#include <QString>
#include <QStringEncoder>

namespace tagora {

// A value as page text: what was typed shows as typed, apostrophes included,
// so it can stand inside an attribute too.
QString HtmlText(const QString& text);

// The lines of a page the system shows, in the code page it declares
// (Windows-1255), each with CRLF. A character the code page lacks goes as a
// numeric reference rather than a question mark. The page is written aside
// and takes its name only when whole: a failure leaves neither a cut page nor
// a stray file, and an earlier page at that name stays until a whole one
// replaces it.
class PageWriter {
public:
    explicit PageWriter(const QString& path);

    bool open();
    void line(const QString& text) { write(text + QStringLiteral("\r\n")); }
    void write(const QString& text);

    // A write that failed (a full disk) fails the page: the rest need not be made.
    bool failed() const { return m_failed; }

    // Puts the page in place; false, with the page left out, when any write failed.
    bool commit();

private:
    QSaveFile m_file;
    QStringEncoder m_encoder{"windows-1255"};
    bool m_failed = false;
};

} // namespace tagora
