#include "RecordStreams.h"

namespace {

// Nesting of the tree record being read on this thread.
thread_local int readDepth = 0;

class NestingGuard
{
public:
    explicit NestingGuard(QDataStream& in)
    {
        if (++readDepth > MaxRecordNesting)
            in.setStatus(QDataStream::ReadCorruptData);
    }
    ~NestingGuard() { --readDepth; }
    NestingGuard(const NestingGuard&) = delete;
    NestingGuard& operator=(const NestingGuard&) = delete;

    static bool tooDeep() { return readDepth > MaxRecordNesting; }
};

template <typename T>
void writeShared(QDataStream& out, const QSharedPointer<T>& v)
{
    out << (v ? *v : T());
}

template <typename T>
void readShared(QDataStream& in, QSharedPointer<T>& v)
{
    v = QSharedPointer<T>::create();
    in >> *v;
}

} // namespace

QDataStream& operator<<(QDataStream& out, const ModuleInfo& v)
{
    return out << v.name << v.type << v.signature << v.path << v.version << v.copyright << v.size << v.moduleId;
}

QDataStream& operator>>(QDataStream& in, ModuleInfo& v)
{
    return in >> v.name >> v.type >> v.signature >> v.path >> v.version >> v.copyright >> v.size >> v.moduleId;
}

QDataStream& operator<<(QDataStream& out, const RegistryInfo& v)
{
    return out << v.mimeType << v.baseClassId << v.handlerClassId << v.priority << v.moduleId << v.active << v.restricted;
}

QDataStream& operator>>(QDataStream& in, RegistryInfo& v)
{
    return in >> v.mimeType >> v.baseClassId >> v.handlerClassId >> v.priority >> v.moduleId >> v.active >> v.restricted;
}

QDataStream& operator<<(QDataStream& out, const ThreadEntry& v)
{
    return out << v.name << v.id << v.priority << v.state << v.processId << v.cpuTimeMs;
}

QDataStream& operator>>(QDataStream& in, ThreadEntry& v)
{
    return in >> v.name >> v.id >> v.priority >> v.state >> v.processId >> v.cpuTimeMs;
}

QDataStream& operator<<(QDataStream& out, const ProcessInfo& v)
{
    out << v.name << v.id;
    writeList(out, v.threads);
    return out;
}

QDataStream& operator>>(QDataStream& in, ProcessInfo& v)
{
    in >> v.name >> v.id;
    readList(in, v.threads);
    return in;
}

QDataStream& operator<<(QDataStream& out, const LoadedModuleEntry& v)
{
    return out << v.name << v.location << v.size << v.id << v.baseAddress << v.refCount;
}

QDataStream& operator>>(QDataStream& in, LoadedModuleEntry& v)
{
    return in >> v.name >> v.location >> v.size >> v.id >> v.baseAddress >> v.refCount;
}

QDataStream& operator<<(QDataStream& out, const LoadedModuleInfo& v)
{
    out << v.name << v.id;
    writeList(out, v.modules);
    return out;
}

QDataStream& operator>>(QDataStream& in, LoadedModuleInfo& v)
{
    in >> v.name >> v.id;
    readList(in, v.modules);
    return in;
}

QDataStream& operator<<(QDataStream& out, const VolumeInfo& v)
{
    return out << v.friendlyName << v.mountPoint << v.volumeSize << v.freeSpace << v.mounted << v.removable << v.volumeId;
}

QDataStream& operator>>(QDataStream& in, VolumeInfo& v)
{
    return in >> v.friendlyName >> v.mountPoint >> v.volumeSize >> v.freeSpace >> v.mounted >> v.removable >> v.volumeId;
}

QDataStream& operator<<(QDataStream& out, const _FileInfo& v)
{
    return out << v.Name() << v.Path() << v.Attributes() << v.size;
}

QDataStream& operator>>(QDataStream& in, _FileInfo& v)
{
    QString name, path, attributes;
    quint64 size = 0;
    in >> name >> path >> attributes >> size;
    v = _FileInfo(name, path, attributes, size);
    return in;
}

QDataStream& operator<<(QDataStream& out, const _DirectoryInfo& v)
{
    out << v.Name() << v.Path();
    writeList(out, v.files);
    writeList(out, v.directories);
    return out;
}

QDataStream& operator>>(QDataStream& in, _DirectoryInfo& v)
{
    NestingGuard guard(in);
    QString name, path;
    in >> name >> path;
    v.SetName(name);
    v.SetPath(path);
    v.files.clear();
    v.directories.clear();
    if (NestingGuard::tooDeep())
        return in;
    readList(in, v.files);
    readList(in, v.directories);
    return in;
}

QDataStream& operator<<(QDataStream& out, const _SettingsInfo& v)
{
    out << v.Name() << v.Path();
    writeList(out, v.values);
    writeList(out, v.children);
    return out;
}

