#include "SaveXmlReport.h"

#include <QCoreApplication>
#include <QDir>
#include <QFileDialog>
#include <QFileInfo>
#include <QMessageBox>
#include <QSaveFile>
#include <QSettings>

SaveXmlReportDialogs& saveXmlReportDialogs()
{
    static SaveXmlReportDialogs dialogs;
    return dialogs;
}

void saveXmlReport(QWidget* parent, const QString& name, const QString& report)
{
    const SaveXmlReportDialogs& dialogs = saveXmlReportDialogs();
    const QString caption = QStringLiteral("Save file") + name;
    const QString filter = QStringLiteral("XML Files (*.xml)");

    QSettings settings;
    QString folder = settings.value("lastPath").toString();
    if (folder.isEmpty())
        folder = QCoreApplication::applicationDirPath();

    const QString fileName = dialogs.askFileName ? dialogs.askFileName(parent, caption, folder, filter)
                                                 : QFileDialog::getSaveFileName(parent, caption, folder, filter);
    if (fileName.isEmpty())
        return;

    // Written aside and renamed over the target, so a failure never leaves half a file.
    QSaveFile file(fileName);
    const QByteArray bytes = report.toLocal8Bit();
    if (!file.open(QIODevice::WriteOnly | QIODevice::Text) || file.write(bytes) != bytes.size() || !file.commit()) {
        const QString title = QObject::tr("Export to XML");
        const QString text = QObject::tr("The file %1 could not be written.\n%2")
                                 .arg(QDir::toNativeSeparators(fileName), file.errorString());
        if (dialogs.warn)
            dialogs.warn(parent, title, text);
        else
            QMessageBox::warning(parent, title, text);
        return;
    }
    settings.setValue("lastPath", QFileInfo(fileName).absolutePath());
}
