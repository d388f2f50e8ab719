#pragma once

#include <QDate>
#include <QString>
#include <QStringList>
#include <QVariantList>
#include <memory>

namespace tagora {

class CardPage;
class ErpConnection;
class PageViewer;
class Prompt;

// The item card from the ERP: everything the ERP knows about one item, as a
// page in the user's temporary folder, shown in a browser window. Used by
// the selection grids; not offered to hosts.
class PriorityInfo {
public:
    PriorityInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt);

    // The waiting page in a new window, then the card in that window, or the
    // error page there when the card could not be made. Without a window the
    // reason is shown as a fault message instead.
    void OpenItemHTML(const QString& pItemCode, const QString& pConnStr, short pConnType, const QString& pConnPath);
    // Writes the card of pItemCode to pFileName: empty text on success, else
    // why (and no half-made page is left at pFileName). Nothing is written to
    // the ERP; an unreachable one ends within the connection's time-out.
    QString CreateItemHTML(const QString& pFileName, const QString& pItemCode, const QString& pConnStr,
                           short pConnType, const QString& pConnPath);
    // The lines of the card's style element.
    static QStringList CreateHTMLStyle();
    static QString CreateWaitHTML(const QString& fileName);
    static QString CreateErrorHTML(const QString& fileName, const QString& message);

    // The day the card's "valid today" sections are read for (today unless set).
    void setToday(const QDate& day) { m_today = day; }
    // Seconds the ERP connection and its queries may take together.
    void setTimeout(int seconds) { m_timeout = seconds; }

private:
    // The sections of a found item (its row of the item query).
    void writeItem(CardPage& page, ErpConnection& erp, const QVariantList& item, const QString& connPath);
    void writeParameters(CardPage& page, ErpConnection& erp, const QVariantList& byId);
    // Where the browser finds the item's picture: a name from the ERP's
    // folder ("..") put under the company folder connPath, any other as it is.
    static QString pictureSource(const QString& name, const QString& connPath);

    std::shared_ptr<PageViewer> m_pages;
    std::shared_ptr<Prompt> m_prompt;
    QDate m_today;
    int m_timeout = 30;
};

} // namespace tagora
