#include "DesktopDriver.h"

#include <QProcess>

namespace {

constexpr int WaitMs = 15000;

QString xdotool(const QStringList& arguments, bool& ok)
{
    QProcess process;
    process.start("xdotool", arguments);
    ok = process.waitForFinished(WaitMs) && process.exitStatus() == QProcess::NormalExit && process.exitCode() == 0;
    return QString::fromLocal8Bit(process.readAllStandardOutput());
}

} // namespace

bool DesktopDriver::pressKeysIn(const QString& pattern, const QStringList& keys)
{
    bool ok = false;
    const QString windows = xdotool({"search", "--sync", "--onlyvisible", "--name", pattern}, ok);
    if (ok)
        xdotool({"windowfocus", "--sync", windows.split('\n').first()}, ok);
    if (ok)
        xdotool(QStringList("key") + keys, ok);
    return ok;
}
