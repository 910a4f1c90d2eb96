#include "Portlex.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"

#include <QDir>
#include <QLocalSocket>
#include <QTemporaryDir>
#include <QThread>
#include <QtEndian>
#include <QtTest>

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <memory>

namespace {

const QString SimulatorImage = QStringLiteral("simulator");
const QString HandsetImage = QStringLiteral("handset");

// Runs work on a thread without an event loop, as the pages' workers call the gateway.
template <typename F>
int callOnWorker(F work)
{
    std::atomic<int> result { -1 };
    std::unique_ptr<QThread> thread(QThread::create([&] { result = work(); }));
    thread->start();
    if (!thread->wait(4 * Protocol::CallTimeoutMs))
        qFatal("a gateway call hung");
    return result;
}

bool isSorted(const QVector<quint32>& ids)
{
    return std::is_sorted(ids.begin(), ids.end()) && std::adjacent_find(ids.begin(), ids.end()) == ids.end();
}

QStringList childNames(const _SettingsInfo& node)
{
    QStringList names;
    for (const auto& child : node.children)
        names << child->Name();
    return names;
}

} // namespace

class PortlexTest : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void cleanup();
    void discovery();
    void connectAndRefusedConnect();
    void everyQuery();
    void handsetAnswers();
    void eightThreadsShareOneDevice();
    void simulatorKilledAndRestarted();
    void stoppedSimulatorTimesOut();
    void failCodesSurface();
    void hostileClientDoesNotDisturbTheDevice();
    void lockRequestsReachTheDevice();

private:
    // Starts image as id and returns its connected device.
    QSharedPointer<_ZantDevice> connected(SimulatorProcess& simulator, const QString& image, const QString& id,
                                          const QStringList& arguments = QStringList());

    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_sockets;
};

void PortlexTest::init()
{
    QVERIFY2(QFileInfo::exists(SimulatorProcess::executable()), "zantro-sim is not built");
    m_dir = std::make_unique<QTemporaryDir>();
    m_sockets = m_dir->filePath(QStringLiteral("sockets"));
    QVERIFY(QDir().mkpath(m_sockets));
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets));
    Portlex::Initialize();
}

void PortlexTest::cleanup()
{
    Portlex::Destroy();
    m_dir.reset();
}

QSharedPointer<_ZantDevice> PortlexTest::connected(SimulatorProcess& simulator, const QString& image, const QString& id,
                                                   const QStringList& arguments)
{
    if (!simulator.start(SimulatorProcess::sampleImage(image), id, arguments)) {
        qWarning("%s", qPrintable(simulator.errorString()));
        return {};
    }
    QList<QPair<QString, QString>> devices;
    Portlex::GetDevices(devices);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(id);
    if (!device || !Portlex::ConnectDevice(device, QString(), QString()))
        return {};
    return device;
}

