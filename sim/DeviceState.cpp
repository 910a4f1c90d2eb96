#include "DeviceState.h"

#include "DeviceProfileParser.h"
#include "PortlexErrors.h"

#include <QDir>
#include <QDirIterator>
#include <QFileInfo>

#include <algorithm>

namespace {

const SettingsNodeSpec* findSettingsNode(const SettingsNodeSpec& root, const QString& path)
{
    if (!path.startsWith(QLatin1Char('/')))
        return nullptr;
    const SettingsNodeSpec* node = &root;
    for (const QString& name : path.split(QLatin1Char('/'), Qt::SkipEmptyParts)) {
        const SettingsNodeSpec* next = nullptr;
        for (const SettingsNodeSpec& child : node->children) {
            if (child.name == name) {
                next = &child;
                break;
            }
        }
        if (!next)
            return nullptr;
        node = next;
    }
    return node;
}

// True when path is folder or lies below it.
bool within(const QString& folder, const QString& path)
{
    return path == folder || path.startsWith(folder + QLatin1Char('/'));
}

qint32 codeFor(VolumePathResolver::Status status)
{
    return status == VolumePathResolver::Status::NotFound || status == VolumePathResolver::Status::NoVolume
        ? qint32(PortlexError::NotFound)
        : qint32(PortlexError::PathRefused);
}

} // namespace

bool DeviceState::fail(const QString& message)
{
    m_error = message;
    return false;
}

bool DeviceState::load(const QString& imageDir, const QString& namesDir)
{
    DeviceProfileParser parser;
    if (!parser.parseFile(QDir(imageDir).filePath(QStringLiteral("device.xml")), m_profile))
        return fail(parser.errorString());

    for (const VolumeSpec& volume : std::as_const(m_profile.volumes)) {
        const QString folder = QDir(imageDir).filePath(volume.folder);
        const QFileInfo info(folder);
        if (info.isSymLink() || !m_resolver.addMount(volume.mountPoint, folder))
            return fail(QStringLiteral("volume %1: the folder %2 is missing (or a link)").arg(volume.id).arg(folder));
    }
    m_names.load(namesDir);
    m_processes = std::make_unique<ProcessTable>(m_profile.residentProcesses, m_profile.transientProcesses,
                                                 m_profile.evolution);
    m_clock.start();
    filesChanged();
    return true;
}

void DeviceState::filesChanged()
{
    m_catalog.scan(m_profile.volumes, m_resolver);
    m_usedBytes.fill(-1, m_profile.volumes.size());
}

DeviceCache DeviceState::cache() const
{
    DeviceCache cache;
    cache.filled = true;
    cache.deviceName = m_profile.displayName();
    cache.connectionKind = m_profile.connectionText();
    cache.platform.name = m_profile.platformName;
    cache.platform.directory = m_profile.platformDirectory;
    cache.classes = m_catalog.classes(m_profile, m_names);
    for (const QString& id : m_profile.interfaces) {
        IdRecord record;
        record.id = id;
        m_names.lookupInterface(id, record.name, record.family, record.subFamily);
        record.source = m_profile.platformName;
        record.path = m_profile.platformDirectory;
        record.available = true;
        cache.interfaces.insert(id, record);
    }
    cache.deviceData = m_profile.data;
    return cache;
}

QVector<ModuleInfo> DeviceState::modules() const
{
    QVector<ModuleInfo> list;
    list.reserve(m_catalog.modules().size());
    for (const ModuleCatalog::Module& module : m_catalog.modules())
        list.append(module.info);
    return list;
}

qint32 DeviceState::moduleMif(const QString& pathOrName, MifEntry& entry) const
{
    const ModuleCatalog::Module* module = m_catalog.find(pathOrName);
    if (!module)
        return PortlexError::NotFound;
    if (!module->mifReadable)
        return PortlexError::IoError;
    entry = module->mif;
    return 0;
}

void DeviceState::advanceClock()
{
    m_processes->advanceTo(quint64(m_clock.elapsed() / m_profile.evolution.intervalMs));
}

QVector<ProcessInfo> DeviceState::processes()
{
    advanceClock();
    QVector<ProcessInfo> list;
    for (const ProcessTable::Process& p : m_processes->processes()) {
        ProcessInfo info;
        info.name = p.name;
        info.id = p.id;
        for (const ProcessTable::Thread& t : p.threads) {
            ThreadEntry thread;
            thread.name = t.name;
            thread.id = t.id;
            thread.priority = t.priority;
            thread.state = t.state;
            thread.processId = p.id;
            info.threads.append(thread);
        }
        list.append(info);
    }
    return list;
}

