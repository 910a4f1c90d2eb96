#include "DeviceProfileParser.h"
#include "DeviceState.h"
#include "PortlexErrors.h"
#include "TestImage.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QRegularExpression>
#include <QtTest>

class TestDeviceImage : public QObject
{
    Q_OBJECT

private slots:
    void profileRefused_data();
    void profileRefused();
    void profileValues();
    void modulesFromMifs();
    void classesFromPlatformAndModules();
    void registryFromMimeRecords();
    void installedModuleChangesEverything();
    void settingsTree();
    void volumesAndLevels();
    void enablementAndLocks();
    void sampleImages_data();
    void sampleImages();

private:
    static QString names() { return QCoreApplication::applicationDirPath(); }
    static QByteArray withVolume(const QByteArray& extra)
    {
        return "<device id=\"d\" name=\"n\">" + extra + "</device>";
    }
};

static const QByteArray Volume = R"(<volume id="1" mount="/" folder="flash" size="10"/>)";

void TestDeviceImage::profileRefused_data()
{
    QTest::addColumn<QByteArray>("xml");
    QTest::newRow("not xml") << QByteArray("<device");
    QTest::newRow("wrong root") << QByteArray("<phone id=\"d\" name=\"n\">") + Volume + "</phone>";
    QTest::newRow("id with slash") << QByteArray("<device id=\"a/b\" name=\"n\">") + Volume + "</device>";
    QTest::newRow("id dot dot") << QByteArray("<device id=\"..\" name=\"n\">") + Volume + "</device>";
    QTest::newRow("no name") << QByteArray("<device id=\"d\">") + Volume + "</device>";
    QTest::newRow("bad connection") << QByteArray("<device id=\"d\" name=\"n\" connection=\"wifi\">") + Volume + "</device>";
    QTest::newRow("no volume") << withVolume("");
    QTest::newRow("volume without id") << withVolume(R"(<volume mount="/" folder="f"/>)");
    QTest::newRow("volume id twice") << withVolume(Volume + R"(<volume id="1" mount="/c" folder="c"/>)");
    QTest::newRow("mount twice") << withVolume(Volume + R"(<volume id="2" mount="/" folder="c"/>)");
    QTest::newRow("relative mount") << withVolume(R"(<volume id="1" mount="c" folder="f"/>)");
    QTest::newRow("mount with dot dot") << withVolume(R"(<volume id="1" mount="/a/../b" folder="f"/>)");
    QTest::newRow("mount with trailing slash") << withVolume(R"(<volume id="1" mount="/a/" folder="f"/>)");
    QTest::newRow("folder dot dot") << withVolume(R"(<volume id="1" mount="/" folder=".."/>)");
    QTest::newRow("folder with slash") << withVolume(R"(<volume id="1" mount="/" folder="a/b"/>)");
    QTest::newRow("module folder out") << withVolume(R"(<volume id="1" mount="/" folder="f" modules="../x" install="../x"/>)");
    QTest::newRow("nested module folders") << withVolume(R"(<volume id="1" mount="/" folder="f" modules="usermod/games usermod"/>)");
    QTest::newRow("module folder twice") << withVolume(R"(<volume id="1" mount="/" folder="f" modules="usermod usermod"/>)");
    QTest::newRow("install not a module folder") << withVolume(R"(<volume id="1" mount="/" folder="f" modules="a" install="b"/>)");
    QTest::newRow("size not a number") << withVolume(R"(<volume id="1" mount="/" folder="f" size="12abc"/>)");
    QTest::newRow("reserved above size") << withVolume(R"(<volume id="1" mount="/" folder="f" size="10" reserved="11"/>)");
    QTest::newRow("flag not yes or no") << withVolume(R"(<volume id="1" mount="/" folder="f" removable="true"/>)");
    QTest::newRow("settings name with slash") << withVolume(Volume + R"(<settings><node name="a/b"/></settings>)");
    QTest::newRow("settings name twice") << withVolume(Volume + R"(<settings><node name="a"/><node name="a"/></settings>)");
    QByteArray deep = "<settings>";
    for (int i = 0; i <= DeviceProfileParser::MaxSettingsDepth + 1; ++i)
        deep += "<node name=\"n\">";
    for (int i = 0; i <= DeviceProfileParser::MaxSettingsDepth + 1; ++i)
        deep += "</node>";
    QTest::newRow("settings too deep") << withVolume(Volume + deep + "</settings>");
    QTest::newRow("process without name") << withVolume(Volume + R"(<processes><process/></processes>)");
    QTest::newRow("interval too short") << withVolume(Volume + R"(<processes interval="10"/>)");
    QTest::newRow("transient without life") << withVolume(Volume + R"(<processes><transient name="t" lifetime="0"/></processes>)");
    QTest::newRow("bad enablement") << withVolume(Volume + R"(<enablement mode="forever"/>)");
    QTest::newRow("platform class without id") << withVolume(Volume + R"(<platform><class/></platform>)");
}