void PortlexTest::discovery()
{
    QList<QPair<QString, QString>> devices { qMakePair(QStringLiteral("left"), QStringLiteral("over")) };
    QCOMPARE(Portlex::GetDevices(devices), 0u);
    QVERIFY(devices.isEmpty());

    // Neither a socket nobody listens on nor a plain file is a device.
    const QByteArray stale = QFile::encodeName(m_sockets + QStringLiteral("/crashed.sock"));
    const int fd = ::socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    qstrncpy(address.sun_path, stale.constData(), sizeof(address.sun_path));
    QCOMPARE(::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    ::close(fd);
    QFile note(m_sockets + QStringLiteral("/notes.txt"));
    QVERIFY(note.open(QIODevice::WriteOnly));
    note.close();
    QCOMPARE(Portlex::GetDevices(devices), 0u);

    SimulatorProcess simulator(m_sockets);
    SimulatorProcess handset(m_sockets);
    QVERIFY2(simulator.start(SimulatorProcess::sampleImage(SimulatorImage), QStringLiteral("sim-a")), qPrintable(simulator.errorString()));
    QVERIFY2(handset.start(SimulatorProcess::sampleImage(HandsetImage), QStringLiteral("hs-b")), qPrintable(handset.errorString()));
    QCOMPARE(Portlex::GetDevices(devices), 2u);
    QVERIFY(devices.contains(qMakePair(QStringLiteral("Zantro Simulator - Aurora"), QStringLiteral("sim-a"))));
    QVERIFY(devices.contains(qMakePair(QStringLiteral("Zantro USB Device: Kestrel K7"), QStringLiteral("hs-b"))));
    QCOMPARE(Portlex::GetDevice(QStringLiteral("sim-a"))->name, QStringLiteral("Zantro Simulator - Aurora"));
    QVERIFY(!Portlex::GetDevice(QStringLiteral("sim-a"))->Connected());
    QVERIFY(Portlex::GetDevice(QStringLiteral("nobody")).isNull());

    // A crashed device leaves its socket behind; it is no longer listed, but its object
    // stays known so that holders can use it again once it is back.
    handset.kill();
    QCOMPARE(Portlex::GetDevices(devices), 1u);
    QCOMPARE(devices.first().second, QStringLiteral("sim-a"));
    QVERIFY(!Portlex::GetDevice(QStringLiteral("hs-b")).isNull());
}

void PortlexTest::connectAndRefusedConnect()
{
    QVERIFY(!Portlex::ConnectDevice(QSharedPointer<_ZantDevice>(), QString(), QString()));
    QCOMPARE(Portlex::LastError(), unsigned(PortlexError::InvalidArgument));

    SimulatorProcess refusing(m_sockets);
    QVERIFY(refusing.start(SimulatorProcess::sampleImage(SimulatorImage), QStringLiteral("locked"),
                           { QStringLiteral("--refuse-connect"), QStringLiteral("77:Handset locked by operator") }));
    QList<QPair<QString, QString>> devices;
    QCOMPARE(Portlex::GetDevices(devices), 1u);
    const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(QStringLiteral("locked"));
    QVERIFY(device);
    QVERIFY(!Portlex::ConnectDevice(device, QString(), QString()));
    QCOMPARE(Portlex::LastError(), 77u);
    QCOMPARE(Portlex::LastStatus(), QStringLiteral("Handset locked by operator"));
    QVERIFY(!device->Connected());
    QVERIFY(!device->cache.filled);
    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), int(PortlexError::NotConnected));

    // A device that went away since it was listed.
    refusing.stop();
    QVERIFY(!Portlex::ConnectDevice(device, QString(), QString()));
    QCOMPARE(Portlex::LastError(), unsigned(PortlexError::Unreachable));
    QVERIFY(!Portlex::LastStatus().isEmpty());

    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> good = connected(simulator, SimulatorImage, QStringLiteral("good"));
    QVERIFY(good);
    QVERIFY(good->Connected());
    QVERIFY(!good->statusText.isEmpty());
    QVERIFY(good->cache.filled);
    QCOMPARE(good->cache.deviceName, QStringLiteral("Zantro Simulator - Aurora"));
    QCOMPARE(good->cache.deviceData.phoneName, QStringLiteral("Aurora Reference"));
    QCOMPARE(good->cache.deviceData.hardwareValue(QStringLiteral("cxScreen"), QString()), QStringLiteral("480"));
    QVERIFY(good->cache.classes.contains(QStringLiteral("0x01011001")));
}

