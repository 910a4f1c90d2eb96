#include "ModuleCatalog.h"

#include "IdFormat.h"
#include "MifReader.h"
#include "NameDatabases.h"
#include "RegularFile.h"
#include "VolumePathResolver.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>
#include <QSet>

#include <algorithm>

#include <sys/stat.h>

namespace {

constexpr qint64 MaxSidecarSize = 64 * 1024;

quint32 parseNumber(const QString& text, bool* ok)
{
    if (text.startsWith(QLatin1String("0x"), Qt::CaseInsensitive))
        return text.mid(2).toUInt(ok, 16);
    return text.toUInt(ok, 10);
}

quint32 parseType(const QString& text)
{
    bool ok = false;
    const quint32 number = parseNumber(text, &ok);
    if (ok)
        return number;
    static const QHash<QString, quint32> flags = {
        {QStringLiteral("application"), ModuleInfo::Application},
        {QStringLiteral("library"), ModuleInfo::Library},
        {QStringLiteral("extension"), ModuleInfo::Extension},
        {QStringLiteral("system"), ModuleInfo::System},
        {QStringLiteral("preinstalled"), ModuleInfo::Preinstalled},
    };
    quint32 type = 0;
    for (const QString& word : text.split(QRegularExpression(QStringLiteral("[\\s|,]+")), Qt::SkipEmptyParts))
        type |= flags.value(word.toLower());
    return type;
}

quint32 parseSignature(const QString& text)
{
    bool ok = false;
    const quint32 number = parseNumber(text, &ok);
    if (ok)
        return number;
    static const QHash<QString, quint32> states = {
        {QStringLiteral("unsigned"), ModuleInfo::Unsigned},
        {QStringLiteral("test"), ModuleInfo::TestSigned},
        {QStringLiteral("developer"), ModuleInfo::DeveloperSigned},
        {QStringLiteral("maker"), ModuleInfo::MakerSigned},
        {QStringLiteral("invalid"), ModuleInfo::SignatureInvalid},
    };
    return states.value(text.toLower(), ModuleInfo::SignatureInvalid);
}

// Changes whenever the file is replaced or written, even within one clock tick.
QByteArray fileStamp(const QString& path)
{
    struct stat info {};
    if (::stat(QFile::encodeName(path).constData(), &info) != 0)
        return QByteArray();
    QByteArray stamp;
    for (const qint64 value : {qint64(info.st_dev), qint64(info.st_ino), qint64(info.st_size), qint64(info.st_mtim.tv_sec),
                               qint64(info.st_mtim.tv_nsec), qint64(info.st_ctim.tv_sec), qint64(info.st_ctim.tv_nsec)})
        stamp.append(reinterpret_cast<const char*>(&value), sizeof value);
    return stamp;
}

qint64 fileSize(const QString& path)
{
    const QFileInfo info(path);
    return info.isFile() && !info.isSymLink() ? info.size() : 0;
}

} // namespace

void ModuleCatalog::readSidecar(const QByteArray& text, ModuleInfo& info)
{
    for (const QByteArray& rawLine : text.split('\n')) {
        const QString line = QString::fromUtf8(rawLine).trimmed();
        const qsizetype equals = line.indexOf(QLatin1Char('='));
        if (line.startsWith(QLatin1Char('#')) || equals <= 0)
            continue;
        const QString key = line.left(equals).trimmed().toLower();
        const QString value = line.mid(equals + 1).trimmed();
        if (key == QLatin1String("version"))
            info.version = value;
        else if (key == QLatin1String("type"))
            info.type = parseType(value);
        else if (key == QLatin1String("signature"))
            info.signature = parseSignature(value);
        else if (key == QLatin1String("copyright"))
            info.copyright = value;
    }
}

void ModuleCatalog::scan(const QList<VolumeSpec>& volumes, const VolumePathResolver& resolver)
{
    m_modules.clear();
    m_byKey.clear();
    QHash<QString, Decoded> found;
    for (int v = 0; v < volumes.size() && v < resolver.mountCount(); ++v) {
        const VolumeSpec& volume = volumes.at(v);
        for (const QString& folder : volume.moduleFolders) {
            VolumePathResolver::Target target;
            const QString deviceFolder = VolumePathResolver::joinDevicePath(resolver.mountPoint(v), folder);
            if (resolver.resolveExisting(deviceFolder, target) != VolumePathResolver::Status::Ok)
                continue;
            scanFolder(target.localPath, target.devicePath, folder != volume.installFolder, resolver, v, found);
        }
    }
    m_decoded = std::move(found); // MIFs that went are forgotten
    for (int i = 0; i < m_modules.size(); ++i) {
        Module& module = m_modules[i];
        module.info.moduleId = quint32(i + 1);
        const QString modPath = module.info.path.left(module.info.path.lastIndexOf(QLatin1Char('.'))) + QStringLiteral(".mod");
        for (const QString& key : {module.info.path, modPath, module.info.name}) {
            if (!m_byKey.contains(key))
                m_byKey.insert(key, i);
        }
    }
}

