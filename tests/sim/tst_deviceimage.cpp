#include "DeviceProfileParser.h"
#include "PackageInstaller.h"
#include "PackageWriter.h"
#include "PortlexErrors.h"
#include "ProcessTable.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QRegularExpression>
#include <QSet>
#include <QtTest>

#include <algorithm>
#include <functional>

#include <sys/stat.h>

namespace {

const QByteArray Volume = R"(<volume id="1" mount="/" folder="flash" size="10"/>)";
QByteArray device(const QByteArray& inside) { return "<device id=\"d\" name=\"n\">" + inside + "</device>"; }
QByteArray volume(const QByteArray& attributes) { return device("<volume id=\"1\" " + attributes + "/>"); }

template <typename List, typename F>
QStringList texts(const List& list, F text)
{
    QStringList result;
    for (const auto& item : list)
        result << text(item);
    return result;
}

QStringList files(const _DirectoryInfo& level)
{
    return texts(level.files, [](const auto& f) { return QStringLiteral("%1 %2 %3").arg(f->Path(), f->Attributes()).arg(f->size); });
}

// Request payloads as the gateway writes them.
template <typename... Values>
QByteArray pack(const Values&... values)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    ((out << values), ...);
    return bytes;
}

// The first field of an answer: a status, a status text or a transfer id.
template <typename T>
T leading(const Answer& answer)
{
    PayloadStream in(answer.body);
    T value {};
    in >> value;
    return value;
}

enum ConnectState { NeverSent, Refused, RefusedLater };

const QList<ProcessSpec> Residents = {
    {"Kernel", 0, {{"idle", 0, 1}, {"timer", 240, 0}},
     {{"k.bin", "/sys/k.bin", 100, false}, {"codec", "/sys/codec.mod", 50, true}, {"net", "/sys/net.mod", 60, true}}},
    {"Shell", 0, {{"ui", 160, 1}}, {}}};
const QList<ProcessSpec> Transients = {
    {"Browser", 3, {{"main", 150, 1}, {"fetch", 120, 2}}, {{"browser.mod", "/sys/mod/browser/browser.mod", 2000, false}}}};

ProcessEvolutionSpec evolution(bool enabled, quint32 seed = 42) { return {enabled, seed, 2000, 6}; }

// Every id in the table, as one comparable value.
QString snapshot(const ProcessTable& table)
{
    QStringList parts;
    for (const ProcessTable::Process& p : table.processes()) {
        QStringList ids {QString::number(p.id)};
        for (const ProcessTable::Thread& t : p.threads)
            ids << QString::number(t.id);
        for (const ProcessTable::Module& m : p.modules)
            ids << 'm' + QString::number(m.id);
        parts << ids.join(',');
    }
    return parts.join(' ');
}

} // namespace

// The device model built from an image (profile, modules, classes, registry, settings,
// volumes, enablement, the process table), the request handler's own rules, and the rules
// the device keeps for itself: read-only system module folders, names kept for its own
// temporary files, Connect before anything else, reservations that expire and keep-alives
// while unpacking.
class TestDeviceImage : public QObject
{
    Q_OBJECT

    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<QTemporaryDir> m_scratch;

