#pragma once

#include <QString>
#include <QStringList>

#include <functional>

// Unpacks a .zantro package (a ZIP archive) into an empty folder, trusting nothing in it:
// only plain files and directories with relative names that stay inside the folder are
// accepted, and the unpacked size and the compression ratio are bounded while the bytes
// are written, whatever the archive's headers claim. On refusal the folder may hold part
// of the package; the caller throws the folder away.
class PackageExtractor
{
public:
    static constexpr quint64 MaxUnpackedBytes = 512ull * 1024 * 1024;
    static constexpr int MaxEntries = 4096;
    static constexpr int MaxEntryPathLength = 512;
    // Unpacked bytes per packed byte; real modules compress far less than this.
    static constexpr quint64 MaxCompressionRatio = 100;
    // Below this total the ratio is not checked, so that tiny packages of text pass.
    static constexpr quint64 RatioFreeBytes = 1024 * 1024;
    // The keep-alive is called at least this often, so that a long unpack is not taken for
    // a dead device.
    static constexpr quint64 KeepAliveBytes = 256 * 1024;
    static constexpr int KeepAliveEntries = 64;

    // Why the entry at relativePath may not be unpacked, or empty when it may.
    using EntryCheck = std::function<QString(const QString& relativePath)>;
    void setEntryCheck(EntryCheck check) { m_check = std::move(check); }
    void setKeepAlive(std::function<void()> keepAlive) { m_keepAlive = std::move(keepAlive); }

    // spaceLimit: the most bytes the package may unpack to (the room left on the volume).
    bool extract(const QString& packagePath, const QString& folder, quint64 spaceLimit);
    // Why extract failed, in words for the user.
    QString errorString() const { return m_error; }
    // The names directly below the folder that the package created.
    QStringList topLevelNames() const { return m_topLevel; }

    // Relative path with "." parts removed, or empty if name may not be extracted.
    static QString safeRelativePath(const QString& name);

private:
    bool fail(const QString& message);
    // Counts work done and calls the keep-alive when enough has piled up.
    void progress(quint64 bytes, int entries);

    EntryCheck m_check;
    std::function<void()> m_keepAlive;
    quint64 m_bytesSinceBeat = 0;
    int m_entriesSinceBeat = 0;
    QString m_error;
    QStringList m_topLevel;
};
