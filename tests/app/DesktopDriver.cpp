#include "DesktopDriver.h"

#include <QDeadlineTimer>
#include <QProcess>
#include <QRegularExpression>
#include <QThread>

#include <algorithm>

namespace {

constexpr int WaitMs = 15000;
constexpr int PollMs = 50;
constexpr int ClickAnswerMs = 2000;

// A popup of the program near the top right corner, where the tray host sits.
bool isTrayMenu(const QRect& window)
{
    return window.height() > 60 && window.right() > 900 && window.top() < 40;
}

} // namespace

QString DesktopDriver::xdotool(const QStringList& arguments, bool* ok)
{
    QProcess process;
    process.start("xdotool", arguments);
    const bool finished = process.waitForFinished(WaitMs);
    if (ok)
        *ok = finished && process.exitStatus() == QProcess::NormalExit && process.exitCode() == 0;
    return QString::fromLocal8Bit(process.readAllStandardOutput());
}

QList<QRect> DesktopDriver::visibleWindows(const QString& className)
{
    const QString shell = xdotool({"search", "--onlyvisible", "--classname", className, "getwindowgeometry", "--shell", "%@"});
    QList<QRect> windows;
    const QRegularExpression geometry("X=(-?\\d+)\\s+Y=(-?\\d+)\\s+WIDTH=(\\d+)\\s+HEIGHT=(\\d+)");
    for (auto match = geometry.globalMatch(shell); match.hasNext();) {
        const auto found = match.next();
        windows << QRect(found.captured(1).toInt(), found.captured(2).toInt(), found.captured(3).toInt(),
                         found.captured(4).toInt());
    }
    return windows;
}

bool DesktopDriver::waitForWindows(const QString& pattern, int count)
{
    const QDeadlineTimer deadline(WaitMs);
    while (!deadline.hasExpired()) {
        const QString found = xdotool({"search", "--onlyvisible", "--name", pattern});
        if (found.split('\n', Qt::SkipEmptyParts).size() >= count)
            return true;
        QThread::msleep(PollMs);
    }
    return false;
}

bool DesktopDriver::openTrayMenu()
{
    const QDeadlineTimer deadline(WaitMs);
    while (!deadline.hasExpired()) {
        const QList<QRect> panels = visibleWindows("panel");
        // The tray host widens its panel once the icon is docked; an early click may be lost.
        if (!panels.isEmpty() && panels.first().width() > 2) {
            const QPoint icon = panels.first().center();
            xdotool({"mousemove", QString::number(icon.x()), QString::number(icon.y()), "click", "3"});
            const QDeadlineTimer shown(ClickAnswerMs);
            while (!shown.hasExpired()) {
                const QList<QRect> windows = visibleWindows("delvix");
                if (std::any_of(windows.begin(), windows.end(), isTrayMenu))
                    return true;
                QThread::msleep(PollMs);
            }
        }
        QThread::msleep(PollMs);
    }
    return false;
}

bool DesktopDriver::pressKeys(const QStringList& keys)
{
    bool ok = false;
    xdotool(QStringList("key") + keys, &ok);
    return ok;
}

bool DesktopDriver::pressKeysIn(const QString& pattern, const QStringList& keys)
{
    bool found = false;
    const QString windows = xdotool({"search", "--sync", "--onlyvisible", "--name", pattern}, &found);
    if (!found)
        return false;
    bool focused = false;
    xdotool({"windowfocus", "--sync", windows.split('\n').first()}, &focused);
    return focused && pressKeys(keys);
}
