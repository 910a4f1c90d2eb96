#include "PackageWriter.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QProcess>
#include <QRandomGenerator>
#include <QRegularExpression>
#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <atomic>
#include <functional>
#include <memory>

using namespace TestSupport;

namespace {

const QString DeviceId = QStringLiteral("actions-dev");
constexpr quint64 LargeVolume = 1024ull * 1024 * 1024;
const QStringList SlowAnswers { QStringLiteral("--latency"), QStringLiteral("100") };

// The device's temporary files below root.
QStringList leftovers(const QString& root)
{
    return treeEntries(root).filter(QRegularExpression(QStringLiteral("(^|/)\\.zantro-")));
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

} // namespace

class ActionsTest : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_sockets;
    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<SimulatorProcess> m_simulator;
    std::unique_ptr<QTemporaryDir> m_local;
    QByteArray m_canaryDigest;

    // Serves m_image in place (so that tests see its files) with a flash volume of the
    // given size, and connects to it.
    QSharedPointer<_ZantDevice> serve(quint64 volumeSize = LargeVolume, const QStringList& arguments = QStringList())
    {
        QByteArray profile = TestImage::defaultProfile();
        m_image->writeProfile(profile.replace("size=\"1000000\"", "size=\"" + QByteArray::number(volumeSize) + '"'));
        m_simulator = std::make_unique<SimulatorProcess>(m_sockets->path());
        return m_simulator->connectDevice(m_image->path(), DeviceId, arguments, SimulatorProcess::Image::InPlace);
    }
    QString flash(const QString& relative = QString()) const { return m_image->path() + QStringLiteral("/flash/") + relative; }
    QString local(const QString& name) const { return m_local->filePath(name); }
    QString makePackage(const QString& name, const std::function<void(PackageWriter&)>& fill) const
    {
        PackageWriter writer;
        if (!writer.open(local(name)))
            return QString();
        fill(writer);
        return writer.close() ? local(name) : QString();
    }
    // Runs a transfer on a worker thread and kills the device once inFlight() holds: true
    // when that happened and the transfer then ended, with an error.
    bool cutByKill(const std::function<int()>& transfer, const std::function<bool()>& inFlight)
    {
        std::atomic<int> result { 0 };
        std::unique_ptr<QThread> worker(QThread::create([&] { result = transfer(); }));
        worker->start();
        const bool started = QTest::qWaitFor(inFlight, 20000);
        m_simulator->kill();
        return worker->wait(30000) && started && result != 0;
    }

private slots:
    void init()
    {
        QVERIFY2(QFileInfo::exists(SimulatorProcess::executable()), "zantro-sim is not built");
        m_sockets = std::make_unique<QTemporaryDir>();
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets->path()));
        m_local = std::make_unique<QTemporaryDir>();
        m_image = std::make_unique<TestImage>();
        m_image->fillDefault();
        m_image->writeFile(QStringLiteral("flash/user/docs/a.txt"), "alpha");
        m_image->writeFile(QStringLiteral("flash/user/docs/deep/b.txt"), "beta");

        // The canary lies outside the image; links inside the volume point at it.
        const QString canary = m_image->outside() + QStringLiteral("/canary");
        QVERIFY(writeFile(canary + QStringLiteral("/secret.txt"), "do not touch"));
        QVERIFY(writeFile(canary + QStringLiteral("/inner/app.mod"), "outside module"));
        QVERIFY(QFile::link(canary, flash(QStringLiteral("user/out"))));
        QVERIFY(QFile::link(canary + QStringLiteral("/secret.txt"), flash(QStringLiteral("user/outfile"))));
        QVERIFY(QFile::link(canary, flash(QStringLiteral("user/docs/deep/escape"))));
        m_canaryDigest = treeDigest(canary);
        Portlex::Initialize();
    }

    void cleanup()
    {
        if (!m_canaryDigest.isEmpty())
            QCOMPARE(treeDigest(m_image->outside() + QStringLiteral("/canary")), m_canaryDigest);
        Portlex::Destroy();
        m_simulator.reset();
        m_image.reset();
        m_local.reset();
        m_sockets.reset();
    }

    // Byte-exact both ways around the chunk size and through the pipeline; each copy
    // replaces the one before.
    void copiesBothWays()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        for (const QByteArray& bytes : { QByteArray(), QByteArray("x"), randomBytes(Protocol::TransferChunkSize, 1),
                                         randomBytes(Protocol::TransferChunkSize + 1, 2), randomBytes(20 * 1024 * 1024 + 7, 3) }) {
            QVERIFY(writeFile(local(QStringLiteral("source.bin")), bytes));
            QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("source.bin")), QStringLiteral("/user/copied.bin")), 0);
            QCOMPARE(readFile(flash(QStringLiteral("user/copied.bin"))), bytes);
            QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/copied.bin"), local(QStringLiteral("back.bin"))), 0);
            QCOMPARE(readFile(local(QStringLiteral("back.bin"))), bytes);
            QCOMPARE(leftovers(flash()), QStringList());
            // The device's listing shows the file with its size.
            QSharedPointer<_DirectoryInfo> level;
            QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr), 0);
            QVERIFY(std::any_of(level->files.cbegin(), level->files.cend(), [&](const QSharedPointer<_FileInfo>& f) {
                return f->Name() == QLatin1String("copied.bin") && f->size == quint64(bytes.size());
            }));
        }
    }

    void copyFailures()
    {
        const QSharedPointer<_ZantDevice> device = serve(2 * 1024 * 1024);
        QVERIFY(device);
        QSet<VolumeInfo> volumes;
        QCOMPARE(device->GetVolumes(volumes), 0);
        const auto flashVolume = std::find_if(volumes.cbegin(), volumes.cend(), [](const VolumeInfo& v) { return v.mountPoint == QLatin1String("/"); });
        QVERIFY(flashVolume != volumes.cend() && flashVolume->freeSpace > 0);
        const int free = int(flashVolume->freeSpace);

        QVERIFY(writeFile(local(QStringLiteral("fits.bin")), QByteArray(free, 'f')));
        QVERIFY(writeFile(local(QStringLiteral("toobig.bin")), QByteArray(free + 1, 'g')));
        const QByteArray before = treeDigest(flash());
        const auto toDevice = [&](const char* from, const char* to) {
            return device->CopyFileToDevice(local(QLatin1String(from)), QLatin1String(to));
        };
        QCOMPARE(toDevice("toobig.bin", "/user/big.bin"), int(PortlexError::NoSpace));
        QCOMPARE(toDevice("fits.bin", "/user/docs"), int(PortlexError::IsDirectory));
        QCOMPARE(toDevice("missing.bin", "/user/m.bin"), int(PortlexError::LocalFileError));
        QCOMPARE(toDevice("fits.bin", "/nowhere/m.bin"), int(PortlexError::NotFound));
        QCOMPARE(treeDigest(flash()), before);
        QCOMPARE(toDevice("fits.bin", "/user/fits.bin"), 0);

        const auto toPC = [&](const char* from, const char* to) { return device->CopyFileToPC(QLatin1String(from), local(QLatin1String(to))); };
        QCOMPARE(toPC("/user/none.txt", "none.txt"), int(PortlexError::NotFound));
        QCOMPARE(toPC("/user/docs", "docs"), int(PortlexError::IsDirectory));
        QCOMPARE(toPC("/user/notes.txt", "no/such/folder/n.txt"), int(PortlexError::LocalFileError));
        QCOMPARE(treeEntries(m_local->path()), QStringList({ "fits.bin", "toobig.bin" }));
        // Each failure left the connection fit for the next call.
        QCOMPARE(toPC("/user/notes.txt", "n.txt"), 0);
        QCOMPARE(readFile(local(QStringLiteral("n.txt"))), QByteArray("hello"));
    }

    void uploadCutByKillLeavesNothing()
    {
        // Slow answers keep the transfer going long enough to be cut in the middle.
        const QSharedPointer<_ZantDevice> device = serve(LargeVolume, SlowAnswers);
        QVERIFY(device);
        QVERIFY(writeFile(local(QStringLiteral("big.bin")), randomBytes(64 * 1024 * 1024, 4)));
        QVERIFY(cutByKill([&] { return device->CopyFileToDevice(local(QStringLiteral("big.bin")), QStringLiteral("/user/big.bin")); },
                          [&] { return !leftovers(flash(QStringLiteral("user"))).isEmpty(); }));
        QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/big.bin"))));

        // The restarted device clears what the crash left, and works again.
        QVERIFY2(m_simulator->start(m_image->path(), DeviceId, QStringList(), SimulatorProcess::Image::InPlace),
                 qPrintable(m_simulator->errorString()));
        QCOMPARE(leftovers(flash()), QStringList());
        QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/big.bin"))));
        QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/notes.txt"), local(QStringLiteral("n.txt"))), 0);
    }

    void downloadCutByKillLeavesNothing()
    {
        m_image->writeFile(QStringLiteral("flash/user/big.bin"), randomBytes(64 * 1024 * 1024, 5));
        const QSharedPointer<_ZantDevice> device = serve(LargeVolume, SlowAnswers);
        QVERIFY(device);
        const QString target = local(QStringLiteral("target"));
        QVERIFY(QDir().mkpath(target));
        // The PC side's temporary file (unnamed where the system allows) shows that bytes are flowing.
        QVERIFY(cutByKill([&] { return device->CopyFileToPC(QStringLiteral("/user/big.bin"), target + QStringLiteral("/big.bin")); },
                          [&] { return writesInto(target); }));
        QCOMPARE(treeEntries(target), QStringList());
    }

    void installShowsTheModule()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        QVERIFY(!device->cache.classes.value(QStringLiteral("0x01011002")).available);
        const QString tuner = local(QStringLiteral("tuner"));
        QString error;
        QVERIFY2(SampleBuilder::writeModule(tuner, TestImage::module(QStringLiteral("tuner"), { 0x01011002 },
                                                                     { { 0x01011002, 0x01011001, QStringLiteral("audio/x-tuner") } }), &error),
                 qPrintable(error));
        QCOMPARE(QProcess::execute(SimulatorProcess::executable(), { QStringLiteral("pack"), tuner, local(QStringLiteral("tuner.zantro")) }), 0);

        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1), 0);
        QCOMPARE(device->statusText, QStringLiteral("Package tuner.zantro installed"));
        QCOMPARE(readFile(flash(QStringLiteral("usermod/tuner/tuner.mif"))), readFile(tuner + QStringLiteral("/tuner.mif")));
        QCOMPARE(leftovers(flash()), QStringList());

        QVector<ModuleInfo> modules;
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        QVERIFY(std::any_of(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.path == QLatin1String("/usermod/tuner/tuner.mif"); }));
        QVector<RegistryInfo> registry;
        QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 0);
        QVERIFY(std::any_of(registry.cbegin(), registry.cend(), [](const RegistryInfo& r) { return r.mimeType == QLatin1String("audio/x-tuner"); }));
        QVERIFY(Portlex::ConnectDevice(device, QString(), QString()));
        QVERIFY(device->cache.classes.value(QStringLiteral("0x01011002")).available);

        // Installing again replaces the module rather than failing or doubling it.
        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1), 0);
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        QCOMPARE(std::count_if(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.name == QLatin1String("tuner"); }), 1);
        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 9), int(PortlexError::NotFound));
        QVERIFY(device->statusText.contains(QLatin1String("no volume 9")));
    }

    // Why a package is refused is PackageExtractor's matter; here: the refusal reaches the
    // caller with its reason, and the image stays as it was.
    void refusedPackagesLeaveTheImage()
    {
        const QSharedPointer<_ZantDevice> device = serve(2 * 1024 * 1024);
        QVERIFY(device);
        const QString escaping = makePackage(QStringLiteral("evil.zantro"), [](PackageWriter& w) {
            w.addFile(QStringLiteral("evil/evil.mif"), "mif");
            w.addFile(QStringLiteral("../x"), "x");
        });
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
        const QString unpacksLarge = makePackage(QStringLiteral("text.zantro"), [&](PackageWriter& w) { w.addFile(QStringLiteral("t/t.mif"), text); });
        QVERIFY(QFileInfo(unpacksLarge).size() < 3 * 512 * 1024);

        const QByteArray before = treeDigest(flash());
        QVector<ModuleInfo> modulesBefore, modulesAfter;
        QCOMPARE(device->GetModules(modulesBefore, nullptr, nullptr), 0);
        QCOMPARE(device->InstallPackage(escaping, 1), int(PortlexError::Refused));
        QVERIFY2(device->statusText.contains(QLatin1String("refused")) && device->statusText.contains(QLatin1String("would leave")),
                 qPrintable(device->statusText));
        QCOMPARE(device->InstallPackage(large, 1), int(PortlexError::NoSpace));
        QVERIFY2(device->statusText.contains(QLatin1String("bytes free")), qPrintable(device->statusText));
        QCOMPARE(device->InstallPackage(unpacksLarge, 1), int(PortlexError::Refused));
        QVERIFY2(device->statusText.contains(QLatin1String("more room")), qPrintable(device->statusText));
        QCOMPARE(treeDigest(flash()), before);
        QCOMPARE(device->GetModules(modulesAfter, nullptr, nullptr), 0);
        QCOMPARE(modulesAfter, modulesBefore);
    }

    void runStartsAProcessThatEnds()
    {
        const QSharedPointer<_ZantDevice> device = serve(LargeVolume, { QStringLiteral("--run-lifetime"), QStringLiteral("300") });
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

    void deleteFilesDirectoriesAndLinks()
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

    // How each action uses the resolver: escapes through ".." and through links out, and
    // run's refusals of what is no module. One device serves every row; nothing may change.
    void refusals()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        QVERIFY(writeFile(local(QStringLiteral("payload.mod")), "overwritten"));
        const QByteArray before = treeDigest(flash());
        QVector<ProcessInfo> processesBefore;
        QCOMPARE(device->GetProcesses(processesBefore), 0);

        const struct
        {
            const char* action;
            const char* path;
            int code;
        } rows[] = {
            { "toDevice", "/../canary/secret.txt", PortlexError::PathRefused },
            { "toDevice", "/user/out/secret.txt", PortlexError::PathRefused },
            { "toDevice", "/user/outfile", PortlexError::PathRefused },  // a link to a file outside
            { "toPC", "/user/../../canary/secret.txt", PortlexError::PathRefused },
            { "toPC", "/user/docs/deep/escape/secret.txt", PortlexError::PathRefused },
            { "toPC", "/user/outfile", PortlexError::PathRefused },
            { "run", "/../canary/inner/app.mod", PortlexError::PathRefused },
            { "run", "/user/out/inner/app.mod", PortlexError::PathRefused },
            { "delete", "/user/../../canary/secret.txt", PortlexError::PathRefused },
            { "delete", "/user/out/secret.txt", PortlexError::PathRefused },
            { "run", "/usermod/userm/none.mod", PortlexError::NotFound },
            { "run", "/usermod/userm/userm.mif", PortlexError::NotRunnable },
            { "run", "/user/notes.txt", PortlexError::NotRunnable },
            { "run", "/usermod/userm", PortlexError::NotRunnable },
        };
        for (const auto& row : rows) {
            const QString action = QLatin1String(row.action), path = QLatin1String(row.path);
            int result = 0;
            if (action == QLatin1String("toDevice"))
                result = device->CopyFileToDevice(local(QStringLiteral("payload.mod")), path);
            else if (action == QLatin1String("toPC"))
                result = device->CopyFileToPC(path, local(QStringLiteral("stolen")));
            else if (action == QLatin1String("run"))
                result = device->RunApplication(path);
            else
                result = device->DeleteDeviceFile(path);
            const QString what = action + QLatin1Char(' ') + path;
            QVERIFY2(result == row.code, qPrintable(what + QStringLiteral(": ") + QString::number(result)));
            QVERIFY2(treeDigest(flash()) == before, qPrintable(what));
            QVERIFY2(!QFileInfo::exists(local(QStringLiteral("stolen"))), qPrintable(what));
        }
        QVector<ProcessInfo> processesAfter;
        QCOMPARE(device->GetProcesses(processesAfter), 0);
        QCOMPARE(processesAfter.size(), processesBefore.size());
        // The canary is compared in cleanup.
    }
};

QTEST_GUILESS_MAIN(ActionsTest)
#include "tst_actions.moc"