    DeviceState& state() { return m_image->state(); }
    QString flash(const QString& relative) const { return m_image->path() + QStringLiteral("/flash/") + relative; }
    Answer handle(Operation operation, const QByteArray& payload = {}, quint64 connection = 1, Protocol::RequestFlags flags = {})
    {
        return m_image->handler().handle(Request {connection, operation, flags, payload, {}});
    }
    // Straight to the device's actions, as after an accepted Connect.
    Answer act(Operation operation, const QByteArray& payload, quint64 connection = 1, const std::function<void()>& keepAlive = {})
    {
        return m_image->handler().actions().handle(Request {connection, operation, {}, payload, keepAlive});
    }
    Answer upload(const QString& path, const QByteArray& bytes)
    {
        const Answer begun = act(Operation::CopyToDeviceBegin, pack(path, quint64(bytes.size())));
        if (begun.result != 0)
            return begun;
        m_image->handler().actions().writeStream(1, leading<quint32>(begun), bytes.constData(), bytes.size());
        return act(Operation::CopyToDeviceCommit, pack(leading<quint32>(begun)));
    }
    QString writePackage(const std::function<void(PackageWriter&)>& fill)
    {
        const QString path = m_scratch->filePath(QStringLiteral("p%1.zantro").arg(QDir(m_scratch->path()).count()));
        PackageWriter writer;
        writer.open(path);
        fill(writer);
        return writer.close() ? path : QString();
    }
    Answer install(const QString& package, const std::function<void()>& keepAlive = {})
    {
        const QByteArray bytes = TestSupport::readFile(package);
        const Answer begun = act(Operation::InstallPackageBegin, pack(quint16(1), QStringLiteral("p.zantro"), quint64(bytes.size())));
        m_image->handler().actions().writeStream(1, leading<quint32>(begun), bytes.constData(), bytes.size());
        return act(Operation::InstallPackageCommit, pack(leading<quint32>(begun)), 1, keepAlive);
    }

private slots:
    void init()
    {
        m_image = std::make_unique<TestImage>();
        m_image->fillDefault();
        m_scratch = std::make_unique<QTemporaryDir>();
        QVERIFY(m_image->load());
    }

    // Each rule the profile must keep, broken once.
    void profileRefused()
    {
        const int deep = DeviceProfileParser::MaxSettingsDepth + 2;
        const QPair<const char*, QByteArray> profiles[] = {
            {"wrong root", "<phone id=\"d\" name=\"n\">" + Volume + "</phone>"},
            {"id dot dot", "<device id=\"..\" name=\"n\">" + Volume + "</device>"},
            {"no name", "<device id=\"d\">" + Volume + "</device>"},
            {"bad connection", "<device id=\"d\" name=\"n\" connection=\"wifi\">" + Volume + "</device>"},
            {"no volume", device("")},
            {"volume without id", device(R"(<volume mount="/" folder="f"/>)")},
            {"volume id twice", device(Volume + R"(<volume id="1" mount="/c" folder="c"/>)")},
            {"mount twice", device(Volume + R"(<volume id="2" mount="/" folder="c"/>)")},
            {"mount with dot dot", volume(R"(mount="/a/../b" folder="f")")},
            {"nested module folders", volume(R"(mount="/" folder="f" modules="usermod/games usermod")")},
            {"install not a module folder", volume(R"(mount="/" folder="f" modules="a" install="b")")},
            {"reserved above size", volume(R"(mount="/" folder="f" size="10" reserved="11")")},
            {"settings name with slash", device(Volume + R"(<settings><node name="a/b"/></settings>)")},
            {"settings too deep", device(Volume + "<settings>" + QByteArray("<node name=\"n\">").repeated(deep)
                                         + QByteArray("</node>").repeated(deep) + "</settings>")},
            {"process without name", device(Volume + R"(<processes><process/></processes>)")},
            {"interval too short", device(Volume + R"(<processes interval="10"/>)")},
            {"transient without life", device(Volume + R"(<processes><transient name="t" lifetime="0"/></processes>)")},
            {"bad enablement", device(Volume + R"(<enablement mode="forever"/>)")},
        };
        for (const auto& [what, xml] : profiles) {
            DeviceProfileParser parser;
            DeviceProfile profile;
            QVERIFY2(!parser.parse(xml, profile) && !parser.errorString().isEmpty(), what);
        }
    }

