#include "platform/clicklabel.h"

#include <QMouseEvent>

namespace tagora {

ClickLabel::ClickLabel(QWidget* parent)
    : QLabel(parent)
{
    setCursor(Qt::PointingHandCursor);
}

void ClickLabel::mousePressEvent(QMouseEvent* event)
{
    m_pressed = event->button() == Qt::LeftButton;
    QLabel::mousePressEvent(event);
}

void ClickLabel::mouseReleaseEvent(QMouseEvent* event)
{
    const bool inside = rect().contains(event->position().toPoint());
    const bool fire = m_pressed && event->button() == Qt::LeftButton && inside;
    m_pressed = false;
    QLabel::mouseReleaseEvent(event);
    if (fire)
        emit clicked();
}

} // namespace tagora

namespace tagora {

void ClickLabel::mouseDoubleClickEvent(QMouseEvent* event)
{
    QLabel::mouseDoubleClickEvent(event);
    if (event->button() == Qt::LeftButton)
        emit doubleClicked();
}

} // namespace tagora
