#include "MifBatchReader.h"
#include "MifEntry.h"
#include "MifWriter.h"
#include "PlatformGenerator.h"
#include "Portlex.h"

#include "TestSupport.h"

#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <sys/inotify.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <climits>
#include <memory>

using TestSupport::writeFile;

namespace {

struct Call
{
    int value;
    int maximum;
    QString text;
    QThread* thread;
};

// The progress callback's context: records every call and answers true at stopAt.
struct Recorder
{
    QVector<Call> calls;
    int stopAt = INT_MIN;

    static bool callback(void* context, int value, int maximum, const QString& text)
    {
        auto* self = static_cast<Recorder*>(context);
        self->calls.append({ value, maximum, text, QThread::currentThread() });
        return value == self->stopAt;
    }
};

// Counts the files opened in one folder, through inotify.
class OpenCounter
{
public:
    explicit OpenCounter(const QString& folder)
        : m_fd(inotify_init1(IN_NONBLOCK | IN_CLOEXEC))
    {
        if (m_fd >= 0 && inotify_add_watch(m_fd, QFile::encodeName(folder).constData(), IN_OPEN) < 0) {
            ::close(m_fd);
            m_fd = -1;
        }
    }
    ~OpenCounter()
    {
        if (m_fd >= 0)
            ::close(m_fd);
    }
    bool isValid() const { return m_fd >= 0; }