    void profileValues()
    {
        DeviceProfileParser parser;
        DeviceProfile profile;
        QVERIFY2(parser.parse(TestImage::defaultProfile(), profile), qPrintable(parser.errorString()));
        QCOMPARE(profile.displayName(), "Zantro Simulator - Test");
        QCOMPARE(profile.data.hardwareValue(QStringLiteral("Manufacturer"), QString()), "Test Maker");
        QCOMPARE(profile.data.video.value(QStringLiteral("H.263")), "No");
        // Numbers are decimal or 0x-hexadecimal, never octal; ids are brought to one form.
        QVERIFY(parser.parse(device(R"(<volume id="010" mount="/" folder="f" size="0x20"/><platform><class id="0xabc"/></platform>)"),
                             profile));
        QCOMPARE(profile.volumes.at(0).id, 10u);
        QCOMPARE(profile.volumes.at(0).size, 32u);
        QCOMPARE(profile.platformClasses.at(0).id, "0x00000ABC");
        QVERIFY(parser.parse("<device id=\"d\" name=\"K\" connection=\"usb\">" + Volume + "</device>", profile));
        QCOMPARE(profile.displayName(), "Zantro USB Device: K");
        QCOMPARE(profile.connectionText(), "USB");
    }

    void modulesFromMifs()
    {
        const QString root = m_image->path();
        m_image->addModule("card/usermod/deep/er", TestImage::module("CardMod", {0x01014001}));
        QVERIFY(QFile::rename(root + "/card/usermod/deep/er/CardMod.mif", root + "/card/usermod/deep/er/CardMod.MIF"));
        m_image->writeFile("flash/usermod/broken/broken.mif", "not a mif at all");
        m_image->writeFile("flash/user/stray.mif", QByteArray()); // not in a module folder
        QVERIFY(QFile::link(root + "/flash/usermod/userm/userm.mif", root + "/flash/usermod/linked.mif"));
        QVERIFY(m_image->load());

        const QVector<ModuleInfo> modules = state().modules();
        QCOMPARE(texts(modules, [](const ModuleInfo& m) { return m.path + ' ' + m.version; }),
                 (QStringList {"/sys/mod/sysm/sysm.mif 1.2.3", "/usermod/broken/broken.mif ", "/usermod/userm/userm.mif 1.2.3",
                               "/card/usermod/deep/er/CardMod.MIF 1.2.3"}));
        QCOMPARE(modules.at(2).type, quint32(ModuleInfo::Application | ModuleInfo::Preinstalled));
        QCOMPARE(modules.at(2).signature, quint32(ModuleInfo::DeveloperSigned));
        QCOMPARE(modules.at(2).copyright, "(c) Test");
        QVERIFY(modules.at(2).size > 100); // code, MIF and sidecar

        // By MIF path, by code path or by name; broken and linked MIFs are not served.
        MifEntry byPath;
        QCOMPARE(state().moduleMif(QStringLiteral("/usermod/userm/userm.mif"), byPath), 0);
        QCOMPARE(byPath.classes, (QVector<quint32> {0x01013001, 0x7F000001}));
        QCOMPARE(byPath.mimeTypes.size(), 2);
        QCOMPARE(byPath.filePath + ' ' + byPath.fileName, "/usermod/userm/userm.mif userm.mif");
        const QPair<const char*, qint32> lookups[] = {{"/usermod/userm/userm.mod", 0}, {"userm", 0},
            {"/usermod/broken/broken.mif", PortlexError::IoError}, {"/usermod/linked.mif", PortlexError::NotFound},
            {"nothing", PortlexError::NotFound}};
        for (const auto& [key, result] : lookups) {
            MifEntry entry;
            QCOMPARE(state().moduleMif(QLatin1String(key), entry), result);
            QVERIFY(result != 0 || entry == byPath);
        }
    }

