#include "MifEntry.h"
#include "MifWriter.h"
#include "Portlex.h"
#include "TestSupport.h"

#include <QScopeGuard>
#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

using TestSupport::threadCount;
using TestSupport::writeFile;

namespace {

// The progress callback's context: records each call as "value/maximum text" and the
// threads it came on, and asks to stop at stopAt, noting how many threads ran then.
struct Recorder
{
    QStringList calls;
    QSet<QThread*> threads;
    int stopAt = -2;
    int threadsAtStop = 0;

    static bool callback(void* context, int value, int maximum, const QString& text)
    {
        auto* self = static_cast<Recorder*>(context);
        self->calls << QStringLiteral("%1/%2 %3").arg(value).arg(maximum).arg(text);
        self->threads.insert(QThread::currentThread());
        if (value == self->stopAt)
            self->threadsAtStop = threadCount();
        return value == self->stopAt;
    }
};

// Counts the files opened in one folder, through inotify.
class OpenCounter
{
public:
    explicit OpenCounter(const QString& folder) { watching = inotify_add_watch(m_fd, QFile::encodeName(folder).constData(), IN_OPEN) >= 0; }
    ~OpenCounter() { ::close(m_fd); }
    bool watching = false;

    // Files opened since the last call.
    int take()
    {
        int opened = 0;
        alignas(inotify_event) char buffer[16384];
        for (ssize_t length; (length = ::read(m_fd, buffer, sizeof buffer)) > 0;) {
            for (ssize_t at = 0; at < length;) {
                const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
                opened += !(event->mask & IN_ISDIR) && event->len > 0;
                at += ssize_t(sizeof(inotify_event) + event->len);
            }
        }
        return opened;
    }

private:
    const int m_fd = inotify_init1(IN_NONBLOCK | IN_CLOEXEC);
};

QByteArray moduleBytes(const QVector<quint32>& classes)
{
    MifEntry entry;
    entry.classes = classes;
    entry.classCount = quint16(classes.size());
    return MifWriter::moduleData(entry);
}

// m000.mif to m499.mif, file i with the one class i + 1.
QStringList writeFlatFolder(const QString& folder)
{
    QStringList paths;
    for (int i = 0; i < 500; ++i) {
        paths << QDir(folder).filePath(QStringLiteral("m%1.mif").arg(i, 3, 10, QLatin1Char('0')));
        if (!writeFile(paths.last(), moduleBytes({ quint32(i + 1) })))
            return QStringList();
    }
    return paths;
}

QStringList relativePaths(const std::vector<MifEntry>& entries, const QString& root)
{
    QStringList paths;
    for (const MifEntry& entry : entries)
        paths << QDir(root).relativeFilePath(entry.filePath);
    return paths;
}

} // namespace

class PlatformScanTest : public QObject
{
    Q_OBJECT

private slots:
    // Any suffix case, hidden files and folders; no FIFO (reading one would block the scan
    // for good) nor dangling link; entries in relative-path order, whatever the disk order.
    void findsMifsInRelativePathOrder()
    {
        QTemporaryDir dir;
        const QStringList mifs = { "top.mif", "UPPER.MIF", "Mixed.Mif", "a/b/c/d/deep.mIf", "a/second.mif", "a.mif",
                                   "folder.mif/inner.mif", ".hidden.mif", "a/.cache/cached.mif", "b.mif", "B.mif",
                                   "a0.mif", "A/y.mif", "a-b.mif" };
        QStringList sorted = mifs;
        sorted.sort();
        // The same tree made twice, in opposite orders, so that its folders list differently on disk.
        for (const bool reversed : { false, true }) {
            const QDir root(dir.filePath(QString::number(reversed)));
            for (int i = 0; i < mifs.size(); ++i) {
                const int n = reversed ? int(mifs.size()) - 1 - i : i;
                QVERIFY(writeFile(root.filePath(mifs[n]), moduleBytes({ 0x01011001u + quint32(n), 0x02000000u })));
            }
            for (const char* other : { "top.mif.bak", "notes.mifx", "mif", "a/readme.txt", "module.mod" })
                QVERIFY(writeFile(root.filePath(other), moduleBytes({ 0x0101FFFF })));
            QCOMPARE(::mkfifo(QFile::encodeName(root.filePath("a/pipe.mif")).constData(), 0600), 0);
            QVERIFY(QFile::link(root.filePath("nowhere"), root.filePath("dangling.mif")));

            std::vector<MifEntry> entries;
            QCOMPARE(Portlex::GetPlatformClassIds(root.path(), entries, nullptr, nullptr), mifs.size());
            QCOMPARE(relativePaths(entries, root.path()), sorted);
            for (const MifEntry& entry : entries) {
                const QString relative = root.relativeFilePath(entry.filePath);
                QCOMPARE(entry.filePath, root.filePath(relative));
                QCOMPARE(entry.fileName, QFileInfo(relative).fileName());
                QCOMPARE(entry.classes, QVector<quint32>({ 0x01011001u + quint32(mifs.indexOf(relative)), 0x02000000u }));
                QCOMPARE(entry.classCount, quint16(2));
                QCOMPARE(entry.header.size(), 40);
            }
        }
    }

