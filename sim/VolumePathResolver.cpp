#include "VolumePathResolver.h"

#include <QDir>
#include <QFileInfo>

namespace {

QString trimMountPoint(const QString& mountPoint)
{
    QString mp = mountPoint;
    while (mp.size() > 1 && mp.endsWith(QLatin1Char('/')))
        mp.chop(1);
    return mp;
}

bool coversPath(const QString& mountPoint, const QString& path)
{
    if (mountPoint == QLatin1String("/"))
        return path.startsWith(QLatin1Char('/'));
    return path == mountPoint || path.startsWith(mountPoint + QLatin1Char('/'));
}

} // namespace

bool VolumePathResolver::addMount(const QString& mountPoint, const QString& rootFolder)
{
    const QString root = QFileInfo(rootFolder).canonicalFilePath();
    if (root.isEmpty() || !QFileInfo(root).isDir())
        return false;
    m_mounts.append({trimMountPoint(mountPoint), root});
    return true;
}

VolumePathResolver::Status VolumePathResolver::split(const QString& devicePath, int& volume,
                                                     QStringList& components) const
{
    if (devicePath.isEmpty() || !devicePath.startsWith(QLatin1Char('/')))
        return Status::Invalid;
    if (devicePath.size() > MaxPathLength)
        return Status::TooLong;
    for (const QChar c : devicePath) {
        if (c.unicode() < 0x20 || c == QLatin1Char('\\') || c.unicode() == 0x7f)
            return Status::Invalid;
    }

    volume = -1;
    int bestLength = -1;
    for (int i = 0; i < m_mounts.size(); ++i) {
        const QString& mp = m_mounts.at(i).mountPoint;
        if (coversPath(mp, devicePath) && mp.size() > bestLength) {
            volume = i;
            bestLength = int(mp.size());
        }
    }
    if (volume < 0)
        return Status::NoVolume;

    components.clear();
    const QString rest = devicePath.mid(m_mounts.at(volume).mountPoint == QLatin1String("/") ? 0 : bestLength);
    for (const QString& part : rest.split(QLatin1Char('/'), Qt::SkipEmptyParts)) {
        if (part == QLatin1String(".."))
            return Status::Escapes;
        if (part != QLatin1String("."))
            components.append(part);
    }
    return Status::Ok;
}

bool VolumePathResolver::within(int volume, const QString& canonicalPath) const
{
    const QString& root = m_mounts.at(volume).root;
    if (canonicalPath.isEmpty())
        return false;
    if (canonicalPath == root)
        return true;
    return canonicalPath.startsWith(root == QLatin1String("/") ? root : root + QLatin1Char('/'));
}

bool VolumePathResolver::isInside(int volume, const QString& localPath) const
{
    if (volume < 0 || volume >= m_mounts.size())
        return false;
    return within(volume, QFileInfo(localPath).canonicalFilePath());
}

QString VolumePathResolver::devicePathOf(int volume, const QStringList& components) const
{
    QString path = m_mounts.at(volume).mountPoint;
    for (const QString& c : components)
        path = joinDevicePath(path, c);
    return path;
}

QString VolumePathResolver::joinDevicePath(const QString& directory, const QString& name)
{
    if (directory.endsWith(QLatin1Char('/')))
        return directory + name;
    return directory + QLatin1Char('/') + name;
}

VolumePathResolver::Status VolumePathResolver::resolveExisting(const QString& devicePath, Target& out) const
{
    int volume = -1;
    QStringList components;
    const Status status = split(devicePath, volume, components);
    if (status != Status::Ok)
        return status;

    QString local = m_mounts.at(volume).root;
    for (const QString& c : components)
        local += QLatin1Char('/') + c;
    const QFileInfo info(local);
    if (!info.exists())
        return info.isSymLink() ? Status::Escapes : Status::NotFound;
    const QString canonical = info.canonicalFilePath();
    if (!within(volume, canonical))
        return Status::Escapes;

    out.volume = volume;
    out.devicePath = devicePathOf(volume, components);
    out.localPath = canonical;
    return Status::Ok;
}

VolumePathResolver::Status VolumePathResolver::resolveForCreate(const QString& devicePath, Target& out) const
{
    Target entry;
    const Status status = resolveEntry(devicePath, entry);
    if (status != Status::Ok)
        return status;
    const QFileInfo info(entry.localPath);
    if (info.isSymLink() && !within(entry.volume, info.canonicalFilePath()))
        return Status::Escapes;
    out = entry;
    return Status::Ok;
}

VolumePathResolver::Status VolumePathResolver::resolveEntry(const QString& devicePath, Target& out) const
{
    int volume = -1;
    QStringList components;
    const Status status = split(devicePath, volume, components);
    if (status != Status::Ok)
        return status;
    if (components.isEmpty())
        return Status::Invalid; // the volume's root cannot be created or replaced

    const QString name = components.takeLast();
    Target parent;
    const Status parentStatus = resolveExisting(devicePathOf(volume, components), parent);
    if (parentStatus != Status::Ok)
        return parentStatus;
    if (!QFileInfo(parent.localPath).isDir())
        return Status::NotFound;

    out.volume = volume;
    out.devicePath = joinDevicePath(parent.devicePath, name);
    out.localPath = parent.localPath + QLatin1Char('/') + name;
    return Status::Ok;
}
