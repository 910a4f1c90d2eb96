#include "DeviceState.h"
#include "PortlexErrors.h"
#include "TestImage.h"
#include "TestSupport.h"
#include "VolumePathResolver.h"

#include <QtTest>

using Status = VolumePathResolver::Status;

enum class Mode
{
    Existing,
    Create,
    Entry,
};

// Device paths against an image whose flash volume holds links leading in, out and nowhere,
// with a canary beside the image that nothing may read or change.
class TestVolumePathResolver : public QObject
{
    Q_OBJECT

    QString flash() const { return m_image.path() + QStringLiteral("/flash"); }
    QString canary() const { return m_image.outside() + QStringLiteral("/canary"); }
    static void row(const char* tag, Mode mode, const QString& path, Status status, const QString& devicePath = {},
                    const QString& local = {})
    {
        QTest::newRow(tag) << mode << path << status << devicePath << local;
    }

    TestImage m_image;
    VolumePathResolver m_resolver;
    QByteArray m_canaryDigest;

private slots:
    void initTestCase()
    {
        m_image.fillDefault();
        m_image.writeFile(QStringLiteral("flash/sub/b.txt"), "b");
        m_image.writeFile(QStringLiteral("card/x.txt"), "x");
        QVERIFY(TestSupport::writeFile(canary() + QStringLiteral("/secret.txt"), "the canary must never be read"));
        m_canaryDigest = TestSupport::treeDigest(canary());

        QVERIFY(QFile::link("../../" + QFileInfo(m_image.outside()).fileName() + "/canary/secret.txt", flash() + "/out-link"));
        QVERIFY(QFileInfo(flash() + QStringLiteral("/out-link")).exists()); // the relative link really leads out
        QVERIFY(QFile::link(canary(), flash() + QStringLiteral("/out-dir")));
        QVERIFY(QFile::link(QStringLiteral("sub/b.txt"), flash() + QStringLiteral("/in-link")));
        QVERIFY(QFile::link(QStringLiteral("nowhere"), flash() + QStringLiteral("/dangling")));
        QVERIFY(QFile::link(QStringLiteral(".."), flash() + QStringLiteral("/sub/loop")));

        QVERIFY(m_resolver.addMount(QStringLiteral("/"), flash()));
        QVERIFY(m_resolver.addMount(QStringLiteral("/card/"), m_image.path() + QStringLiteral("/card")));
        QVERIFY(!m_resolver.addMount(QStringLiteral("/gone"), m_image.path() + QStringLiteral("/missing")));
    }

    void cleanupTestCase() { QCOMPARE(TestSupport::treeDigest(canary()), m_canaryDigest); }