QVector<LoadedModuleInfo> DeviceState::loadedModules()
{
    advanceClock();
    QVector<LoadedModuleInfo> list;
    for (const ProcessTable::Process& p : m_processes->processes()) {
        LoadedModuleInfo info;
        info.name = p.name;
        info.id = p.id;
        for (const ProcessTable::Module& m : p.modules) {
            LoadedModuleEntry entry;
            entry.name = m.name;
            entry.location = m.location;
            entry.size = m.size;
            entry.id = m.id;
            entry.refCount = 1;
            info.modules.append(entry);
        }
        list.append(info);
    }
    return list;
}

quint64 DeviceState::usedBytes(int volume)
{
    if (m_usedBytes.at(volume) < 0) {
        qint64 total = 0;
        QDirIterator it(m_resolver.rootFolder(volume), QDir::Files | QDir::NoSymLinks | QDir::Hidden | QDir::System,
                        QDirIterator::Subdirectories);
        while (it.hasNext()) {
            it.next();
            total += it.fileInfo().size();
        }
        m_usedBytes[volume] = total;
    }
    return quint64(m_usedBytes.at(volume));
}

quint64 DeviceState::freeSpace(int volume)
{
    const VolumeSpec& spec = m_profile.volumes.at(volume);
    const quint64 taken = spec.reserved + usedBytes(volume);
    return taken >= spec.size ? 0 : spec.size - taken;
}

quint32 DeviceState::startProcess(const ProcessSpec& spec, int lifetimeMs)
{
    // Catch up first, so that steps owed from the past do not age the new process.
    advanceClock();
    const int interval = std::max(1, m_profile.evolution.intervalMs);
    return m_processes->start(spec, (lifetimeMs + interval - 1) / interval);
}

QList<VolumeInfo> DeviceState::volumes()
{
    QList<VolumeInfo> list;
    for (int i = 0; i < m_profile.volumes.size(); ++i) {
        const VolumeSpec& spec = m_profile.volumes.at(i);
        VolumeInfo info;
        info.friendlyName = spec.friendlyName;
        info.mountPoint = spec.mountPoint;
        info.volumeSize = spec.size;
        info.freeSpace = freeSpace(i);
        info.mounted = spec.mounted;
        info.removable = spec.removable;
        info.volumeId = spec.id;
        list.append(info);
    }
    return list;
}

qint32 DeviceState::childSettings(const QString& path, _SettingsInfo& node) const
{
    const SettingsNodeSpec* spec = findSettingsNode(m_profile.settings, path);
    if (!spec)
        return PortlexError::NotFound;
    node.SetName(spec->name);
    node.values = QVector<QPair<QString, QString>>(spec->values.cbegin(), spec->values.cend());
    node.children.clear();
    for (const SettingsNodeSpec& child : spec->children)
        node.children.append(QSharedPointer<_SettingsInfo>::create(child.name, VolumePathResolver::joinDevicePath(path, child.name)));
    return 0;
}

qint32 DeviceState::fileSystemLevel(const QString& path, _DirectoryInfo& level) const
{
    VolumePathResolver::Target target;
    const VolumePathResolver::Status status = m_resolver.resolveExisting(path, target);
    if (status != VolumePathResolver::Status::Ok)
        return codeFor(status);
    if (!QFileInfo(target.localPath).isDir())
        return PortlexError::NotFound;

    const bool isRoot = target.devicePath == m_resolver.mountPoint(target.volume);
    level.SetPath(target.devicePath);
    level.SetName(isRoot ? target.devicePath : target.devicePath.mid(target.devicePath.lastIndexOf(QLatin1Char('/')) + 1));
    level.files.clear();
    level.directories.clear();

    QVector<DirectoryListing::Entry> entries;
    if (!DirectoryListing::list(target.localPath, entries))
        return PortlexError::IoError;
    const bool system = inSystemFolder(target.volume, target.devicePath);
    for (const DirectoryListing::Entry& entry : std::as_const(entries)) {
        // A link shows as the file it names, and only when that stays in the volume;
        // linked directories are left out so that the crawl can never loop.
        if (entry.link
            && (entry.directory || !m_resolver.isInside(target.volume, target.localPath + QLatin1Char('/') + entry.name)))
            continue;
        const QString devicePath = VolumePathResolver::joinDevicePath(target.devicePath, entry.name);
        if (entry.directory)
            level.directories.append(QSharedPointer<_DirectoryInfo>::create(entry.name, devicePath));
        else
            level.files.append(QSharedPointer<_FileInfo>::create(entry.name, devicePath, attributesOf(entry, system), entry.size));
    }
    return 0;
}

