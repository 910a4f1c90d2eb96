#pragma once

// Small helpers shared by the tests: files, tree digests, seeded bytes, thread counts, calls
// from a worker thread and stale sockets. Header-only so that every test folder can use it.

#include <QByteArray>
#include <QCryptographicHash>
#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>
#include <QRandomGenerator>
#include <QString>
#include <QStringList>
#include <QThread>

#include <atomic>
#include <memory>

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace TestSupport {

// Writes bytes to path, creating its folder; false when anything fails.
inline bool writeFile(const QString& path, const QByteArray& bytes)
{
    QDir().mkpath(QFileInfo(path).absolutePath());
    QFile file(path);
    return file.open(QIODevice::WriteOnly | QIODevice::Truncate) && file.write(bytes) == bytes.size();
}

inline QByteArray readFile(const QString& path)
{
    QFile file(path);
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray("<unreadable>");
}

// Every entry below root, relative and sorted, folders included.
inline QStringList treeEntries(const QString& root)
{
    QStringList entries;
    QDirIterator it(root, QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot,
                    QDirIterator::Subdirectories);
    while (it.hasNext())
        entries << QDir(root).relativeFilePath(it.next());
    entries.sort();
    return entries;
}

// Every path below root with its bytes (links as their target text): any change in the
// tree gives another digest.
inline QByteArray treeDigest(const QString& root)
{
    QCryptographicHash hash(QCryptographicHash::Sha256);
    for (const QString& relative : treeEntries(root)) {
        const QFileInfo info(QDir(root).filePath(relative));
        QFile file(info.filePath());
        hash.addData(relative.toUtf8());
        if (info.isSymLink())
            hash.addData(info.symLinkTarget().toUtf8());
        else if (info.isFile() && file.open(QIODevice::ReadOnly))
            hash.addData(&file);
    }
    return hash.result();
}

// Reproducible bytes for a seed.
inline QByteArray randomBytes(qsizetype size, quint32 seed)
{
    QByteArray bytes(size, Qt::Uninitialized);
    QRandomGenerator generator(seed);
    generator.fillRange(reinterpret_cast<quint32*>(bytes.data()), size / 4);
    for (qsizetype i = size / 4 * 4; i < size; ++i)
        bytes[i] = char(generator.generate());
    return bytes;
}

// The threads this process runs now.
inline int threadCount()
{
    return QDir(QStringLiteral("/proc/self/task")).entryList(QDir::Dirs | QDir::NoDotAndDotDot).size();
}

// Runs work on a thread of its own, as the pages' workers call the gateway; a call that
// does not come back within limitMs ends the test run.
template <typename F>
int callOnWorker(F work, int limitMs)
{
    std::atomic<int> result { -1 };
    std::unique_ptr<QThread> thread(QThread::create([&] { result = work(); }));
    thread->start();
    if (!thread->wait(limitMs))
        qFatal("a call on a worker thread hung");
    return result;
}

// A socket file nobody listens on, as a crashed device leaves it.
inline bool makeStaleSocket(const QString& path)
{
    const int fd = ::socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    qstrncpy(address.sun_path, QFile::encodeName(path).constData(), sizeof(address.sun_path));
    const bool bound = ::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0;
    ::close(fd);
    return bound;
}

} // namespace TestSupport
