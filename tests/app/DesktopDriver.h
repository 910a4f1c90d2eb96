#pragma once

#include <QRect>
#include <QString>
#include <QStringList>

// Drives a real X display through xdotool, as a person with a mouse and a keyboard would:
// for tests that run the delvix program itself on the display of scripts/with-tray-host.
class DesktopDriver
{
public:
    // Waits until count windows whose names match pattern (a regular expression) are shown.
    static bool waitForWindows(const QString& pattern, int count = 1);
    // Waits until the tray host shows an icon, then right-clicks it and waits for the menu.
    static bool openTrayMenu();
    static bool pressKeys(const QStringList& keys);
    // Gives the keyboard to the window whose name matches pattern, then presses keys.
    static bool pressKeysIn(const QString& pattern, const QStringList& keys);

private:
    static QString xdotool(const QStringList& arguments, bool* ok = nullptr);
    static QList<QRect> visibleWindows(const QString& className);
};
