#include "DeviceConnection.h"
#include "PackageWriter.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QRegularExpression>
#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <atomic>
#include <functional>
#include <memory>

using namespace TestSupport;

namespace {

const QString Name = QStringLiteral("Zantro Simulator - Test");
const QString DeviceId = QStringLiteral("test-dev");
constexpr int HangLimitMs = 4 * Protocol::CallTimeoutMs;
constexpr quint64 LargeVolume = 1024ull * 1024 * 1024;
const QStringList SlowAnswers { QStringLiteral("--latency"), QStringLiteral("100") };

template <typename List, typename Field, typename Value>
bool anyHas(const List& list, Field field, const Value& value)
{
    return std::any_of(list.cbegin(), list.cend(), [&](const auto& item) { return item.*field == value; });
}

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
    const QStringList open = fds.entryList(QDir::System | QDir::Files | QDir::NoDotAndDotDot);
    return std::any_of(open.cbegin(), open.cend(),
                       [&](const QString& fd) { return QFile::symLinkTarget(fds.filePath(fd)).startsWith(prefix); });
}

} // namespace

// The client against real zantro-sim processes serving a TestImage: discovery, queries,
// threads, devices that die or stop, and the actions that change a device's files. A canary
// beside the image, which links inside the volume lead to, is never touched.
class PortlexTest : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_sockets;
    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<SimulatorProcess> m_simulator;
    std::unique_ptr<QTemporaryDir> m_local;
    QByteArray m_canaryDigest;

    // Serves m_image in place (so that tests see its files) with a flash volume of the
    // given size, and connects to it.
    QSharedPointer<_ZantDevice> serve(quint64 volumeSize = LargeVolume, const QStringList& arguments = {})
    {
        QByteArray profile = TestImage::defaultProfile();
        m_image->writeProfile(profile.replace("size=\"1000000\"", "size=\"" + QByteArray::number(volumeSize) + '"'));
        m_simulator = std::make_unique<SimulatorProcess>(m_sockets->path());
        return m_simulator->connectDevice(m_image->path(), DeviceId, arguments, SimulatorProcess::Image::InPlace);
    }
    QString flash(const QString& relative = QString()) const { return m_image->path() + QStringLiteral("/flash/") + relative; }
    QString local(const QString& name) const { return m_local->filePath(name); }
    QString canary() const { return m_image->outside() + QStringLiteral("/canary"); }
    QString makePackage(const QString& name, const QString& entry, const QByteArray& bytes) const
    {
        PackageWriter writer;
        return writer.open(local(name)) && writer.addFile(entry, bytes) && writer.close() ? local(name) : QString();
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
        QVERIFY(writeFile(canary() + QStringLiteral("/secret.txt"), "do not touch"));
        QVERIFY(writeFile(canary() + QStringLiteral("/inner/app.mod"), "outside module"));
        QVERIFY(QFile::link(canary(), flash(QStringLiteral("user/out"))));
        QVERIFY(QFile::link(canary() + QStringLiteral("/secret.txt"), flash(QStringLiteral("user/outfile"))));
        QVERIFY(QFile::link(canary(), flash(QStringLiteral("user/docs/deep/escape"))));
        m_canaryDigest = treeDigest(canary());
        Portlex::Initialize();
    }

    void cleanup()
    {
        QCOMPARE(treeDigest(canary()), m_canaryDigest);
        Portlex::Destroy();
        DeviceConnection::setCallTimeoutMs(Protocol::CallTimeoutMs);
        m_simulator.reset(); // before its image goes, at the next init
    }

    // Discovery, and a device that refuses to be connected.
    void discoveryAndRefusedConnect()
    {
        QList<QPair<QString, QString>> devices { qMakePair(QStringLiteral("left"), QStringLiteral("over")) };
        QCOMPARE(Portlex::GetDevices(devices), 0u);
        QVERIFY(devices.isEmpty());
        // Neither a socket nobody listens on nor a plain file is a device.
        QVERIFY(makeStaleSocket(m_sockets->filePath(QStringLiteral("crashed.sock"))));
        QVERIFY(writeFile(m_sockets->filePath(QStringLiteral("notes.txt")), "note"));
        QCOMPARE(Portlex::GetDevices(devices), 0u);
        int code = 0;
        QString reason;
        QVERIFY(!Portlex::ConnectDevice(QSharedPointer<_ZantDevice>(), QString(), QString(), &code, &reason));
        QCOMPARE(code, int(PortlexError::InvalidArgument));

        SimulatorProcess first(m_sockets->path()), refusing(m_sockets->path());
        QVERIFY2(first.start(m_image->path(), QStringLiteral("dev-a")), qPrintable(first.errorString()));
        QVERIFY2(refusing.start(m_image->path(), QStringLiteral("dev-b"), { "--refuse-connect", "77:Handset locked by operator" }),
                 qPrintable(refusing.errorString()));
        QCOMPARE(Portlex::GetDevices(devices), 2u);
        QVERIFY(devices.contains(qMakePair(Name, QStringLiteral("dev-a"))) && devices.contains(qMakePair(Name, QStringLiteral("dev-b"))));
        QVERIFY(!Portlex::GetDevice(QStringLiteral("dev-a"))->Connected());
        QVERIFY(Portlex::GetDevice(QStringLiteral("nobody")).isNull());
        const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(QStringLiteral("dev-b"));
        QVERIFY(device && device->name == Name);
        QVERIFY(!Portlex::ConnectDevice(device, QString(), QString(), &code, &reason));
        QCOMPARE(code, 77);
        QCOMPARE(reason, QStringLiteral("Handset locked by operator"));
        QVERIFY(!device->Connected() && !device->cache()->filled);
        QVector<ModuleInfo> modules;
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), int(PortlexError::NotConnected));
    }

    // Each query's operation and record reach the right output; a --fail code surfaces
    // unchanged and leaves the output as it was.
    void everyQuery()
    {
        const QSharedPointer<_ZantDevice> device
            = serve(LargeVolume, { QStringLiteral("--fail"), QStringLiteral("GetChildSettings:/appinfo=0xDEADBEEF") });
        QVERIFY(device && device->Connected() && device->cache()->filled);
        QCOMPARE(device->cache()->deviceData.phoneName, QStringLiteral("Test Phone"));
        QVERIFY(device->cache()->classes.contains(QStringLiteral("0x01011001")));

        QVector<ModuleInfo> modules;
        QVERIFY(device->GetModules(modules, nullptr, nullptr) == 0
                && anyHas(modules, &ModuleInfo::path, QStringLiteral("/usermod/userm/userm.mif")));
        MifEntry mif, untouched;
        QCOMPARE(device->GetModuleMif(QStringLiteral("/usermod/userm/userm.mif"), mif), 0);
        QCOMPARE(mif.classes, QVector<quint32>({ 0x01013001, 0x7F000001 }));
        untouched.fileName = QStringLiteral("kept");
        QCOMPARE(device->GetModuleMif(QStringLiteral("/usermod/none/none.mif"), untouched), int(PortlexError::NotFound));
        QCOMPARE(untouched.fileName, QStringLiteral("kept"));

        QVector<ProcessInfo> processes;
        QVERIFY(device->GetProcesses(processes) == 0 && anyHas(processes, &ProcessInfo::name, QStringLiteral("Kernel")));
        QVector<LoadedModuleInfo> loaded;
        QVERIFY(device->GetLoadedModules(loaded) == 0 && !loaded.isEmpty()
                && anyHas(loaded.first().modules, &LoadedModuleEntry::location, QStringLiteral("/sys/k.bin")));
        QSet<VolumeInfo> volumes;
        QVERIFY(device->GetVolumes(volumes) == 0 && anyHas(volumes, &VolumeInfo::friendlyName, QStringLiteral("Card")));
        QVector<RegistryInfo> registry;
        QVERIFY(device->GetRegistry(registry, nullptr, nullptr) == 0 && anyHas(registry, &RegistryInfo::mimeType, QStringLiteral("image/png")));
        QVector<PriviledgeRecord> privileges;
        QVERIFY(device->GetTepSigPrivs(privileges) == 0 && anyHas(privileges, &PriviledgeRecord::id, QStringLiteral("0x12345678")));

        auto node = QSharedPointer<_SettingsInfo>::create();
        node->SetPath(QStringLiteral("/appinfo"));
        QCOMPARE(device->GetChildSettings(node), int(0xDEADBEEF));
        QVERIFY(node->children.isEmpty());
        node->SetPath(QStringLiteral("/appinfo/calc"));
        QCOMPARE(device->GetChildSettings(node), 0);
        QCOMPARE(node->values, (QVector<QPair<QString, QString>> { { QStringLiteral("version"), QStringLiteral("1.0") } }));

        QSharedPointer<_DirectoryInfo> level;
        QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr), 0);
        QVERIFY(level && std::any_of(level->files.cbegin(), level->files.cend(), [](const QSharedPointer<_FileInfo>& file) {
            return file->Name() == QLatin1String("notes.txt") && file->size == 5;
        }));

        QString mode, owner, expiry;
        QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementEnabled);
        QCOMPARE(owner, QStringLiteral("Tester"));
        QVERIFY(device->GlobalTestSigStatus(mode, owner, expiry) != EnablementEnabled);

        // A lock request rides on the next call, whichever thread makes it, and is then cleared.
        device->serviceLockRequest = true;
        QCOMPARE(callOnWorker([&] { return device->GetVolumes(volumes); }, HangLimitMs), 0);
        QVERIFY(!device->serviceLockRequest);
        QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementDisabled);
    }

    // A device that dies, comes back, then stops.
    void simulatorKilledRestartedAndStopped()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        m_simulator->kill();

        // Lock requests made while the device is away wait for the call that reaches it.
        device->serviceLockRequest = true;
        device->signatureLockRequest = true;
        QVector<ModuleInfo> modules;
        const auto getModules = [&] { return device->GetModules(modules, nullptr, nullptr); };
        QCOMPARE(getModules(), int(PortlexError::Unreachable));
        QCOMPARE(callOnWorker(getModules, HangLimitMs), int(PortlexError::Unreachable));
        QVERIFY(device->serviceLockRequest && device->signatureLockRequest);

        QByteArray profile = TestImage::defaultProfile();
        m_image->writeProfile(profile.replace("mode=\"service\"", "mode=\"signature\""));
        QVERIFY2(m_simulator->start(m_image->path(), DeviceId, {}, SimulatorProcess::Image::InPlace), qPrintable(m_simulator->errorString()));
        QCOMPARE(getModules(), 0);
        QVERIFY(!modules.isEmpty() && !device->serviceLockRequest && !device->signatureLockRequest);
        QCOMPARE(callOnWorker(getModules, HangLimitMs), 0);
        QString mode, owner, expiry;
        QCOMPARE(device->GlobalTestSigStatus(mode, owner, expiry), EnablementDisabled);

        // A stopped device: a fresh connection (another thread) gets no further than the
        // handshake, the call leaves its output as it was, and discovery skips the device.
        DeviceConnection::setCallTimeoutMs(1000);
        m_simulator->pause();
        QVector<ModuleInfo> kept { ModuleInfo() };
        QCOMPARE(callOnWorker([&] { return device->GetModules(kept, nullptr, nullptr); }, HangLimitMs), int(PortlexError::Timeout));
        QCOMPARE(kept.size(), 1);
        QList<QPair<QString, QString>> devices;
        QCOMPARE(Portlex::GetDevices(devices), 0u);
        m_simulator->resume();
        QCOMPARE(device->GetModules(kept, nullptr, nullptr), 0);
        QCOMPARE(Portlex::GetDevices(devices), 1u);
    }

    // Byte-exact both ways around the data frame size and for a large file; each copy
    // replaces the one before. Then a package install.
    void copiesAndInstall()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        for (const QByteArray& bytes : { QByteArray(), QByteArray("x"), randomBytes(Protocol::TransferChunkSize - 1, 1),
                                         randomBytes(Protocol::TransferChunkSize + 1, 2), randomBytes(300 * 1024 * 1024, 3) }) {
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

        // Install updates modules, registry and classes; installing again replaces the module.
        const QSharedPointer<const DeviceCache> before = device->cache();
        QVERIFY(!before->classes.value(QStringLiteral("0x01011002")).available);
        const QString tuner = local(QStringLiteral("tuner"));
        QString error;
        QVERIFY(SampleBuilder::writeModule(tuner, TestImage::module(QStringLiteral("tuner"), { 0x01011002 },
                                                                    { { 0x01011002, 0x01011001, QStringLiteral("audio/x-tuner") } }), &error)
                && PackageWriter::pack(tuner, local(QStringLiteral("tuner.zantro")), &error));

        QString reason;
        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1, &reason), 0);
        QCOMPARE(reason, QStringLiteral("Package tuner.zantro installed"));
        QCOMPARE(readFile(flash(QStringLiteral("usermod/tuner/tuner.mif"))), readFile(tuner + QStringLiteral("/tuner.mif")));
        QCOMPARE(leftovers(flash()), QStringList());
        QVector<ModuleInfo> modules;
        QVERIFY(device->GetModules(modules, nullptr, nullptr) == 0
                && anyHas(modules, &ModuleInfo::path, QStringLiteral("/usermod/tuner/tuner.mif")));
        QVector<RegistryInfo> registry;
        QVERIFY(device->GetRegistry(registry, nullptr, nullptr) == 0
                && anyHas(registry, &RegistryInfo::mimeType, QStringLiteral("audio/x-tuner")));
        // A new connect publishes a new record; the one held before stays as it was.
        QVERIFY(Portlex::ConnectDevice(device, QString(), QString()));
        QVERIFY(device->cache()->classes.value(QStringLiteral("0x01011002")).available);
        QVERIFY(!before->classes.value(QStringLiteral("0x01011002")).available);

        // Installing again replaces the module rather than failing or doubling it.
        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 1), 0);
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        QCOMPARE(std::count_if(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.name == QLatin1String("tuner"); }), 1);
        QCOMPARE(device->InstallPackage(local(QStringLiteral("tuner.zantro")), 9, &reason), int(PortlexError::NotFound));
        QVERIFY2(reason.contains(QLatin1String("no volume 9")), qPrintable(reason));
    }

    // Two threads copy at once on one device without mixing.
    void concurrentCopies()
    {
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        const QByteArray bytes = randomBytes(8 * Protocol::TransferChunkSize + 3, 11);
        QVERIFY(writeFile(local(QStringLiteral("source.bin")), bytes));
        QCOMPARE(device->CopyFileToDevice(local(QStringLiteral("source.bin")), QStringLiteral("/user/c.bin")), 0);
        const QString target = local(QStringLiteral("c.bin"));
        std::atomic<int> upResult { -1 };
        std::unique_ptr<QThread> uploader(QThread::create([&] {
            upResult = device->CopyFileToDevice(local(QStringLiteral("source.bin")), QStringLiteral("/user/d.bin"));
        }));
        uploader->start();
        QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/c.bin"), target), 0);
        QVERIFY(uploader->wait(HangLimitMs));
        QCOMPARE(upResult.load(), 0);
        QCOMPARE(readFile(target), bytes);
        QCOMPARE(readFile(flash(QStringLiteral("user/d.bin"))), bytes);
    }

    // The callback hears the size, then every chunk; asking to stop after the first chunk
    // ends the copy with Cancelled and leaves neither side changed.
    void progressAndCancel_data()
    {
        QTest::addColumn<bool>("toDevice");
        QTest::newRow("to the device") << true;
        QTest::newRow("to the PC") << false;
    }

    void progressAndCancel()
    {
        QFETCH(bool, toDevice);
        const QByteArray bytes = randomBytes(3 * Protocol::TransferChunkSize + 5, 6);
        m_image->writeFile(QStringLiteral("flash/user/big.bin"), bytes);
        QVERIFY(writeFile(local(QStringLiteral("big.bin")), bytes));
        const QSharedPointer<_ZantDevice> device = serve();
        QVERIFY(device);
        struct Progress
        {
            QVector<QPair<int, int>> calls;
            bool stop = false;
        } progress;
        const PortlexProgressCallback callback = [](void* context, int value, int maximum, const QString&) {
            auto* seen = static_cast<Progress*>(context);
            seen->calls.append({ value, maximum });
            return seen->stop && value >= 0;
        };
        const auto copy = [&](const QString& name) {
            return toDevice ? device->CopyFileToDevice(local(QStringLiteral("big.bin")), QStringLiteral("/user/") + name, callback, &progress)
                            : device->CopyFileToPC(QStringLiteral("/user/big.bin"), local(name), callback, &progress);
        };
        const int totalKiB = 3 * 1024 + 1;
        QCOMPARE(copy(QStringLiteral("whole.bin")), 0);
        QCOMPARE(progress.calls, (QVector<QPair<int, int>> { { -1, totalKiB }, { 1024, totalKiB }, { 2048, totalKiB },
                                                             { 3072, totalKiB }, { totalKiB, totalKiB } }));
        const QByteArray deviceBefore = treeDigest(flash());
        const QStringList localBefore = treeEntries(m_local->path());
        progress = { {}, true };
        QCOMPARE(copy(QStringLiteral("cut.bin")), int(PortlexError::Cancelled));
        QCOMPARE(progress.calls, (QVector<QPair<int, int>> { { -1, totalKiB }, { 1024, totalKiB } }));
        QCOMPARE(treeDigest(flash()), deviceBefore);
        QCOMPARE(treeEntries(m_local->path()), localBefore);
    }

    void failuresChangeNothing()
    {
        const QSharedPointer<_ZantDevice> device = serve(2 * 1024 * 1024);
        QVERIFY(device);
        QSet<VolumeInfo> volumes;
        QCOMPARE(device->GetVolumes(volumes), 0);
        int free = 0;
        for (const VolumeInfo& volume : std::as_const(volumes))
            free = volume.volumeId == 1 ? int(volume.freeSpace) : free;
        QVERIFY(free > 0);

        QVERIFY(writeFile(local(QStringLiteral("fits.bin")), QByteArray(free, 'f')));
        QVERIFY(writeFile(local(QStringLiteral("toobig.bin")), QByteArray(free + 1, 'g')));
        const QByteArray before = treeDigest(flash());
        const auto toDevice = [&](const char* from, const char* to) {
            return device->CopyFileToDevice(local(QLatin1String(from)), QLatin1String(to));
        };
        QCOMPARE(toDevice("toobig.bin", "/user/big.bin"), int(PortlexError::NoSpace));
        QCOMPARE(toDevice("fits.bin", "/user/docs"), int(PortlexError::IsDirectory));
        QCOMPARE(toDevice("missing.bin", "/user/m.bin"), int(PortlexError::LocalFileError));
        QCOMPARE(toDevice("fits.bin", "/user/notes.txt/m.bin"), int(PortlexError::NotFound));
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

        // Why a package is refused is PackageExtractor's matter; here: the device's room decides
        // at the start and while unpacking, the refusal reaches the caller with its reason, and
        // the image stays as it was. Random bytes do not compress: this package itself is larger
        // than the room left.
        const QString large = makePackage(QStringLiteral("large.zantro"), QStringLiteral("l/l.mif"), randomBytes(3 << 20, 9));
        // A 1 MiB package that unpacks to 4 MiB, beyond the room left.
        const QString unpacksLarge = makePackage(QStringLiteral("4x.zantro"), QStringLiteral("t/t.mif"),
                                                 randomBytes(1 << 20, 10) + QByteArray(3 << 20, 'z'));
        QVERIFY(QFileInfo(unpacksLarge).size() < free);
        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/fits.bin")), 0);
        const QByteArray unpacked = treeDigest(flash());
        QVector<ModuleInfo> modulesBefore, modulesAfter;
        QCOMPARE(device->GetModules(modulesBefore, nullptr, nullptr), 0);
        QString reason;
        QCOMPARE(device->InstallPackage(large, 1, &reason), int(PortlexError::NoSpace));
        QVERIFY2(reason.contains(QLatin1String("bytes free")), qPrintable(reason));
        QCOMPARE(device->InstallPackage(unpacksLarge, 1, &reason), int(PortlexError::Refused));
        QVERIFY2(reason.contains(QLatin1String("more room")), qPrintable(reason));
        QCOMPARE(treeDigest(flash()), unpacked);
        QCOMPARE(device->GetModules(modulesAfter, nullptr, nullptr), 0);
        QCOMPARE(modulesAfter, modulesBefore);
    }

    // A device crash in the middle of a transfer leaves no partial file on either side; the
    // restarted device clears what the crash left, and works again.
    void transfersCutByKillLeaveNothing()
    {
        m_image->writeFile(QStringLiteral("flash/user/big.bin"), randomBytes(64 * 1024 * 1024, 5));
        // Slow answers keep the transfers going long enough to be cut in the middle.
        const QSharedPointer<_ZantDevice> device = serve(LargeVolume, SlowAnswers);
        QVERIFY(device);
        const QString target = local(QStringLiteral("target"));
        QVERIFY(QDir().mkpath(target));
        // The PC side's temporary file (unnamed where the system allows) shows that bytes are flowing.
        QVERIFY(cutByKill([&] { return device->CopyFileToPC(QStringLiteral("/user/big.bin"), target + QStringLiteral("/big.bin")); },
                          [&] { return writesInto(target); }));
        QCOMPARE(treeEntries(target), QStringList());

        QVERIFY2(m_simulator->start(m_image->path(), DeviceId, SlowAnswers, SimulatorProcess::Image::InPlace),
                 qPrintable(m_simulator->errorString()));
        QVERIFY(writeFile(local(QStringLiteral("up.bin")), randomBytes(64 * 1024 * 1024, 4)));
        QVERIFY(cutByKill([&] { return device->CopyFileToDevice(local(QStringLiteral("up.bin")), QStringLiteral("/user/up.bin")); },
                          [&] { return !leftovers(flash(QStringLiteral("user"))).isEmpty(); }));
        QVERIFY2(m_simulator->start(m_image->path(), DeviceId, {}, SimulatorProcess::Image::InPlace),
                 qPrintable(m_simulator->errorString()));
        QCOMPARE(leftovers(flash()), QStringList());
        QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/up.bin"))));
        QCOMPARE(device->CopyFileToPC(QStringLiteral("/user/notes.txt"), local(QStringLiteral("n.txt"))), 0);
    }

    // How each action uses the resolver: escapes through ".." and through links out, and
    // run's refusals of what is no module; nothing may change. Then what run and delete do.
    void runDeleteAndRefusals()
    {
        const QSharedPointer<_ZantDevice> device = serve(LargeVolume, { QStringLiteral("--run-lifetime"), QStringLiteral("300") });
        QVERIFY(device);
        QVERIFY(writeFile(local(QStringLiteral("payload.mod")), "overwritten"));
        const QByteArray before = treeDigest(flash());
        QVector<ProcessInfo> processesBefore;
        QCOMPARE(device->GetProcesses(processesBefore), 0);

        // > copies to the device, < to the PC, r runs, d deletes.
        const struct { char action; const char* path; int code; } rows[] = {
            { '>', "/user/out/secret.txt", PortlexError::PathRefused },
            { '>', "/user/outfile", PortlexError::PathRefused }, // a link to a file outside
            { '<', "/user/../../canary/secret.txt", PortlexError::PathRefused },
            { '<', "/user/outfile", PortlexError::PathRefused },
            { 'r', "/user/out/inner/app.mod", PortlexError::PathRefused },
            { 'd', "/user/out/secret.txt", PortlexError::PathRefused },
            { 'r', "/usermod/userm/none.mod", PortlexError::NotFound },
            { 'r', "/usermod/userm/userm.mif", PortlexError::NotRunnable },
            { 'r', "/usermod/userm", PortlexError::NotRunnable },
        };
        for (const auto& [action, path, code] : rows) {
            const QString where = QLatin1String(path);
            const int result = action == '>' ? device->CopyFileToDevice(local(QStringLiteral("payload.mod")), where)
                : action == '<'              ? device->CopyFileToPC(where, local(QStringLiteral("stolen")))
                : action == 'r'              ? device->RunApplication(where)
                                             : device->DeleteDeviceFile(where);
            QVERIFY2(result == code && treeDigest(flash()) == before && !QFileInfo::exists(local(QStringLiteral("stolen"))),
                     qPrintable(QStringLiteral("%1 %2: %3").arg(action).arg(where).arg(result)));
        }
        QVector<ProcessInfo> processesAfter;
        QCOMPARE(device->GetProcesses(processesAfter), 0);
        QCOMPARE(processesAfter.size(), processesBefore.size());

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
            return p.name == QLatin1String("userm") && anyHas(p.modules, &LoadedModuleEntry::location, QStringLiteral("/usermod/userm/userm.mod"));
        }));
        QTRY_VERIFY_WITH_TIMEOUT(!running(), 15000);

        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/notes.txt")), 0);
        QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/notes.txt"))));
        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/notes.txt")), int(PortlexError::NotFound));
        // The directory goes with its contents; the link inside it is removed, not followed.
        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/docs")), 0);
        QVERIFY(!QFileInfo::exists(flash(QStringLiteral("user/docs"))));
        // A link that points out of the volume: the link goes, its target stays (cleanup checks).
        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/user/outfile")), 0);
        QVERIFY(!QFileInfo(flash(QStringLiteral("user/outfile"))).isSymLink());
        QCOMPARE(device->DeleteDeviceFile(QStringLiteral("/")), int(PortlexError::PathRefused));
        QVERIFY(QFileInfo(flash(QStringLiteral("user"))).isDir());
    }
};

QTEST_GUILESS_MAIN(PortlexTest)
#include "tst_portlex.moc"