void TestDeviceImage::profileRefused()
{
    QFETCH(QByteArray, xml);
    DeviceProfileParser parser;
    DeviceProfile profile;
    QVERIFY(!parser.parse(xml, profile));
    QVERIFY(!parser.errorString().isEmpty());
}

void TestDeviceImage::profileValues()
{
    DeviceProfileParser parser;
    DeviceProfile profile;
    QVERIFY2(parser.parse(TestImage::defaultProfile(), profile), qPrintable(parser.errorString()));
    QCOMPARE(profile.displayName(), QStringLiteral("Zantro Simulator - Test"));
    QCOMPARE(profile.data.phoneName, QStringLiteral("Test Phone"));
    QCOMPARE(profile.data.hardwareValue(QStringLiteral("Manufacturer"), QString()), QStringLiteral("Test Maker"));
    QCOMPARE(profile.data.audio.value(QStringLiteral("MP3")), QStringLiteral("Yes"));
    QCOMPARE(profile.data.video.value(QStringLiteral("H.263")), QStringLiteral("No"));
    QCOMPARE(profile.volumes.size(), 2);
    QCOMPARE(profile.volumes.at(0).moduleFolders, (QStringList{QStringLiteral("sys/mod"), QStringLiteral("usermod")}));
    QCOMPARE(profile.volumes.at(1).moduleFolders, QStringList{QStringLiteral("usermod")});
    QVERIFY(profile.volumes.at(1).removable);

    // Numbers are decimal or 0x-hexadecimal, never octal; ids are brought to one form.
    QVERIFY(parser.parse(withVolume(R"(<volume id="010" mount="/" folder="f" size="0x20"/>
        <platform><class id="0xabc"/></platform><device/>)"), profile));
    QCOMPARE(profile.volumes.at(0).id, 10u);
    QCOMPARE(profile.volumes.at(0).size, 32u);
    QCOMPARE(profile.platformClasses.at(0).id, QStringLiteral("0x00000ABC"));

    QVERIFY(parser.parse("<device id=\"d\" name=\"K\" connection=\"usb\">" + Volume + "</device>", profile));
    QCOMPARE(profile.displayName(), QStringLiteral("Zantro USB Device: K"));
    QCOMPARE(profile.connectionText(), QStringLiteral("USB"));
}

void TestDeviceImage::modulesFromMifs()
{
    TestImage image;
    image.fillDefault();
    image.addModule(QStringLiteral("card/usermod/deep/er"), TestImage::module(QStringLiteral("CardMod"), {0x01014001}));
    QVERIFY(QFile::rename(image.path() + QStringLiteral("/card/usermod/deep/er/CardMod.mif"),
                          image.path() + QStringLiteral("/card/usermod/deep/er/CardMod.MIF")));
    image.writeFile(QStringLiteral("flash/usermod/broken/broken.mif"), "not a mif at all");
    image.writeFile(QStringLiteral("flash/user/stray.mif"), QByteArray()); // not in a module folder
    QVERIFY(QFile::link(image.path() + QStringLiteral("/flash/usermod/userm/userm.mif"),
                        image.path() + QStringLiteral("/flash/usermod/linked.mif")));

    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));
    const QVector<ModuleInfo> modules = state.modules();
    QStringList paths;
    for (const ModuleInfo& m : modules)
        paths << m.path;
    QCOMPARE(paths, (QStringList{QStringLiteral("/sys/mod/sysm/sysm.mif"), QStringLiteral("/usermod/broken/broken.mif"),
                                 QStringLiteral("/usermod/userm/userm.mif"), QStringLiteral("/card/usermod/deep/er/CardMod.MIF")}));

    const ModuleInfo& user = modules.at(2);
    QCOMPARE(user.name, QStringLiteral("userm"));
    QCOMPARE(user.version, QStringLiteral("1.2.3"));
    QCOMPARE(user.type, quint32(ModuleInfo::Application | ModuleInfo::Preinstalled));
    QCOMPARE(user.signature, quint32(ModuleInfo::DeveloperSigned));
    QCOMPARE(user.copyright, QStringLiteral("(c) Test"));
    QVERIFY(user.size > 100); // code, MIF and sidecar
    QCOMPARE(modules.at(1).version, QString()); // no sidecar

    MifEntry byPath;
    MifEntry byCode;
    MifEntry byName;
    QCOMPARE(state.moduleMif(QStringLiteral("/usermod/userm/userm.mif"), byPath), 0);
    QCOMPARE(state.moduleMif(QStringLiteral("/usermod/userm/userm.mod"), byCode), 0);
    QCOMPARE(state.moduleMif(QStringLiteral("userm"), byName), 0);
    QCOMPARE(byPath.classes, (QVector<quint32>{0x01013001, 0x7F000001}));
    QCOMPARE(byPath.classCount, quint16(2));
    QCOMPARE(byPath.mimeTypes.size(), 2);
    QCOMPARE(byPath.filePath, QStringLiteral("/usermod/userm/userm.mif"));
    QCOMPARE(byPath.fileName, QStringLiteral("userm.mif"));
    QCOMPARE(byCode, byPath);
    QCOMPARE(byName, byPath);

    MifEntry entry;
    QCOMPARE(state.moduleMif(QStringLiteral("/usermod/broken/broken.mif"), entry), qint32(PortlexError::IoError));
    QCOMPARE(state.moduleMif(QStringLiteral("/usermod/linked.mif"), entry), qint32(PortlexError::NotFound));
    QCOMPARE(state.moduleMif(QStringLiteral("nothing"), entry), qint32(PortlexError::NotFound));
}

