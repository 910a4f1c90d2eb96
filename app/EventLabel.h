#pragma once

#include <QLabel>

class QMouseEvent;

// A label that reports each mouse-button release, so it can be used as a button.
class EventLabel : public QLabel
{
    Q_OBJECT

public:
    explicit EventLabel(QWidget* parent = nullptr);

signals:
    void mouseRelease(QMouseEvent* mouseEvent);

protected:
    void mouseReleaseEvent(QMouseEvent* event) override;
};
