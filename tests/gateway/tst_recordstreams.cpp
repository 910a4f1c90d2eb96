#include "PayloadStream.h"
#include "RecordStreams.h"

#include <QSet>
#include <QtTest>

namespace {

template <typename T>
QByteArray encode(const T& value)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    out << value;
    return bytes;
}

// Writes value, reads it back and checks that it is the same record and that every
// shorter prefix of its bytes is refused.
template <typename T>
void checkRoundTrip(const T& value)
{
    const QByteArray bytes = encode(value);
    T back;
    PayloadStream in(bytes);
    in >> back;
    QVERIFY(in.ok());
    QVERIFY(in.atEnd());
    QVERIFY(back == value);
    for (int cut = 0; cut < bytes.size(); ++cut) {
        T partial;
        PayloadStream truncated(bytes.left(cut));
        truncated >> partial;
        QVERIFY2(!truncated.ok(), qPrintable(QStringLiteral("accepted %1 of %2 bytes").arg(cut).arg(bytes.size())));
    }
}

QSharedPointer<_SettingsInfo> settingsChain(int depth)
{
    auto root = QSharedPointer<_SettingsInfo>::create(QStringLiteral("n0"), QStringLiteral("/n0"));
    auto node = root;
    for (int i = 1; i < depth; ++i) {
        auto child = QSharedPointer<_SettingsInfo>::create(QStringLiteral("n%1").arg(i), node->Path() + QStringLiteral("/n%1").arg(i));
        node->children << child;
        node = child;
    }
    return root;
}

} // namespace

class RecordStreamsTest : public QObject
{
    Q_OBJECT

private slots:
    void queryRecordsRoundTrip();
    void treeRecordsRoundTrip();
    void coreRecordsRoundTrip();
    void hostileInputIsRefused();
    void volumesWorkInSets();
    void moduleDisplayTexts_data();
    void moduleDisplayTexts();
};

void RecordStreamsTest::queryRecordsRoundTrip()
{
    ModuleInfo module;
    module.name = QStringLiteral("Mediaplayer");
    module.type = ModuleInfo::Application | ModuleInfo::Preinstalled;
    module.signature = ModuleInfo::MakerSigned;
    module.path = QStringLiteral("/usermod/mediaplayer/mediaplayer.mif");
    module.version = QStringLiteral("3.1.0");
    module.copyright = QString::fromUtf8("© Norvale");
    module.size = 123456;
    module.moduleId = 77;
    checkRoundTrip(module);

    RegistryInfo registry;
    registry.mimeType = QStringLiteral("audio/x-zmf");
    registry.baseClassId = 0x01001000;
    registry.handlerClassId = 0x01002000;
    registry.priority = 2;
    registry.moduleId = 77;
    registry.active = true;
    checkRoundTrip(registry);

    ProcessInfo process;
    process.name = QStringLiteral("shell");
    process.id = 12;
    ThreadEntry thread;
    thread.name = QStringLiteral("ui");
    thread.id = 13;
    thread.priority = 250;
    thread.state = 3;
    thread.processId = 12;
    thread.cpuTimeMs = 0x100000000ULL;
    process.threads << thread << ThreadEntry();
    checkRoundTrip(process);

    LoadedModuleInfo loaded;
    loaded.name = QStringLiteral("shell");
    loaded.id = 12;
    LoadedModuleEntry entry;
    entry.name = QStringLiteral("core.mod");
    entry.location = QStringLiteral("/sys/core.mod");
    entry.size = 4096;
    entry.id = 5;
    entry.baseAddress = 0x80000000;
    entry.refCount = 2;
    loaded.modules << entry;
    checkRoundTrip(loaded);

    VolumeInfo volume;
    volume.friendlyName = QStringLiteral("Internal");
    volume.mountPoint = QStringLiteral("fs:/");
    volume.volumeSize = 0x200000000ULL;
    volume.freeSpace = 1;
    volume.mounted = true;
    volume.removable = true;
    volume.volumeId = 0xFFFFFFFF;
    checkRoundTrip(volume);

    PriviledgeRecord privilege { QStringLiteral("0x0100"), QStringLiteral("PL_FILE"), QStringLiteral("File"), QString() };
    checkRoundTrip(privilege);
}