    void classesAndRegistry()
    {
        const DeviceCache cache = state().cache();
        QVERIFY(cache.filled);
        QCOMPARE((QStringList {cache.deviceName, cache.connectionKind, cache.deviceData.targetId}),
                 (QStringList {"Zantro Simulator - Test", "Simulator", "0x01020304"}));
        // Platform classes are built in or missing; the modules bring the rest.
        const auto classText = [](const IdRecord& r) { return QStringList {r.id, r.available ? "yes" : "no", r.source, r.path}.join('|'); };
        QCOMPARE(texts(cache.classes, classText),
                 (QStringList {"0x01011001|yes|core|/opt/test", "0x01011002|no||",
                               "0x01012001|yes|/sys/mod/sysm/sysm.mif|/sys/mod/sysm",
                               "0x01013001|yes|/usermod/userm/userm.mif|/usermod/userm",
                               "0x7F000001|yes|/usermod/userm/userm.mif|/usermod/userm"}));
        QCOMPARE(cache.classes.value(QStringLiteral("0x01011001")).name, "Heap"); // from ClassDB.xml beside the test
        QCOMPARE(cache.classes.value(QStringLiteral("0x7F000001")).name, "not found");
        QCOMPARE(cache.interfaces.first().name, "IBase");

        // The system module claims text/plain first: active and restricted. The user module's
        // claim of the same type in other letter case is the second, inactive one.
        const QVector<RegistryInfo> registry = state().registry();
        QCOMPARE(texts(registry, [](const RegistryInfo& r) {
                     return QStringLiteral("%1 %2>%3 %4%5%6").arg(r.mimeType).arg(r.handlerClassId, 0, 16).arg(r.baseClassId, 0, 16)
                         .arg(r.priority).arg(r.active ? " active" : "", r.restricted ? " restricted" : "");
                 }),
                 (QStringList {"text/plain 1012001>1011001 0 active restricted", "TEXT/plain 1013001>1011001 1",
                               "image/png 7f000001>1011001 0 active"}));
        QCOMPARE(registry.at(0).moduleId, state().modules().at(0).moduleId);
    }

    void settingsTree()
    {
        _SettingsInfo root(QString(), QStringLiteral("/")), appinfo(QString(), QStringLiteral("/appinfo"));
        QCOMPARE(state().childSettings(QStringLiteral("/"), root), 0);
        QCOMPARE(root.values.size(), 1);
        QCOMPARE(texts(root.children, [](const auto& c) { return c->Path(); }), (QStringList {"/appinfo", "/CSA_REMOVAL"}));
        QCOMPARE(state().childSettings(QStringLiteral("/appinfo"), appinfo), 0);
        QCOMPARE(appinfo.values, (QVector<QPair<QString, QString>> {{"count", "2"}, {"owner", "test"}}));
        QCOMPARE(texts(appinfo.children, [](const auto& c) { return c->Path(); }), (QStringList {"/appinfo/calc", "/appinfo/notes"}));
        for (const char* missing : {"/appinfo/nothing", "appinfo"})
            QCOMPARE(state().childSettings(QLatin1String(missing), appinfo), qint32(PortlexError::NotFound));
    }

