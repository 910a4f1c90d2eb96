#include "DeviceProfileParser.h"
#include "DeviceState.h"
#include "PortlexErrors.h"
#include "SimRequestHandler.h"
#include "TestImage.h"

#include <QCoreApplication>
#include <QRegularExpression>
#include <QtTest>

static const QByteArray Volume = R"(<volume id="1" mount="/" folder="flash" size="10"/>)";
static QByteArray device(const QByteArray& inside) { return "<device id=\"d\" name=\"n\">" + inside + "</device>"; }
static QByteArray volume(const QByteArray& attributes) { return device("<volume id=\"1\" " + attributes + "/>"); }

template <typename List, typename F>
static QStringList texts(const List& list, F text)
{
    QStringList result;
    for (const auto& item : list)
        result << text(item);
    return result;
}

// The device model built from an image (profile, modules, classes, registry, settings,
// volumes, enablement) and the request handler's own rules.
class TestDeviceImage : public QObject
{
    Q_OBJECT

    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<DeviceState> m_state;
    std::unique_ptr<SimRequestHandler> m_handler;

    // Loads the image (a fresh default one unless the test made its own) with a handler.
    bool load(bool fresh = true)
    {
        if (fresh) {
            m_image = std::make_unique<TestImage>();
            m_image->fillDefault();
        }
        m_handler.reset();
        m_state = std::make_unique<DeviceState>();
        if (!m_state->load(m_image->path(), QCoreApplication::applicationDirPath())) {
            qWarning("%s", qPrintable(m_state->errorString()));
            return false;
        }
        m_handler = std::make_unique<SimRequestHandler>(*m_state);
        return true;
    }
    Answer handle(Operation operation, const QByteArray& payload = {}, Protocol::RequestFlags flags = {}, quint64 connection = 1)
    {
        Request request;
        request.connectionId = connection;
        request.operation = operation;
        request.payload = payload;
        request.flags = flags;
        return m_handler->handle(request);
    }
    template <typename T>
    static T decoded(const QByteArray& body)
    {
        PayloadStream in(body);
        T value {};
        in >> value;
        return value;
    }
    static QStringList files(const _DirectoryInfo& level)
    {
        return texts(level.files,
                     [](const auto& f) { return QStringLiteral("%1 %2 %3").arg(f->Path(), f->Attributes()).arg(f->size); });
    }

private slots:
    void profileRefused_data()
    {
        QTest::addColumn<QByteArray>("xml");
        QTest::newRow("wrong root") << "<phone id=\"d\" name=\"n\">" + Volume + "</phone>";
        QTest::newRow("id dot dot") << "<device id=\"..\" name=\"n\">" + Volume + "</device>";
        QTest::newRow("no name") << "<device id=\"d\">" + Volume + "</device>";
        QTest::newRow("bad connection") << "<device id=\"d\" name=\"n\" connection=\"wifi\">" + Volume + "</device>";
        QTest::newRow("no volume") << device("");
        QTest::newRow("volume without id") << device(R"(<volume mount="/" folder="f"/>)");
        QTest::newRow("volume id twice") << device(Volume + R"(<volume id="1" mount="/c" folder="c"/>)");
        QTest::newRow("mount twice") << device(Volume + R"(<volume id="2" mount="/" folder="c"/>)");
        QTest::newRow("mount with dot dot") << volume(R"(mount="/a/../b" folder="f")");
        QTest::newRow("folder dot dot") << volume(R"(mount="/" folder="..")");
        QTest::newRow("module folder out") << volume(R"(mount="/" folder="f" modules="../x" install="../x")");
        QTest::newRow("nested module folders") << volume(R"(mount="/" folder="f" modules="usermod/games usermod")");
        QTest::newRow("install not a module folder") << volume(R"(mount="/" folder="f" modules="a" install="b")");
        QTest::newRow("reserved above size") << volume(R"(mount="/" folder="f" size="10" reserved="11")");
        QTest::newRow("flag not yes or no") << volume(R"(mount="/" folder="f" removable="true")");
        QTest::newRow("settings name with slash") << device(Volume + R"(<settings><node name="a/b"/></settings>)");
        QTest::newRow("settings name twice") << device(Volume + R"(<settings><node name="a"/><node name="a"/></settings>)");
        const int deep = DeviceProfileParser::MaxSettingsDepth + 2;
        QTest::newRow("settings too deep") << device(Volume + "<settings>" + QByteArray("<node name=\"n\">").repeated(deep)
                                                     + QByteArray("</node>").repeated(deep) + "</settings>");
        QTest::newRow("process without name") << device(Volume + R"(<processes><process/></processes>)");
        QTest::newRow("interval too short") << device(Volume + R"(<processes interval="10"/>)");
        QTest::newRow("transient without life") << device(Volume + R"(<processes><transient name="t" lifetime="0"/></processes>)");
        QTest::newRow("bad enablement") << device(Volume + R"(<enablement mode="forever"/>)");
        QTest::newRow("privilege without id") << device(Volume + R"(<enablement mode="service"><priviledge/></enablement>)");
        QTest::newRow("platform class without id") << device(Volume + R"(<platform><class/></platform>)");
    }

