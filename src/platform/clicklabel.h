#pragma once

#include <QLabel>

namespace tagora {

// A label that answers a click: the step pictures, the "to" captions that copy
// a value across, the variable numbers that step on each click.
class ClickLabel : public QLabel {
    Q_OBJECT
public:
    explicit ClickLabel(QWidget* parent = nullptr);

signals:
    void clicked();
    void doubleClicked();

protected:
    void mousePressEvent(QMouseEvent* event) override;
    void mouseReleaseEvent(QMouseEvent* event) override;
    void mouseDoubleClickEvent(QMouseEvent* event) override;

private:
    bool m_pressed = false;
};

} // namespace tagora

using tagora::ClickLabel;