void PortlexTest::everyQuery()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("aurora"));
    QVERIFY(device);

    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    const auto appmanager = std::find_if(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.name == QLatin1String("appmanager"); });
    QVERIFY(appmanager != modules.cend());
    QCOMPARE(appmanager->path, QStringLiteral("/sys/mod/appmanager/appmanager.mif"));
    QCOMPARE(appmanager->GetModuleSig(), QStringLiteral("Maker Signed"));

    MifEntry mif;
    QCOMPARE(device->GetModuleMif(appmanager->path, mif), 0);
    QCOMPARE(mif.fileName, QStringLiteral("appmanager.mif"));
    QVERIFY(!mif.classes.isEmpty());
    MifEntry untouched;
    untouched.fileName = QStringLiteral("kept");
    QCOMPARE(device->GetModuleMif(QStringLiteral("/sys/mod/none/none.mif"), untouched), int(PortlexError::NotFound));
    QCOMPARE(untouched.fileName, QStringLiteral("kept"));

    QVector<ProcessInfo> processes;
    QCOMPARE(device->GetProcesses(processes), 0);
    QVERIFY(!processes.isEmpty());
    QVector<quint32> processIds;
    for (const ProcessInfo& process : processes) {
        processIds << process.id;
        QVector<quint32> threadIds;
        for (const ThreadEntry& thread : process.threads)
            threadIds << thread.id;
        QVERIFY(isSorted(threadIds));
    }
    QVERIFY(isSorted(processIds));
    QCOMPARE(processes.first().name, QStringLiteral("Kernel"));

    QVector<LoadedModuleInfo> loaded;
    QCOMPARE(device->GetLoadedModules(loaded), 0);
    QVERIFY(!loaded.isEmpty());
    for (const LoadedModuleInfo& process : loaded) {
        QVector<quint32> moduleIds;
        for (const LoadedModuleEntry& module : process.modules)
            moduleIds << module.id;
        QVERIFY(isSorted(moduleIds));
    }

    QSet<VolumeInfo> volumes;
    QCOMPARE(device->GetVolumes(volumes), 0);
    QCOMPARE(volumes.size(), 1);
    const VolumeInfo flash = *volumes.cbegin();
    QCOMPARE(flash.friendlyName, QStringLiteral("Simulator Flash"));
    QVERIFY(flash.mounted);
    QVERIFY(flash.freeSpace < flash.volumeSize);

    QVector<RegistryInfo> registry;
    QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 0);
    QVERIFY(std::any_of(registry.cbegin(), registry.cend(),
                        [](const RegistryInfo& r) { return r.mimeType == QLatin1String("application/x-zantro-package"); }));

    auto root = QSharedPointer<_SettingsInfo>::create();
    root->SetPath(QStringLiteral("/"));
    QCOMPARE(device->GetChildSettings(root), 0);
    const QStringList branches = childNames(*root);
    for (const char* name : { "appinfo", "ztoversion", "oattest", "CSA_NORMAL", "CSA_REMOVAL" })
        QVERIFY2(branches.contains(QLatin1String(name)), name);
    auto shell = QSharedPointer<_SettingsInfo>::create();
    shell->SetPath(QStringLiteral("/appinfo/shell"));
    QCOMPARE(device->GetChildSettings(shell), 0);
    QCOMPARE(shell->Name(), QStringLiteral("shell"));
    QVERIFY(shell->values.contains(qMakePair(QStringLiteral("version"), QStringLiteral("5.0.14"))));
    QSharedPointer<_SettingsInfo> none;
    QCOMPARE(device->GetChildSettings(none), int(PortlexError::InvalidArgument));

    QSharedPointer<_DirectoryInfo> level;
    QCOMPARE(device->GetFileSystemLevel(flash.mountPoint, level, nullptr, nullptr), 0);
    QVERIFY(level);
    QStringList folders;
    for (const auto& directory : level->directories)
        folders << directory->Name();
    for (const char* name : { "user", "usermod", "shared", "err" })
        QVERIFY2(folders.contains(QLatin1String(name)), name);
    auto err = QSharedPointer<_DirectoryInfo>::create();
    QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/err"), err, nullptr, nullptr), 0);
    QCOMPARE(err->Path(), QStringLiteral("/err"));
    QVERIFY(!err->files.isEmpty());
    QVERIFY(err->files.first()->size > 0);
    QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/../.."), err, nullptr, nullptr), int(PortlexError::PathRefused));
    QCOMPARE(err->Path(), QStringLiteral("/err"));

    QVector<PriviledgeRecord> privileges;
    QCOMPARE(device->GetTepSigPrivs(privileges), 0);
    QVERIFY(!privileges.isEmpty());

    QString mode, owner, expiry;
    QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementEnabled);
    QCOMPARE(expiry, QStringLiteral("Sun Sep 19 20:00:00 2027"));
    QVERIFY(device->GlobalTestSigStatus(mode, owner, expiry) != EnablementEnabled);
}

