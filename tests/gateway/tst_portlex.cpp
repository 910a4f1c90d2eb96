#include "Portlex.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <atomic>
#include <memory>

using TestSupport::callOnWorker;

namespace {

const QString Name = QStringLiteral("Zantro Simulator - Test");
constexpr int HangLimitMs = 4 * Protocol::CallTimeoutMs;

template <typename List, typename Field, typename Value>
bool anyHas(const List& list, Field field, const Value& value)
{
    return std::any_of(list.cbegin(), list.cend(), [&](const auto& item) { return item.*field == value; });
}

} // namespace

// The client against real zantro-sim processes serving copies of a TestImage.
class PortlexTest : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_dir;
    std::unique_ptr<TestImage> m_image;
    QString m_sockets;

    QSharedPointer<_ZantDevice> connected(SimulatorProcess& simulator, const QString& id, const QStringList& arguments = {})
    {
        return simulator.connectDevice(m_image->path(), id, arguments);
    }

private slots:
    void init()
    {
        QVERIFY2(QFileInfo::exists(SimulatorProcess::executable()), "zantro-sim is not built");
        m_dir = std::make_unique<QTemporaryDir>();
        m_sockets = m_dir->filePath(QStringLiteral("sockets"));
        QVERIFY(QDir().mkpath(m_sockets));
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets));
        m_image = std::make_unique<TestImage>();
        m_image->fillDefault();
        Portlex::Initialize();
    }

    void cleanup()
    {
        Portlex::Destroy();
        m_image.reset();
        m_dir.reset();
    }

    void discovery()
    {
        QList<QPair<QString, QString>> devices { qMakePair(QStringLiteral("left"), QStringLiteral("over")) };
        QCOMPARE(Portlex::GetDevices(devices), 0u);
        QVERIFY(devices.isEmpty());
        // Neither a socket nobody listens on nor a plain file is a device.
        QVERIFY(TestSupport::makeStaleSocket(m_sockets + QStringLiteral("/crashed.sock")));
        QVERIFY(TestSupport::writeFile(m_sockets + QStringLiteral("/notes.txt"), "note"));
        QCOMPARE(Portlex::GetDevices(devices), 0u);

        SimulatorProcess first(m_sockets), second(m_sockets);
        QVERIFY2(first.start(m_image->path(), QStringLiteral("dev-a")), qPrintable(first.errorString()));
        QVERIFY2(second.start(m_image->path(), QStringLiteral("dev-b")), qPrintable(second.errorString()));
        QCOMPARE(Portlex::GetDevices(devices), 2u);
        QVERIFY(devices.contains(qMakePair(Name, QStringLiteral("dev-a"))));
        QVERIFY(devices.contains(qMakePair(Name, QStringLiteral("dev-b"))));
        QCOMPARE(Portlex::GetDevice(QStringLiteral("dev-a"))->name, Name);
        QVERIFY(!Portlex::GetDevice(QStringLiteral("dev-a"))->Connected());
        QVERIFY(Portlex::GetDevice(QStringLiteral("nobody")).isNull());

        // A crashed device leaves its socket behind; it is no longer listed, but its object
        // stays known so that holders can use it again once it is back.
        second.kill();
        QCOMPARE(Portlex::GetDevices(devices), 1u);
        QCOMPARE(devices.first().second, QStringLiteral("dev-a"));
        QVERIFY(!Portlex::GetDevice(QStringLiteral("dev-b")).isNull());
    }

    void connectAndRefusedConnect()
    {
        QVERIFY(!Portlex::ConnectDevice(QSharedPointer<_ZantDevice>(), QString(), QString()));
        QCOMPARE(Portlex::LastError(), unsigned(PortlexError::InvalidArgument));

        SimulatorProcess refusing(m_sockets);
        QVERIFY(refusing.start(m_image->path(), QStringLiteral("locked"),
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
        const QSharedPointer<_ZantDevice> good = connected(simulator, QStringLiteral("good"));
        QVERIFY(good && good->Connected());
        QVERIFY(!good->statusText.isEmpty());
        QVERIFY(good->cache.filled);
        QCOMPARE(good->cache.deviceData.phoneName, QStringLiteral("Test Phone"));
        QVERIFY(good->cache.classes.contains(QStringLiteral("0x01011001")));
    }

    // Each query's operation and record reach the right output.
    void everyQuery()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(simulator, QStringLiteral("known"));
        QVERIFY(device);

        QVector<ModuleInfo> modules;
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        QVERIFY(anyHas(modules, &ModuleInfo::path, QStringLiteral("/usermod/userm/userm.mif")));
        MifEntry mif;
        QCOMPARE(device->GetModuleMif(QStringLiteral("/usermod/userm/userm.mif"), mif), 0);
        QCOMPARE(mif.classes, QVector<quint32>({ 0x01013001, 0x7F000001 }));
        MifEntry untouched;
        untouched.fileName = QStringLiteral("kept");
        QCOMPARE(device->GetModuleMif(QStringLiteral("/usermod/none/none.mif"), untouched), int(PortlexError::NotFound));
        QCOMPARE(untouched.fileName, QStringLiteral("kept"));

        QVector<ProcessInfo> processes;
        QCOMPARE(device->GetProcesses(processes), 0);
        QVERIFY(anyHas(processes, &ProcessInfo::name, QStringLiteral("Kernel")));
        QVector<LoadedModuleInfo> loaded;
        QCOMPARE(device->GetLoadedModules(loaded), 0);
        QVERIFY(std::any_of(loaded.cbegin(), loaded.cend(),
                            [](const LoadedModuleInfo& p) { return anyHas(p.modules, &LoadedModuleEntry::location, QStringLiteral("/sys/k.bin")); }));
        QSet<VolumeInfo> volumes;
        QCOMPARE(device->GetVolumes(volumes), 0);
        QVERIFY(anyHas(volumes, &VolumeInfo::friendlyName, QStringLiteral("Card")));
        QVector<RegistryInfo> registry;
        QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 0);
        QVERIFY(anyHas(registry, &RegistryInfo::mimeType, QStringLiteral("image/png")));
        QVector<PriviledgeRecord> privileges;
        QCOMPARE(device->GetTepSigPrivs(privileges), 0);
        QVERIFY(anyHas(privileges, &PriviledgeRecord::id, QStringLiteral("0x12345678")));

        auto calc = QSharedPointer<_SettingsInfo>::create();
        calc->SetPath(QStringLiteral("/appinfo/calc"));
        QCOMPARE(device->GetChildSettings(calc), 0);
        QCOMPARE(calc->values, (QVector<QPair<QString, QString>> { { QStringLiteral("version"), QStringLiteral("1.0") } }));
        QSharedPointer<_SettingsInfo> none;
        QCOMPARE(device->GetChildSettings(none), int(PortlexError::InvalidArgument));

        QSharedPointer<_DirectoryInfo> level;
        QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr), 0);
        QVERIFY(level && std::any_of(level->files.cbegin(), level->files.cend(), [](const QSharedPointer<_FileInfo>& file) {
            return file->Name() == QLatin1String("notes.txt") && file->size == 5;
        }));
        QCOMPARE(device->GetFileSystemLevel(QStringLiteral("/../.."), level, nullptr, nullptr), int(PortlexError::PathRefused));
        QCOMPARE(level->Path(), QStringLiteral("/user"));

        QString mode, owner, expiry;
        QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementEnabled);
        QCOMPARE(owner, QStringLiteral("Tester"));
        QVERIFY(device->GlobalTestSigStatus(mode, owner, expiry) != EnablementEnabled);
    }

    void eightThreadsShareOneDevice()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(simulator, QStringLiteral("busy"));
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
                                                : device->GetVolumes(volumes) == 0 && volumes.size() == 2)
                        && device->GetChildSettings(node) == 0 && node->children.size() == 2
                        && device->TepStatus(mode, owner, expiry) == EnablementEnabled;
                    failures += !ok;
                }
            }));
            threads.back()->start();
        }
        // The GUI thread keeps using the device meanwhile.
        for (int i = 0; i < 40; ++i) {
            QVector<ProcessInfo> processes;
            failures += device->GetProcesses(processes) != 0;
        }
        for (auto& thread : threads)
            QVERIFY(thread->wait(60000));
        QCOMPARE(failures.load(), 0);
    }

    void simulatorKilledAndRestarted()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(simulator, QStringLiteral("fragile"),
                                                             { QStringLiteral("--latency"), QStringLiteral("1500") });
        QVERIFY(device);

        // A call in flight when the device dies ends with an error, not a hang. Nothing shows
        // when the request has left; the pause makes that likely, well inside the latency.
        std::atomic<bool> calling { false };
        std::atomic<int> result { 0 };
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
        QCOMPARE(result.load(), int(PortlexError::Unreachable));

        QVector<ModuleInfo> modules;
        const auto getModules = [&] { return device->GetModules(modules, nullptr, nullptr); };
        QCOMPARE(getModules(), int(PortlexError::Unreachable));
        QCOMPARE(callOnWorker(getModules, HangLimitMs), int(PortlexError::Unreachable));
        QVERIFY2(simulator.start(m_image->path(), QStringLiteral("fragile")), qPrintable(simulator.errorString()));
        QCOMPARE(getModules(), 0);
        QVERIFY(!modules.isEmpty());
        QCOMPARE(callOnWorker(getModules, HangLimitMs), 0);
    }

    void stoppedSimulatorTimesOut()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(simulator, QStringLiteral("sleepy"));
        QVERIFY(device);
        simulator.pause();
        // A fresh connection (another thread) gets no further than the handshake, and the
        // call leaves its output as it was.
        QVector<ModuleInfo> kept { ModuleInfo() };
        QCOMPARE(callOnWorker([&] { return device->GetModules(kept, nullptr, nullptr); }, HangLimitMs), int(PortlexError::Timeout));
        QCOMPARE(kept.size(), 1);
        QList<QPair<QString, QString>> devices;
        QCOMPARE(Portlex::GetDevices(devices), 0u);

        simulator.resume();
        QCOMPARE(device->GetModules(kept, nullptr, nullptr), 0);
        QCOMPARE(Portlex::GetDevices(devices), 1u);
    }

    void failCodesSurface()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(
            simulator, QStringLiteral("failing"),
            { QStringLiteral("--fail"), QStringLiteral("GetRegistry=3"), QStringLiteral("--fail"),
              QStringLiteral("GetChildSettings:/appinfo=0xDEADBEEF") });
        QVERIFY(device);

        QVector<RegistryInfo> registry { RegistryInfo() };
        QCOMPARE(device->GetRegistry(registry, nullptr, nullptr), 3);
        QCOMPARE(registry.size(), 1);
        auto appinfo = QSharedPointer<_SettingsInfo>::create();
        appinfo->SetPath(QStringLiteral("/appinfo"));
        QCOMPARE(device->GetChildSettings(appinfo), int(0xDEADBEEF));
        QVERIFY(appinfo->children.isEmpty());
        auto calc = QSharedPointer<_SettingsInfo>::create();
        calc->SetPath(QStringLiteral("/appinfo/calc"));
        QCOMPARE(device->GetChildSettings(calc), 0);
    }

    // A lock request rides on the next call that reaches the device, whichever thread makes it.
    void lockRequestsReachTheDevice()
    {
        SimulatorProcess simulator(m_sockets);
        const QSharedPointer<_ZantDevice> device = connected(simulator, QStringLiteral("service"));
        QVERIFY(device);
        QString mode, owner, expiry;
        QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementEnabled);

        // A request made while the device is away waits for the call that reaches it.
        simulator.kill();
        device->serviceLockRequest = true;
        QVector<ModuleInfo> modules;
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), int(PortlexError::Unreachable));
        QVERIFY(device->serviceLockRequest);
        QVERIFY(simulator.start(m_image->path(), QStringLiteral("service")));
        QCOMPARE(device->GetModules(modules, nullptr, nullptr), 0);
        QVERIFY(!device->serviceLockRequest);
        QCOMPARE(device->TepStatus(mode, owner, expiry), EnablementDisabled);

        QByteArray profile = TestImage::defaultProfile();
        m_image->writeProfile(profile.replace("mode=\"service\"", "mode=\"signature\""));
        SimulatorProcess signing(m_sockets);
        const QSharedPointer<_ZantDevice> signedDevice = connected(signing, QStringLiteral("signed"));
        QVERIFY(signedDevice);
        QCOMPARE(signedDevice->GlobalTestSigStatus(mode, owner, expiry), EnablementEnabled);
        QVERIFY(signedDevice->TepStatus(mode, owner, expiry) != EnablementEnabled);
        signedDevice->signatureLockRequest = true;
        QSet<VolumeInfo> volumes;
        QCOMPARE(callOnWorker([&] { return signedDevice->GetVolumes(volumes); }, HangLimitMs), 0);
        QVERIFY(!signedDevice->signatureLockRequest);
        QCOMPARE(signedDevice->GlobalTestSigStatus(mode, owner, expiry), EnablementDisabled);
    }
};

QTEST_GUILESS_MAIN(PortlexTest)
#include "tst_portlex.moc"
