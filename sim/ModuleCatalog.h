#pragma once

#include "DeviceProfile.h"
#include "IdRecord.h"
#include "MifEntry.h"
#include "ModuleInfo.h"
#include "RegistryInfo.h"

#include <QHash>
#include <QList>
#include <QVector>

class NameDatabases;
class VolumePathResolver;

// The modules installed on a device, found from its files: every MIF file (suffix "mif",
// any case) below a volume's module folders is one module. Beside it, "<name>.mod" is the
// module's code and an optional "<name>.inf" sidecar gives its version, type, signature
// and copyright. The device's classes and registry follow from what is installed.
class ModuleCatalog
{
public:
    struct Module
    {
        ModuleInfo info;
        MifEntry mif;
        bool mifReadable = false;
        bool system = false; // in a module folder that packages are not installed to
        QString folderDevicePath;
    };

    // Scans the volumes' module folders. resolver must hold one mount per volume, in order.
    void scan(const QList<VolumeSpec>& volumes, const VolumePathResolver& resolver);

    const QVector<Module>& modules() const { return m_modules; }
    // By the device path of its MIF or of its "<name>.mod", or by its name. Null if unknown.
    const Module* find(const QString& pathOrName) const;

    // Platform classes plus the classes installed modules export. A class is available
    // when a built-in component or an installed module exports it.
    IdRecordMap classes(const DeviceProfile& profile, const NameDatabases& names) const;
    // One entry per MIME record of an installed module. The first module (system folders
    // first) to claim a MIME type holds the active entry; system modules' entries are
    // restricted.
    QVector<RegistryInfo> registry() const;

    // "key=value" lines; unknown keys are ignored.
    static void readSidecar(const QByteArray& text, ModuleInfo& info);

private:
    void scanFolder(const QString& localFolder, const QString& deviceFolder, bool system,
                    const VolumePathResolver& resolver, int volume);

    QVector<Module> m_modules;
    QHash<QString, int> m_byKey; // MIF path, .mod path and name, to index in m_modules
};