void PortlexTest::handsetAnswers()
{
    SimulatorProcess handset(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(handset, HandsetImage, QStringLiteral("kestrel"));
    QVERIFY(device);
    QCOMPARE(device->cache.connectionKind.toLower(), QStringLiteral("usb"));
    QString mode, owner, expiry;
    QCOMPARE(device->GlobalTestSigStatus(mode, owner, expiry), EnablementEnabled);
    QVERIFY(!expiry.isEmpty());
    QVERIFY(device->TepStatus(mode, owner, expiry) != EnablementEnabled);
}

void PortlexTest::eightThreadsShareOneDevice()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("busy"));
    QVERIFY(device);
    QVector<ModuleInfo> reference;
    QCOMPARE(device->GetModules(reference, nullptr, nullptr), 0);

    std::atomic<int> failures { 0 };
    std::vector<std::unique_ptr<QThread>> threads;
    for (int t = 0; t < 8; ++t) {
        threads.emplace_back(QThread::create([&, t] {
            for (int i = 0; i < 40; ++i) {
                QVector<ModuleInfo> modules;
                QSet<VolumeInfo> volumes;
                auto node = QSharedPointer<_SettingsInfo>::create();
                node->SetPath(QStringLiteral("/appinfo"));
                QString mode, owner, expiry;
                const bool ok = (t % 2 == 0 ? device->GetModules(modules, nullptr, nullptr) == 0 && modules == reference
                                            : device->GetVolumes(volumes) == 0 && volumes.size() == 1)
                    && device->GetChildSettings(node) == 0 && !node->children.isEmpty()
                    && device->TepStatus(mode, owner, expiry) == EnablementEnabled;
                if (!ok)
                    ++failures;
            }
        }));
        threads.back()->start();
    }
    // The GUI thread keeps using the device meanwhile.
    for (int i = 0; i < 40; ++i) {
        QVector<ProcessInfo> processes;
        if (device->GetProcesses(processes) != 0)
            ++failures;
    }
    for (auto& thread : threads)
        QVERIFY(thread->wait(60000));
    QCOMPARE(failures.load(), 0);
}

void PortlexTest::simulatorKilledAndRestarted()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("fragile"),
                                                         { QStringLiteral("--latency"), QStringLiteral("1500") });
    QVERIFY(device);

    // A call in flight when the device dies ends with an error, not a hang.
    std::atomic<bool> calling { false };
    int result = 0;
    std::unique_ptr<QThread> worker(QThread::create([&] {
        QVector<ModuleInfo> modules;
        calling = true;
        result = device->GetModules(modules, nullptr, nullptr);
    }));
    worker->start();
    QTRY_VERIFY(calling);
    QTest::qWait(300);
    simulator.kill();
    QVERIFY(worker->wait(2 * Protocol::CallTimeoutMs));
    QCOMPARE(result, int(PortlexError::Unreachable));

    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), int(PortlexError::Unreachable));
    QCOMPARE(callOnWorker([&] { return device->GetModules(modules, nullptr, nullptr); }), int(PortlexError::Unreachable));

    QVERIFY2(simulator.start(SimulatorProcess::sampleImage(SimulatorImage), QStringLiteral("fragile")), qPrintable(simulator.errorString()));
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QVERIFY(!modules.isEmpty());
    QCOMPARE(callOnWorker([&] { return device->GetModules(modules, nullptr, nullptr); }), 0);
}

void PortlexTest::stoppedSimulatorTimesOut()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("sleepy"));
    QVERIFY(device);
    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);

    simulator.pause();
    QVector<ModuleInfo> kept { ModuleInfo() };
    QCOMPARE(device->GetModules(kept, nullptr, nullptr), int(PortlexError::Timeout));
    QCOMPARE(kept.size(), 1);
    // A fresh connection (another thread) gets no further than the handshake.
    QCOMPARE(callOnWorker([&] { return device->GetModules(modules, nullptr, nullptr); }), int(PortlexError::Timeout));
    QList<QPair<QString, QString>> devices;
    QCOMPARE(Portlex::GetDevices(devices), 0u);

    simulator.resume();
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QCOMPARE(Portlex::GetDevices(devices), 1u);
}

