#pragma once

#include "labels/pagewriter.h"

#include <QString>
#include <QStringList>
#include <QVector>

namespace tagora {

// The item cards' pages: the file names, the folder, and the frame both
// cards share (head, sections, footer, the waiting page and the error page).
namespace cardfiles {
inline constexpr char Wait[] = "vnicrd0.htm";
inline constexpr char ErpCard[] = "vnicrd1.htm";
inline constexpr char LocalCard[] = "vnicrd2.htm";
inline constexpr char ErpError[] = "vnierr1.htm";
} // namespace cardfiles

// A card page's file in the user's temporary folder (made when missing).
QString CardPagePath(const char* fileName);

// A value as a cell shows it: escaped, and "&nbsp;" when there is nothing,
// so an empty cell keeps its borders.
QString CardCell(const QString& text);

// The waiting page, in the card's colour. One that reloads itself carries
// kPageReloadMeta, so the window can be moved on to the card once it is
// written; one that does not stays as it is (the card failed and the window
// keeps the waiting page). Empty text on success, else why.
QString WriteCardWaitPage(const QString& path, const QString& colour, bool reloads);
// The error page of the ERP card: the message under its heading, and a
// button that closes the window. Empty text on success, else why.
QString WriteCardErrorPage(const QString& path, const QString& message);

// One card page being written. Cells passed in are page text already (made
// with CardCell, or markup of the card's own); captions are the system's own
// texts and are escaped here all the same.
class CardPage {
public:
    explicit CardPage(const QString& path) : m_out(path) {}

    // Opens the file and writes the head, the style lines, the start of the
    // body and of the outer table, and the title row. False when the file
    // cannot be made.
    bool begin(const QStringList& styleLines, const QString& titleRow);

    // A table with the column captions in class Cap over one row of cells.
    // cellAttributes as for listSection.
    void captionTable(const QStringList& captions, const QStringList& cells, const QStringList& cellAttributes = {});
    // A section: its caption in class GCap, then a table with the column
    // captions in class Cap and a row per entry. Nothing at all is written
    // for a section without rows.
    void listSection(const QString& caption, const QStringList& columns, const QVector<QStringList>& rows);
    // The same, with the markup each column's cells carry in their tag
    // (e.g. "dir=ltr" for a column of Latin text); an empty entry or a
    // missing one leaves the cell plain.
    void listSection(const QString& caption, const QStringList& columns, const QVector<QStringList>& rows,
                     const QStringList& cellAttributes);
    // Markup of the card's own layout, as it stands.
    void line(const QString& text) { m_out.line(text); }

    // The footer, the closing tags, and the file put in place. Empty text on
    // success, else why (nothing is left at the path then but an earlier page).
    QString finish();

private:
    PageWriter m_out;
};

} // namespace tagora
