#pragma once

#include <QObject>
#include <QString>
#include <QStringList>
#include <memory>

namespace tagora {

class PageViewer;
class Prompt;

// The item card from the local databases: the item, its price lists,
// special prices and alternate keys, and one account's label definition.
// A public class: hosts create it and call its methods, through the
// meta-object as well.
class TagoraInfo : public QObject {
    Q_OBJECT
public:
    // Without services the user's browser and message boxes serve.
    explicit TagoraInfo(QObject* parent = nullptr);
    TagoraInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt, QObject* parent = nullptr);
    ~TagoraInfo() override;

    // The waiting page in a new window, then the card in that window. On a
    // failure the reason is shown as a fault and the window keeps the
    // waiting page.
    Q_INVOKABLE void OpenItemHTML(const QString& pItemCode, const QString& pDBName,
                                  const QString& pAccountKey = QString());
    // Writes the card of pItemCode, read from the database pDBName (the
    // temporary documents database, whose links reach the items), to
    // pFileName. True on success; a failure is shown as a fault and leaves
    // no half-made page at pFileName.
    Q_INVOKABLE bool CreateItemHTML(const QString& pFileName, const QString& pItemCode, const QString& pDBName,
                                    const QString& pAccountKey = QString());
    // The lines of the card's style element.
    Q_INVOKABLE QStringList CreateHTMLStyle() const;

private:
    // Empty text when the whole card is at fileName, else why it could not
    // be made (and no card is left there).
    QString writeCard(const QString& fileName, const QString& itemCode, const QString& dbName,
                      const QString& accountKey);

    std::shared_ptr<PageViewer> m_pages;
    std::shared_ptr<Prompt> m_prompt;
};

} // namespace tagora
