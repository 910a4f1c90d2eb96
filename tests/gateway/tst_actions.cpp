#include "PackageWriter.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"
#include "TestImage.h"

#include <QCryptographicHash>
#include <QDir>
#include <QDirIterator>
#include <QProcess>
#include <QRandomGenerator>
#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <atomic>
#include <functional>
#include <memory>

using PackageFill = std::function<void(PackageWriter&)>;
Q_DECLARE_METATYPE(PackageFill)

namespace {

const QString DeviceId = QStringLiteral("actions-dev");
constexpr quint64 LargeVolume = 1024ull * 1024 * 1024;

// Every path below root with its bytes (links as their target text), so that any change
// in a tree shows up as a different digest.
QByteArray treeDigest(const QString& root)
{
    QStringList paths;
    QDirIterator it(root, QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot, QDirIterator::Subdirectories);
    while (it.hasNext())
        paths << it.next();
    paths.sort();
    QCryptographicHash hash(QCryptographicHash::Sha256);
    for (const QString& path : std::as_const(paths)) {
        const QFileInfo info(path);
        hash.addData(QDir(root).relativeFilePath(path).toUtf8());
        if (info.isSymLink()) {
            hash.addData(info.symLinkTarget().toUtf8());
        } else if (info.isFile()) {
            QFile file(path);
            file.open(QIODevice::ReadOnly);
            hash.addData(&file);
        }
    }
    return hash.result();
}

QStringList leftovers(const QString& root)
{
    QStringList found;
    QDirIterator it(root, QDir::AllEntries | QDir::Hidden | QDir::NoDotAndDotDot, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString name = QFileInfo(it.next()).fileName();
        if (name.startsWith(QLatin1String(".zantro-")))
            found << it.filePath();
    }
    return found;
}

// True while this process holds a file open in folder, named or not.
bool writesInto(const QString& folder)
{
    const QString prefix = QFileInfo(folder).canonicalFilePath() + QLatin1Char('/');
    const QDir fds(QStringLiteral("/proc/self/fd"));
    for (const QString& fd : fds.entryList(QDir::System | QDir::Files | QDir::NoDotAndDotDot)) {
        if (QFile::symLinkTarget(fds.filePath(fd)).startsWith(prefix))
            return true;
    }
    return false;
}

QByteArray readAll(const QString& path)
{
    QFile file(path);
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray("<unreadable>");
}

void writeBytes(const QString& path, const QByteArray& bytes)
{
    QFile file(path);
    QVERIFY(file.open(QIODevice::WriteOnly));
    QCOMPARE(file.write(bytes), bytes.size());
}

QByteArray randomBytes(qsizetype size, quint32 seed)
{
    QByteArray bytes(size, Qt::Uninitialized);
    QRandomGenerator generator(seed);
    generator.fillRange(reinterpret_cast<quint32*>(bytes.data()), size / 4);
    for (qsizetype i = size / 4 * 4; i < size; ++i)
        bytes[i] = char(generator.generate());
    return bytes;
}

QByteArray everyByteValue(int repeat)
{
    QByteArray bytes;
    for (int r = 0; r < repeat; ++r) {
        for (int value = 0; value < 256; ++value)
            bytes.append(char(value));
    }
    return bytes;
}

// Runs work on a thread of its own, as the pages' workers call the gateway.
template <typename F>
int callOnWorker(F work)
{
    std::atomic<int> result { -1 };
    std::unique_ptr<QThread> thread(QThread::create([&] { result = work(); }));
    thread->start();
    if (!thread->wait(60000))
        qFatal("a gateway call hung");
    return result;
}

} // namespace

class ActionsTest : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void cleanup();
    void copiesBothWays_data();
    void copiesBothWays();
    void copyFailures();
    void uploadCutByKillLeavesNothing();
    void downloadCutByKillLeavesNothing();
    void installShowsTheModule();
    void refusedPackages_data();
    void refusedPackages();
    void packagesLargerThanTheFreeSpace();
    void runStartsAProcessThatEnds();
    void runRefusesWhatIsNotAModule_data();
    void runRefusesWhatIsNotAModule();
    void deleteFilesDirectoriesAndLinks();
    void confinement_data();
    void confinement();