void RecordStreamsTest::treeRecordsRoundTrip()
{
    _SettingsInfo settings(QStringLiteral("appinfo"), QStringLiteral("/appinfo"));
    settings.values << qMakePair(QStringLiteral("vendor"), QStringLiteral("Norvale")) << qMakePair(QString(), QString());
    settings.children << QSharedPointer<_SettingsInfo>::create(QStringLiteral("cache"), QStringLiteral("/appinfo/cache"));
    checkRoundTrip(settings);
    checkRoundTrip(*settingsChain(MaxRecordNesting));

    _DirectoryInfo level(QStringLiteral("user"), QStringLiteral("fs:/user"));
    level.files << QSharedPointer<_FileInfo>::create(QStringLiteral("a.txt"), QStringLiteral("fs:/user/a.txt"), QStringLiteral("rw-"), 0x1FFFFFFFFULL);
    level.directories << QSharedPointer<_DirectoryInfo>::create(QStringLiteral("usermod"), QStringLiteral("fs:/user/usermod"));
    checkRoundTrip(level);

    // A null child cannot travel; it arrives as an empty record, never as null.
    _DirectoryInfo withNull;
    withNull.files << QSharedPointer<_FileInfo>();
    _DirectoryInfo back;
    PayloadStream in(encode(withNull));
    in >> back;
    QVERIFY(in.ok());
    QCOMPARE(back.files.size(), 1);
    QVERIFY(back.files.first());
    QCOMPARE(*back.files.first(), _FileInfo());
}

void RecordStreamsTest::coreRecordsRoundTrip()
{
    MifEntry mif;
    mif.kind = 0x5000;
    mif.fileName = QStringLiteral("player.mif");
    mif.filePath = QStringLiteral("/usermod/player/player.mif");
    mif.classCount = 9;  // as stored, not recomputed
    mif.appletCount = 1;
    mif.classes << 0x01001000 << 0x01001001;
    MifApplet applet;
    applet.classId = 0x01001000;
    applet.name = QStringLiteral("Player");
    applet.baseId = 0x10;
    applet.appType = 2;
    applet.host = 0xABCDEF01;
    applet.privSet = 7;
    applet.flags = 0x8000;
    mif.applets << applet;
    mif.externalClasses << 0x0100F000;
    mif.notifiers << MifNotifier { 1, 2, 0xFFFFFFFF };
    mif.mimeTypes << MifMimeType { 0x01001000, 0x01000001, QStringLiteral("audio/x-zmf") };
    mif.header = QByteArray(40, '\x5A');
    checkRoundTrip(mif);

    DeviceCache cache;
    cache.filled = true;
    cache.deviceName = QStringLiteral("Zantro Simulator - Aurora");
    cache.connectionKind = QStringLiteral("Simulator");
    cache.platform = { QStringLiteral("Aurora"), QStringLiteral("/platform") };
    IdRecord cls { QStringLiteral("0x01001000"), QStringLiteral("Player"), QStringLiteral("Media"), QStringLiteral("Audio"),
                   QStringLiteral("player.mod"), QStringLiteral("/usermod/player"), true };
    cache.classes.insert(cls.id, cls);
    cache.interfaces.insert(QStringLiteral("0x02000001"), IdRecord { QStringLiteral("0x02000001"), QStringLiteral("IFile"), {}, {}, {}, {}, false });
    cache.deviceData.phoneName = QStringLiteral("Aurora");
    cache.deviceData.targetId = QStringLiteral("ZS-001");
    cache.deviceData.componentServicesBuild = QStringLiteral("cs-7");
    cache.deviceData.hardware.insert(QStringLiteral("Display Width"), QStringLiteral("240"));
    cache.deviceData.video.insert(QStringLiteral("video/mp4"), QStringLiteral("yes"));

    const QByteArray bytes = encode(cache);
    DeviceCache back;
    PayloadStream in(bytes);
    in >> back;
    QVERIFY(in.ok());
    QVERIFY(in.atEnd());
    QCOMPARE(back.filled, true);
    QCOMPARE(back.deviceName, cache.deviceName);
    QCOMPARE(back.connectionKind, cache.connectionKind);
    QCOMPARE(back.platform.name, cache.platform.name);
    QCOMPARE(back.platform.directory, cache.platform.directory);
    QCOMPARE(back.classes, cache.classes);
    QCOMPARE(back.interfaces, cache.interfaces);
    QCOMPARE(back.deviceData.phoneName, cache.deviceData.phoneName);
    QCOMPARE(back.deviceData.targetId, cache.deviceData.targetId);
    QCOMPARE(back.deviceData.componentServicesBuild, cache.deviceData.componentServicesBuild);
    QCOMPARE(back.deviceData.hardware, cache.deviceData.hardware);
    QCOMPARE(back.deviceData.video, cache.deviceData.video);
    for (int cut = 0; cut < bytes.size(); ++cut) {
        DeviceCache partial;
        PayloadStream truncated(bytes.left(cut));
        truncated >> partial;
        QVERIFY(!truncated.ok());
    }
}