bool DeviceState::inSystemFolder(int volume, const QString& devicePath) const
{
    const VolumeSpec& spec = m_profile.volumes.at(volume);
    for (const QString& folder : spec.moduleFolders) {
        const QString systemPath = VolumePathResolver::joinDevicePath(spec.mountPoint, folder);
        if (folder != spec.installFolder && (devicePath == systemPath || devicePath.startsWith(systemPath + QLatin1Char('/'))))
            return true;
    }
    return false;
}

bool DeviceState::touchesSystemFolder(const QString& localPath) const
{
    for (int v = 0; v < m_profile.volumes.size() && v < m_resolver.mountCount(); ++v) {
        const VolumeSpec& spec = m_profile.volumes.at(v);
        for (const QString& folder : spec.moduleFolders) {
            if (folder == spec.installFolder)
                continue;
            // A declared system folder that does not exist yet is no less the system's:
            // a client must not create it and plant modules there.
            VolumePathResolver::Target system;
            const VolumePathResolver::Status found
                = m_resolver.resolveExisting(VolumePathResolver::joinDevicePath(m_resolver.mountPoint(v), folder), system);
            if (found == VolumePathResolver::Status::NotFound)
                system.localPath = QDir::cleanPath(m_resolver.rootFolder(v) + QLatin1Char('/') + folder);
            else if (found != VolumePathResolver::Status::Ok)
                continue;
            if (within(system.localPath, localPath) || within(localPath, system.localPath))
                return true;
        }
    }
    return false;
}

bool DeviceState::isSystemModule(const QString& name) const
{
    const QVector<ModuleCatalog::Module>& list = m_catalog.modules();
    return std::any_of(list.cbegin(), list.cend(), [&name](const ModuleCatalog::Module& module) {
        return module.system && module.info.name.compare(name, Qt::CaseInsensitive) == 0;
    });
}

QString DeviceState::attributesOf(const DirectoryListing::Entry& file, bool system)
{
    QString text;
    text += file.readable ? QLatin1Char('r') : QLatin1Char('-');
    text += file.writable && !system ? QLatin1Char('w') : QLatin1Char('-');
    text += file.name.endsWith(QLatin1String(".mod"), Qt::CaseInsensitive) ? QLatin1Char('x') : QLatin1Char('-');
    if (file.name.startsWith(QLatin1Char('.')))
        text += QLatin1Char('h');
    if (system)
        text += QLatin1Char('s');
    return text;
}

bool DeviceState::serviceEnabled() const
{
    const EnablementSpec::Mode mode = m_profile.enablement.mode;
    return (mode == EnablementSpec::Mode::Service || mode == EnablementSpec::Mode::Both) && !m_serviceLocked;
}

bool DeviceState::signatureEnabled() const
{
    const EnablementSpec::Mode mode = m_profile.enablement.mode;
    return (mode == EnablementSpec::Mode::Signature || mode == EnablementSpec::Mode::Both) && !m_signatureLocked;
}

EnablementStatus DeviceState::tepStatus(QString& mode, QString& owner, QString& expires) const
{
    if (!serviceEnabled())
        return EnablementDisabled;
    mode = QStringLiteral("Developer Enabled Service");
    owner = m_profile.enablement.owner;
    expires = m_profile.enablement.expires;
    return EnablementEnabled;
}

EnablementStatus DeviceState::globalTestSigStatus(QString& mode, QString& owner, QString& expires) const
{
    if (!signatureEnabled())
        return EnablementDisabled;
    mode = QStringLiteral("Developer Enabled Signature");
    owner = m_profile.enablement.owner;
    expires = m_profile.enablement.expires;
    return EnablementEnabled;
}

QVector<PriviledgeRecord> DeviceState::tepPriviledges() const
{
    QVector<PriviledgeRecord> list;
    if (!serviceEnabled())
        return list;
    for (const QString& id : m_profile.enablement.priviledges) {
        PriviledgeRecord record;
        m_names.lookupPriviledge(id, record);
        list.append(record);
    }
    return list;
}
