#include "SnapshotCollector.h"

#include "ClassReport.h"
#include "LoadedModuleReport.h"
#include "ModuleReport.h"
#include "PhoneInfoReport.h"
#include "PortlexErrors.h"
#include "ProcessReport.h"
#include "RegistryReport.h"
#include "SettingsReport.h"
#include "SnapshotFile.h"
#include "_ZantDevice.h"

#include <QCryptographicHash>
#include <QDateTime>
#include <QFile>
#include <QJsonArray>
#include <QSet>
#include <QTemporaryDir>

#include <algorithm>

namespace {

// What was being read, with the device's word on why it failed when it gave one.
QString failure(const QString& what, const QString& reason)
{
    return reason.isEmpty() ? what : what + QStringLiteral(": ") + reason;
}

QByteArray contentHash(_ZantDevice& device, const QString& path, const QTemporaryDir& scratch, int* result, QString* reason)
{
    const QString local = scratch.filePath(QStringLiteral("content"));
    *result = device.CopyFileToPC(path, local, nullptr, nullptr, reason);
    QFile file(local);
    QCryptographicHash hash(QCryptographicHash::Sha256);
    if (*result == 0 && (!file.open(QIODevice::ReadOnly) || !hash.addData(&file)))
        *result = PortlexError::LocalFileError;
    file.remove();
    return hash.result().toHex();
}

// Every file below the volume's mount point (other volumes mounted inside it excluded),
// as {path, size, attributes[, sha256]}, folders by path.
int listVolume(_ZantDevice& device, const VolumeInfo& volume, const QSet<QString>& mountPoints, qint64 hashLimit,
               QJsonObject* listing, QString* failed)
{
    QTemporaryDir scratch;
    QJsonArray files;
    QJsonArray folders;
    QStringList pending {volume.mountPoint};
    // A device that names an ancestor as a child is listed once, not for ever.
    QSet<QString> seen;
    while (!pending.isEmpty()) {
        const QString path = pending.takeFirst();
        if (seen.contains(path))
            continue;
        seen.insert(path);
        QSharedPointer<_DirectoryInfo> level;
        QString reason;
        if (const int result = device.GetFileSystemLevel(path, level, nullptr, nullptr, &reason)) {
            *failed = failure(QStringLiteral("the folder %1").arg(path), reason);
            return result;
        }
        for (const QSharedPointer<_DirectoryInfo>& directory : std::as_const(level->directories)) {
            if (mountPoints.contains(directory->Path()))
                continue;
            folders.append(directory->Path());
            pending.append(directory->Path());
        }
        for (const QSharedPointer<_FileInfo>& file : std::as_const(level->files)) {
            QJsonObject entry {{QStringLiteral("path"), file->Path()},
                               {QStringLiteral("size"), qint64(file->size)},
                               {QStringLiteral("attributes"), file->Attributes()}};
            if (hashLimit >= 0 && file->size <= quint64(hashLimit)) {
                int result = 0;
                QString reason;
                const QByteArray hash = contentHash(device, file->Path(), scratch, &result, &reason);
                if (result) {
                    *failed = failure(QStringLiteral("the content of %1").arg(file->Path()), reason);
                    return result;
                }
                entry.insert(QStringLiteral("sha256"), QString::fromLatin1(hash));
            }
            files.append(entry);
        }
    }
    *listing = {{QStringLiteral("id"), qint64(volume.volumeId)},
                {QStringLiteral("mount-point"), volume.mountPoint},
                {QStringLiteral("name"), volume.friendlyName},
                {QStringLiteral("folders"), folders},
                {QStringLiteral("files"), files}};
    return 0;
}

} // namespace

int SnapshotCollector::settingsNodes(_ZantDevice& device, QVector<_SettingsInfo>* nodes, QString* failed)
{
    QStringList pending {QStringLiteral("/")};
    QSet<QString> seen;
    while (!pending.isEmpty()) {
        const QString path = pending.takeLast();
        if (seen.contains(path))
            continue;
        seen.insert(path);
        auto node = QSharedPointer<_SettingsInfo>::create();
        node->SetPath(path);
        QString reason;
        if (const int result = device.GetChildSettings(node, &reason)) {
            *failed = failure(QStringLiteral("the settings at %1").arg(path), reason);
            return result;
        }
        for (auto child = node->children.crbegin(); child != node->children.crend(); ++child)
            pending.append((*child)->Path());
        nodes->append(*node);
    }
    return 0;
}

