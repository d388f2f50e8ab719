#include "labels/pagewriter.h"

namespace tagora {

QString HtmlText(const QString& text)
{
    return text.toHtmlEscaped().replace(QLatin1Char('\''), QLatin1String("&#39;"));
}

PageWriter::PageWriter(const QString& path)
    : m_file(path)
{
}

bool PageWriter::open()
{
    return m_file.open(QIODevice::WriteOnly);
}

void PageWriter::write(const QString& text)
{
    QByteArray bytes = m_encoder.encode(text);
    if (m_encoder.hasError()) {
        bytes.clear();
        // One reference per character: a surrogate pair is one code point.
        for (int i = 0; i < text.size(); ++i) {
            const bool pair = text[i].isHighSurrogate() && i + 1 < text.size() && text[i + 1].isLowSurrogate();
            const QString one = pair ? text.mid(i, 2) : text.mid(i, 1);
            QStringEncoder single("windows-1255");
            QByteArray b = single.encode(one);
            if (single.hasError())
                b = "&#" + QByteArray::number(one.toUcs4().value(0)) + ';';
            bytes += b;
            if (pair)
                ++i;
        }
        m_encoder.resetState();
    }
    // The buffer hides a failed write from write()'s count; the device's
    // error shows it once the buffer was flushed.
    if (!m_failed && (m_file.write(bytes) != bytes.size() || m_file.error() != QFileDevice::NoError))
        m_failed = true;
}

bool PageWriter::commit()
{
    // QSaveFile (Qt 6.4) commits a page whose last buffer the disk refused
    // (a file size limit, a full disk): the flush is asked first.
    if (!m_failed && !m_file.flush())
        m_failed = true;
    if (m_failed) {
        m_file.cancelWriting();
        m_file.commit();
        return false;
    }
    return m_file.commit();
}

} // namespace tagora
