#include "TopWidget.h"

#include <QWidget>

QWidget* TopWidget(QWidget* widget)
{
    while (widget && widget->parentWidget())
        widget = widget->parentWidget();
    return widget;
}
