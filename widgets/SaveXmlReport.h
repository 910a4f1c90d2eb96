#pragma once

#include <QString>

#include <functional>

class QWidget;

// The dialogs saveXmlReport asks through. Empty members use the standard file dialog and
// warning box; tests put their own answers in.
struct SaveXmlReportDialogs
{
    std::function<QString(QWidget* parent, const QString& caption, const QString& folder, const QString& filter)>
        askFileName;
    std::function<void(QWidget* parent, const QString& title, const QString& text)> warn;
};

SaveXmlReportDialogs& saveXmlReportDialogs();

// Asks for a file name ("Save file" followed by name, starting in the folder of the last
// export) and writes report to it unchanged. A cancelled dialog ends silently; a file that
// cannot be written is reported in a warning box and left as it was.
void saveXmlReport(QWidget* parent, const QString& name, const QString& report);