void TestDeviceImage::classesFromPlatformAndModules()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));
    const DeviceCache cache = state.cache();
    QVERIFY(cache.filled);
    QCOMPARE(cache.deviceName, QStringLiteral("Zantro Simulator - Test"));
    QCOMPARE(cache.connectionKind, QStringLiteral("Simulator"));
    QCOMPARE(cache.platform.name, QStringLiteral("Test Platform"));
    QCOMPARE(cache.deviceData.targetId, QStringLiteral("0x01020304"));
    QCOMPARE(cache.classes.keys(), (QStringList{QStringLiteral("0x01011001"), QStringLiteral("0x01011002"), QStringLiteral("0x01012001"),
                                                QStringLiteral("0x01013001"), QStringLiteral("0x7F000001")}));

    const IdRecord builtIn = cache.classes.value(QStringLiteral("0x01011001"));
    QVERIFY(builtIn.available);
    QCOMPARE(builtIn.source, QStringLiteral("core"));
    QCOMPARE(builtIn.name, QStringLiteral("Heap")); // named from ClassDB.xml beside the test

    const IdRecord notShipped = cache.classes.value(QStringLiteral("0x01011002"));
    QVERIFY(!notShipped.available);
    QVERIFY(notShipped.source.isEmpty());

    const IdRecord fromSystemModule = cache.classes.value(QStringLiteral("0x01012001"));
    QVERIFY(fromSystemModule.available);
    QCOMPARE(fromSystemModule.source, QStringLiteral("/sys/mod/sysm/sysm.mif"));
    QCOMPARE(fromSystemModule.path, QStringLiteral("/sys/mod/sysm"));

    const IdRecord onlyInModule = cache.classes.value(QStringLiteral("0x7F000001"));
    QVERIFY(onlyInModule.available);
    QCOMPARE(onlyInModule.name, QStringLiteral("not found"));
    QCOMPARE(onlyInModule.source, QStringLiteral("/usermod/userm/userm.mif"));

    QCOMPARE(cache.interfaces.keys(), QStringList{QStringLiteral("0x02011001")});
    QCOMPARE(cache.interfaces.first().name, QStringLiteral("IBase"));
}

