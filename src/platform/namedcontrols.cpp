#include "platform/namedcontrols.h"

#include <QAbstractButton>
#include <QJsonDocument>
#include <QJsonObject>
#include <QLayout>
#include <QMetaMethod>
#include <QRegularExpression>
#include <QWidget>

namespace tagora {

void renameIndexedControls(QWidget* root)
{
    static const QRegularExpression indexed(QStringLiteral("^([A-Za-z][A-Za-z0-9]*)_([0-9]+)$"));
    const auto widgets = root->findChildren<QWidget*>();
    for (QWidget* w : widgets) {
        const auto m = indexed.match(w->objectName());
        if (m.hasMatch())
            w->setObjectName(m.captured(1) + QLatin1Char('(') + m.captured(2) + QLatin1Char(')'));
    }
}

QObject* findControl(const QObject* root, const QString& name)
{
    if (!root || name.isEmpty())
        return nullptr;
    if (root->objectName() == name)
        return const_cast<QObject*>(root);
    return root->findChild<QObject*>(name, Qt::FindChildrenRecursively);
}

bool clickControl(QObject* control)
{
    if (!control)
        return false;
    if (auto* b = qobject_cast<QAbstractButton*>(control)) {
        if (!b->isEnabled())
            return false;
        b->click();
        return true;
    }
    const QMetaObject* mo = control->metaObject();
    const int idx = mo->indexOfSignal("clicked()");
    if (idx < 0)
        return false;
    return mo->method(idx).invoke(control, Qt::DirectConnection);
}

namespace {
bool isCallable(const QMetaMethod& m)
{
    return m.access() == QMetaMethod::Public
        && (m.methodType() == QMetaMethod::Method || m.methodType() == QMetaMethod::Slot);
}

std::optional<QVariant> convertArg(const QString& text, QMetaType type, const QObject* controlRoot, QString* error)
{
    const int id = type.id();
    if (id == QMetaType::QVariant)
        return QVariant(text);
    if (id == QMetaType::QString)
        return QVariant(text);
    if (id == QMetaType::Bool) {
        const QString t = text.trimmed().toLower();
        if (t == QLatin1String("true") || t == QLatin1String("yes") || t == QLatin1String("-1") || t == QLatin1String("1"))
            return QVariant(true);
        if (t == QLatin1String("false") || t == QLatin1String("no") || t == QLatin1String("0"))
            return QVariant(false);
        *error = QStringLiteral("'%1' is not true or false").arg(text);
        return std::nullopt;
    }
    if (id == QMetaType::QVariantMap) {
        QJsonParseError pe{};
        const QJsonDocument doc = QJsonDocument::fromJson(text.toUtf8(), &pe);
        if (pe.error != QJsonParseError::NoError || !doc.isObject()) {
            *error = QStringLiteral("'%1' is not a JSON object").arg(text);
            return std::nullopt;
        }
        return QVariant(doc.object().toVariantMap());
    }
    if (id == QMetaType::QObjectStar) {
        QObject* o = findControl(controlRoot, text);
        if (!o) {
            *error = QStringLiteral("no control named '%1'").arg(text);
            return std::nullopt;
        }
        return QVariant::fromValue(o);
    }
    bool ok = false;
    const qlonglong n = text.trimmed().toLongLong(&ok);
    if (!ok) {
        *error = QStringLiteral("'%1' is not a whole number").arg(text);
        return std::nullopt;
    }
    qlonglong lo = 0, hi = 0;
    switch (id) {
    case QMetaType::UChar: lo = 0; hi = 255; break;
    case QMetaType::Short: lo = -32768; hi = 32767; break;
    case QMetaType::Int: lo = INT_MIN; hi = INT_MAX; break;
    case QMetaType::LongLong: lo = LLONG_MIN; hi = LLONG_MAX; break;
    default:
        *error = QStringLiteral("arguments of type %1 cannot be given as text").arg(QString::fromLatin1(type.name()));
        return std::nullopt;
    }
    if (n < lo || n > hi) {
        *error = QStringLiteral("%1 is out of range for %2").arg(text, QString::fromLatin1(type.name()));
        return std::nullopt;
    }
    QVariant v(n);
    v.convert(type);
    return v;
}
} // namespace

std::optional<std::pair<int, int>> methodArity(const QObject* target, const QString& method)
{
    if (!target)
        return std::nullopt;
    const QMetaObject* mo = target->metaObject();
    std::optional<std::pair<int, int>> out;
    for (int i = 0; i < mo->methodCount(); ++i) {
        const QMetaMethod m = mo->method(i);
        if (!isCallable(m) || QString::fromLatin1(m.name()) != method)
            continue;
        const int n = m.parameterCount();
        if (!out)
            out = std::make_pair(n, n);
        else
            out = std::make_pair(std::min(out->first, n), std::max(out->second, n));
    }
    return out;
}

CallResult callMethod(QObject* target, const QString& method, const QStringList& args, const QObject* controlRoot)
{
    CallResult result;
    if (!target) {
        result.error = QStringLiteral("no object");
        return result;
    }
    const QMetaObject* mo = target->metaObject();
    QMetaMethod chosen;
    bool nameFound = false;
    for (int i = 0; i < mo->methodCount(); ++i) {
        const QMetaMethod m = mo->method(i);
        if (!isCallable(m) || QString::fromLatin1(m.name()) != method)
            continue;
        nameFound = true;
        if (m.parameterCount() == args.size()) {
            chosen = m;
            break;
        }
    }
    if (!chosen.isValid()) {
        result.error = nameFound ? QStringLiteral("%1 does not take %2 arguments").arg(method).arg(args.size())
                                 : QStringLiteral("no public method named '%1'").arg(method);
        return result;
    }

    std::vector<QVariant> values;
    values.reserve(size_t(args.size()));
    for (int i = 0; i < args.size(); ++i) {
        QString error;
        auto v = convertArg(args[i], chosen.parameterMetaType(i), controlRoot ? controlRoot : target, &error);
        if (!v) {
            result.error = QStringLiteral("argument %1 (%2): %3")
                               .arg(i + 1)
                               .arg(QString::fromLatin1(chosen.parameterNames().value(i)), error);
            return result;
        }
        values.push_back(*v);
    }

    QGenericArgument a[10];
    for (size_t i = 0; i < values.size(); ++i) {
        const QMetaType t = chosen.parameterMetaType(int(i));
        // A QVariant parameter takes the variant itself, any other type its payload.
        a[i] = QGenericArgument(t.name(), t.id() == QMetaType::QVariant ? static_cast<const void*>(&values[i])
                                                                         : values[i].constData());
    }

    const QMetaType rt = chosen.returnMetaType();
    result.hasValue = rt.id() != QMetaType::Void;
    QVariant ret = result.hasValue ? QVariant(rt) : QVariant();
    QGenericReturnArgument r;
    if (result.hasValue)
        r = QGenericReturnArgument(rt.name(), rt.id() == QMetaType::QVariant ? static_cast<void*>(&ret) : ret.data());
    result.ok = chosen.invoke(target, Qt::DirectConnection, r, a[0], a[1], a[2], a[3], a[4], a[5], a[6], a[7],
                              a[8], a[9]);
    if (!result.ok)
        result.error = QStringLiteral("%1 could not be called").arg(method);
    result.value = ret;
    return result;
}

QString variantText(const QVariant& value)
{
    if (!value.isValid() || value.isNull())
        return QString();
    switch (value.metaType().id()) {
    case QMetaType::Bool: return value.toBool() ? QStringLiteral("True") : QStringLiteral("False");
    case QMetaType::UChar: return QString::number(value.value<uchar>());
    case QMetaType::QVariantMap:
        return QString::fromUtf8(QJsonDocument(QJsonObject::fromVariantMap(value.toMap())).toJson(QJsonDocument::Compact));
    default: return value.toString();
    }
}

} // namespace tagora
