#pragma once

#include <functional>
#include <memory>
#include <QString>

class FreeFormProgressDialog;
class PlatformClassIDDialog;
class PlatformComparisonDialog;
class QWidget;

// The two device-less tools of the tray menu: the platform class-id scan and the comparison
// of two scans.

// The standard dialogs the tools ask through. Empty members use Qt's; tests put their own
// answers in.
struct PlatformToolPrompts
{
    std::function<QString(QWidget* parent, const QString& caption, const QString& folder)> askDirectory;
    std::function<QString(
        QWidget* parent, const QString& caption, const QString& folder, const QString& filter)>
        askOpenFile;
    std::function<void(QWidget* parent, const QString& title, const QString& text)> inform;
};

PlatformToolPrompts& platformToolPrompts();
// An information box with one OK button.
void informUser(QWidget* parent, const QString& title, const QString& text);

// Asks for a platform build folder (starting at the last one), scans it with a progress
// window and shows its classes in a modal dialog; nothing when the scan finds no module.
void scanPlatformClassIds();
// The scan of a chosen folder, reporting to progress: the filled dialog, or null when the
// scan found no module or was cancelled.
std::unique_ptr<PlatformClassIDDialog> scanPlatformFolder(
    const QString& folder, FreeFormProgressDialog* progress);

// Asks for two scan files (each starting in the folder of its last choice) and opens their
// comparison in a window of its own, which deletes itself when closed.
void comparePlatformScans();
// The comparison of two chosen files, shown; null when they are the same file (after a
// "User Error" box) or either cannot be loaded.
PlatformComparisonDialog* openPlatformComparison(const QString& first, const QString& second);
