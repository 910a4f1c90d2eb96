#include "WindowCascade.h"

#include "EnsureWindowPlacementOnDesktop.h"

#include <QApplication>
#include <QScreen>
#include <QSet>
#include <QSettings>
#include <QWidget>

#include <utility>

namespace {

// Corners a cascade uses before it starts again at the top.
constexpr int StepsPerRound = 8;

} // namespace

WindowCascade::WindowCascade(QString group, int step)
    : m_group(std::move(group))
    , m_step(step)
{
}

void WindowCascade::restore(QWidget* window, const QPoint& defaultPosition, const QSize& defaultSize)
{
    QSettings settings;
    settings.beginGroup(m_group);
    const QPoint position = settings.value("pos", defaultPosition).toPoint();
    const QSize size = settings.value("size", defaultSize).toSize();
    settings.endGroup();
    window->resize(size);

    QSet<QPoint> taken;
    const char* kind = window->metaObject()->className();
    for (const QWidget* other : QApplication::topLevelWidgets()) {
        if (other != window && other->isVisible() && qstrcmp(other->metaObject()->className(), kind) == 0)
            taken.insert(other->pos());
    }
    const auto stepped = [this](const QPoint& from, int steps) { return from + QPoint(m_step, m_step) * steps; };
    m_steps = 0;
    while (taken.contains(stepped(position, m_steps)) && m_steps < StepsPerRound * 4)
        ++m_steps;
    QPoint placed = stepped(position, m_steps);
    if (const QScreen* screen = QGuiApplication::screenAt(position); screen && m_steps > 0) {
        const QRect area = screen->availableGeometry();
        if (!area.contains(QRect(placed, size)))
            placed = stepped(area.topLeft(), m_steps % StepsPerRound);
    }
    window->move(placed);
    EnsureWindowPlacementOnDesktop(window);
}

void WindowCascade::save(const QWidget* window) const
{
    QSettings settings;
    settings.beginGroup(m_group);
    settings.setValue("pos", window->pos() - QPoint(m_step, m_step) * m_steps);
    settings.setValue("size", window->size());
    settings.endGroup();
}