int SnapshotCollector::collect(_ZantDevice& device, const QString& deviceId, qint64 hashLimit, QJsonObject* snapshot,
                               QString* failedStep, PortlexProgressCallback callback, void* context)
{
    int step = 0;
    QString reason;
    const auto next = [&](const QString& name) { return callback && callback(context, step++, Steps, name); };
    QJsonObject documents;

    if (next(QStringLiteral("phone information")))
        return PortlexError::Cancelled;
    documents.insert(QStringLiteral("phone-info"), PhoneInfoReport::build(device.cache()->deviceData).toJsonObject());

    if (next(QStringLiteral("modules")))
        return PortlexError::Cancelled;
    QVector<ModuleInfo> modules;
    if (const int result = device.GetModules(modules, nullptr, nullptr, &reason)) {
        *failedStep = failure(QStringLiteral("the modules"), reason);
        return result;
    }
    QVector<QStringList> rows;
    for (const ModuleInfo& module : std::as_const(modules))
        rows.append(ModuleReport::cells(module));
    Report::sortRows(rows, ModuleReport::NameColumn);
    documents.insert(QStringLiteral("modules"), ModuleReport::build(rows).toJsonObject());

    if (next(QStringLiteral("classes")))
        return PortlexError::Cancelled;
    rows.clear();
    for (const IdRecord& record : std::as_const(device.cache()->classes))
        rows.append(ClassReport::cells(record));
    Report::sortRows(rows, ClassReport::NameColumn);
    documents.insert(QStringLiteral("class-ids"), ClassReport::build(rows, device.cache()->deviceData).toJsonObject());

    if (next(QStringLiteral("registry")))
        return PortlexError::Cancelled;
    QVector<RegistryInfo> entries;
    if (const int result = device.GetRegistry(entries, nullptr, nullptr, &reason)) {
        *failedStep = failure(QStringLiteral("the registry"), reason);
        return result;
    }
    rows.clear();
    for (const RegistryInfo& entry : std::as_const(entries))
        rows.append(RegistryReport::cells(entry));
    Report::sortRows(rows, RegistryReport::ClassTypeColumn);
    documents.insert(QStringLiteral("registry"), RegistryReport::build(rows).toJsonObject());

    if (next(QStringLiteral("settings")))
        return PortlexError::Cancelled;
    QVector<_SettingsInfo> nodes;
    if (const int result = settingsNodes(device, &nodes, failedStep))
        return result;
    documents.insert(QStringLiteral("settings"), SettingsReport::build(nodes).toJsonObject());

    if (next(QStringLiteral("processes")))
        return PortlexError::Cancelled;
    QVector<ProcessInfo> processes;
    if (const int result = device.GetProcesses(processes, &reason)) {
        *failedStep = failure(QStringLiteral("the processes"), reason);
        return result;
    }
    documents.insert(QStringLiteral("processes"), ProcessReport::build(processes).toJsonObject());

    if (next(QStringLiteral("loaded modules")))
        return PortlexError::Cancelled;
    QVector<LoadedModuleInfo> loaded;
    if (const int result = device.GetLoadedModules(loaded, &reason)) {
        *failedStep = failure(QStringLiteral("the loaded modules"), reason);
        return result;
    }
    documents.insert(QStringLiteral("loaded-modules"), LoadedModuleReport::build(loaded).toJsonObject());

    if (next(QStringLiteral("files")))
        return PortlexError::Cancelled;
    QSet<VolumeInfo> found;
    if (const int result = device.GetVolumes(found, &reason)) {
        *failedStep = failure(QStringLiteral("the volumes"), reason);
        return result;
    }
    QList<VolumeInfo> volumes(found.cbegin(), found.cend());
    std::sort(volumes.begin(), volumes.end(), [](const VolumeInfo& a, const VolumeInfo& b) { return a.mountPoint < b.mountPoint; });
    QSet<QString> mountPoints;
    for (const VolumeInfo& volume : std::as_const(volumes))
        mountPoints.insert(volume.mountPoint);
    QJsonArray listings;
    for (const VolumeInfo& volume : std::as_const(volumes)) {
        QJsonObject listing;
        if (const int result = listVolume(device, volume, mountPoints, hashLimit, &listing, failedStep))
            return result;
        listings.append(listing);
    }
    documents.insert(QStringLiteral("files"), QJsonObject {{QStringLiteral("volumes"), listings}});

    QJsonObject schemas;
    for (auto it = documents.constBegin(); it != documents.constEnd(); ++it) {
        const QString schema = it.value().toObject().value(QStringLiteral("schema")).toString();
        if (!schema.isEmpty())
            schemas.insert(schema, Report::SchemaVersion);
    }
    const QJsonObject manifest {
        {QStringLiteral("device"), QJsonObject {{QStringLiteral("id"), deviceId}, {QStringLiteral("name"), device.name}}},
        {QStringLiteral("taken"), QDateTime::currentDateTimeUtc().toString(Qt::ISODate)},
        {QStringLiteral("program"), QStringLiteral("Delvix ") + QStringLiteral(DELVIX_VERSION)},
        {QStringLiteral("hash-limit"), hashLimit >= 0 ? QJsonValue(hashLimit) : QJsonValue()},
        {QStringLiteral("schemas"), schemas}};
    *snapshot = {{QStringLiteral("schema"), SnapshotFile::SchemaName},
                 {QStringLiteral("version"), SnapshotFile::Version},
                 {QStringLiteral("manifest"), manifest},
                 {QStringLiteral("documents"), documents}};
    return 0;
}