    void resolve_data()
    {
        QTest::addColumn<Mode>("mode");
        QTest::addColumn<QString>("path");
        QTest::addColumn<Status>("status");
        QTest::addColumn<QString>("devicePath");
        QTest::addColumn<QString>("local"); // relative to the image folder

        const Mode E = Mode::Existing;
        row("file", E, "/user/notes.txt", Status::Ok, "/user/notes.txt", "flash/user/notes.txt");
        row("root", E, "/", Status::Ok, "/", "flash");
        row("extra slashes and dots", E, "//sub/.///b.txt", Status::Ok, "/sub/b.txt", "flash/sub/b.txt");
        row("link inside", E, "/in-link", Status::Ok, "/in-link", "flash/sub/b.txt");
        row("dir link inside", E, "/sub/loop/user", Status::Ok, "/sub/loop/user", "flash/user");
        row("card", E, "/card/x.txt", Status::Ok, "/card/x.txt", "card/x.txt");
        row("longer name is not the card", E, "/cardx", Status::NotFound);
        row("host path stays inside", E, "/etc/passwd", Status::NotFound);
        row("dot dot out", E, "/../canary/secret.txt", Status::Escapes);
        row("dot dot that stays inside", E, "/sub/../user/notes.txt", Status::Escapes);
        row("file link out", E, "/out-link", Status::Escapes);
        row("through dir link out", E, "/out-dir/secret.txt", Status::Escapes);
        row("dangling link", E, "/dangling", Status::Escapes);
        row("empty", E, "", Status::Invalid);
        row("relative", E, "user/notes.txt", Status::Invalid);
        row("NUL", E, QStringLiteral("/user/notes.txt") + QChar(0) + "x", Status::Invalid);
        row("backslash", E, "/sub\\..\\..\\canary", Status::Invalid);
        row("longest allowed", E, "/" + QString(VolumePathResolver::MaxPathLength - 1, 'a'), Status::NotFound);
        row("too long", E, "/" + QString(VolumePathResolver::MaxPathLength, 'a'), Status::TooLong);

        const Mode C = Mode::Create;
        row("create new file", C, "/new.txt", Status::Ok, "/new.txt", "flash/new.txt");
        row("create in sub", C, "/sub//new.txt", Status::Ok, "/sub/new.txt", "flash/sub/new.txt");
        row("create over a file", C, "/user/notes.txt", Status::Ok, "/user/notes.txt", "flash/user/notes.txt");
        row("create over a link inside", C, "/in-link", Status::Ok, "/in-link", "flash/in-link");
        row("create below a link out", C, "/out-dir/new.txt", Status::Escapes);
        row("create over a link out", C, "/out-link", Status::Escapes);
        row("create without parent", C, "/nodir/new.txt", Status::NotFound);
        row("create below a file", C, "/user/notes.txt/new", Status::NotFound);
        row("create the root", C, "/", Status::Invalid);

        const Mode N = Mode::Entry;
        row("entry: a link out names itself", N, "/out-link", Status::Ok, "/out-link", "flash/out-link");
        row("entry below a link out", N, "/out-dir/secret.txt", Status::Escapes);
        row("entry: the root", N, "/", Status::Invalid);
        row("entry without parent", N, "/nodir/a.txt", Status::NotFound);
    }

    void resolve()
    {
        QFETCH(Mode, mode);
        QFETCH(QString, path);
        QFETCH(Status, status);
        QFETCH(QString, devicePath);
        QFETCH(QString, local);

        VolumePathResolver::Target target;
        const Status result = mode == Mode::Existing ? m_resolver.resolveExisting(path, target)
                            : mode == Mode::Create   ? m_resolver.resolveForCreate(path, target)
                                                     : m_resolver.resolveEntry(path, target);
        QCOMPARE(result, status);
        if (status != Status::Ok)
            return;
        const QFileInfo expected(QDir(m_image.path()).filePath(local));
        QCOMPARE(target.volume, local.startsWith(QLatin1String("card")) ? 1 : 0);
        QCOMPARE(target.devicePath, devicePath);
        // Only an existing target is followed; the others keep their own name in the real parent.
        QCOMPARE(target.localPath, mode == Mode::Existing ? expected.canonicalFilePath()
                                                          : QFileInfo(expected.absolutePath()).canonicalFilePath() + '/'
                                                                + expected.fileName());
    }

    // Served through the device: links out of the volume never show, the loop link is not
    // offered for crawling, and asking for them answers the refusal code.
    void levelsNeverShowTheCanary()
    {
        QVERIFY(m_image.load());
        DeviceState& state = m_image.state();
        QStringList names;
        for (const char* path : {"/", "/sub"}) {
            _DirectoryInfo level;
            QCOMPARE(state.fileSystemLevel(QLatin1String(path), level), 0);
            for (const auto& file : std::as_const(level.files))
                names << file->Path();
            for (const auto& directory : std::as_const(level.directories))
                names << directory->Path();
        }
        QCOMPARE(names.join(QLatin1Char(' ')), "/in-link /shared /sub /sys /user /usermod /sub/b.txt");
        for (const char* path : {"/out-dir", "/../", "/out-dir/secret.txt"}) {
            _DirectoryInfo level;
            QCOMPARE(state.fileSystemLevel(QLatin1String(path), level), qint32(PortlexError::PathRefused));
            QVERIFY(level.files.isEmpty());
        }
        MifEntry entry;
        QCOMPARE(state.moduleMif(QStringLiteral("/out-dir/secret.txt"), entry), qint32(PortlexError::NotFound));
    }
};

QTEST_GUILESS_MAIN(TestVolumePathResolver)
#include "tst_volumepathresolver.moc"