ModuleCatalog::Decoded ModuleCatalog::decode(const QString& mifPath, const QByteArray& stamp)
{
    Decoded decoded;
    decoded.stamp = stamp;
    const qint64 size = fileSize(mifPath);
    if (size > MaxMifSize) {
        qWarning("Not reading %s: %lld bytes is more than a MIF may have (%lld)", qPrintable(mifPath), size, MaxMifSize);
        return decoded;
    }
    ++m_mifReads;
    MifReader reader;
    decoded.readable = reader.readFile(mifPath) && reader.decodeModule(decoded.mif);
    return decoded;
}

void ModuleCatalog::scanFolder(const QString& localFolder, const QString& deviceFolder, bool system,
                               const VolumePathResolver& resolver, int volume, QHash<QString, Decoded>& found)
{
    QStringList mifs;
    QDirIterator it(localFolder, QDir::Files | QDir::NoSymLinks | QDir::Hidden, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        if (it.fileInfo().suffix().compare(QLatin1String("mif"), Qt::CaseInsensitive) == 0
            && resolver.isInside(volume, path))
            mifs.append(path);
    }
    std::sort(mifs.begin(), mifs.end());

    for (const QString& mifPath : std::as_const(mifs)) {
        const QFileInfo mifInfo(mifPath);
        const QString relative = QDir(localFolder).relativeFilePath(mifPath);
        const QString base = mifInfo.path() + QLatin1Char('/') + mifInfo.completeBaseName();

        Module module;
        module.system = system;
        module.info.name = mifInfo.completeBaseName();
        module.info.path = VolumePathResolver::joinDevicePath(deviceFolder, relative);
        module.folderDevicePath = module.info.path.left(module.info.path.lastIndexOf(QLatin1Char('/')));
        module.info.size = quint32(qMin<qint64>(
            fileSize(mifPath) + fileSize(base + QStringLiteral(".mod")) + fileSize(base + QStringLiteral(".inf")),
            0xffffffff));

        QFile sidecar;
        if (!QFileInfo(base + QStringLiteral(".inf")).isSymLink() && RegularFile::open(sidecar, base + QStringLiteral(".inf")))
            readSidecar(sidecar.read(MaxSidecarSize), module.info);

        const QByteArray stamp = fileStamp(mifPath);
        const auto known = m_decoded.constFind(mifPath);
        const Decoded decoded = known != m_decoded.constEnd() && !stamp.isEmpty() && known->stamp == stamp
            ? *known
            : decode(mifPath, stamp);
        found.insert(mifPath, decoded);
        module.mif = decoded.mif;
        module.mifReadable = decoded.readable;
        module.mif.fileName = mifInfo.fileName();
        module.mif.filePath = module.info.path;
        m_modules.append(module);
    }
}

const ModuleCatalog::Module* ModuleCatalog::find(const QString& pathOrName) const
{
    const auto it = m_byKey.constFind(pathOrName);
    return it == m_byKey.constEnd() ? nullptr : &m_modules.at(*it);
}

IdRecordMap ModuleCatalog::classes(const DeviceProfile& profile, const NameDatabases& names) const
{
    IdRecordMap map;
    const auto named = [&names](const QString& id) {
        IdRecord record;
        record.id = id;
        names.lookupClass(id, record.name, record.family, record.subFamily);
        return record;
    };
    for (const PlatformClassSpec& spec : profile.platformClasses) {
        IdRecord record = named(spec.id);
        if (!spec.component.isEmpty()) {
            record.available = true;
            record.source = spec.component;
            record.path = profile.platformDirectory;
        }
        map.insert(spec.id, record);
    }
    for (const Module& module : m_modules) {
        for (quint32 classId : module.mif.classes) {
            const QString id = formatId(classId);
            auto it = map.find(id);
            if (it == map.end())
                it = map.insert(id, named(id));
            if (it->available)
                continue; // the first exporter is the one shown
            it->available = true;
            it->source = module.info.path;
            it->path = module.folderDevicePath;
        }
    }
    return map;
}

QVector<RegistryInfo> ModuleCatalog::registry() const
{
    QVector<const Module*> ordered;
    for (const Module& module : m_modules)
        ordered.append(&module);
    std::stable_sort(ordered.begin(), ordered.end(),
                     [](const Module* a, const Module* b) { return a->system && !b->system; });

    QVector<RegistryInfo> entries;
    QHash<QString, quint32> claims;
    for (const Module* module : std::as_const(ordered)) {
        for (const MifMimeType& mime : module->mif.mimeTypes) {
            const QString key = mime.mimeType.toLower();
            RegistryInfo entry;
            entry.mimeType = mime.mimeType;
            entry.baseClassId = mime.baseClassId;
            entry.handlerClassId = mime.handlerClassId;
            entry.priority = claims.value(key);
            entry.moduleId = module->info.moduleId;
            entry.active = entry.priority == 0;
            entry.restricted = module->system;
            claims.insert(key, entry.priority + 1);
            entries.append(entry);
        }
    }
    return entries;
}
