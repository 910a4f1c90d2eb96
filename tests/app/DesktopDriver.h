#pragma once

#include <QString>
#include <QStringList>

// Drives a real X display through xdotool, as a person with a keyboard would: for tests that
// run the delvix program itself on the display of scripts/with-tray-host.
namespace DesktopDriver {

// Waits for a window whose name matches pattern (a regular expression), gives it the
// keyboard and presses keys; false if any step fails.
bool pressKeysIn(const QString& pattern, const QStringList& keys);

} // namespace DesktopDriver
