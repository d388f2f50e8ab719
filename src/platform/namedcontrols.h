#pragma once

#include <QString>
#include <QStringList>
#include <QVariant>
#include <optional>

class QObject;
class QWidget;

namespace tagora {

// Reaching a control, its click and its public methods by name, as a host's
// script or the headless host's verbs do. (The label programs' automation
// objects are another matter: labels/programautomation.h.)

// Designer names must be identifiers, so a control array element X(i) is
// drawn as X_i; this gives every such widget under root its published name.
void renameIndexedControls(QWidget* root);

// The named control under root (a child widget or object), or null.
QObject* findControl(const QObject* root, const QString& name);

// Runs a control's click: a button is clicked, a clickable label or picture
// gets its clicked() signal. False when the control has nothing to click.
bool clickControl(QObject* control);

// Calls a public method by name with arguments given as text, converting each
// to the method's parameter type (numbers, true/false, a JSON object for a
// record, a control name for an object). The method is chosen by name and
// argument count. The result is empty for a method without one.
struct CallResult {
    bool ok = false;
    bool hasValue = false;
    QVariant value;
    QString error;
};
CallResult callMethod(QObject* target, const QString& method, const QStringList& args,
                      const QObject* controlRoot = nullptr);

// The number of arguments a public method takes at least and at most, or
// nothing when the object has no such method.
std::optional<std::pair<int, int>> methodArity(const QObject* target, const QString& method);

// A value as text, the way the headless host prints results.
QString variantText(const QVariant& value);

} // namespace tagora
