#pragma once

#include <QLabel>

namespace tagora {

// A caption for a text that can be longer than the screen (a label file's
// path): it takes the width its layout gives it and no more, shows the text
// elided in the middle when it does not fit, and the whole text as its tool
// tip. text() is always the whole text, as stored and as hosts read it.
class ElidedLabel : public QLabel {
    Q_OBJECT
public:
    explicit ElidedLabel(QWidget* parent = nullptr);

    QSize sizeHint() const override;
    QSize minimumSizeHint() const override;

    // The text as it is painted at the present width.
    QString shownText() const;

protected:
    bool event(QEvent* event) override;
    void paintEvent(QPaintEvent* event) override;

private:
    QRect textRect() const;
    void syncToolTip();
};

} // namespace tagora

using tagora::ElidedLabel;
