#include "cards/tagorainfo.h"

#include "cards/cardpage.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"

namespace tagora {

TagoraInfo::TagoraInfo(QObject* parent)
    : TagoraInfo(std::make_shared<DesktopPageViewer>(), std::make_shared<MessageBoxPrompt>(nullptr), parent)
{
}

TagoraInfo::TagoraInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt, QObject* parent)
    : QObject(parent)
    , m_pages(std::move(pages))
    , m_prompt(std::move(prompt))
{
}

TagoraInfo::~TagoraInfo() = default;

void TagoraInfo::OpenItemHTML(const QString&, const QString&, const QString&) {}

bool TagoraInfo::CreateItemHTML(const QString&, const QString&, const QString&, const QString&) { return false; }

QStringList TagoraInfo::CreateHTMLStyle() const { return {}; }

QString TagoraInfo::writeCard(const QString&, const QString&, const QString&, const QString&) { return QString(); }

} // namespace tagora