    // Files opened since the last call.
    int take()
    {
        int opened = 0;
        alignas(inotify_event) char buffer[16384];
        ssize_t length;
        while ((length = ::read(m_fd, buffer, sizeof buffer)) > 0) {
            for (ssize_t at = 0; at < length;) {
                const auto* event = reinterpret_cast<const inotify_event*>(buffer + at);
                if (!(event->mask & IN_ISDIR) && event->len > 0)
                    ++opened;
                at += ssize_t(sizeof(inotify_event) + event->len);
            }
        }
        return opened;
    }

private:
    int m_fd;
};

QByteArray moduleBytes(const QVector<quint32>& classes)
{
    MifEntry entry;
    entry.classes = classes;
    entry.classCount = quint16(classes.size());
    return MifWriter::moduleData(entry);
}

QStringList writeFlatFolder(const QString& folder, int count)
{
    QStringList paths;
    for (int i = 0; i < count; ++i) {
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

QStringList sorted(QStringList list)
{
    std::sort(list.begin(), list.end());
    return list;
}

int threadCount()
{
    return QDir(QStringLiteral("/proc/self/task")).entryList(QDir::Dirs | QDir::NoDotAndDotDot).size();
}

} // namespace

class PlatformScanTest : public QObject
{
    Q_OBJECT

private slots:
    void findsMifsInNestedFoldersWithAnySuffixCase()
    {
        QTemporaryDir dir;
        const QStringList mifs = { "top.mif", "UPPER.MIF", "Mixed.Mif", "a/b/c/d/deep.mIf", "a/second.mif",
                                   "folder.mif/inner.mif", ".hidden.mif", "a/.cache/cached.mif" };
        QHash<QString, QVector<quint32>> classes;
        for (int i = 0; i < mifs.size(); ++i) {
            classes[mifs[i]] = { 0x01011001u + quint32(i), 0x02000000u + quint32(i) };
            QVERIFY(writeFile(dir.filePath(mifs[i]), moduleBytes(classes[mifs[i]])));
        }
        for (const char* other : { "top.mif.bak", "notes.mifx", "mif", "a/readme.txt", "module.mod" })
            QVERIFY(writeFile(dir.filePath(other), moduleBytes({ 0x0101FFFF })));
        // Reading a FIFO would block the scan for good.
        QCOMPARE(::mkfifo(QFile::encodeName(dir.filePath("a/pipe.mif")).constData(), 0600), 0);
        QVERIFY(QFile::link(dir.filePath("nowhere"), dir.filePath("dangling.mif")));

        std::vector<MifEntry> entries;
        QCOMPARE(Portlex::GetPlatformClassIds(dir.path(), entries, nullptr, nullptr), mifs.size());
        QCOMPARE(relativePaths(entries, dir.path()), sorted(mifs));
        for (const MifEntry& entry : entries) {
            const QString relative = QDir(dir.path()).relativeFilePath(entry.filePath);
            QCOMPARE(entry.filePath, dir.filePath(relative));
            QCOMPARE(entry.fileName, QFileInfo(relative).fileName());
            QCOMPARE(entry.classes, classes[relative]);
            QCOMPARE(entry.classCount, quint16(2));
            QCOMPARE(entry.header.size(), 40);
        }
    }

    void orderFollowsRelativePathsNotCreationOrder()
    {
        const QStringList names = { "b.mif", "B.mif", "a/x.mif", "a.mif", "a0.mif", "A/y.mif", "a/z/0.mif", "a-b.mif" };
        QTemporaryDir dir;
        // The same tree made twice, in opposite creation order, gives the folders different orders on disk.
        QStringList found[2];
        for (int copy = 0; copy < 2; ++copy) {
            const QString root = dir.filePath(QString::number(copy));
            for (int i = 0; i < names.size(); ++i) {
                const QString& name = copy == 0 ? names[i] : names[names.size() - 1 - i];
                QVERIFY(writeFile(QDir(root).filePath(name), moduleBytes({ 0x01011001 })));
            }
            std::vector<MifEntry> entries;
            Portlex::GetPlatformClassIds(root, entries, nullptr, nullptr);
            found[copy] = relativePaths(entries, root);
        }
        QCOMPARE(found[0], sorted(names));
        QCOMPARE(found[1], found[0]);
    }

    void progressSequenceOnCallingThread_data()
    {
        QTest::addColumn<bool>("onWorker");
        QTest::newRow("main thread") << false;
        QTest::newRow("worker thread") << true;
    }

    void progressSequenceOnCallingThread()
    {
        QFETCH(bool, onWorker);
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
        QThread* caller = QThread::currentThread();
        const auto scan = [&] { count = Portlex::GetPlatformClassIds(dir.path(), entries, &Recorder::callback, &recorder); };
        if (onWorker) {
            std::unique_ptr<QThread> worker(QThread::create(scan));
            caller = worker.get();
            worker->start();
            QVERIFY(worker->wait(60000));
        } else {
            scan();
        }
        QCOMPARE(count, 3);
        QCOMPARE(relativePaths(entries, dir.path()), QStringList({ "first.mif", "m/n/middle.Mif", "z/last.MIF" }));

        const QStringList expected = { "first.mif", "m/broken.mif", "m/early.mif", "m/n/middle.Mif", "z/last.MIF" };
        QCOMPARE(recorder.calls.size(), 1 + expected.size());
        QCOMPARE(recorder.calls[0].value, -1);
        QCOMPARE(recorder.calls[0].maximum, expected.size());
        for (int i = 0; i < expected.size(); ++i) {
            QCOMPARE(recorder.calls[i + 1].value, i);
            QCOMPARE(recorder.calls[i + 1].maximum, expected.size());
            QCOMPARE(recorder.calls[i + 1].text, QFileInfo(expected[i]).fileName());
        }
        for (const Call& call : recorder.calls)
            QCOMPARE(call.thread, caller);
    }

    void cancelStopsAtOnce_data()
    {
        QTest::addColumn<int>("stopAt");
        QTest::newRow("at the range") << -1;
        QTest::newRow("at the first file") << 0;
        QTest::newRow("midway") << 250;
        QTest::newRow("at the last file") << 499;
    }

    void cancelStopsAtOnce()
    {
        QFETCH(int, stopAt);
        QTemporaryDir dir;
        QCOMPARE(writeFlatFolder(dir.path(), 500).size(), 500);
        OpenCounter opens(dir.path());
        QVERIFY(opens.isValid());
        Recorder recorder;
        recorder.stopAt = stopAt;
        std::vector<MifEntry> entries { MifEntry() };
        const int threadsBefore = threadCount();

        QCOMPARE(Portlex::GetPlatformClassIds(dir.path(), entries, &Recorder::callback, &recorder), 0);
        QVERIFY(entries.empty());
        QCOMPARE(recorder.calls.size(), stopAt + 2);
        QCOMPARE(recorder.calls.last().value, stopAt);
        QCOMPARE(threadCount(), threadsBefore); // no worker outlives the scan
        if (stopAt == -1)
            QCOMPARE(opens.take(), 0);
    }

    void readerStartsNoFileAfterCancel()
    {
        constexpr int Threads = 3;
        QTemporaryDir dir;
        const QStringList paths = writeFlatFolder(dir.path(), 500);
        QCOMPARE(paths.size(), 500);
        OpenCounter opens(dir.path());
        QVERIFY(opens.isValid());
        {
            MifBatchReader reader(paths, Threads);
            MifEntry entry;
            QVERIFY(reader.take(0, entry));
            QCOMPARE(entry.classes, QVector<quint32>({ 1 }));
            reader.cancel();
            opens.take();
        }
        // Each worker may finish the file it had claimed, but claims no other.
        QVERIFY2(opens.take() <= Threads - 1, "workers kept reading after the cancel");
    }

    void emptyOrMissingFolder_data()
    {
        QTest::addColumn<QString>("relative");
        QTest::newRow("empty folder") << "empty";
        QTest::newRow("missing folder") << "missing";
        QTest::newRow("a MIF file, not a folder") << "single.mif";
        QTest::newRow("empty path") << "";
    }

    void emptyOrMissingFolder()
    {
        QFETCH(QString, relative);
        QTemporaryDir dir;
        QVERIFY(QDir(dir.path()).mkpath("empty"));
        QVERIFY(writeFile(dir.filePath("single.mif"), moduleBytes({ 1 })));
        // An empty path must not fall back to the working folder, which holds a MIF here.
        const QString previous = QDir::currentPath();
        QVERIFY(QDir::setCurrent(dir.path()));
        const QString path = relative.isEmpty() ? QString() : dir.filePath(relative);

        Recorder recorder;
        std::vector<MifEntry> entries { MifEntry() };
        const int count = Portlex::GetPlatformClassIds(path, entries, &Recorder::callback, &recorder);
        QDir::setCurrent(previous);
        QCOMPARE(count, 0);
        QVERIFY(entries.empty());
        QCOMPARE(recorder.calls.size(), 1);
        QCOMPARE(recorder.calls[0].value, -1);
        QCOMPARE(recorder.calls[0].maximum, 0);
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

    void generatedPlatform()
    {
        constexpr int MifCount = 420;  // passes every kind of broken file
        const QVector<quint32> known = PlatformGenerator::classDatabaseIds(QCoreApplication::applicationDirPath());
        QVERIFY2(!known.isEmpty(), "ClassDB.xml is not beside the test");
        QTemporaryDir dir;
        PlatformGenerator generator;
        QVERIFY2(generator.generate(dir.filePath("p"), MifCount, known), qPrintable(generator.errorString()));
        std::vector<MifEntry> entries, again;
        QCOMPARE(Portlex::GetPlatformClassIds(dir.filePath("p"), entries, nullptr, nullptr),
                 MifCount - PlatformGenerator::brokenCount(MifCount));
        // Scanning again gives the same entries, whatever order the workers finished in.
        Portlex::GetPlatformClassIds(dir.filePath("p"), again, nullptr, nullptr);
        QVERIFY(again == entries);
    }
};

QTEST_GUILESS_MAIN(PlatformScanTest)
#include "tst_platformscan.moc"
