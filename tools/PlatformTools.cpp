#include "PlatformTools.h"

#include "FreeFormProgressDialog.h"
#include "GatewayCall.h"
#include "PlatformClassIDDialog.h"
#include "PlatformComparisonDialog.h"
#include "Portlex.h"

#include <QCoreApplication>
#include <QEventLoop>
#include <QFileDialog>
#include <QFileInfo>
#include <QMessageBox>
#include <QSettings>

#include <atomic>

namespace {

QString startFolder(const QString& key)
{
    const QString folder = QSettings().value(key).toString();
    return folder.isEmpty() ? QCoreApplication::applicationDirPath() : folder;
}

QString askOpenFile(const QString& caption, const QString& folder)
{
    const PlatformToolPrompts& prompts = platformToolPrompts();
    const QString filter = QStringLiteral("*.xml");
    return prompts.askOpenFile ? prompts.askOpenFile(nullptr, caption, folder, filter)
                               : QFileDialog::getOpenFileName(nullptr, caption, folder, filter);
}

// The scan's progress, reported on the scanning thread and shown on the GUI thread: each
// step is queued to the progress window, and a cancel there is read back through a flag.
struct ScanProgress
{
    FreeFormProgressDialog* dialog = nullptr;  // lives until the scan has ended
    std::atomic<bool> cancelled { false };

    static bool report(void* context, int value, int maximum, const QString& text)
    {
        auto* progress = static_cast<ScanProgress*>(context);
        QMetaObject::invokeMethod(
            progress->dialog,
            [progress, value, maximum, text] {
                if (FreeFormProgressDialog::progressCallback(progress->dialog, value, maximum, text))
                    progress->cancelled = true;
            },
            Qt::QueuedConnection);
        return progress->cancelled;
    }
};

// The gateway's scan on a worker, the GUI thread meanwhile turning its event loop.
std::vector<MifEntry> scanOffTheGuiThread(const QString& folder, FreeFormProgressDialog* dialog)
{
    ScanProgress progress;
    progress.dialog = dialog;
    std::vector<MifEntry> entries;
    QEventLoop loop;
    GatewayCall::run(
        &loop,
        [folder, context = dialog ? &progress : nullptr] {
            std::vector<MifEntry> found;
            Portlex::GetPlatformClassIds(folder, found, context ? &ScanProgress::report : nullptr, context);
            return found;
        },
        [&entries, &loop](std::vector<MifEntry> found) {
            entries = std::move(found);
            loop.quit();
        });
    // The steps were posted before the result, so none is left to reach the gone record.
    loop.exec();
    return entries;
}

} // namespace

PlatformToolPrompts& platformToolPrompts()
{
    static PlatformToolPrompts prompts;
    return prompts;
}

void informUser(QWidget* parent, const QString& title, const QString& text)
{
    const PlatformToolPrompts& prompts = platformToolPrompts();
    if (prompts.inform)
        prompts.inform(parent, title, text);
    else
        QMessageBox::information(parent, title, text, QMessageBox::Ok);
}

void scanPlatformClassIds()
{
    const QString caption = QCoreApplication::translate("PlatformTools", "Browse for Platform Directory");
    const QString start = startFolder(QStringLiteral("lastClassIDPath"));
    const PlatformToolPrompts& prompts = platformToolPrompts();
    const QString folder = prompts.askDirectory
        ? prompts.askDirectory(nullptr, caption, start)
        : QFileDialog::getExistingDirectory(
            nullptr, caption, start, QFileDialog::ShowDirsOnly | QFileDialog::DontResolveSymlinks);
    if (folder.isEmpty())
        return;
    QSettings().setValue("lastClassIDPath", folder);

    FreeFormProgressDialog progress;
    progress.show();
    if (const std::unique_ptr<PlatformClassIDDialog> dialog = scanPlatformFolder(folder, &progress))
        dialog->exec();
}

std::unique_ptr<PlatformClassIDDialog> scanPlatformFolder(
    const QString& folder, FreeFormProgressDialog* progress)
{
    const std::vector<MifEntry> entries = scanOffTheGuiThread(folder, progress);
    if (entries.empty())
        return nullptr;
    auto dialog = std::make_unique<PlatformClassIDDialog>();
    dialog->setProgressDialog(progress);
    dialog->populate(entries);
    if (progress)
        progress->hide();
    return dialog;
}

void comparePlatformScans()
{
    const QString first
        = askOpenFile(QCoreApplication::translate("PlatformTools", "Browse for Platform Scan"),
            startFolder(QStringLiteral("lastComparePath1")));
    if (first.isEmpty())
        return;
    const QString second = askOpenFile(
        QCoreApplication::translate("PlatformTools", "Browse for Comparison Platform Scan File"),
        startFolder(QStringLiteral("lastComparePath2")));
    if (second.isEmpty())
        return;
    QSettings settings;
    settings.setValue("lastComparePath1", QFileInfo(first).absolutePath());
    settings.setValue("lastComparePath2", QFileInfo(second).absolutePath());
    openPlatformComparison(first, second);
}

PlatformComparisonDialog* openPlatformComparison(const QString& first, const QString& second)
{
    if (first == second) {
        informUser(nullptr, QCoreApplication::translate("PlatformTools", "User Error"),
            QCoreApplication::translate("PlatformTools", "The files are the same"));
        return nullptr;
    }
    auto* dialog = new PlatformComparisonDialog;
    if (!dialog->loadFiles({first, second})) {
        delete dialog;
        return nullptr;
    }
    dialog->setSizeGripEnabled(true);
    dialog->show();
    return dialog;
}
