#pragma once

class QWidget;

// The outermost ancestor of widget: widget itself when it has no parent, null for null.
QWidget* TopWidget(QWidget* widget);
