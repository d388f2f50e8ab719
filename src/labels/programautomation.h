#pragma once

#include <QFile>
#include <QString>
#include <QVariant>
#include <QVariantList>
#include <functional>
#include <map>
#include <memory>

namespace tagora {

// An automation object of a label program: members called by name with
// arguments, properties set by name. A call that fails returns false (or a
// null object) with the program's description in error.
class AutomationObject {
public:
    virtual ~AutomationObject() = default;
    virtual bool call(const QString& member, const QVariantList& args, QVariant* result, QString* error) = 0;
    // A member or property whose value is itself an object (a document, a collection, a variable).
    virtual std::shared_ptr<AutomationObject> object(const QString& member, const QVariantList& args,
                                                     QString* error) = 0;
    virtual bool setProperty(const QString& name, const QVariant& value, QString* error) = 0;
};

// Makes the application object of a program from its ProgID.
class AutomationProvider {
public:
    virtual ~AutomationProvider() = default;
    virtual std::shared_ptr<AutomationObject> create(const QString& progId, QString* error) = 0;
};

// Providers by ProgID. A provider for a real program (ActiveQt on Windows, a
// bridge to a Linux label program) is added here; the adapters never change.
// A ProgID without a provider goes to the fallback, if one is set.
class AutomationRegistry {
public:
    void add(const QString& progId, std::shared_ptr<AutomationProvider> provider);
    void setFallback(std::shared_ptr<AutomationProvider> provider);
    std::shared_ptr<AutomationObject> create(const QString& progId, QString* error) const;

private:
    std::map<QString, std::shared_ptr<AutomationProvider>> m_providers;
    std::shared_ptr<AutomationProvider> m_fallback;
};

// The journal: a stand-in for every label program, for users without one on
// this system and for tests. Every object creation, call and property
// assignment is written, in order, as one line of the journal file:
//   create NiceLabel.Application
//   NiceLabel.Application.LabelOpen("/labels/a.lbl") -> 3
//   LPPX.Application.ActiveDocument.Variables("ItemKey").Value = "A'1"
//   release NiceLabel.Application
// An object is named by the path it was reached by. Texts are in double quotes
// with \" \\ \n \r \t escaped; whole numbers and decimals bare; True/False;
// Null. A call answers with the number of its line in the journal, so
// identifiers a program hands back (a label id) are distinct and stable.
class JournalProvider : public AutomationProvider {
public:
    explicit JournalProvider(QString path);
    ~JournalProvider() override;
    std::shared_ptr<AutomationObject> create(const QString& progId, QString* error) override;

    struct Sink;

private:
    std::shared_ptr<Sink> m_sink;
};

// A value as the journal writes it.
QString journalValue(const QVariant& value);

} // namespace tagora
