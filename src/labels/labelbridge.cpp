#include "labels/labelbridge.h"

namespace tagora {

BridgeProvider::BridgeProvider(LabelSinkFactory factory)
    : m_factory(std::move(factory))
{
}

std::shared_ptr<AutomationObject> BridgeProvider::create(const QString& progId, QString* error)
{
    *error = QStringLiteral("not yet: ") + progId;
    return nullptr;
}

} // namespace tagora