    // The progress protocol, on the thread that scans.
    void progressSequenceOnCallingThread()
    {
        QTemporaryDir dir;
        for (const char* name : { "z/last.MIF", "first.mif", "m/n/middle.Mif" })
            QVERIFY(writeFile(dir.filePath(name), moduleBytes({ 1 })));
        // Broken files (which ones is MifReader's matter) are skipped, but have their step.
        MifWriter noModule;
        noModule.addResource(0x1234, 0, "not a module");
        QVERIFY(writeFile(dir.filePath("m/broken.mif"), TestSupport::randomBytes(300, 7)));
        QVERIFY(writeFile(dir.filePath("m/early.mif"), noModule.data()));

        Recorder recorder;
        std::vector<MifEntry> entries;
        int count = -1;
        std::unique_ptr<QThread> worker(QThread::create(
            [&] { count = Portlex::GetPlatformClassIds(dir.path(), entries, &Recorder::callback, &recorder); }));
        worker->start();
        QVERIFY(worker->wait(60000));
        QCOMPARE(count, 3);
        QCOMPARE(relativePaths(entries, dir.path()), QStringList({ "first.mif", "m/n/middle.Mif", "z/last.MIF" }));
        QCOMPARE(recorder.calls, QStringList({ "-1/5 ", "0/5 first.mif", "1/5 broken.mif", "2/5 early.mif", "3/5 middle.Mif",
                                               "4/5 last.MIF" }));
        QCOMPARE(recorder.threads, QSet<QThread*>({ worker.get() }));
    }

    void cancelStopsAtOnce_data()
    {
        QTest::addColumn<int>("stopAt");
        QTest::newRow("not at all") << -2;
        QTest::newRow("at the range") << -1;
        QTest::newRow("at the first file") << 0;
        QTest::newRow("at the last file") << 499;
    }
    void cancelStopsAtOnce()
    {
        QFETCH(int, stopAt);
        QTemporaryDir dir;
        QCOMPARE(writeFlatFolder(dir.path()).size(), 500);
        OpenCounter opens(dir.path());
        QVERIFY(opens.watching);
        Recorder recorder;
        recorder.stopAt = stopAt;
        std::vector<MifEntry> entries { MifEntry() };
        const int threadsBefore = threadCount();

        const int count = Portlex::GetPlatformClassIds(dir.path(), entries, &Recorder::callback, &recorder);
        QCOMPARE(threadCount(), threadsBefore); // no worker outlives the scan
        QCOMPARE(recorder.calls.size(), stopAt == -2 ? 501 : stopAt + 2);
        if (stopAt == -2) { // every file in its place, whichever worker read it
            QCOMPARE(count, 500);
            for (int i = 0; i < 500; ++i)
                QCOMPARE(entries[size_t(i)].classes, QVector<quint32>({ quint32(i + 1) }));
            return;
        }
        QCOMPARE(count, 0);
        QVERIFY(entries.empty());
        QVERIFY(recorder.calls.last().startsWith(QStringLiteral("%1/500").arg(stopAt)));
        if (stopAt == -1) { // before any work starts
            QCOMPARE(recorder.threadsAtStop, threadsBefore);
            QCOMPARE(opens.take(), 0);
        }
    }

    void nothingToScan()
    {
        QTemporaryDir dir;
        QVERIFY(QDir(dir.path()).mkpath("empty"));
        QVERIFY(writeFile(dir.filePath("single.mif"), moduleBytes({ 1 })));
        // An empty path must not fall back to the working folder, which holds a MIF here.
        const QString previous = QDir::currentPath();
        QVERIFY(QDir::setCurrent(dir.path()));
        const auto restore = qScopeGuard([&] { QDir::setCurrent(previous); });
        for (const QString& path : { dir.filePath("empty"), dir.filePath("missing"), dir.filePath("single.mif"), QString() }) {
            Recorder recorder;
            std::vector<MifEntry> entries { MifEntry() };
            QCOMPARE(Portlex::GetPlatformClassIds(path, entries, &Recorder::callback, &recorder), 0);
            QVERIFY(entries.empty());
            QCOMPARE(recorder.calls, QStringList({ "-1/0 " }));
        }
    }

    void linkedFoldersAreEnteredOnce()
    {
        QTemporaryDir dir;
        const QString root = dir.filePath("root");
        QVERIFY(writeFile(QDir(root).filePath("a/x.mif"), moduleBytes({ 1 })));
        QVERIFY(writeFile(dir.filePath("outside/y.mif"), moduleBytes({ 2 })));
        QVERIFY(QFile::link(root, QDir(root).filePath("a/loop")));
        QVERIFY(QFile::link(QDir(root).filePath("a"), QDir(root).filePath("b")));
        QVERIFY(QFile::link(QDir(root).filePath("a/x.mif"), QDir(root).filePath("alias.mif")));
        QVERIFY(QFile::link(dir.filePath("outside"), QDir(root).filePath("out")));

        std::vector<MifEntry> entries;
        QCOMPARE(Portlex::GetPlatformClassIds(root, entries, nullptr, nullptr), 3);
        QCOMPARE(relativePaths(entries, root), QStringList({ "a/x.mif", "alias.mif", "out/y.mif" }));
        QCOMPARE(entries[1].classes, entries[0].classes);
    }
};

QTEST_GUILESS_MAIN(PlatformScanTest)
#include "tst_platformscan.moc"