QDataStream& operator>>(QDataStream& in, _SettingsInfo& v)
{
    NestingGuard guard(in);
    QString name, path;
    in >> name >> path;
    v.SetName(name);
    v.SetPath(path);
    v.values.clear();
    v.children.clear();
    if (NestingGuard::tooDeep())
        return in;
    readList(in, v.values);
    readList(in, v.children);
    return in;
}

QDataStream& operator<<(QDataStream& out, const QSharedPointer<_FileInfo>& v)
{
    writeShared(out, v);
    return out;
}

QDataStream& operator>>(QDataStream& in, QSharedPointer<_FileInfo>& v)
{
    readShared(in, v);
    return in;
}

QDataStream& operator<<(QDataStream& out, const QSharedPointer<_DirectoryInfo>& v)
{
    writeShared(out, v);
    return out;
}

QDataStream& operator>>(QDataStream& in, QSharedPointer<_DirectoryInfo>& v)
{
    readShared(in, v);
    return in;
}

QDataStream& operator<<(QDataStream& out, const QSharedPointer<_SettingsInfo>& v)
{
    writeShared(out, v);
    return out;
}

QDataStream& operator>>(QDataStream& in, QSharedPointer<_SettingsInfo>& v)
{
    readShared(in, v);
    return in;
}

QDataStream& operator<<(QDataStream& out, const PriviledgeRecord& v)
{
    return out << v.id << v.name << v.family << v.subFamily;
}

QDataStream& operator>>(QDataStream& in, PriviledgeRecord& v)
{
    return in >> v.id >> v.name >> v.family >> v.subFamily;
}

QDataStream& operator<<(QDataStream& out, const MifApplet& v)
{
    return out << v.classId << v.name << v.baseId << v.appType << v.host << v.privSet << v.flags;
}

QDataStream& operator>>(QDataStream& in, MifApplet& v)
{
    return in >> v.classId >> v.name >> v.baseId >> v.appType >> v.host >> v.privSet >> v.flags;
}

QDataStream& operator<<(QDataStream& out, const MifNotifier& v)
{
    return out << v.typeId << v.notifierId << v.mask;
}

QDataStream& operator>>(QDataStream& in, MifNotifier& v)
{
    return in >> v.typeId >> v.notifierId >> v.mask;
}

QDataStream& operator<<(QDataStream& out, const MifMimeType& v)
{
    return out << v.handlerClassId << v.baseClassId << v.mimeType;
}

QDataStream& operator>>(QDataStream& in, MifMimeType& v)
{
    return in >> v.handlerClassId >> v.baseClassId >> v.mimeType;
}

QDataStream& operator<<(QDataStream& out, const MifEntry& v)
{
    out << v.kind << v.fileName << v.filePath << v.classCount << v.appletCount << v.externalClassCount
        << v.notificationCount << v.mimeTypeCount;
    writeList(out, v.classes);
    writeList(out, v.applets);
    writeList(out, v.externalClasses);
    writeList(out, v.notifiers);
    writeList(out, v.mimeTypes);
    return out << v.header;
}

QDataStream& operator>>(QDataStream& in, MifEntry& v)
{
    in >> v.kind >> v.fileName >> v.filePath >> v.classCount >> v.appletCount >> v.externalClassCount
        >> v.notificationCount >> v.mimeTypeCount;
    readList(in, v.classes);
    readList(in, v.applets);
    readList(in, v.externalClasses);
    readList(in, v.notifiers);
    readList(in, v.mimeTypes);
    return in >> v.header;
}

QDataStream& operator<<(QDataStream& out, const IdRecord& v)
{
    return out << v.id << v.name << v.family << v.subFamily << v.source << v.path << v.available;
}

QDataStream& operator>>(QDataStream& in, IdRecord& v)
{
    return in >> v.id >> v.name >> v.family >> v.subFamily >> v.source >> v.path >> v.available;
}

QDataStream& operator<<(QDataStream& out, const DeviceData& v)
{
    return out << v.phoneName << v.targetId << v.zantVersion << v.zantBuildNumber << v.staticBuildId
               << v.dynamicBuildId << v.componentServicesBuild << v.hardware << v.audio << v.image << v.video;
}

QDataStream& operator>>(QDataStream& in, DeviceData& v)
{
    return in >> v.phoneName >> v.targetId >> v.zantVersion >> v.zantBuildNumber >> v.staticBuildId
              >> v.dynamicBuildId >> v.componentServicesBuild >> v.hardware >> v.audio >> v.image >> v.video;
}

QDataStream& operator<<(QDataStream& out, const DeviceCache& v)
{
    return out << v.filled << v.deviceName << v.connectionKind << v.platform.name << v.platform.directory
               << v.classes << v.interfaces << v.deviceData;
}

QDataStream& operator>>(QDataStream& in, DeviceCache& v)
{
    return in >> v.filled >> v.deviceName >> v.connectionKind >> v.platform.name >> v.platform.directory
              >> v.classes >> v.interfaces >> v.deviceData;
}