private:
    // Serves m_image in place (so that tests see its files) with a flash volume of the
    // given size, and connects to it.
    QSharedPointer<_ZantDevice> serve(quint64 volumeSize = LargeVolume, const QStringList& arguments = QStringList());
    QString flash(const QString& relative = QString()) const;
    QString local(const QString& name) const { return m_local.filePath(name); }
    QString makePackage(const QString& name, const std::function<void(PackageWriter&)>& fill) const;

    std::unique_ptr<QTemporaryDir> m_sockets;
    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<SimulatorProcess> m_simulator;
    std::unique_ptr<QTemporaryDir> m_localDir;
    QDir m_local;
    QByteArray m_canaryDigest;
};

void ActionsTest::init()
{
    QVERIFY2(QFileInfo::exists(SimulatorProcess::executable()), "zantro-sim is not built");
    m_sockets = std::make_unique<QTemporaryDir>();
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets->path()));
    m_localDir = std::make_unique<QTemporaryDir>();
    m_local = QDir(m_localDir->path());
    m_image = std::make_unique<TestImage>();
    m_image->fillDefault();
    m_image->writeFile(QStringLiteral("flash/user/docs/a.txt"), "alpha");
    m_image->writeFile(QStringLiteral("flash/user/docs/deep/b.txt"), "beta");

    // The canary lies outside the image; links inside the volume point at it.
    const QDir outside(m_image->outside());
    QVERIFY(outside.mkpath(QStringLiteral("canary/inner")));
    writeBytes(outside.filePath(QStringLiteral("canary/secret.txt")), "do not touch");
    writeBytes(outside.filePath(QStringLiteral("canary/inner/app.mod")), "outside module");
    QVERIFY(QFile::link(outside.filePath(QStringLiteral("canary")), flash(QStringLiteral("user/out"))));
    QVERIFY(QFile::link(outside.filePath(QStringLiteral("canary/secret.txt")), flash(QStringLiteral("user/outfile"))));
    QVERIFY(QFile::link(outside.filePath(QStringLiteral("canary")), flash(QStringLiteral("user/docs/deep/escape"))));
    m_canaryDigest = treeDigest(outside.filePath(QStringLiteral("canary")));
    Portlex::Initialize();
}

void ActionsTest::cleanup()
{
    if (m_canaryDigest.size() > 0)
        QCOMPARE(treeDigest(QDir(m_image->outside()).filePath(QStringLiteral("canary"))), m_canaryDigest);
    Portlex::Destroy();
    m_simulator.reset();
    m_image.reset();
    m_localDir.reset();
    m_sockets.reset();
}

QString ActionsTest::flash(const QString& relative) const
{
    return QDir(m_image->path()).filePath(QStringLiteral("flash/") + relative);
}