void PortlexTest::failCodesSurface()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(
        simulator, SimulatorImage, QStringLiteral("failing"),
        { QStringLiteral("--fail"), QStringLiteral("GetRegistry=3"), QStringLiteral("--fail"),
          QStringLiteral("GetChildSettings:/appinfo=0xDEADBEEF"), QStringLiteral("--fail"),
          QStringLiteral("GetFileSystemLevel:/user=0xDEADBEEF"), QStringLiteral("--fail"), QStringLiteral("GetProcesses=42") });
    QVERIFY(device);

    QVector<RegistryInfo> registry { RegistryInfo() };
    QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 3);
    QCOMPARE(registry.size(), 1);

    auto appinfo = QSharedPointer<_SettingsInfo>::create();
    appinfo->SetPath(QStringLiteral("/appinfo"));
    QCOMPARE(device->GetChildSettings(appinfo), int(0xDEADBEEF));
    QVERIFY(appinfo->children.isEmpty());
    auto version = QSharedPointer<_SettingsInfo>::create();
    version->SetPath(QStringLiteral("/ztoversion"));
    QCOMPARE(device->GetChildSettings(version), 0);

    QSharedPointer<_DirectoryInfo> level;
    QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr), int(0xDEADBEEF));
    QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/shared"), level, nullptr, nullptr), 0);

    QVector<ProcessInfo> processes;
    QCOMPARE(device->GetProcesses(processes), 42);
}

void PortlexTest::hostileClientDoesNotDisturbTheDevice()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("sturdy"));
    QVERIFY(device);
    QVector<ModuleInfo> before;
    QCOMPARE(device->GetModules(before, nullptr, nullptr), 0);

    QByteArray oversized(Protocol::HeaderSize, '\0');
    qToBigEndian<quint32>(Protocol::FrameMagic, oversized.data());
    qToBigEndian<quint32>(0xFFFFFFFF, oversized.data() + 4);
    for (const QByteArray& bytes : { QByteArray("\x7f garbage that is no frame"), oversized }) {
        QLocalSocket hostile;
        hostile.connectToServer(simulator.socketPath());
        QVERIFY(hostile.waitForConnected());
        hostile.write(bytes);
        QVERIFY(hostile.waitForBytesWritten());
        // The device hangs up on the hostile client...
        QVERIFY(hostile.waitForDisconnected(Protocol::CallTimeoutMs));
        // ...and keeps serving the gateway's connection.
        QVector<ModuleInfo> after;
        QCOMPARE(device->GetModules(after, nullptr, nullptr), 0);
        QCOMPARE(after, before);
    }
}

void PortlexTest::lockRequestsReachTheDevice()
{
    SimulatorProcess simulator(m_sockets);
    const QSharedPointer<_ZantDevice> device = connected(simulator, SimulatorImage, QStringLiteral("service"));
    QVERIFY(device);
    QString mode, owner, expiry;
    QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementEnabled);

    // A request made while the device is away waits for the call that reaches it.
    simulator.kill();
    device->serviceLockRequest = true;
    QVector<ModuleInfo> modules;
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), int(PortlexError::Unreachable));
    QVERIFY(device->serviceLockRequest);

    QVERIFY(simulator.start(SimulatorProcess::sampleImage(SimulatorImage), QStringLiteral("service")));
    QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
    QVERIFY(!device->serviceLockRequest);
    QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementDisabled);

    SimulatorProcess handset(m_sockets);
    const QSharedPointer<_ZantDevice> signedDevice = connected(handset, HandsetImage, QStringLiteral("signed"));
    QVERIFY(signedDevice);
    QCOMPARE(signedDevice->GlobalTestSigStatus(mode, owner, expiry), EnablementEnabled);
    signedDevice->signatureLockRequest = true;
    QSet<VolumeInfo> volumes;
    QCOMPARE(callOnWorker([&] { return signedDevice->GetVolumes(volumes); }), 0);
    QVERIFY(!signedDevice->signatureLockRequest);
    QCOMPARE(signedDevice->GlobalTestSigStatus(mode, owner, expiry), EnablementDisabled);
}

QTEST_GUILESS_MAIN(PortlexTest)
#include "tst_portlex.moc"
