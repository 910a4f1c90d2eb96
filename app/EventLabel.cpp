#include "EventLabel.h"

#include <QMouseEvent>

EventLabel::EventLabel(QWidget* parent)
    : QLabel(parent)
{
}

void EventLabel::mouseReleaseEvent(QMouseEvent* event)
{
    emit mouseRelease(event);
    event->accept();
}