void RecordStreamsTest::hostileInputIsRefused()
{
    // A count of four billion modules backed by a few bytes: refused, nothing kept.
    QByteArray claim;
    {
        PayloadStream out(&claim);
        out << quint32(0xFFFFFFFF) << QStringLiteral("only one name");
    }
    QVector<ModuleInfo> modules { ModuleInfo() };
    PayloadStream in(claim);
    readList(in, modules);
    QVERIFY(!in.ok());
    QVERIFY(modules.isEmpty());

    // The same for a list of plain numbers inside a MIF entry.
    QByteArray mifBytes = encode(MifEntry());
    const int classesOffset = 4 + 4 + 4 + 5 * 2;  // kind, two null texts, five counts
    mifBytes.replace(classesOffset, 4, QByteArray("\xFF\xFF\xFF\xF0", 4));
    MifEntry mif;
    PayloadStream mifIn(mifBytes);
    mifIn >> mif;
    QVERIFY(!mifIn.ok());
    QVERIFY(mif.classes.isEmpty());

    // Trees one level deeper than allowed are corrupt, not a stack overflow.
    _SettingsInfo tooDeep;
    PayloadStream deepIn(encode(*settingsChain(MaxRecordNesting + 1)));
    deepIn >> tooDeep;
    QCOMPARE(deepIn.status(), QDataStream::ReadCorruptData);

    _DirectoryInfo deepDirectory;
    QByteArray nested = encode(_DirectoryInfo());
    for (int i = 0; i < 1000; ++i) {
        QByteArray outer;
        PayloadStream out(&outer);
        out << QString() << QString() << quint32(0) << quint32(1);
        outer += nested;
        nested = outer;
    }
    PayloadStream nestedIn(nested);
    nestedIn >> deepDirectory;
    QCOMPARE(nestedIn.status(), QDataStream::ReadCorruptData);

    // A text with an odd byte count cannot be UTF-16.
    QByteArray oddText;
    {
        PayloadStream out(&oddText);
        out << quint32(3);
        out.writeRawData("abc", 3);
    }
    VolumeInfo volume;
    PayloadStream textIn(oddText);
    textIn >> volume;
    QVERIFY(!textIn.ok());
}

void RecordStreamsTest::volumesWorkInSets()
{
    VolumeInfo a;
    a.mountPoint = QStringLiteral("fs:/");
    a.volumeId = 1;
    VolumeInfo same = a;
    VolumeInfo fuller = a;
    fuller.freeSpace = 10;
    VolumeInfo other = a;
    other.volumeId = 2;

    QCOMPARE(qHash(a, 7), qHash(same, 7));
    const QSet<VolumeInfo> set { a, same, fuller, other };
    QCOMPARE(set.size(), 3);
    QVERIFY(set.contains(fuller));
}

void RecordStreamsTest::moduleDisplayTexts_data()
{
    QTest::addColumn<quint32>("type");
    QTest::addColumn<quint32>("signature");
    QTest::addColumn<QString>("property");
    QTest::addColumn<QString>("sig");

    QTest::newRow("application, unsigned") << quint32(ModuleInfo::Application) << quint32(ModuleInfo::Unsigned) << "Application" << "Unsigned";
    QTest::newRow("library, system, maker") << quint32(ModuleInfo::Library | ModuleInfo::System) << quint32(ModuleInfo::MakerSigned)
                                            << "Library | System" << "Maker Signed";
    QTest::newRow("no flags, test signed") << quint32(0) << quint32(ModuleInfo::TestSigned) << "None" << "Test Signed";
    QTest::newRow("unknown bits kept visible") << quint32(ModuleInfo::Extension | 0x100) << quint32(ModuleInfo::DeveloperSigned)
                                               << "Extension | 0x100" << "Developer Signed";
    QTest::newRow("unknown signature") << quint32(ModuleInfo::Preinstalled) << quint32(42) << "Preinstalled" << "Unknown (42)";
}

void RecordStreamsTest::moduleDisplayTexts()
{
    QFETCH(quint32, type);
    QFETCH(quint32, signature);
    QFETCH(QString, property);
    QFETCH(QString, sig);
    ModuleInfo module;
    module.type = type;
    module.signature = signature;
    QCOMPARE(module.GetModuleProperty(), property);
    QCOMPARE(module.GetModuleSig(), sig);
}

QTEST_GUILESS_MAIN(RecordStreamsTest)
#include "tst_recordstreams.moc"
