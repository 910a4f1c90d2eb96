#include "DeviceState.h"
#include "PackageExtractor.h"
#include "PackageWriter.h"
#include "PortlexErrors.h"
#include "TestImage.h"
#include "TestSupport.h"
#include "TransferTable.h"
#include "VolumePathResolver.h"

#include <QTemporaryDir>
#include <QtTest>

#include <functional>

using Status = VolumePathResolver::Status;

enum class Mode
{
    Existing,
    Create,
    Entry,
};

using PackageFill = std::function<void(PackageWriter&)>;
// Turns the written package into the bytes that reach the extractor.
using Damage = std::function<QByteArray(const QByteArray&)>;

// Where an absolute entry would land if it were obeyed.
static QString absoluteTarget() { return QDir::tempPath() + QStringLiteral("/delvix-package-escape-probe"); }

// Device paths against an image whose flash volume holds links leading in, out and nowhere,
// with a canary beside the image that nothing may read or change; and package extraction
// on its own: what may be unpacked, where, and how much, and the sweep of what cut
// transfers leave.
class TestDevicePaths : public QObject
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
    std::unique_ptr<QTemporaryDir> m_dir; // a package test's own

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

    void init()
    {
        m_dir = std::make_unique<QTemporaryDir>();
        QVERIFY(QDir(m_dir->path()).mkdir(QStringLiteral("into")));
    }

    void safeRelativePath()
    {
        const QPair<QString, QString> names[] = {
            {"mod/a.mif", "mod/a.mif"}, {"./mod//./a.mif", "mod/a.mif"}, {"mod/", "mod"},
            // Refused: parent, parent that stays inside, absolute, backslash, drive, control, too long.
            {"../a", ""}, {"mod/../a", ""}, {"/etc/passwd", ""}, {"..\\a", ""}, {"C:/a", ""}, {"a\nb", ""},
            {QString(PackageExtractor::MaxEntryPathLength + 1, QLatin1Char('a')), ""},
        };
        for (const auto& [name, expected] : names)
            QCOMPARE(PackageExtractor::safeRelativePath(name), expected);
    }

    void extractsAModuleFolder()
    {
        const QString module = m_dir->filePath(QStringLiteral("radio"));
        QVERIFY(TestSupport::writeFile(module + "/radio.mif", "mif bytes"));
        QVERIFY(TestSupport::writeFile(module + "/radio.mod", QByteArray(5000, 'm')));
        QVERIFY(TestSupport::writeFile(module + "/data/.hidden", "h"));
        QVERIFY(QFile::link(module + QStringLiteral("/radio.mif"), module + QStringLiteral("/link.mif")));
        QString error;
        const QString package = m_dir->filePath(QStringLiteral("radio.zantro"));
        QVERIFY2(PackageWriter::pack(module, package, &error), qPrintable(error));

        PackageExtractor extractor;
        const QString into = m_dir->filePath(QStringLiteral("into"));
        QVERIFY2(extractor.extract(package, into, 1 << 20), qPrintable(extractor.errorString()));
        QCOMPARE(extractor.topLevelNames(), QStringList {"radio"});
        // The link is not packed.
        QCOMPARE(TestSupport::treeEntries(into),
                 (QStringList {"radio", "radio/data", "radio/data/.hidden", "radio/radio.mif", "radio/radio.mod"}));
        QCOMPARE(TestSupport::readFile(into + "/radio/radio.mod"), QByteArray(5000, 'm'));

        // Packing is reproducible.
        const QString again = m_dir->filePath(QStringLiteral("again.zantro"));
        QVERIFY(PackageWriter::pack(module, again, &error));
        QCOMPARE(TestSupport::readFile(again), TestSupport::readFile(package));
    }

    void refusals_data()
    {
        QTest::addColumn<PackageFill>("fill");
        QTest::addColumn<Damage>("damage");
        QTest::addColumn<quint64>("spaceLimit");
        QTest::addColumn<QString>("reason");
        const auto file = [](const QString& name, const QByteArray& bytes = "x") {
            return PackageFill([=](PackageWriter& w) { w.addFile(name, bytes); });
        };
        const auto row = [](const char* tag, const PackageFill& fill, const char* reason, const Damage& damage = {},
                            quint64 spaceLimit = 1ull << 30) { QTest::newRow(tag) << fill << damage << spaceLimit << reason; };
        row("parent", file("../escaped"), "would leave");
        row("absolute", file(absoluteTarget()), "would leave");
        row("symlink", [](PackageWriter& w) { w.addSymlink("m/l", "../../"); }, "not a plain file");
        row("file over a folder", [](PackageWriter& w) { w.addDirectory("m/d"); w.addFile("m/d", "x"); }, "clashes");
        row("duplicate", [](PackageWriter& w) { w.addFile("m/a", "1"); w.addFile("m/a", "2"); }, "twice");
        row("over the space limit", file("m/a", QByteArray(3000, 'a')), "more room", {}, 2999);
        row("ratio", file("m/z", QByteArray(8 << 20, 0)), "beyond belief");
        row("too many entries", [](PackageWriter& w) {
            for (int i = 0; i <= PackageExtractor::MaxEntries; ++i)
                w.addFile(QStringLiteral("m/%1").arg(i), QByteArray());
        }, "entries");
        row("empty", [](PackageWriter&) {}, "empty");
        row("not a zip", file("m/a"), "not a readable ZIP", [](const QByteArray&) { return TestSupport::randomBytes(4096, 6); });
        row("truncated", file("m/a", TestSupport::randomBytes(300000, 7)), "damaged",
            [](const QByteArray& bytes) { return bytes.left(bytes.size() / 2); });
    }

    void refusals()
    {
        QFETCH(PackageFill, fill);
        QFETCH(Damage, damage);
        QFETCH(quint64, spaceLimit);
        QFETCH(QString, reason);
        const QString package = m_dir->filePath(QStringLiteral("p.zantro"));
        PackageWriter writer;
        QVERIFY(writer.open(package));
        fill(writer);
        QVERIFY(writer.close());
        if (damage)
            QVERIFY(TestSupport::writeFile(package, damage(TestSupport::readFile(package))));

        PackageExtractor extractor;
        QVERIFY(!extractor.extract(package, m_dir->filePath(QStringLiteral("into")), spaceLimit));
        QVERIFY2(extractor.errorString().contains(reason), qPrintable(extractor.errorString()));
        // Nothing landed beside the target folder.
        QCOMPARE(QDir(m_dir->path()).entryList(QDir::AllEntries | QDir::Hidden | QDir::NoDotAndDotDot),
                 (QStringList {"into", "p.zantro"}));
        QVERIFY(!QFileInfo::exists(absoluteTarget()));
    }

    void sweepRemovesOnlyLeftovers()
    {
        const QString root = m_dir->filePath(QStringLiteral("volume"));
        QTemporaryDir outside;
        QVERIFY(TestSupport::writeFile(root + "/user/keep.txt", "x"));
        QVERIFY(TestSupport::writeFile(root + "/user/" + TransferTable::PartialPrefix + "abc", "x"));
        QVERIFY(TestSupport::writeFile(root + "/usermod/" + TransferTable::StagingPrefix + "1/new/m/m.mif", "x"));
        QVERIFY(TestSupport::writeFile(outside.filePath(TransferTable::PartialPrefix + "theirs"), "x"));
        QVERIFY(QFile::link(outside.path(), root + QStringLiteral("/user/linked")));

        QCOMPARE(TransferTable::sweep(root), 2);
        QCOMPARE(TestSupport::treeEntries(root), (QStringList {"user", "user/keep.txt", "user/linked", "usermod"}));
        QVERIFY(QFileInfo::exists(outside.filePath(TransferTable::PartialPrefix + "theirs")));
    }
};

QTEST_GUILESS_MAIN(TestDevicePaths)
#include "tst_devicepaths.moc"
