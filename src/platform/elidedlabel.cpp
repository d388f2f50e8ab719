#include "platform/elidedlabel.h"

#include <QEvent>
#include <QPainter>
#include <QStyle>

#include <algorithm>

namespace tagora {

namespace {
// Wide enough for a few characters and the ellipsis; the layout gives more.
constexpr int kMinimumChars = 8;
} // namespace

ElidedLabel::ElidedLabel(QWidget* parent)
    : QLabel(parent)
{
    setTextFormat(Qt::PlainText);
    setWordWrap(false);
    setSizePolicy(QSizePolicy::Expanding, sizePolicy().verticalPolicy());
}

QSize ElidedLabel::minimumSizeHint() const
{
    // The whole text's width would hold the screen open for good.
    const QSize base = QLabel::minimumSizeHint();
    const int frame = 2 * (frameWidth() + margin()) + indent();
    return {fontMetrics().averageCharWidth() * kMinimumChars + frame, base.height()};
}

QSize ElidedLabel::sizeHint() const
{
    return {minimumSizeHint().width(), QLabel::sizeHint().height()};
}

QRect ElidedLabel::textRect() const
{
    const int m = margin();
    return contentsRect().adjusted(m, m, -m, -m);
}

QString ElidedLabel::shownText() const
{
    return fontMetrics().elidedText(text(), Qt::ElideMiddle, std::max(textRect().width(), 0));
}

void ElidedLabel::syncToolTip()
{
    if (toolTip() != text())
        setToolTip(text());
}

bool ElidedLabel::event(QEvent* event)
{
    // QLabel tells nobody when its text changes; the tip is brought up to
    // date whenever it could be seen.
    if (event->type() == QEvent::ToolTip)
        syncToolTip();
    return QLabel::event(event);
}

void ElidedLabel::paintEvent(QPaintEvent* event)
{
    QFrame::paintEvent(event);
    syncToolTip();
    const QString shown = shownText();
    if (shown.isEmpty())
        return;
    // As QLabel does: the text reads in its own direction (a path left to
    // right on a right-to-left screen) and is aligned accordingly.
    const Qt::LayoutDirection direction = text().isRightToLeft() ? Qt::RightToLeft : Qt::LeftToRight;
    QPainter painter(this);
    painter.setLayoutDirection(direction);
    style()->drawItemText(&painter, textRect(), int(QStyle::visualAlignment(direction, alignment())), palette(),
                          isEnabled(), shown, foregroundRole());
}

} // namespace tagora