    void profileRefused()
    {
        QFETCH(QByteArray, xml);
        DeviceProfileParser parser;
        DeviceProfile profile;
        QVERIFY(!parser.parse(xml, profile));
        QVERIFY(!parser.errorString().isEmpty());
    }

    void profileValues()
    {
        DeviceProfileParser parser;
        DeviceProfile profile;
        QVERIFY2(parser.parse(TestImage::defaultProfile(), profile), qPrintable(parser.errorString()));
        QCOMPARE(profile.displayName(), "Zantro Simulator - Test");
        QCOMPARE(profile.data.hardwareValue(QStringLiteral("Manufacturer"), QString()), "Test Maker");
        QCOMPARE(profile.data.video.value(QStringLiteral("H.263")), "No");
        QCOMPARE(profile.volumes.at(0).moduleFolders, (QStringList {"sys/mod", "usermod"}));
        QCOMPARE(profile.volumes.at(1).moduleFolders, QStringList {"usermod"});
        QVERIFY(profile.volumes.at(1).removable);
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
        m_image = std::make_unique<TestImage>();
        m_image->fillDefault();
        const QString root = m_image->path();
        m_image->addModule("card/usermod/deep/er", TestImage::module("CardMod", {0x01014001}));
        QVERIFY(QFile::rename(root + "/card/usermod/deep/er/CardMod.mif", root + "/card/usermod/deep/er/CardMod.MIF"));
        m_image->writeFile("flash/usermod/broken/broken.mif", "not a mif at all");
        m_image->writeFile("flash/user/stray.mif", QByteArray()); // not in a module folder
        QVERIFY(QFile::link(root + "/flash/usermod/userm/userm.mif", root + "/flash/usermod/linked.mif"));
        QVERIFY(load(false));

        const QVector<ModuleInfo> modules = m_state->modules();
        QCOMPARE(texts(modules, [](const ModuleInfo& m) { return m.path + ' ' + m.version; }),
                 (QStringList {"/sys/mod/sysm/sysm.mif 1.2.3", "/usermod/broken/broken.mif ", "/usermod/userm/userm.mif 1.2.3",
                               "/card/usermod/deep/er/CardMod.MIF 1.2.3"}));
        QCOMPARE(modules.at(2).type, quint32(ModuleInfo::Application | ModuleInfo::Preinstalled));
        QCOMPARE(modules.at(2).signature, quint32(ModuleInfo::DeveloperSigned));
        QCOMPARE(modules.at(2).copyright, "(c) Test");
        QVERIFY(modules.at(2).size > 100); // code, MIF and sidecar

        // By MIF path, by code path or by name; broken and linked MIFs are not served.
        MifEntry byPath;
        QCOMPARE(m_state->moduleMif(QStringLiteral("/usermod/userm/userm.mif"), byPath), 0);
        QCOMPARE(byPath.classes, (QVector<quint32> {0x01013001, 0x7F000001}));
        QCOMPARE(byPath.mimeTypes.size(), 2);
        QCOMPARE(byPath.filePath + ' ' + byPath.fileName, "/usermod/userm/userm.mif userm.mif");
        const QPair<const char*, qint32> lookups[] = {{"/usermod/userm/userm.mod", 0}, {"userm", 0},
            {"/usermod/broken/broken.mif", PortlexError::IoError}, {"/usermod/linked.mif", PortlexError::NotFound},
            {"nothing", PortlexError::NotFound}};
        for (const auto& [key, result] : lookups) {
            MifEntry entry;
            QCOMPARE(m_state->moduleMif(QLatin1String(key), entry), result);
            QVERIFY(result != 0 || entry == byPath);
        }
    }