    void volumesAndLevels()
    {
        qint64 used = 0;
        QDirIterator it(m_image->path() + "/flash", QDir::Files | QDir::Hidden, QDirIterator::Subdirectories);
        while (it.hasNext())
            used += QFileInfo(it.next()).size();
        const QList<VolumeInfo> volumes = state().volumes();
        QCOMPARE(volumes.at(0).freeSpace, quint64(1000000 - 1000 - used)); // less the reserve
        QCOMPARE(volumes.at(1).freeSpace, 300u); // 500 bytes, a 200-byte photo
        QVERIFY(volumes.at(1).removable && volumes.at(1).mounted && volumes.at(1).mountPoint == "/card" && volumes.at(1).volumeId == 2);
        m_image->writeFile("card/user/big.jpg", QByteArray(400, 'b'));
        state().filesChanged();
        QCOMPARE(state().volumes().at(1).freeSpace, 0u); // full, never negative

        _DirectoryInfo root, user, system, card;
        QCOMPARE(state().fileSystemLevel(QStringLiteral("/"), root), 0);
        QCOMPARE(texts(root.directories, [](const auto& d) { return d->Path(); }),
                 (QStringList {"/shared", "/sys", "/user", "/usermod"}));
        QCOMPARE(state().fileSystemLevel(QStringLiteral("/user/"), user), 0);
        QCOMPARE(user.Path(), "/user");
        QCOMPARE(files(user), (QStringList {"/user/.hidden rw-h 1", "/user/notes.txt rw- 5"}));
        QCOMPARE(state().fileSystemLevel(QStringLiteral("/sys/mod/sysm"), system), 0);
        QCOMPARE(files(system).last(), "/sys/mod/sysm/sysm.mod r-xs 100");
        QCOMPARE(state().fileSystemLevel(QStringLiteral("/card"), card), 0);
        QCOMPARE(card.Name() + ' ' + card.directories.first()->Path(), "/card /card/user");

        const struct { const char* path; qint32 result; } refusals[] = {
            {"/user/notes.txt", PortlexError::NotFound}, {"/nothing", PortlexError::NotFound},
            {"/user/..", PortlexError::PathRefused}, {"user", PortlexError::PathRefused}};
        for (const auto& refusal : refusals) {
            _DirectoryInfo level;
            QCOMPARE(state().fileSystemLevel(QLatin1String(refusal.path), level), refusal.result);
        }
    }

    void enablementAndRequests()
    {
        QString mode, owner, expiry;
        QCOMPARE(state().tepStatus(mode, owner, expiry), EnablementEnabled);
        QCOMPARE((QStringList {mode, owner, expiry}), (QStringList {"Developer Enabled Service", "Tester", "Sun Sep 19 20:00:00 2027"}));
        QCOMPARE(state().globalTestSigStatus(mode, owner, expiry), EnablementDisabled);
        QCOMPARE(texts(state().tepPriviledges(), [](const PriviledgeRecord& p) { return p.id + ' ' + p.name; }),
                 (QStringList {"0x00000011 FileReadUser", "0x12345678 not found"}));

        QCOMPARE(handle(Operation::Connect).result, 0);
        QCOMPARE(handle(Operation::GetChildSettings).result, qint32(PortlexError::BadRequest));
        QCOMPARE(handle(Operation::GetFileSystemLevel, QByteArray("\xff\xff\xff", 3)).result, qint32(PortlexError::BadRequest));
        QCOMPARE(handle(Operation(9999)).result, qint32(PortlexError::UnknownOperation));
        // A lock flag locks only its own mode, before the request that carries it is answered.
        const auto status = [this](Protocol::RequestFlags flags) { return leading<qint32>(handle(Operation::TepStatus, {}, 1, flags)); };
        QCOMPARE(status(Protocol::SignatureLockRequest), qint32(EnablementEnabled));
        QCOMPARE(status(Protocol::ServiceLockRequest), qint32(EnablementDisabled));
        QVERIFY(state().tepPriviledges().isEmpty());
    }

