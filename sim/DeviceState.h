#pragma once

#include "DeviceCache.h"
#include "DeviceProfile.h"
#include "DirectoryListing.h"
#include "EnablementStatus.h"
#include "LoadedModuleInfo.h"
#include "MifEntry.h"
#include "ModuleCatalog.h"
#include "NameDatabases.h"
#include "PriviledgeRecord.h"
#include "ProcessInfo.h"
#include "ProcessTable.h"
#include "VolumeInfo.h"
#include "VolumePathResolver.h"
#include "_DirectoryInfo.h"
#include "_SettingsInfo.h"

#include <QElapsedTimer>
#include <QList>
#include <QVector>

#include <memory>

// One device served from an image folder: its profile, its volumes' files and what follows
// from them, its running processes and its enablement state. Every answer is built here;
// the request handler only moves them over the wire. Results are 0 or a PortlexError code.
class DeviceState
{
public:
    // Reads imageDir/device.xml and scans the volumes. namesDir holds the name databases
    // used to name classes and privileges (missing files leave the names empty).
    bool load(const QString& imageDir, const QString& namesDir);
    QString errorString() const { return m_error; }

    const DeviceProfile& profile() const { return m_profile; }
    void setId(const QString& id) { m_profile.id = id; }

    DeviceCache cache() const;
    QVector<ModuleInfo> modules() const;
    qint32 moduleMif(const QString& pathOrName, MifEntry& entry) const;
    QVector<RegistryInfo> registry() const { return m_catalog.registry(); }
    QVector<ProcessInfo> processes();
    QVector<LoadedModuleInfo> loadedModules();
    QList<VolumeInfo> volumes();
    qint32 childSettings(const QString& path, _SettingsInfo& node) const;
    qint32 fileSystemLevel(const QString& path, _DirectoryInfo& level) const;

    EnablementStatus tepStatus(QString& mode, QString& owner, QString& expires) const;
    EnablementStatus globalTestSigStatus(QString& mode, QString& owner, QString& expires) const;
    QVector<PriviledgeRecord> tepPriviledges() const;
    void lockService() { m_serviceLocked = true; }
    void lockSignature() { m_signatureLocked = true; }

    // Files changed on a volume: modules, classes, registry and free space follow.
    void filesChanged();

    // For the actions: where device paths lead, and the room left on a volume.
    const VolumePathResolver& resolver() const { return m_resolver; }
    const ModuleCatalog& catalog() const { return m_catalog; }
    // True when localPath is a system module folder, lies inside one or holds one: the
    // device neither writes nor deletes there.
    bool touchesSystemFolder(const QString& localPath) const;
    // True when a module of that name (letter case ignored) lives in a system module folder.
    bool isSystemModule(const QString& name) const;
    quint64 freeSpace(int volume);
    // Starts a process that ends after about lifetimeMs. Returns its id.
    quint32 startProcess(const ProcessSpec& spec, int lifetimeMs);

private:
    // File attribute text: 'r', 'w' or '-', 'x' for runnable modules, 'h' hidden, 's' in a
    // system module folder (never writable there).
    static QString attributesOf(const DirectoryListing::Entry& file, bool system);
    bool fail(const QString& message);
    void advanceClock();
    quint64 usedBytes(int volume);
    bool inSystemFolder(int volume, const QString& devicePath) const;
    // The mode is in the profile and no lock request has ended it.
    bool serviceEnabled() const;
    bool signatureEnabled() const;

    DeviceProfile m_profile;
    VolumePathResolver m_resolver;
    ModuleCatalog m_catalog;
    NameDatabases m_names;
    std::unique_ptr<ProcessTable> m_processes;
    QElapsedTimer m_clock;
    QVector<qint64> m_usedBytes; // per volume; -1 until counted
    bool m_serviceLocked = false;
    bool m_signatureLocked = false;
    QString m_error;
};