void TestDeviceImage::registryFromMimeRecords()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));
    const QVector<RegistryInfo> registry = state.registry();
    QCOMPARE(registry.size(), 3);

    // The system module claims text/plain first: active and restricted. The user module's
    // claim of the same type (in other letter case) is the second, inactive one.
    QCOMPARE(registry.at(0).mimeType, QStringLiteral("text/plain"));
    QCOMPARE(registry.at(0).handlerClassId, 0x01012001u);
    QCOMPARE(registry.at(0).baseClassId, 0x01011001u);
    QVERIFY(registry.at(0).active);
    QVERIFY(registry.at(0).restricted);
    QCOMPARE(registry.at(0).priority, 0u);
    QCOMPARE(registry.at(0).moduleId, state.modules().at(0).moduleId);

    QCOMPARE(registry.at(1).mimeType, QStringLiteral("TEXT/plain"));
    QVERIFY(!registry.at(1).active);
    QVERIFY(!registry.at(1).restricted);
    QCOMPARE(registry.at(1).priority, 1u);

    QCOMPARE(registry.at(2).mimeType, QStringLiteral("image/png"));
    QVERIFY(registry.at(2).active);
    QVERIFY(!registry.at(2).restricted);
}

void TestDeviceImage::installedModuleChangesEverything()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));
    QVERIFY(!state.cache().classes.value(QStringLiteral("0x01011002")).available);
    const quint64 freeBefore = state.volumes().at(0).freeSpace;

    image.addModule(QStringLiteral("flash/usermod/pager"),
                    TestImage::module(QStringLiteral("pager"), {0x01011002}, {{0x01011002, 0x01011001, QStringLiteral("application/x-page")}}));
    QCOMPARE(state.modules().size(), 2); // nothing changes until the device is told
    state.filesChanged();

    QCOMPARE(state.modules().size(), 3);
    const IdRecord record = state.cache().classes.value(QStringLiteral("0x01011002"));
    QVERIFY(record.available);
    QCOMPARE(record.source, QStringLiteral("/usermod/pager/pager.mif"));
    QCOMPARE(state.registry().at(1).mimeType, QStringLiteral("application/x-page")); // "pager" sorts before "userm"
    QVERIFY(state.volumes().at(0).freeSpace < freeBefore);
}

void TestDeviceImage::settingsTree()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));

    _SettingsInfo root(QString(), QStringLiteral("/"));
    QCOMPARE(state.childSettings(QStringLiteral("/"), root), 0);
    QCOMPARE(root.Name(), QStringLiteral("/"));
    QCOMPARE(root.values.size(), 1);
    QCOMPARE(root.children.size(), 2);
    QCOMPARE(root.children.at(0)->Name(), QStringLiteral("appinfo"));
    QCOMPARE(root.children.at(0)->Path(), QStringLiteral("/appinfo"));
    QCOMPARE(root.children.at(1)->Path(), QStringLiteral("/CSA_REMOVAL"));

    _SettingsInfo appinfo(QString(), QStringLiteral("/appinfo"));
    QCOMPARE(state.childSettings(QStringLiteral("/appinfo"), appinfo), 0);
    QCOMPARE(appinfo.values, (QVector<QPair<QString, QString>>{{QStringLiteral("count"), QStringLiteral("2")},
                                                               {QStringLiteral("owner"), QStringLiteral("test")}}));
    QCOMPARE(appinfo.children.size(), 2);
    QCOMPARE(appinfo.children.at(0)->Path(), QStringLiteral("/appinfo/calc"));

    _SettingsInfo calc;
    QCOMPARE(state.childSettings(QStringLiteral("/appinfo/calc"), calc), 0);
    QCOMPARE(calc.values.first().second, QStringLiteral("1.0"));
    QVERIFY(calc.children.isEmpty());

    _SettingsInfo missing;
    QCOMPARE(state.childSettings(QStringLiteral("/appinfo/nothing"), missing), qint32(PortlexError::NotFound));
    QCOMPARE(state.childSettings(QStringLiteral("appinfo"), missing), qint32(PortlexError::NotFound));
}

