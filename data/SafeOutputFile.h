#pragma once

#include <QString>

// A file written whole or not at all, like QSaveFile, that also refuses what QSaveFile
// would write through: the bytes go to a new temporary file beside the target, which
// replaces the target on commit only when the target is a regular file or absent. A
// symbolic link at the target is refused, not followed (another user may have planted
// it in a shared folder, where the kernel's link protection never sees a followed
// link), and so is a device node, FIFO or socket. Uncommitted bytes vanish with the
// object. One thread.
class SafeOutputFile
{
public:
    explicit SafeOutputFile(const QString& path);
    ~SafeOutputFile();
    SafeOutputFile(const SafeOutputFile&) = delete;
    SafeOutputFile& operator=(const SafeOutputFile&) = delete;

    bool open();
    bool write(const char* data, qint64 size);
    bool write(const QByteArray& bytes) { return write(bytes.constData(), bytes.size()); }
    // Syncs the bytes to the disk and renames them over the target.
    bool commit();
    void cancel();
    QString errorString() const { return m_error; }

private:
    // Empty when the target may be replaced, else why not.
    QString refusal() const;
    bool fail(const QString& message);

    QString m_path;
    QByteArray m_tempName;
    int m_fd = -1;
    QString m_error;
};