    // System module folders are read-only and the names of the device's own temporary files
    // are kept for it, while the install folder stays writable.
    void writesTheDeviceRefuses()
    {
        QVERIFY(QFile::link(flash(QStringLiteral("sys/mod/sysm")), flash(QStringLiteral("user/syslink"))));
        const int refused = PortlexError::PathRefused, refusedPackage = PortlexError::Refused;
        // u uploads, d deletes, i installs a package whose one entry is the path.
        const struct { char action; const char* path; int code; const char* because; } rows[] = {
            {'u', "/sys/mod/sysm/sysm.mif", refused, "read-only"},
            {'u', "/user/syslink/extra.txt", refused, "read-only"},
            {'d', "/sys/mod/sysm", refused, "read-only"},
            {'d', "/sys", refused, "read-only"}, // it holds one
            {'i', "sysm/SYSM.mif", refusedPackage, "would replace the system module"},
            {'u', "/user/.zantro-partial-mine", refused, ".zantro-partial-"},
            {'i', ".zantro-staging-evil/m.mif", refusedPackage, "temporary files"},
            {'u', "/usermod/userm/extra.txt", 0, ""},
            {'d', "/usermod/userm", 0, ""},
            {'i', "radio/radio.mif", 0, "installed"},
        };
        for (const auto& [action, path, code, because] : rows) {
            const QByteArray before = TestSupport::treeDigest(m_image->path());
            const QString where = QString::fromUtf8(path);
            const Answer answer = action == 'u' ? upload(where, "new")
                : action == 'd'                 ? act(Operation::DeleteDeviceFile, pack(where))
                                                : install(writePackage([&](PackageWriter& w) { w.addFile(where, "x"); }));
            const QString said = leading<QString>(answer);
            QVERIFY2(answer.result == code && said.contains(QLatin1String(because)), qPrintable(where + ": " + said));
            QVERIFY2((TestSupport::treeDigest(m_image->path()) == before) == (code != 0), path);
        }
    }

    void reservationExpiresWhenIdle_data()
    {
        QTest::addColumn<bool>("package");
        QTest::newRow("upload") << false;
        QTest::newRow("package") << true;
    }
    void reservationExpiresWhenIdle()
    {
        QFETCH(bool, package);
        qint64 now = 0;
        m_image->handler().actions().setClock([&now] { return now; });
        const quint64 room = state().freeSpace(0);
        const Answer hog = package ? act(Operation::InstallPackageBegin, pack(quint16(1), QStringLiteral("all.zantro"), room))
                                   : act(Operation::CopyToDeviceBegin, pack(QStringLiteral("/user/all.bin"), room));
        QCOMPARE(hog.result, 0);
        const quint32 id = leading<quint32>(hog);
        const auto other = [this] { return act(Operation::CopyToDeviceBegin, pack(QStringLiteral("/user/b.bin"), quint64(1)), 2).result; };
        QCOMPARE(other(), int(PortlexError::NoSpace));

        constexpr qint64 limit = DeviceActions::TransferIdleLimitMs;
        now = limit - 1;
        QCOMPARE(m_image->handler().actions().writeStream(1, id, "x", 1), 0); // moving keeps it
        now = 2 * limit - 1;
        QCOMPARE(other(), int(PortlexError::NoSpace));
        now = 2 * limit; // quiet for longer than the limit
        QCOMPARE(other(), 0);
        QCOMPARE(m_image->handler().actions().writeStream(1, id, "y", 1), int(PortlexError::NotFound));
        const QStringList partials = QStringList { TransferTable::PartialPrefix + QLatin1Char('*') };
        QCOMPARE(QDir(flash(QStringLiteral("user"))).entryList(partials, QDir::Files | QDir::Hidden).size(), 1); // b.bin's
        QCOMPARE(QDir(flash(QStringLiteral("usermod"))).entryList(partials, QDir::Files | QDir::Hidden).size(), 0);
    }