QSharedPointer<_ZantDevice> ActionsTest::serve(quint64 volumeSize, const QStringList& arguments)
{
    QByteArray profile = TestImage::defaultProfile();
    profile.replace("size=\"1000000\"", "size=\"" + QByteArray::number(volumeSize) + '"');
    m_image->writeProfile(profile);
    m_simulator = std::make_unique<SimulatorProcess>(m_sockets->path());
    if (!m_simulator->start(m_image->path(), DeviceId, arguments, SimulatorProcess::Image::InPlace)) {
        qWarning("%s", qPrintable(m_simulator->errorString()));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(DeviceId);
    if (!device || !Portlex::ConnectDevice(device, QString(), QString()))
        return {};
    return device;
}

QString ActionsTest::makePackage(const QString& name, const std::function<void(PackageWriter&)>& fill) const
{
    const QString path = local(name);
    PackageWriter writer;
    if (!writer.open(path))
        return QString();
    fill(writer);
    return writer.close() ? path : QString();
}

void ActionsTest::copiesBothWays_data()
{
    QTest::addColumn<QByteArray>("bytes");
    QTest::newRow("empty") << QByteArray();
    QTest::newRow("one byte") << QByteArray("x");
    QTest::newRow("every byte value") << everyByteValue(300);
    QTest::newRow("exactly one chunk") << randomBytes(Protocol::TransferChunkSize, 1);
    QTest::newRow("one chunk and a byte") << randomBytes(Protocol::TransferChunkSize + 1, 2);
    QTest::newRow("20 MiB") << randomBytes(20 * 1024 * 1024 + 7, 3);
}

void ActionsTest::copiesBothWays()
{
    QFETCH(QByteArray, bytes);
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);
    writeBytes(local(QStringLiteral("source.bin")), bytes);

    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("source.bin")), QStringLiteral("/user/copied.bin")), 0);
    QCOMPARE(readAll(flash(QStringLiteral("user/copied.bin"))), bytes);
    // A second copy replaces the first.
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("source.bin")), QStringLiteral("/user/copied.bin")), 0);
    QCOMPARE(readAll(flash(QStringLiteral("user/copied.bin"))), bytes);

    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/copied.bin"), local(QStringLiteral("back.bin"))), 0);
    QCOMPARE(readAll(local(QStringLiteral("back.bin"))), bytes);
    QCOMPARE(leftovers(flash()), QStringList());

    // The device's listing shows the new file with its size.
    QSharedPointer<_DirectoryInfo> level;
    QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr), 0);
    const auto file = std::find_if(level->files.cbegin(), level->files.cend(),
                                   [](const QSharedPointer<_FileInfo>& f) { return f->Name() == QLatin1String("copied.bin"); });
    QVERIFY(file != level->files.cend());
    QCOMPARE((*file)->size, quint64(bytes.size()));
}

void ActionsTest::copyFailures()
{
    const QSharedPointer<_ZantDevice> device = serve(2 * 1024 * 1024);
    QVERIFY(device);
    QSet<VolumeInfo> volumes;
    QCOMPARE(device->GetVolumes(volumes), 0);
    quint64 free = 0;
    for (const VolumeInfo& v : std::as_const(volumes)) {
        if (v.mountPoint == QLatin1String("/"))
            free = v.freeSpace;
    }
    QVERIFY(free > 0);

    writeBytes(local(QStringLiteral("fits.bin")), QByteArray(int(free), 'f'));
    writeBytes(local(QStringLiteral("toobig.bin")), QByteArray(int(free) + 1, 'g'));
    const QByteArray before = treeDigest(flash());
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("toobig.bin")), QStringLiteral("/user/big.bin")),
             int(PortlexError::NoSpace));
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("fits.bin")), QStringLiteral("/user/docs")),
             int(PortlexError::IsDirectory));
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("missing.bin")), QStringLiteral("/user/m.bin")),
             int(PortlexError::LocalFileError));
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("fits.bin")), QStringLiteral("/nowhere/m.bin")),
             int(PortlexError::NotFound));
    QCOMPARE(treeDigest(flash()), before);
    QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("fits.bin")), QStringLiteral("/user/fits.bin")), 0);

    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/none.txt"), local(QStringLiteral("none.txt"))),
             int(PortlexError::NotFound));
    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/docs"), local(QStringLiteral("docs"))), int(PortlexError::IsDirectory));
    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/notes.txt"), local(QStringLiteral("no/such/folder/n.txt"))),
             int(PortlexError::LocalFileError));
    QVERIFY(!QFileInfo::exists(local(QStringLiteral("none.txt"))));
    QVERIFY(!QFileInfo::exists(local(QStringLiteral("docs"))));
    // Each failure left the connection fit for the next call.
    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/notes.txt"), local(QStringLiteral("n.txt"))), 0);
    QCOMPARE(readAll(local(QStringLiteral("n.txt"))), QByteArray("hello"));
}

