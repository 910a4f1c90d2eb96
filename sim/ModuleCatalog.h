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
// and copyright. The device's classes and registry follow from what is installed. A rescan
// decodes only the MIFs that are new or changed since the last one, and never reads a MIF
// larger than MaxMifSize (its module is listed with an unreadable MIF).
class ModuleCatalog
{
public:
    static constexpr qint64 MaxMifSize = 16 * 1024 * 1024;

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
    // How many MIF files have been read so far.
    int mifReads() const { return m_mifReads; }
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
    // A MIF as the last scan found it: its file's identity and what it decoded to.
    struct Decoded
    {
        QByteArray stamp; // inode, size, modification and change times
        MifEntry mif;
        bool readable = false;
    };

    void scanFolder(const QString& localFolder, const QString& deviceFolder, bool system,
                    const VolumePathResolver& resolver, int volume, QHash<QString, Decoded>& found);
    Decoded decode(const QString& mifPath, const QByteArray& stamp);

    QVector<Module> m_modules;
    QHash<QString, int> m_byKey; // MIF path, .mod path and name, to index in m_modules
    QHash<QString, Decoded> m_decoded; // by local MIF path
    int m_mifReads = 0;
};