    void servesOnlyAfterConnect_data()
    {
        QTest::addColumn<int>("connect");
        QTest::newRow("Connect never sent") << int(NeverSent);
        QTest::newRow("Connect refused") << int(Refused);
        QTest::newRow("refused after an accepted Connect") << int(RefusedLater);
    }
    void servesOnlyAfterConnect()
    {
        QFETCH(int, connect);
        const QByteArray hello = pack(QString(), QString());
        QCOMPARE(handle(Operation::Connect, hello, 2).result, 0); // another client is connected
        if (connect == RefusedLater)
            QCOMPARE(handle(Operation::Connect, hello).result, 0);
        if (connect == Refused || connect == RefusedLater)
            m_image->handler().refuseConnect(77, QStringLiteral("Not now"));
        QVERIFY(connect == NeverSent || handle(Operation::Connect, hello).result != 0);

        const qint32 notConnected = PortlexError::NotConnected;
        QCOMPARE(handle(Operation::GetFileSystemLevel, pack(QStringLiteral("/user"))).result, notConnected);
        QCOMPARE(handle(Operation::DeleteDeviceFile, pack(QStringLiteral("/user/notes.txt"))).result, notConnected);
        QCOMPARE(handle(Operation::GetVolumes, {}, 1, Protocol::ServiceLockRequest).result, notConnected);
        QVERIFY(QFileInfo::exists(flash(QStringLiteral("user/notes.txt"))));
        QString mode, owner, expires;
        QCOMPARE(state().tepStatus(mode, owner, expires), EnablementEnabled); // the lock request was not applied
        QCOMPARE(handle(Operation::GetVolumes, {}, 2).result, 0); // a refusal is no one else's
    }

    // FIFOs in an image, where the daemon would block on them for good: a sidecar at load
    // and a file asked for by name are passed over, and the device answers on.
    void fifosDoNotBlock()
    {
        QVERIFY(QDir().mkpath(flash("usermod/fifoinf")) && QFile::copy(flash("usermod/userm/userm.mif"), flash("usermod/fifoinf/fifoinf.mif")));
        for (const char* fifo : {"usermod/fifoinf/fifoinf.inf", "user/pipe.txt"})
            QVERIFY(::mkfifo(QFile::encodeName(flash(fifo)).constData(), 0600) == 0);
        QVERIFY(m_image->load());
        const QVector<ModuleInfo> modules = state().modules();
        QVERIFY(std::any_of(modules.cbegin(), modules.cend(), [](const ModuleInfo& m) { return m.path == "/usermod/fifoinf/fifoinf.mif"; }));
        QCOMPARE(act(Operation::CopyToPCBegin, pack(QStringLiteral("/user/pipe.txt"))).result, qint32(PortlexError::IoError));
        QVERIFY(handle(Operation::Connect).result == 0 && handle(Operation::GetVolumes).result == 0);
    }

    // An install killed before, between or after any of its renames leaves, once the device
    // starts again, either the whole old set or the whole new one; never a mix, never a
    // module lost.
    void installSurvivesAKillAtEveryStep()
    {
        const auto version = [this](const QString& name) {
            return QFileInfo::exists(flash("usermod/" + name + "/v")) ? TestSupport::readFile(flash("usermod/" + name + "/v")) : QByteArray();
        };
        const QString first = writePackage([](PackageWriter& w) { w.addFile("a/v", "old a"), w.addFile("b/v", "old b"); });
        const QString second = writePackage([](PackageWriter& w) { w.addFile("a/v", "new a"), w.addFile("b/v", "new b"), w.addFile("c/v", "new c"); });
        QCOMPARE(install(first).result, 0);
        // Two renames a name, then the end of the switch: steps 0 to 6; at 7 it runs through.
        for (int kill = 0; kill <= 7; ++kill) {
            PackageInstaller::faultHook = [kill](int step) { return step == kill; };
            const qint32 result = install(second).result;
            PackageInstaller::faultHook = nullptr;
            QVERIFY(m_image->load());
            m_image->handler().actions().sweepLeftovers();
            const bool done = kill == 7 && result == 0;
            QCOMPARE(version("a") + '|' + version("b") + '|' + version("c"),
                     done ? QByteArray("new a|new b|new c") : QByteArray("old a|old b|"));
            QCOMPARE(QDir(flash("usermod")).entryList(QDir::AllEntries | QDir::Hidden | QDir::NoDotAndDotDot).filter(".zantro"), QStringList());
        }
        // The recovery found nothing of a finished install to undo.
        QCOMPARE(install(second).result, 0);
        QCOMPARE(version("c"), QByteArray("new c"));
    }

