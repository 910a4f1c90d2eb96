#pragma once

#include <QString>
#include <QVector>

// Maps a device path ("/usermod/calc/calc.mif", "/card/user/a.txt") to a local file inside
// the folder that holds that volume, and refuses every path that could reach anything
// outside it. Reads and the write actions both go through here.
class VolumePathResolver
{
public:
    enum class Status
    {
        Ok,
        Invalid,   // empty, relative, control characters, backslash
        TooLong,
        NoVolume,  // no mount point covers the path
        Escapes,   // "..", or a link that leads out of the volume
        NotFound,
    };

    struct Target
    {
        int volume = -1;
        QString devicePath; // normalised: single slashes, no "." components
        QString localPath;  // canonical for existing targets
    };

    static constexpr int MaxPathLength = 1024;

    // rootFolder must exist; it is canonicalised once here. Returns false if it does not.
    bool addMount(const QString& mountPoint, const QString& rootFolder);
    int mountCount() const { return int(m_mounts.size()); }
    QString mountPoint(int volume) const { return m_mounts.at(volume).mountPoint; }
    QString rootFolder(int volume) const { return m_mounts.at(volume).root; }

    // The target must exist; a link is followed only when it stays inside the volume.
    Status resolveExisting(const QString& devicePath, Target& out) const;
    // The parent must exist inside the volume; the target itself may be missing, but if it
    // is a link it must point inside.
    Status resolveForCreate(const QString& devicePath, Target& out) const;

    // The parent must exist inside the volume; the target itself is not followed, so a
    // link names the link (for deleting it).
    Status resolveEntry(const QString& devicePath, Target& out) const;

    // True when localPath, made canonical, lies in the volume's folder. False for dangling links.
    bool isInside(int volume, const QString& localPath) const;

    // Joins a device directory and a name with exactly one slash.
    static QString joinDevicePath(const QString& directory, const QString& name);

private:
    struct Mount
    {
        QString mountPoint; // without a trailing slash, except the root "/"
        QString root;       // canonical local folder
    };

    Status split(const QString& devicePath, int& volume, QStringList& components) const;
    bool within(int volume, const QString& canonicalPath) const;
    QString devicePathOf(int volume, const QStringList& components) const;

    QVector<Mount> m_mounts;
};
