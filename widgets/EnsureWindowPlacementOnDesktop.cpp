#include "EnsureWindowPlacementOnDesktop.h"

#include <QGuiApplication>
#include <QScreen>
#include <QWidget>

void EnsureWindowPlacementOnDesktop(QWidget* widget)
{
    const QList<QScreen*> screens = QGuiApplication::screens();
    if (!widget || screens.isEmpty())
        return;

    QRect frame = widget->frameGeometry();
    if (!widget->isWindow())
        frame.moveTopLeft(widget->mapToGlobal(QPoint(0, 0)));
    for (const QScreen* screen : screens) {
        if (screen->geometry().intersects(frame))
            return;
    }
    widget->move(40, 40);
}