    void classesAndRegistry()
    {
        QVERIFY(load());
        const DeviceCache cache = m_state->cache();
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
        const QVector<RegistryInfo> registry = m_state->registry();
        QCOMPARE(texts(registry, [](const RegistryInfo& r) {
                     return QStringLiteral("%1 %2>%3 %4%5%6").arg(r.mimeType).arg(r.handlerClassId, 0, 16).arg(r.baseClassId, 0, 16)
                         .arg(r.priority).arg(r.active ? " active" : "", r.restricted ? " restricted" : "");
                 }),
                 (QStringList {"text/plain 1012001>1011001 0 active restricted", "TEXT/plain 1013001>1011001 1",
                               "image/png 7f000001>1011001 0 active"}));
        QCOMPARE(registry.at(0).moduleId, m_state->modules().at(0).moduleId);
    }

    void installedModuleChangesEverything()
    {
        QVERIFY(load());
        const quint64 freeBefore = m_state->volumes().at(0).freeSpace;
        m_image->addModule("flash/usermod/pager",
                           TestImage::module("pager", {0x01011002}, {{0x01011002, 0x01011001, "application/x-page"}}));
        QCOMPARE(m_state->modules().size(), 2); // nothing changes until the device is told
        m_state->filesChanged();
        QCOMPARE(m_state->modules().size(), 3);
        QCOMPARE(m_state->cache().classes.value(QStringLiteral("0x01011002")).source, "/usermod/pager/pager.mif");
        QCOMPARE(m_state->registry().at(1).mimeType, "application/x-page"); // "pager" sorts before "userm"
        QVERIFY(m_state->volumes().at(0).freeSpace < freeBefore);
    }

    void settingsTree()
    {
        QVERIFY(load());
        _SettingsInfo root(QString(), QStringLiteral("/"));
        QCOMPARE(m_state->childSettings(QStringLiteral("/"), root), 0);
        QCOMPARE(root.values.size(), 1);
        QCOMPARE(texts(root.children, [](const auto& c) { return c->Path(); }), (QStringList {"/appinfo", "/CSA_REMOVAL"}));
        _SettingsInfo appinfo(QString(), QStringLiteral("/appinfo"));
        QCOMPARE(m_state->childSettings(QStringLiteral("/appinfo"), appinfo), 0);
        QCOMPARE(appinfo.values, (QVector<QPair<QString, QString>> {{"count", "2"}, {"owner", "test"}}));
        QCOMPARE(texts(appinfo.children, [](const auto& c) { return c->Path(); }),
                 (QStringList {"/appinfo/calc", "/appinfo/notes"}));
        _SettingsInfo calc;
        QCOMPARE(m_state->childSettings(QStringLiteral("/appinfo/calc"), calc), 0);
        QCOMPARE(calc.values.first().second, "1.0");
        for (const char* missing : {"/appinfo/nothing", "appinfo"})
            QCOMPARE(m_state->childSettings(QLatin1String(missing), calc), qint32(PortlexError::NotFound));
    }

    void volumesAndLevels()
    {
        QVERIFY(load());
        qint64 used = 0;
        QDirIterator it(m_image->path() + "/flash", QDir::Files | QDir::Hidden, QDirIterator::Subdirectories);
        while (it.hasNext())
            used += QFileInfo(it.next()).size();
        const QList<VolumeInfo> volumes = m_state->volumes();
        QCOMPARE(volumes.at(0).freeSpace, quint64(1000000 - 1000 - used)); // less the reserve
        QCOMPARE(volumes.at(1).freeSpace, 300u); // 500 bytes, a 200-byte photo
        QVERIFY(volumes.at(1).removable && volumes.at(1).mounted);
        QCOMPARE(volumes.at(1).mountPoint + ' ' + QString::number(volumes.at(1).volumeId), "/card 2");
        m_image->writeFile("card/user/big.jpg", QByteArray(400, 'b'));
        m_state->filesChanged();
        QCOMPARE(m_state->volumes().at(1).freeSpace, 0u); // full, never negative

        _DirectoryInfo root, user, system, card;
        QCOMPARE(m_state->fileSystemLevel(QStringLiteral("/"), root), 0);
        QCOMPARE(texts(root.directories, [](const auto& d) { return d->Path(); }),
                 (QStringList {"/shared", "/sys", "/user", "/usermod"}));
        QCOMPARE(m_state->fileSystemLevel(QStringLiteral("/user/"), user), 0);
        QCOMPARE(user.Path(), "/user");
        QCOMPARE(files(user), (QStringList {"/user/.hidden rw-h 1", "/user/notes.txt rw- 5"}));
        QCOMPARE(m_state->fileSystemLevel(QStringLiteral("/sys/mod/sysm"), system), 0);
        QCOMPARE(files(system).last(), "/sys/mod/sysm/sysm.mod r-xs 100");
        QCOMPARE(m_state->fileSystemLevel(QStringLiteral("/card"), card), 0);
        QCOMPARE(card.Name() + ' ' + card.directories.first()->Path(), "/card /card/user");

        const struct { const char* path; qint32 result; } refusals[] = {
            {"/user/notes.txt", PortlexError::NotFound}, {"/nothing", PortlexError::NotFound},
            {"/user/..", PortlexError::PathRefused}, {"user", PortlexError::PathRefused}};
        for (const auto& refusal : refusals) {
            _DirectoryInfo level;
            QCOMPARE(m_state->fileSystemLevel(QLatin1String(refusal.path), level), refusal.result);
        }
    }

