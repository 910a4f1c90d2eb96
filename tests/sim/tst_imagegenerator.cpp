#include "DeviceState.h"
#include "ImageCopy.h"
#include "ImageGenerator.h"
#include "MifReader.h"
#include "SampleBuilder.h"

#include <QCoreApplication>
#include <QCryptographicHash>
#include <QDir>
#include <QDirIterator>
#include <QTemporaryDir>
#include <QtTest>

class TestImageGenerator : public QObject
{
    Q_OBJECT

private slots:
    void generatedImageHasTheRequestedSize();
    void sampleDescriptionBuildsModules();
    void sampleDescriptionStaysInsideTheImage_data();
    void sampleDescriptionStaysInsideTheImage();
    void committedSamplesMatchTheirDescriptions_data();
    void committedSamplesMatchTheirDescriptions();
    void imageCopyKeepsLinksAsLinks();

private:
    // Relative path to content hash of every file below folder.
    static QMap<QString, QByteArray> treeHashes(const QString& folder);
};

QMap<QString, QByteArray> TestImageGenerator::treeHashes(const QString& folder)
{
    QMap<QString, QByteArray> hashes;
    QDirIterator it(folder, QDir::Files | QDir::Hidden, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        QFile file(path);
        if (file.open(QIODevice::ReadOnly))
            hashes.insert(QDir(folder).relativeFilePath(path), QCryptographicHash::hash(file.readAll(), QCryptographicHash::Sha1));
    }
    return hashes;
}

void TestImageGenerator::generatedImageHasTheRequestedSize()
{
    QTemporaryDir dir;
    ImageGenerator::Counts counts;
    counts.modules = 230;
    counts.classes = 700;
    counts.files = 321;
    counts.processes = 9;
    ImageGenerator generator;
    QVERIFY2(generator.generate(dir.path(), counts), qPrintable(generator.errorString()));

    DeviceState state;
    QVERIFY2(state.load(dir.path(), QCoreApplication::applicationDirPath()), qPrintable(state.errorString()));
    QCOMPARE(state.modules().size(), 230);
    const DeviceCache cache = state.cache();
    QCOMPARE(cache.classes.size(), 700);
    for (const IdRecord& record : cache.classes)
        QVERIFY(record.available);
    QCOMPARE(state.registry().size(), 230);
    QCOMPARE(state.processes().size(), 9);

    _DirectoryInfo bulk;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/shared/bulk"), bulk), 0);
    QCOMPARE(bulk.files.size(), 321);

    // Fewer classes than modules: the first modules export one each, the rest none.
    QTemporaryDir small;
    counts = ImageGenerator::Counts();
    counts.modules = 5;
    counts.classes = 2;
    QVERIFY(generator.generate(small.path(), counts));
    DeviceState smallState;
    QVERIFY(smallState.load(small.path(), QCoreApplication::applicationDirPath()));
    QCOMPARE(smallState.modules().size(), 5);
    QCOMPARE(smallState.cache().classes.size(), 2);
    QCOMPARE(smallState.registry().size(), 2);
}

void TestImageGenerator::sampleDescriptionBuildsModules()
{
    QTemporaryDir dir;
    const QString description = dir.filePath(QStringLiteral("desc.xml"));
    QFile file(description);
    QVERIFY(file.open(QIODevice::WriteOnly));
    file.write(R"(<sample>
  <module volume="flash" folder="usermod/calc" name="calc" version="1.4.0" type="Application" signature="maker"
          copyright="(c) Calc" size="300">
    <class id="0x010A6001"/>
    <applet id="0x010A6001" baseId="5" appType="0x0005" host="0x00000001" privSet="0x0003" flags="0x0002"/>
    <external id="0x01011001"/>
    <notifier type="0x01015002" notifier="0x010A6001" mask="0x00000010"/>
    <mime type="application/x-calc" handler="0x010A6001" base="0x01011001"/>
  </module>
  <file path="flash/shared/filler.bin" size="1000"/>
  <text path="flash/user/readme.txt">
    hello &amp; welcome
  </text>
</sample>)");
    file.close();
    const QString image = dir.filePath(QStringLiteral("image"));
    SampleBuilder builder;
    QVERIFY2(builder.build(description, image), qPrintable(builder.errorString()));

    QCOMPARE(QFileInfo(image + QStringLiteral("/flash/usermod/calc/calc.mod")).size(), 300);
    QCOMPARE(QFileInfo(image + QStringLiteral("/flash/shared/filler.bin")).size(), 1000);
    QFile readme(image + QStringLiteral("/flash/user/readme.txt"));
    QVERIFY(readme.open(QIODevice::ReadOnly));
    QCOMPARE(readme.readAll(), QByteArray("hello & welcome\n"));

    QFile sidecar(image + QStringLiteral("/flash/usermod/calc/calc.inf"));
    QVERIFY(sidecar.open(QIODevice::ReadOnly));
    ModuleInfo info;
    ModuleCatalog::readSidecar(sidecar.readAll(), info);
    QCOMPARE(info.version, QStringLiteral("1.4.0"));
    QCOMPARE(info.type, quint32(ModuleInfo::Application));
    QCOMPARE(info.signature, quint32(ModuleInfo::MakerSigned));
    QCOMPARE(info.copyright, QStringLiteral("(c) Calc"));

    MifReader reader;
    MifEntry entry;
    QVERIFY(reader.readFile(image + QStringLiteral("/flash/usermod/calc/calc.mif")));
    QVERIFY(reader.decodeModule(entry));
    QCOMPARE(entry.classes, QVector<quint32>{0x010A6001});
    QCOMPARE(entry.externalClasses, QVector<quint32>{0x01011001});
    QCOMPARE(entry.appletCount, quint16(1));
    QCOMPARE(entry.applets.first().baseId, quint16(5));
    QCOMPARE(entry.applets.first().appType, quint16(5));
    QCOMPARE(entry.applets.first().host, 1u);
    QCOMPARE(entry.applets.first().flags, quint16(2));
    QCOMPARE(entry.notifiers.first().mask, 0x10u);
    QCOMPARE(entry.mimeTypes.first().mimeType, QStringLiteral("application/x-calc"));
    QCOMPARE(entry.mimeTypes.first().baseClassId, 0x01011001u);
}

