#pragma once

#include <QPoint>
#include <QSize>
#include <QString>

class QWidget;

// The place of a window kept in the settings group of its kind. A window opens at the stored
// place, or one step right and down for each window of the same class that already stands
// there (a cascade), starting again at its screen's corner rather than running off it. It
// stores its place without its cascade steps, so that opening and closing never walks.
class WindowCascade
{
public:
    WindowCascade(QString group, int step);

    // Resizes and moves window to its place; the defaults serve a group stored nowhere yet.
    void restore(QWidget* window, const QPoint& defaultPosition, const QSize& defaultSize);
    void save(const QWidget* window) const;
    // How many cascade steps the window was moved by.
    int steps() const { return m_steps; }

private:
    QString m_group;
    int m_step;
    int m_steps = 0;
};