void TestDeviceImage::volumesAndLevels()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));

    qint64 used = 0;
    QDirIterator it(image.path() + QStringLiteral("/flash"), QDir::Files | QDir::Hidden, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        it.next();
        used += it.fileInfo().size();
    }
    const QList<VolumeInfo> volumes = state.volumes();
    QCOMPARE(volumes.size(), 2);
    QCOMPARE(volumes.at(0).mountPoint, QStringLiteral("/"));
    QCOMPARE(volumes.at(0).volumeSize, 1000000u);
    QCOMPARE(volumes.at(0).freeSpace, quint64(1000000 - 1000 - used));
    QCOMPARE(volumes.at(1).freeSpace, 300u); // 500 bytes, a 200-byte photo
    QVERIFY(volumes.at(1).removable);
    QVERIFY(volumes.at(1).mounted);
    QCOMPARE(volumes.at(1).volumeId, 2u);

    image.writeFile(QStringLiteral("card/user/big.jpg"), QByteArray(400, 'b'));
    state.filesChanged();
    QCOMPARE(state.volumes().at(1).freeSpace, 0u); // full, never negative

    _DirectoryInfo root;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/"), root), 0);
    QCOMPARE(root.Path(), QStringLiteral("/"));
    QStringList directories;
    for (const auto& d : root.directories)
        directories << d->Path();
    QCOMPARE(directories, (QStringList{QStringLiteral("/shared"), QStringLiteral("/sys"), QStringLiteral("/user"), QStringLiteral("/usermod")}));

    _DirectoryInfo user;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/user/"), user), 0);
    QCOMPARE(user.Name(), QStringLiteral("user"));
    QCOMPARE(user.Path(), QStringLiteral("/user"));
    QCOMPARE(user.files.size(), 2);
    QCOMPARE(user.files.at(0)->Name(), QStringLiteral(".hidden"));
    QCOMPARE(user.files.at(0)->Attributes(), QStringLiteral("rw-h"));
    QCOMPARE(user.files.at(1)->Path(), QStringLiteral("/user/notes.txt"));
    QCOMPARE(user.files.at(1)->size, 5u);

    _DirectoryInfo system;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/sys/mod/sysm"), system), 0);
    QCOMPARE(system.files.size(), 3);
    QCOMPARE(system.files.at(2)->Name(), QStringLiteral("sysm.mod"));
    QCOMPARE(system.files.at(2)->Attributes(), QStringLiteral("r-xs"));

    _DirectoryInfo cardRoot;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/card"), cardRoot), 0);
    QCOMPARE(cardRoot.Name(), QStringLiteral("/card"));
    QCOMPARE(cardRoot.directories.first()->Path(), QStringLiteral("/card/user"));

    _DirectoryInfo level;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/user/notes.txt"), level), qint32(PortlexError::NotFound));
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/nothing"), level), qint32(PortlexError::NotFound));
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/user/.."), level), qint32(PortlexError::PathRefused));
    QCOMPARE(state.fileSystemLevel(QStringLiteral("user"), level), qint32(PortlexError::PathRefused));
}

void TestDeviceImage::enablementAndLocks()
{
    TestImage image;
    image.fillDefault();
    DeviceState state;
    QVERIFY2(state.load(image.path(), names()), qPrintable(state.errorString()));

    QString mode, owner, expiry;
    QCOMPARE(state.tepStatus(mode, owner, expiry), EnablementEnabled);
    QCOMPARE(mode, QStringLiteral("Developer Enabled Service"));
    QCOMPARE(owner, QStringLiteral("Tester"));
    QCOMPARE(expiry, QStringLiteral("Sun Sep 19 20:00:00 2027"));
    QCOMPARE(state.globalTestSigStatus(mode, owner, expiry), EnablementDisabled);

    const QVector<PriviledgeRecord> privileges = state.tepPriviledges();
    QCOMPARE(privileges.size(), 2);
    QCOMPARE(privileges.at(0).id, QStringLiteral("0x00000011"));
    QCOMPARE(privileges.at(0).name, QStringLiteral("FileReadUser"));
    QCOMPARE(privileges.at(1).name, QStringLiteral("not found"));

    state.lockSignature(); // the other mode: no effect on the service
    QCOMPARE(state.tepStatus(mode, owner, expiry), EnablementEnabled);
    state.lockService();
    QCOMPARE(state.tepStatus(mode, owner, expiry), EnablementDisabled);
    QVERIFY(state.tepPriviledges().isEmpty());
}