void TestImageGenerator::sampleDescriptionStaysInsideTheImage_data()
{
    QTest::addColumn<QByteArray>("element");
    QTest::newRow("file dot dot") << QByteArray(R"(<file path="flash/../../escaped.bin" size="10"/>)");
    QTest::newRow("file absolute") << QByteArray(R"(<file path="/escaped.bin" size="10"/>)");
    QTest::newRow("text dot dot") << QByteArray(R"(<text path="../escaped.bin">x</text>)");
    QTest::newRow("module folder dot dot") << QByteArray(R"(<module volume="flash" folder="../.." name="escaped"/>)");
    QTest::newRow("module name with slash") << QByteArray(R"(<module volume="flash" folder="usermod" name="../escaped"/>)");
}

void TestImageGenerator::sampleDescriptionStaysInsideTheImage()
{
    QFETCH(QByteArray, element);
    QTemporaryDir dir;
    const QString description = dir.filePath(QStringLiteral("desc.xml"));
    QFile file(description);
    QVERIFY(file.open(QIODevice::WriteOnly));
    file.write("<sample>" + element + "</sample>");
    file.close();
    const QString image = dir.filePath(QStringLiteral("a/b/image"));
    SampleBuilder builder;
    QVERIFY(!builder.build(description, image));
    QVERIFY(!builder.errorString().isEmpty());
    QCOMPARE(treeHashes(dir.path()).keys(), QStringList{QStringLiteral("desc.xml")});
}

void TestImageGenerator::committedSamplesMatchTheirDescriptions_data()
{
    QTest::addColumn<QString>("name");
    QTest::newRow("simulator") << "simulator";
    QTest::newRow("handset") << "handset";
}

// The committed binaries are exactly what make-samples writes from the descriptions.
void TestImageGenerator::committedSamplesMatchTheirDescriptions()
{
    QFETCH(QString, name);
    const QString committed = QStringLiteral(DELVIX_SAMPLES_DIR "/devices/") + name;
    QTemporaryDir dir;
    SampleBuilder builder;
    QVERIFY2(builder.build(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/sources/%1.xml").arg(name), dir.path()),
             qPrintable(builder.errorString()));
    const auto built = treeHashes(dir.path());
    const auto expected = treeHashes(committed);
    QVERIFY(built.size() > 90);
    for (auto it = built.cbegin(); it != built.cend(); ++it)
        QVERIFY2(expected.value(it.key()) == it.value(), qPrintable(it.key() + QStringLiteral(" differs; run samples/devices/make-samples")));
}

void TestImageGenerator::imageCopyKeepsLinksAsLinks()
{
    QTemporaryDir source;
    QTemporaryDir outside;
    QVERIFY(QDir(source.path()).mkpath(QStringLiteral("flash/user")));
    QFile secret(outside.filePath(QStringLiteral("secret.txt")));
    QVERIFY(secret.open(QIODevice::WriteOnly));
    secret.write("outside");
    secret.close();
    QFile plain(source.filePath(QStringLiteral("flash/user/a.txt")));
    QVERIFY(plain.open(QIODevice::WriteOnly));
    plain.write("inside");
    plain.close();
    QVERIFY(QFile::link(secret.fileName(), source.filePath(QStringLiteral("flash/out"))));
    QVERIFY(QFile::link(QStringLiteral("user/a.txt"), source.filePath(QStringLiteral("flash/in"))));

    QTemporaryDir target;
    QString error;
    QVERIFY2(ImageCopy::copyTree(source.path(), target.filePath(QStringLiteral("copy")), &error), qPrintable(error));
    const QString copy = target.filePath(QStringLiteral("copy/flash/"));
    QCOMPARE(QFileInfo(copy + QStringLiteral("out")).symLinkTarget(), secret.fileName());
    QVERIFY(QFileInfo(copy + QStringLiteral("in")).isSymLink());
    QCOMPARE(QFileInfo(copy + QStringLiteral("in")).symLinkTarget(), copy + QStringLiteral("user/a.txt")); // relative stays relative
    QCOMPARE(QFileInfo(copy + QStringLiteral("user/a.txt")).size(), 6);
}

QTEST_GUILESS_MAIN(TestImageGenerator)
#include "tst_imagegenerator.moc"