void ActionsTest::uploadCutByKillLeavesNothing()
{
    // Slow answers keep the transfer going long enough to be cut in the middle.
    const QSharedPointer<_ZantDevice> device = serve(LargeVolume, {QStringLiteral("--latency"), QStringLiteral("100")});
    QVERIFY(device);
    writeBytes(local(QStringLiteral("big.bin")), randomBytes(64 * 1024 * 1024, 4));

    std::atomic<int> result { -1 };
    std::unique_ptr<QThread> worker(QThread::create([&] {
        result = device->CopyFileToDevice(local(QStringLiteral("big.bin")), QStringLiteral("/user/big.bin"));
    }));
    worker->start();
    QTRY_VERIFY_WITH_TIMEOUT(!leftovers(flash(QStringLiteral("user"))).isEmpty(), 20000);
    m_simulator->kill();
    QVERIFY(worker->wait(30000));
    QVERIFY(result != 0);
    QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/big.bin"))));

    // The restarted device clears what the crash left, and works again.
    QVERIFY2(m_simulator->start(m_image->path(), DeviceId, QStringList(), SimulatorProcess::Image::InPlace),
             qPrintable(m_simulator->errorString()));
    QCOMPARE(leftovers(flash()), QStringList());
    QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/big.bin"))));
    QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/notes.txt"), local(QStringLiteral("n.txt"))), 0);
}

void ActionsTest::downloadCutByKillLeavesNothing()
{
    m_image->writeFile(QStringLiteral("flash/user/big.bin"), randomBytes(64 * 1024 * 1024, 5));
    const QSharedPointer<_ZantDevice> device = serve(LargeVolume, {QStringLiteral("--latency"), QStringLiteral("100")});
    QVERIFY(device);
    QVERIFY(m_local.mkdir(QStringLiteral("target")));

    std::atomic<int> result { -1 };
    std::unique_ptr<QThread> worker(QThread::create([&] {
        result = device->CopyFileToPC(QStringLiteral("/user/big.bin"), local(QStringLiteral("target/big.bin")));
    }));
    worker->start();
    // The PC side's temporary file (unnamed where the system allows) shows that bytes are flowing.
    QTRY_VERIFY_WITH_TIMEOUT(writesInto(local(QStringLiteral("target"))), 20000);
    m_simulator->kill();
    QVERIFY(worker->wait(30000));
    QVERIFY(result != 0);
    QVERIFY(QDir(local(QStringLiteral("target"))).isEmpty(QDir::AllEntries | QDir::Hidden | QDir::NoDotAndDotDot));
}

void ActionsTest::installShowsTheModule()
{
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);
    QVERIFY(!device->cache.classes.value(QStringLiteral("0x01011002")).available);

    QString error;
    QVERIFY2(SampleBuilder::writeModule(local(QStringLiteral("tuner")),
                                        TestImage::module(QStringLiteral("tuner"), {0x01011002},
                                                          {{0x01011002, 0x01011001, QStringLiteral("audio/x-tuner")}}),
                                        &error),
             qPrintable(error));
    QProcess pack;
    pack.start(SimulatorProcess::executable(),
               {QStringLiteral("pack"), local(QStringLiteral("tuner")), local(QStringLiteral("tuner.zantro"))});
    QVERIFY(pack.waitForFinished());
    QCOMPARE(pack.exitCode(), 0);

    QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1), 0);
    QCOMPARE(device->statusText, QStringLiteral("Package tuner.zantro installed"));
    QCOMPARE(readAll(flash(QStringLiteral("usermod/tuner/tuner.mif"))), readAll(local(QStringLiteral("tuner/tuner.mif"))));
    QCOMPARE(leftovers(flash()), QStringList());

    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QVERIFY(std::any_of(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) {
        return m.name == QLatin1String("tuner") && m.path == QLatin1String("/usermod/tuner/tuner.mif");
    }));
    QVector<RegistryInfo> registry;
    QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 0);
    QVERIFY(std::any_of(registry.cbegin(), registry.cend(),
                        [](const RegistryInfo& r) { return r.mimeType == QLatin1String("audio/x-tuner"); }));
    QVERIFY(Portlex::ConnectDevice(device, QString(), QString()));
    QVERIFY(device->cache.classes.value(QStringLiteral("0x01011002")).available);

    // Installing again replaces the module rather than failing or doubling it.
    QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1), 0);
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QCOMPARE(std::count_if(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.name == QLatin1String("tuner"); }),
             1);
    QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 9), int(PortlexError::NotFound));
    QVERIFY(device->statusText.contains(QLatin1String("no volume 9")));
}

