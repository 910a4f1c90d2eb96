#include "DeviceState.h"
#include "PortlexErrors.h"
#include "TestImage.h"
#include "VolumePathResolver.h"

#include <QCoreApplication>
#include <QDateTime>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QtTest>

using Status = VolumePathResolver::Status;

class TestVolumePathResolver : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase();
    void resolveExisting_data();
    void resolveExisting();
    void resolveForCreate_data();
    void resolveForCreate();
    void joinDevicePath();
    void levelsNeverShowTheCanary();
    void cleanupTestCase();

private:
    QString flash() const { return m_image.path() + QStringLiteral("/flash"); }
    QString canary() const { return m_image.outside() + QStringLiteral("/canary"); }

    TestImage m_image;
    VolumePathResolver m_resolver;
    QDateTime m_canaryModified;
};

static const QByteArray CanaryBytes("the canary must never be read");

void TestVolumePathResolver::initTestCase()
{
    m_image.fillDefault();
    m_image.writeFile(QStringLiteral("flash/sub/b.txt"), "b");
    m_image.writeFile(QStringLiteral("card/x.txt"), "x");
    QVERIFY(QDir().mkpath(canary()));
    QFile secret(canary() + QStringLiteral("/secret.txt"));
    QVERIFY(secret.open(QIODevice::WriteOnly));
    secret.write(CanaryBytes);
    secret.close();
    m_canaryModified = QFileInfo(secret).lastModified();

    QVERIFY(QFile::link(QStringLiteral("../../%1/canary/secret.txt").arg(QFileInfo(m_image.outside()).fileName()),
                        flash() + QStringLiteral("/out-link")));
    QVERIFY(QFileInfo(flash() + QStringLiteral("/out-link")).exists()); // the relative link really leads out
    QVERIFY(QFile::link(canary(), flash() + QStringLiteral("/out-dir")));
    QVERIFY(QFile::link(QStringLiteral("sub/b.txt"), flash() + QStringLiteral("/in-link")));
    QVERIFY(QFile::link(QStringLiteral("nowhere"), flash() + QStringLiteral("/dangling")));
    QVERIFY(QFile::link(QStringLiteral(".."), flash() + QStringLiteral("/sub/loop")));

    QVERIFY(m_resolver.addMount(QStringLiteral("/"), flash()));
    QVERIFY(m_resolver.addMount(QStringLiteral("/card/"), m_image.path() + QStringLiteral("/card")));
    QVERIFY(!m_resolver.addMount(QStringLiteral("/gone"), m_image.path() + QStringLiteral("/missing")));
}

