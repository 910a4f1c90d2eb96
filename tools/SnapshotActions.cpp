#include "SnapshotActions.h"

#include "PlatformTools.h"
#include "PortlexErrors.h"
#include "SnapshotCollector.h"
#include "SnapshotDiffDialog.h"
#include "SnapshotFile.h"
#include "_ZantDevice.h"

#include <QEventLoop>
#include <QFileDialog>
#include <QFileInfo>
#include <QFutureWatcher>
#include <QJsonObject>
#include <QProgressDialog>
#include <QtConcurrent>

namespace {

const char* const Filter = QT_TRANSLATE_NOOP("SnapshotActions", "Delvix snapshots (*.json);;All files (*)");

struct Taken
{
    int result = 0;
    QString failedStep;
    QJsonObject snapshot;
};

} // namespace

bool SnapshotActions::take(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId,
                           qint64 hashLimit, QJsonObject* snapshot)
{
    QProgressDialog busy(QObject::tr("Reading the whole device..."), QString(), 0, 0, parent);
    busy.setWindowTitle(QObject::tr("Snapshot"));
    busy.setWindowModality(Qt::WindowModal);
    busy.setMinimumDuration(0);
    busy.show();
    QFutureWatcher<Taken> watcher;
    QEventLoop loop;
    QObject::connect(&watcher, &QFutureWatcher<Taken>::finished, &loop, &QEventLoop::quit);
    // The device is shared with the worker: it stays alive until the snapshot is taken.
    watcher.setFuture(QtConcurrent::run([device, deviceId, hashLimit] {
        Taken taken;
        taken.result = SnapshotCollector::collect(*device, deviceId, hashLimit, &taken.snapshot, &taken.failedStep);
        return taken;
    }));
    loop.exec();
    busy.close();
    const Taken taken = watcher.result();
    if (taken.result != 0) {
        const QString meaning = PortlexError::describe(taken.result);
        informUser(parent, QObject::tr("Snapshot"),
                   QObject::tr("Reading %1 failed: error %2%3.")
                       .arg(taken.failedStep)
                       .arg(taken.result)
                       .arg(meaning.isEmpty() ? QString() : QStringLiteral(" (%1)").arg(meaning)));
        return false;
    }
    *snapshot = taken.snapshot;
    return true;
}

void SnapshotActions::save(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId)
{
    const QString path = QFileDialog::getSaveFileName(parent, QObject::tr("Save Snapshot"), deviceId + QStringLiteral(".json"),
                                                      QObject::tr(Filter));
    if (path.isEmpty())
        return;
    QJsonObject snapshot;
    if (!take(parent, device, deviceId, -1, &snapshot))
        return;
    QString error;
    if (!SnapshotFile::write(path, snapshot, &error))
        informUser(parent, QObject::tr("Save Snapshot"), QObject::tr("Could not write %1: %2").arg(path, error));
}

void SnapshotActions::compare(QWidget* parent, const QSharedPointer<_ZantDevice>& device, const QString& deviceId)
{
    const QString path = QFileDialog::getOpenFileName(parent, QObject::tr("Compare with Snapshot"), QString(), QObject::tr(Filter));
    if (path.isEmpty())
        return;
    QJsonObject saved;
    QString error;
    if (!SnapshotFile::read(path, &saved, &error)) {
        informUser(parent, QObject::tr("Compare with Snapshot"), QObject::tr("Cannot read %1: %2").arg(path, error));
        return;
    }
    // Hashed as the saved snapshot was, so that hashes meet hashes.
    const QJsonValue limit = saved.value(QStringLiteral("manifest")).toObject().value(QStringLiteral("hash-limit"));
    QJsonObject now;
    if (!take(parent, device, deviceId, limit.isDouble() ? limit.toInteger() : -1, &now))
        return;
    auto* dialog = new SnapshotDiffDialog(SnapshotDiff(saved, now), QFileInfo(path).fileName(), parent);
    dialog->setAttribute(Qt::WA_DeleteOnClose);
    dialog->show();
}