    // The extractor's heartbeats reach the keep-alive of the device's request, for large
    // files and for many small ones.
    void keepAliveWhileUnpacking()
    {
        m_image->writeProfile(TestImage::defaultProfile().replace("size=\"1000000\"", "size=\"100000000\""));
        QVERIFY(m_image->load());
        const struct { int files, fileSize, atLeast; } packages[] = {{1, 4 << 20, 16}, {320, 0, 5}};
        for (const auto& [files, fileSize, atLeast] : packages) {
            const QString package = writePackage([&](PackageWriter& w) {
                for (int i = 0; i < files; ++i)
                    w.addFile(QStringLiteral("m%1/f%2").arg(files).arg(i), TestSupport::randomBytes(fileSize, quint32(i)));
            });
            int beats = 0;
            QCOMPARE(install(package, [&beats] { ++beats; }).result, 0);
            QVERIFY2(beats >= atLeast, qPrintable(QString::number(beats)));
        }
    }

    // Residents stay while short-lived processes, threads and on-demand modules come and go;
    // whatever appears has an id above every id seen before (processes and threads share one space).
    void lifeGoesOnWithAscendingIds()
    {
        ProcessTable table(Residents, Transients, evolution(true));
        const quint32 kernel = table.processes().first().id;
        QSet<quint32> live[2], seen[2];
        quint32 highest[2] = {};
        for (quint64 step = 0; step <= 400; table.advanceTo(++step)) {
            QSet<quint32> now[2];
            for (const ProcessTable::Process& p : table.processes()) {
                now[0] << p.id;
                for (const ProcessTable::Thread& t : p.threads)
                    now[0] << t.id;
                for (const ProcessTable::Module& m : p.modules)
                    now[1] << m.id;
            }
            for (int kind : {0, 1}) {
                for (const quint32 id : std::as_const(now[kind]))
                    QVERIFY2(live[kind].contains(id) || id > highest[kind], qPrintable(snapshot(table)));
                highest[kind] = std::max(highest[kind], *std::max_element(now[kind].cbegin(), now[kind].cend()));
                seen[kind] += now[kind];
            }
            QCOMPARE(table.processes().first().id, kernel);
            QCOMPARE(table.processes().at(1).name, "Shell");
            std::swap(live, now);
        }
        QVERIFY2(seen[0].size() > 40 && seen[1].size() > 4, qPrintable(QStringLiteral("%1 %2").arg(seen[0].size()).arg(seen[1].size())));

        // The same seed gives the same history in one jump, another seed another; steps
        // already run are never run again.
        ProcessTable twin(Residents, Transients, evolution(true)), other(Residents, Transients, evolution(true, 8));
        twin.advanceTo(401);
        other.advanceTo(401);
        QCOMPARE(snapshot(twin), snapshot(table));
        QVERIFY(snapshot(other) != snapshot(table));
        table.advanceTo(10);
        QCOMPARE(table.currentStep(), 401u);
        QCOMPARE(snapshot(table), snapshot(twin));
    }

    void withoutEvolutionOnlyShortLivedProcessesEnd()
    {
        ProcessTable table(Residents, Transients, evolution(false));
        const QString atStart = snapshot(table);
        const quint32 id = table.start(Transients.first(), 3);
        QCOMPARE(table.processes().last().id, id);
        QCOMPARE(table.processes().last().threads.first().id, id + 1);
        table.advanceTo(2);
        QCOMPARE(table.processes().size(), 3);
        table.advanceTo(3);
        QCOMPARE(table.processes().size(), 2);
        table.advanceTo(100);
        QCOMPARE(snapshot(table), atStart);
        table.start(Transients.first(), 0); // lives at least one step
        QCOMPARE(table.processes().size(), 3);
        table.advanceTo(101);
        QCOMPARE(table.processes().size(), 2);
    }
};

QTEST_GUILESS_MAIN(TestDeviceImage)
#include "tst_deviceimage.moc"
