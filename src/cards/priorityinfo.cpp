#include "cards/priorityinfo.h"

#include "cards/cardpage.h"
#include "platform/pageviewer.h"
#include "platform/prompt.h"

namespace tagora {

PriorityInfo::PriorityInfo(std::shared_ptr<PageViewer> pages, std::shared_ptr<Prompt> prompt)
    : m_pages(std::move(pages))
    , m_prompt(std::move(prompt))
{
}

void PriorityInfo::OpenItemHTML(const QString&, const QString&, short, const QString&) {}

QString PriorityInfo::CreateItemHTML(const QString&, const QString&, const QString&, short, const QString&)
{
    return QStringLiteral("not yet");
}

QStringList PriorityInfo::CreateHTMLStyle() { return {}; }

QString PriorityInfo::CreateWaitHTML(const QString& fileName)
{
    return WriteCardWaitPage(fileName, QStringLiteral("#5F8EBE"), true);
}

QString PriorityInfo::CreateErrorHTML(const QString& fileName, const QString& message)
{
    return WriteCardErrorPage(fileName, message);
}

} // namespace tagora