void ActionsTest::refusedPackages_data()
{
    using Fill = PackageFill;
    QTest::addColumn<Fill>("fill");
    QTest::addColumn<QByteArray>("rawBytes");  // instead of fill, when set
    QTest::addColumn<QString>("reason");

    const auto good = [](PackageWriter& w) { w.addFile(QStringLiteral("evil/evil.mif"), "mif"); };
    QTest::newRow("parent entry") << Fill([=](PackageWriter& w) { good(w); w.addFile(QStringLiteral("../x"), "x"); })
                                  << QByteArray() << QStringLiteral("would leave");
    QTest::newRow("inner parent") << Fill([=](PackageWriter& w) { good(w); w.addFile(QStringLiteral("evil/../../x"), "x"); })
                                  << QByteArray() << QStringLiteral("would leave");
    QTest::newRow("absolute") << Fill([=](PackageWriter& w) { good(w); w.addFile(QStringLiteral("/tmp/x"), "x"); })
                              << QByteArray() << QStringLiteral("would leave");
    QTest::newRow("symlink") << Fill([=](PackageWriter& w) { good(w); w.addSymlink(QStringLiteral("evil/link"), QStringLiteral("/etc")); })
                             << QByteArray() << QStringLiteral("not a plain file");
    QTest::newRow("ratio bomb") << Fill([](PackageWriter& w) { w.addFile(QStringLiteral("bomb/bomb.mif"), QByteArray(64 * 1024 * 1024, 0)); })
                                << QByteArray() << QStringLiteral("compressed beyond belief");
    QTest::newRow("duplicate") << Fill([](PackageWriter& w) { w.addFile(QStringLiteral("d/a"), "1"); w.addFile(QStringLiteral("d/a"), "2"); })
                               << QByteArray() << QStringLiteral("twice");
    QTest::newRow("empty") << Fill([](PackageWriter&) {}) << QByteArray() << QStringLiteral("empty");
    QTest::newRow("not a zip") << Fill() << randomBytes(4096, 6) << QStringLiteral("not a readable ZIP");
    QTest::newRow("truncated") << Fill() << QByteArray("truncated") << QStringLiteral("refused");
}

void ActionsTest::refusedPackages()
{
    QFETCH(PackageFill, fill);
    QFETCH(QByteArray, rawBytes);
    QFETCH(QString, reason);
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);

    QString package;
    if (QByteArray(QTest::currentDataTag()) == "truncated") {
        package = makePackage(QStringLiteral("full.zantro"), [](PackageWriter& w) {
            w.addFile(QStringLiteral("t/t.mif"), randomBytes(300000, 7));
            w.addFile(QStringLiteral("t/t.mod"), randomBytes(300000, 8));
        });
        QFile file(package);
        QVERIFY(file.resize(file.size() / 2));
    } else if (!rawBytes.isEmpty()) {
        package = local(QStringLiteral("raw.zantro"));
        writeBytes(package, rawBytes);
    } else {
        package = makePackage(QStringLiteral("evil.zantro"), fill);
    }
    QVERIFY(!package.isEmpty());

    const QByteArray before = treeDigest(flash());
    QVector<ModuleInfo> modulesBefore;
    QCOMPARE(device->GetModules(modulesBefore, nullptr, nullptr), 0);
    QCOMPARE(device->InstallPackage(package, 1), int(PortlexError::Refused));
    QVERIFY2(device->statusText.contains(reason), qPrintable(device->statusText));
    QVERIFY(device->statusText.contains(QLatin1String("refused")));
    QCOMPARE(treeDigest(flash()), before);
    QVector<ModuleInfo> modulesAfter;
    QCOMPARE(device->GetModules(modulesAfter, nullptr, nullptr), 0);
    QCOMPARE(modulesAfter, modulesBefore);
}

