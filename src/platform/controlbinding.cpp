#include "platform/controlbinding.h"

#include <QCheckBox>
#include <QComboBox>
#include <QLabel>
#include <QLineEdit>
#include <QListWidget>
#include <QRadioButton>
#include <QTabWidget>
#include <QTextEdit>
#include <QPlainTextEdit>
#include <QAbstractButton>
#include <QGroupBox>
#include <cmath>

namespace tagora {

bool isBindKind(int kind)
{
    return kind == 1 || kind == 2 || kind == 3 || kind == 5;
}

std::optional<bool> parseTruth(const QString& text)
{
    const QString t = text.trimmed();
    if (t.compare(QLatin1String("true"), Qt::CaseInsensitive) == 0)
        return true;
    if (t.compare(QLatin1String("false"), Qt::CaseInsensitive) == 0)
        return false;
    bool ok = false;
    const double d = t.toDouble(&ok);
    if (!ok || !std::isfinite(d))
        return std::nullopt;
    return d != 0.0;
}

namespace {
std::optional<long long> parseWhole(const QString& text)
{
    bool ok = false;
    const double d = text.trimmed().toDouble(&ok);
    if (!ok || !std::isfinite(d) || std::fabs(d) > 2147483647.0)
        return std::nullopt;
    return std::llround(d);
}
} // namespace

bool listLacksStored(const QObject* c, BindKind kind, const QString& stored)
{
    auto* list = qobject_cast<const QComboBox*>(c);
    if (!list || list->isEditable() || list->currentIndex() >= 0)
        return false;
    if (kind == BindKind::Text)
        return !stored.isEmpty() && list->findText(stored, Qt::MatchFixedString) < 0;
    if (kind == BindKind::ListIndex) {
        const auto n = parseWhole(stored);
        return !n || *n < -1 || *n >= list->count();
    }
    return false;
}

std::optional<BindKind> naturalKind(const QObject* c)
{
    if (qobject_cast<const QLineEdit*>(c) || qobject_cast<const QTextEdit*>(c) || qobject_cast<const QPlainTextEdit*>(c))
        return BindKind::Text;
    if (qobject_cast<const QComboBox*>(c) || qobject_cast<const QTabWidget*>(c) || qobject_cast<const QListWidget*>(c))
        return BindKind::ListIndex;
    if (qobject_cast<const QAbstractButton*>(c) && static_cast<const QAbstractButton*>(c)->isCheckable())
        return BindKind::Value;
    if (qobject_cast<const QLabel*>(c) || qobject_cast<const QAbstractButton*>(c) || qobject_cast<const QGroupBox*>(c))
        return BindKind::Caption;
    return std::nullopt;
}

void setOptionValue(QObject* c, bool on)
{
    auto* b = qobject_cast<QAbstractButton*>(c);
    if (!b)
        return;
    if (on || !b->isChecked() || !b->autoExclusive()) {
        b->setChecked(on);
        return;
    }
    b->setAutoExclusive(false);
    b->setChecked(false);
    b->setAutoExclusive(true);
}

std::optional<QString> readBound(const QObject* c, BindKind kind)
{
    if (!c)
        return std::nullopt;
    switch (kind) {
    case BindKind::Text:
        if (auto* e = qobject_cast<const QLineEdit*>(c))
            return e->text();
        if (auto* cb = qobject_cast<const QComboBox*>(c))
            return cb->currentText();
        if (auto* t = qobject_cast<const QTextEdit*>(c))
            return t->toPlainText();
        if (auto* t = qobject_cast<const QPlainTextEdit*>(c))
            return t->toPlainText();
        if (auto* l = qobject_cast<const QLabel*>(c))
            return l->text();
        break;
    case BindKind::ListIndex:
        if (auto* cb = qobject_cast<const QComboBox*>(c))
            return QString::number(cb->currentIndex());
        if (auto* tw = qobject_cast<const QTabWidget*>(c))
            return QString::number(tw->currentIndex());
        if (auto* lw = qobject_cast<const QListWidget*>(c))
            return QString::number(lw->currentRow());
        break;
    case BindKind::Value:
        if (auto* ch = qobject_cast<const QCheckBox*>(c))
            return QString::number(ch->checkState() == Qt::Checked ? 1 : ch->checkState() == Qt::PartiallyChecked ? 2 : 0);
        if (auto* b = qobject_cast<const QAbstractButton*>(c))
            return b->isChecked() ? QStringLiteral("True") : QStringLiteral("False");
        break;
    case BindKind::Caption:
        if (auto* l = qobject_cast<const QLabel*>(c))
            return l->text();
        if (auto* b = qobject_cast<const QAbstractButton*>(c))
            return b->text();
        if (auto* g = qobject_cast<const QGroupBox*>(c))
            return g->title();
        break;
    }
    return std::nullopt;
}

bool writeBound(QObject* c, BindKind kind, const QString& text)
{
    if (!c)
        return false;
    switch (kind) {
    case BindKind::Text:
        if (auto* e = qobject_cast<QLineEdit*>(c)) {
            e->setText(text);
            return true;
        }
        if (auto* cb = qobject_cast<QComboBox*>(c)) {
            if (cb->isEditable()) {
                cb->setEditText(text);
                return true;
            }
            // A fixed list only takes a text it holds; "" clears the choice.
            if (text.isEmpty()) {
                cb->setCurrentIndex(-1);
                return true;
            }
            const int i = cb->findText(text, Qt::MatchFixedString);
            if (i < 0)
                return false;
            cb->setCurrentIndex(i);
            return true;
        }
        if (auto* t = qobject_cast<QTextEdit*>(c)) {
            t->setPlainText(text);
            return true;
        }
        if (auto* t = qobject_cast<QPlainTextEdit*>(c)) {
            t->setPlainText(text);
            return true;
        }
        if (auto* l = qobject_cast<QLabel*>(c)) {
            l->setText(text);
            return true;
        }
        return false;
    case BindKind::ListIndex: {
        const auto n = parseWhole(text);
        if (!n)
            return false;
        if (auto* cb = qobject_cast<QComboBox*>(c)) {
            if (*n < -1 || *n >= cb->count())
                return false;
            cb->setCurrentIndex(int(*n));
            return true;
        }
        if (auto* tw = qobject_cast<QTabWidget*>(c)) {
            if (*n < 0 || *n >= tw->count())
                return false;
            tw->setCurrentIndex(int(*n));
            return true;
        }
        if (auto* lw = qobject_cast<QListWidget*>(c)) {
            if (*n < -1 || *n >= lw->count())
                return false;
            lw->setCurrentRow(int(*n));
            return true;
        }
        return false;
    }
    case BindKind::Value:
        if (auto* ch = qobject_cast<QCheckBox*>(c)) {
            const auto n = parseWhole(text);
            if (!n || *n < 0 || *n > 2)
                return false;
            if (*n == 2)
                ch->setTristate(true);
            ch->setCheckState(*n == 0 ? Qt::Unchecked : *n == 1 ? Qt::Checked : Qt::PartiallyChecked);
            return true;
        }
        if (auto* b = qobject_cast<QAbstractButton*>(c)) {
            if (!b->isCheckable())
                return false;
            const auto on = parseTruth(text);
            if (!on)
                return false;
            setOptionValue(b, *on);
            return true;
        }
        return false;
    case BindKind::Caption:
        if (auto* l = qobject_cast<QLabel*>(c)) {
            l->setText(text);
            return true;
        }
        if (auto* b = qobject_cast<QAbstractButton*>(c)) {
            b->setText(text);
            return true;
        }
        if (auto* g = qobject_cast<QGroupBox*>(c)) {
            g->setTitle(text);
            return true;
        }
        return false;
    }
    return false;
}

} // namespace tagora