void TestVolumePathResolver::resolveExisting_data()
{
    QTest::addColumn<QString>("path");
    QTest::addColumn<Status>("status");
    QTest::addColumn<int>("volume");
    QTest::addColumn<QString>("devicePath");
    QTest::addColumn<QString>("localRelative"); // to the image folder

    QTest::newRow("file") << "/user/notes.txt" << Status::Ok << 0 << "/user/notes.txt" << "flash/user/notes.txt";
    QTest::newRow("root") << "/" << Status::Ok << 0 << "/" << "flash";
    QTest::newRow("extra slashes") << "//sub///b.txt" << Status::Ok << 0 << "/sub/b.txt" << "flash/sub/b.txt";
    QTest::newRow("dot") << "/sub/./b.txt" << Status::Ok << 0 << "/sub/b.txt" << "flash/sub/b.txt";
    QTest::newRow("link inside") << "/in-link" << Status::Ok << 0 << "/in-link" << "flash/sub/b.txt";
    QTest::newRow("dir link inside") << "/sub/loop/user" << Status::Ok << 0 << "/sub/loop/user" << "flash/user";
    QTest::newRow("card") << "/card/x.txt" << Status::Ok << 1 << "/card/x.txt" << "card/x.txt";
    QTest::newRow("card root") << "/card" << Status::Ok << 1 << "/card" << "card";
    QTest::newRow("longer name is not the card") << "/cardx" << Status::NotFound << -1 << "" << "";
    QTest::newRow("absolute host path stays inside") << "/etc/passwd" << Status::NotFound << -1 << "" << "";
    QTest::newRow("missing") << "/missing.txt" << Status::NotFound << -1 << "" << "";

    QTest::newRow("dot dot out") << "/../canary/secret.txt" << Status::Escapes << -1 << "" << "";
    QTest::newRow("dot dot deeper") << "/sub/../../canary/secret.txt" << Status::Escapes << -1 << "" << "";
    QTest::newRow("dot dot that stays inside") << "/sub/../user/notes.txt" << Status::Escapes << -1 << "" << "";
    QTest::newRow("dot dot out of the card") << "/card/../user/notes.txt" << Status::Escapes << -1 << "" << "";
    QTest::newRow("file link out") << "/out-link" << Status::Escapes << -1 << "" << "";
    QTest::newRow("dir link out") << "/out-dir" << Status::Escapes << -1 << "" << "";
    QTest::newRow("through dir link out") << "/out-dir/secret.txt" << Status::Escapes << -1 << "" << "";
    QTest::newRow("dangling link") << "/dangling" << Status::Escapes << -1 << "" << "";

    QTest::newRow("empty") << "" << Status::Invalid << -1 << "" << "";
    QTest::newRow("relative") << "user/notes.txt" << Status::Invalid << -1 << "" << "";
    QTest::newRow("NUL") << QStringLiteral("/user/notes.txt") + QChar(0) + QStringLiteral("x") << Status::Invalid << -1 << "" << "";
    QTest::newRow("control character") << QStringLiteral("/user/\x01") << Status::Invalid << -1 << "" << "";
    QTest::newRow("backslash") << "/sub\\..\\..\\canary" << Status::Invalid << -1 << "" << "";
    QTest::newRow("longest allowed") << QStringLiteral("/") + QString(VolumePathResolver::MaxPathLength - 1, QLatin1Char('a'))
                                     << Status::NotFound << -1 << "" << "";
    QTest::newRow("too long") << QStringLiteral("/") + QString(VolumePathResolver::MaxPathLength, QLatin1Char('a'))
                              << Status::TooLong << -1 << "" << "";
}

void TestVolumePathResolver::resolveExisting()
{
    QFETCH(QString, path);
    QFETCH(Status, status);
    QFETCH(int, volume);
    QFETCH(QString, devicePath);
    QFETCH(QString, localRelative);

    VolumePathResolver::Target target;
    QCOMPARE(m_resolver.resolveExisting(path, target), status);
    if (status != Status::Ok)
        return;
    QCOMPARE(target.volume, volume);
    QCOMPARE(target.devicePath, devicePath);
    QCOMPARE(target.localPath, QFileInfo(QDir(m_image.path()).filePath(localRelative)).canonicalFilePath());
}

void TestVolumePathResolver::resolveForCreate_data()
{
    QTest::addColumn<QString>("path");
    QTest::addColumn<Status>("status");
    QTest::addColumn<QString>("localRelative");

    QTest::newRow("new file") << "/new.txt" << Status::Ok << "flash/new.txt";
    QTest::newRow("new in sub") << "/sub//new.txt" << Status::Ok << "flash/sub/new.txt";
    QTest::newRow("existing file") << "/user/notes.txt" << Status::Ok << "flash/user/notes.txt";
    QTest::newRow("link inside may be replaced") << "/in-link" << Status::Ok << "flash/in-link";
    QTest::newRow("card") << "/card/new.txt" << Status::Ok << "card/new.txt";
    QTest::newRow("parent is a link out") << "/out-dir/new.txt" << Status::Escapes << "";
    QTest::newRow("target is a link out") << "/out-link" << Status::Escapes << "";
    QTest::newRow("target is dangling") << "/dangling" << Status::Escapes << "";
    QTest::newRow("dot dot") << "/sub/../new.txt" << Status::Escapes << "";
    QTest::newRow("missing parent") << "/nodir/new.txt" << Status::NotFound << "";
    QTest::newRow("parent is a file") << "/user/notes.txt/new" << Status::NotFound << "";
    QTest::newRow("volume root") << "/" << Status::Invalid << "";
    QTest::newRow("card root") << "/card" << Status::Invalid << "";
    QTest::newRow("NUL") << QStringLiteral("/new") + QChar(0) << Status::Invalid << "";
}