void ActionsTest::packagesLargerThanTheFreeSpace()
{
    const QSharedPointer<_ZantDevice> device = serve(2 * 1024 * 1024);
    QVERIFY(device);
    // Random bytes do not compress: the package itself is larger than the room left.
    const QString large = makePackage(QStringLiteral("large.zantro"),
                                      [](PackageWriter& w) { w.addFile(QStringLiteral("l/l.mif"), randomBytes(3 * 1024 * 1024, 9)); });
    // Text compresses a few times over: a small package that unpacks beyond the room left.
    QByteArray text;
    QRandomGenerator words(10);
    const QList<QByteArray> vocabulary { "tuner", "band", "signal", "preset", "scan", "volume", "mute", "stereo",
                                         "mono", "station", "frequency", "antenna", "noise", "gain", "seek", "store" };
    while (text.size() < 4 * 1024 * 1024)
        text += vocabulary.at(int(words.bounded(vocabulary.size()))) + ' ';
    const QString unpacksLarge = makePackage(QStringLiteral("text.zantro"),
                                             [&](PackageWriter& w) { w.addFile(QStringLiteral("t/t.mif"), text); });
    QVERIFY(QFileInfo(unpacksLarge).size() < 3 * 512 * 1024);

    const QByteArray before = treeDigest(flash());
    QCOMPARE(device->InstallPackage(large, 1), int(PortlexError::NoSpace));
    QVERIFY2(device->statusText.contains(QLatin1String("bytes free")), qPrintable(device->statusText));
    QCOMPARE(device->InstallPackage(unpacksLarge, 1), int(PortlexError::Refused));
    QVERIFY2(device->statusText.contains(QLatin1String("more room")), qPrintable(device->statusText));
    QCOMPARE(treeDigest(flash()), before);
}

void ActionsTest::runStartsAProcessThatEnds()
{
    const QSharedPointer<_ZantDevice> device = serve(LargeVolume, {QStringLiteral("--run-lifetime"), QStringLiteral("300")});
    QVERIFY(device);
    const auto running = [&device] {
        QVector<ProcessInfo> processes;
        device->GetProcesses(processes);
        return std::any_of(processes.cbegin(), processes.cend(),
                           [](const ProcessInfo& p) { return p.name == QLatin1String("userm") && p.threads.size() == 3; });
    };
    QVERIFY(!running());
    QCOMPARE(device->RunApplication(QStringLiteral("/usermod/userm/userm.mod")), 0);
    QVERIFY(running());
    QVector<LoadedModuleInfo> loaded;
    QCOMPARE(device->GetLoadedModules(loaded), 0);
    QVERIFY(std::any_of(loaded.cbegin(), loaded.cend(), [](const LoadedModuleInfo& p) {
        return p.name == QLatin1String("userm")
            && std::any_of(p.modules.cbegin(), p.modules.cend(),
                           [](const LoadedModuleEntry& m) { return m.location == QLatin1String("/usermod/userm/userm.mod"); });
    }));
    QTRY_VERIFY_WITH_TIMEOUT(!running(), 15000);
}

void ActionsTest::runRefusesWhatIsNotAModule_data()
{
    QTest::addColumn<QString>("path");
    QTest::addColumn<int>("code");
    QTest::newRow("missing") << "/usermod/userm/none.mod" << int(PortlexError::NotFound);
    QTest::newRow("a MIF") << "/usermod/userm/userm.mif" << int(PortlexError::NotRunnable);
    QTest::newRow("a text") << "/user/notes.txt" << int(PortlexError::NotRunnable);
    QTest::newRow("a directory") << "/usermod/userm" << int(PortlexError::NotRunnable);
    QTest::newRow("outside") << "/user/out/inner/app.mod" << int(PortlexError::PathRefused);
}