    void enablementAndLocks()
    {
        QVERIFY(load());
        QString mode, owner, expiry;
        QCOMPARE(m_state->tepStatus(mode, owner, expiry), EnablementEnabled);
        QCOMPARE((QStringList {mode, owner, expiry}),
                 (QStringList {"Developer Enabled Service", "Tester", "Sun Sep 19 20:00:00 2027"}));
        QCOMPARE(m_state->globalTestSigStatus(mode, owner, expiry), EnablementDisabled);
        QCOMPARE(texts(m_state->tepPriviledges(), [](const PriviledgeRecord& p) { return p.id + ' ' + p.name; }),
                 (QStringList {"0x00000011 FileReadUser", "0x12345678 not found"}));

        // A lock flag locks only its own mode, before the request that carries it is answered.
        QCOMPARE(handle(Operation::Connect).result, 0);
        const auto status = [this](Protocol::RequestFlags flags) { return decoded<qint32>(handle(Operation::TepStatus, {}, flags).body); };
        QCOMPARE(status(Protocol::SignatureLockRequest), qint32(EnablementEnabled));
        QCOMPARE(status(Protocol::ServiceLockRequest), qint32(EnablementDisabled));
        QVERIFY(m_state->tepPriviledges().isEmpty());
    }

    void malformedAndRefusedRequests()
    {
        QVERIFY(load());
        QCOMPARE(handle(Operation::Connect).result, 0);
        QByteArray escaping;
        PayloadStream out(&escaping);
        out << QStringLiteral("/../..");
        QCOMPARE(handle(Operation::GetChildSettings).result, qint32(PortlexError::BadRequest));
        QCOMPARE(handle(Operation::GetFileSystemLevel, QByteArray("\xff\xff\xff", 3)).result, qint32(PortlexError::BadRequest));
        QCOMPARE(handle(Operation::GetFileSystemLevel, escaping).result, qint32(PortlexError::PathRefused));
        QCOMPARE(handle(Operation(9999)).result, qint32(PortlexError::UnknownOperation));

        m_handler->refuseConnect(1106, QStringLiteral("Device busy"));
        const Answer refused = handle(Operation::Connect, {}, {}, 2);
        QCOMPARE(QString::number(refused.result) + ' ' + decoded<QString>(refused.body), "1106 Device busy");
        QCOMPARE(handle(Operation::GetModules).result, 0); // only Connect is refused
    }

    // The committed samples load and hang together; their exact contents are theirs to change.
    void sampleImages()
    {
        for (const char* name : {"simulator", "handset"}) {
            DeviceState state;
            const QString image = QStringLiteral(DELVIX_SAMPLES_DIR "/devices/") + name;
            QVERIFY2(state.load(image, QCoreApplication::applicationDirPath()), qPrintable(state.errorString()));
            QVERIFY(QRegularExpression(QStringLiteral("^[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9]\\d \\d\\d:\\d\\d:\\d\\d \\d{4}$"))
                        .match(state.profile().enablement.expires).hasMatch());
            QVERIFY(!state.modules().isEmpty());
            for (const ModuleInfo& module : state.modules()) {
                MifEntry entry;
                QCOMPARE(state.moduleMif(module.path, entry), 0);
                QVERIFY2(!entry.classes.isEmpty(), qPrintable(module.path));
            }
            const DeviceCache cache = state.cache();
            const auto available =
                std::count_if(cache.classes.cbegin(), cache.classes.cend(), [](const IdRecord& r) { return r.available; });
            QVERIFY(available > 0 && available < cache.classes.size()); // some classes are known but missing
        }
    }
};

QTEST_GUILESS_MAIN(TestDeviceImage)
#include "tst_deviceimage.moc"