void TestVolumePathResolver::resolveForCreate()
{
    QFETCH(QString, path);
    QFETCH(Status, status);
    QFETCH(QString, localRelative);

    VolumePathResolver::Target target;
    QCOMPARE(m_resolver.resolveForCreate(path, target), status);
    if (status == Status::Ok) {
        const QString parent = QFileInfo(QDir(m_image.path()).filePath(localRelative)).absolutePath();
        QCOMPARE(target.localPath, QFileInfo(parent).canonicalFilePath() + QLatin1Char('/') + QFileInfo(localRelative).fileName());
    }
}

void TestVolumePathResolver::joinDevicePath()
{
    QCOMPARE(VolumePathResolver::joinDevicePath(QStringLiteral("/"), QStringLiteral("a")), QStringLiteral("/a"));
    QCOMPARE(VolumePathResolver::joinDevicePath(QStringLiteral("/card"), QStringLiteral("a")), QStringLiteral("/card/a"));
    QCOMPARE(VolumePathResolver::joinDevicePath(QStringLiteral("/card/"), QStringLiteral("a")), QStringLiteral("/card/a"));
}

// Served through the device: links out of the volume never show, and asking for them
// through the file system answers the refusal code.
void TestVolumePathResolver::levelsNeverShowTheCanary()
{
    DeviceState state;
    QVERIFY2(state.load(m_image.path(), QCoreApplication::applicationDirPath()), qPrintable(state.errorString()));

    _DirectoryInfo root;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/"), root), 0);
    QStringList names;
    for (const auto& file : root.files)
        names << file->Name();
    for (const auto& directory : root.directories)
        names << directory->Name();
    QVERIFY2(names.contains(QStringLiteral("in-link")), qPrintable(names.join(',')));
    QVERIFY(!names.contains(QStringLiteral("out-link")));
    QVERIFY(!names.contains(QStringLiteral("out-dir")));
    QVERIFY(!names.contains(QStringLiteral("dangling")));

    _DirectoryInfo sub;
    QCOMPARE(state.fileSystemLevel(QStringLiteral("/sub"), sub), 0);
    QVERIFY(sub.directories.isEmpty()); // the loop link is not offered for crawling

    for (const char* path : {"/out-dir", "/../", "/sub/../../", "/out-dir/secret.txt"}) {
        _DirectoryInfo level;
        QCOMPARE(state.fileSystemLevel(QLatin1String(path), level), qint32(PortlexError::PathRefused));
        QVERIFY(level.files.isEmpty());
    }
    MifEntry entry;
    QCOMPARE(state.moduleMif(QStringLiteral("/out-dir/secret.txt"), entry), qint32(PortlexError::NotFound));
}

void TestVolumePathResolver::cleanupTestCase()
{
    QFile secret(canary() + QStringLiteral("/secret.txt"));
    QVERIFY(secret.open(QIODevice::ReadOnly));
    QCOMPARE(secret.readAll(), CanaryBytes);
    QCOMPARE(QFileInfo(secret).lastModified(), m_canaryModified);
    QCOMPARE(QDir(canary()).entryList(QDir::AllEntries | QDir::NoDotAndDotDot | QDir::Hidden), QStringList{QStringLiteral("secret.txt")});
}

QTEST_GUILESS_MAIN(TestVolumePathResolver)
#include "tst_volumepathresolver.moc"