void TestDeviceImage::sampleImages_data()
{
    QTest::addColumn<QString>("image");
    QTest::addColumn<QString>("displayName");
    QTest::addColumn<int>("mode");
    QTest::newRow("simulator") << "simulator" << "Zantro Simulator - Aurora" << int(EnablementSpec::Mode::Service);
    QTest::newRow("handset") << "handset" << "Zantro USB Device: Kestrel K7" << int(EnablementSpec::Mode::Signature);
}

void TestDeviceImage::sampleImages()
{
    QFETCH(QString, image);
    QFETCH(QString, displayName);
    QFETCH(int, mode);

    DeviceState state;
    QVERIFY2(state.load(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/") + image, names()), qPrintable(state.errorString()));
    const DeviceProfile& profile = state.profile();
    QCOMPARE(profile.displayName(), displayName);
    QCOMPARE(int(profile.enablement.mode), mode);
    QVERIFY(QRegularExpression(QStringLiteral("^[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9]\\d \\d\\d:\\d\\d:\\d\\d \\d{4}$"))
                .match(profile.enablement.expires).hasMatch());

    const DeviceData& data = profile.data;
    for (const QString& text : {data.phoneName, data.targetId, data.zantVersion, data.zantBuildNumber, data.staticBuildId,
                                data.dynamicBuildId, data.componentServicesBuild})
        QVERIFY(!text.isEmpty());
    for (const char* key : {"Manufacturer", "Model", "Firmware", "PlatformID", "MobileID", "ChipID", "IMEI", "HWID", "QXEVersion",
                            "ColorDepth", "cxScreen", "cyScreen", "FlipPhone", "Vibrate", "LocationSupport", "PenSupport",
                            "DeviceMDN", "RUIMID", "DeviceIDHash", "HeapMemory", "HeapFree", "FSTotal", "FSAvail"})
        QVERIFY2(data.hardware.contains(QLatin1String(key)), key);
    QVERIFY(!data.audio.isEmpty() && !data.image.isEmpty() && !data.video.isEmpty());

    QStringList branches;
    for (const SettingsNodeSpec& node : profile.settings.children)
        branches << node.name;
    for (const char* branch : {"appinfo", "ztoversion", "oattest", "CSA_NORMAL", "CSA_REMOVAL"})
        QVERIFY2(branches.contains(QLatin1String(branch)), branch);

    QVERIFY(state.modules().size() >= 30);
    int exportingModules = 0;
    for (const ModuleInfo& module : state.modules()) {
        MifEntry entry;
        QCOMPARE(state.moduleMif(module.path, entry), 0);
        exportingModules += entry.classes.isEmpty() ? 0 : 1;
    }
    QCOMPARE(exportingModules, state.modules().size());
    QVERIFY(state.registry().size() >= 20);

    const DeviceCache cache = state.cache();
    int available = 0;
    for (const IdRecord& record : cache.classes)
        available += record.available ? 1 : 0;
    QVERIFY(available > 100);
    QVERIFY(available < cache.classes.size()); // some classes are known but missing

    for (const char* folder : {"/user", "/usermod", "/shared", "/err"}) {
        _DirectoryInfo level;
        QCOMPARE(state.fileSystemLevel(QLatin1String(folder), level), 0);
    }
    QVERIFY(!state.processes().isEmpty());
    QVERIFY(!state.loadedModules().first().modules.isEmpty());
    if (profile.enablement.mode == EnablementSpec::Mode::Service)
        QVERIFY(state.tepPriviledges().size() >= 10);
}

QTEST_GUILESS_MAIN(TestDeviceImage)
#include "tst_deviceimage.moc"