void ActionsTest::runRefusesWhatIsNotAModule()
{
    QFETCH(QString, path);
    QFETCH(int, code);
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);
    QVector<ProcessInfo> before;
    QCOMPARE(device->GetProcesses(before), 0);
    QCOMPARE(device->RunApplication(path), code);
    QVector<ProcessInfo> after;
    QCOMPARE(device->GetProcesses(after), 0);
    QCOMPARE(after.size(), before.size());
}

void ActionsTest::deleteFilesDirectoriesAndLinks()
{
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);
    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/notes.txt")), 0);
    QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/notes.txt"))));
    // The directory goes with its contents; the link inside it is removed, not followed.
    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/docs")), 0);
    QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/docs"))));
    // A link that points out of the volume: the link goes, its target stays.
    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/outfile")), 0);
    QVERIFY(!QFileInfo(flash(QStringLiteral("user/outfile"))).isSymLink());

    QVector<ModuleInfo> modules;
    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/usermod/userm")), 0);
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QVERIFY(std::none_of(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.name == QLatin1String("userm"); }));

    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/notes.txt")), int(PortlexError::NotFound));
    QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/")), int(PortlexError::PathRefused));
    QVERIFY(QFileInfo(flash(QStringLiteral("user"))).isDir());
}

void ActionsTest::confinement_data()
{
    QTest::addColumn<QString>("action");
    QTest::addColumn<QString>("path");
    const QStringList actions { QStringLiteral("toDevice"), QStringLiteral("toPC"), QStringLiteral("run"), QStringLiteral("delete") };
    const QList<QPair<const char*, QString>> paths {
        {"parent", QStringLiteral("/../canary/secret.txt")},
        {"inner parent", QStringLiteral("/user/../../canary/secret.txt")},
        {"through a linked folder", QStringLiteral("/user/out/secret.txt")},
        {"deep linked folder", QStringLiteral("/user/docs/deep/escape/inner/app.mod")},
        {"NUL", QStringLiteral("/user/notes.txt") + QChar(0) + QStringLiteral("x")},
        {"over-long", QStringLiteral("/user/") + QString(5000, QLatin1Char('a'))},
        {"relative", QStringLiteral("user/notes.txt")},
        {"empty", QString()},
        {"backslash", QStringLiteral("/user\\..\\..\\canary")},
    };
    for (const QString& action : actions) {
        for (const auto& path : paths)
            QTest::addRow("%s %s", qPrintable(action), path.first) << action << path.second;
    }
    // A link to a file outside: reading or writing through it is refused (deleting it
    // removes only the link, see deleteFilesDirectoriesAndLinks).
    QTest::newRow("toDevice through a file link") << "toDevice" << "/user/outfile";
    QTest::newRow("toPC through a file link") << "toPC" << "/user/outfile";
}

void ActionsTest::confinement()
{
    QFETCH(QString, action);
    QFETCH(QString, path);
    const QSharedPointer<_ZantDevice> device = serve();
    QVERIFY(device);
    writeBytes(local(QStringLiteral("payload.mod")), "overwritten");
    const QByteArray before = treeDigest(flash());

    int result = 0;
    if (action == QLatin1String("toDevice"))
        result = device->CopyFileToDevice(local(QStringLiteral("payload.mod")), path);
    else if (action == QLatin1String("toPC"))
        result = device->CopyFileToPC(path, local(QStringLiteral("stolen")));
    else if (action == QLatin1String("run"))
        result = device->RunApplication(path);
    else
        result = device->DeleteDeviceFile(path);
    QVERIFY2(result == PortlexError::PathRefused || result == PortlexError::NotFound,
             qPrintable(QString::number(result)));
    QCOMPARE(treeDigest(flash()), before);
    QVERIFY(!QFileInfo::exists(local(QStringLiteral("stolen"))));
    // The canary is compared in cleanup.
}

QTEST_GUILESS_MAIN(ActionsTest)
#include "tst_actions.moc"
