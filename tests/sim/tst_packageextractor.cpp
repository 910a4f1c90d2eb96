#include "PackageExtractor.h"
#include "PackageWriter.h"
#include "TransferTable.h"

#include <QDir>
#include <QDirIterator>
#include <QTemporaryDir>
#include <QtTest>

#include <functional>

using PackageFill = std::function<void(PackageWriter&)>;
Q_DECLARE_METATYPE(PackageFill)

namespace {

QStringList treeOf(const QString& root)
{
    QStringList paths;
    QDirIterator it(root, QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot, QDirIterator::Subdirectories);
    while (it.hasNext())
        paths << QDir(root).relativeFilePath(it.next());
    paths.sort();
    return paths;
}

void touch(const QString& path, const QByteArray& bytes = "x")
{
    QVERIFY(QDir().mkpath(QFileInfo(path).path()));
    QFile file(path);
    QVERIFY(file.open(QIODevice::WriteOnly));
    file.write(bytes);
}

// Where an absolute entry would land if it were obeyed.
QString absoluteTarget()
{
    return QDir::tempPath() + QStringLiteral("/delvix-package-escape-probe");
}

} // namespace

// Package extraction on its own: what may be unpacked, where, and how much; and the sweep
// of what cut transfers leave.
class TestPackageExtractor : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void safeRelativePath_data();
    void safeRelativePath();
    void extractsAModuleFolder();
    void refusals_data();
    void refusals();
    void sweepRemovesOnlyLeftovers();

private:
    QString build(const PackageFill& fill);

    std::unique_ptr<QTemporaryDir> m_dir;
};

void TestPackageExtractor::init()
{
    m_dir = std::make_unique<QTemporaryDir>();
    QVERIFY(QDir(m_dir->path()).mkdir(QStringLiteral("into")));
}

QString TestPackageExtractor::build(const PackageFill& fill)
{
    const QString path = m_dir->filePath(QStringLiteral("p.zantro"));
    PackageWriter writer;
    if (!writer.open(path))
        return QString();
    fill(writer);
    return writer.close() ? path : QString();
}

void TestPackageExtractor::safeRelativePath_data()
{
    QTest::addColumn<QString>("name");
    QTest::addColumn<QString>("expected");
    QTest::newRow("plain") << "mod/a.mif" << "mod/a.mif";
    QTest::newRow("dots and slashes") << "./mod//./a.mif" << "mod/a.mif";
    QTest::newRow("folder entry") << "mod/" << "mod";
    QTest::newRow("parent") << "../a" << "";
    QTest::newRow("inner parent") << "mod/../../a" << "";
    QTest::newRow("parent that stays inside") << "mod/../a" << "";
    QTest::newRow("absolute") << "/etc/passwd" << "";
    QTest::newRow("backslash") << "..\\a" << "";
    QTest::newRow("drive") << "C:/a" << "";
    QTest::newRow("control") << QStringLiteral("a\nb") << "";
    QTest::newRow("only dots") << "./." << "";
    QTest::newRow("empty") << "" << "";
    QTest::newRow("too long") << QString(PackageExtractor::MaxEntryPathLength + 1, QLatin1Char('a')) << "";
}

void TestPackageExtractor::safeRelativePath()
{
    QFETCH(QString, name);
    QFETCH(QString, expected);
    QCOMPARE(PackageExtractor::safeRelativePath(name), expected);
}

void TestPackageExtractor::extractsAModuleFolder()
{
    const QString module = m_dir->filePath(QStringLiteral("radio"));
    touch(module + QStringLiteral("/radio.mif"), "mif bytes");
    touch(module + QStringLiteral("/radio.mod"), QByteArray(5000, 'm'));
    touch(module + QStringLiteral("/data/.hidden"), "h");
    QVERIFY(QFile::link(module + QStringLiteral("/radio.mif"), module + QStringLiteral("/link.mif")));
    QString error;
    const QString package = m_dir->filePath(QStringLiteral("radio.zantro"));
    QVERIFY2(PackageWriter::pack(module, package, &error), qPrintable(error));

    PackageExtractor extractor;
    const QString into = m_dir->filePath(QStringLiteral("into"));
    QVERIFY2(extractor.extract(package, into, 1 << 20), qPrintable(extractor.errorString()));
    QCOMPARE(extractor.topLevelNames(), QStringList { QStringLiteral("radio") });
    // The link is not packed.
    QCOMPARE(treeOf(into), (QStringList { "radio", "radio/data", "radio/data/.hidden", "radio/radio.mif", "radio/radio.mod" }));
    QFile mod(into + QStringLiteral("/radio/radio.mod"));
    QVERIFY(mod.open(QIODevice::ReadOnly));
    QCOMPARE(mod.readAll(), QByteArray(5000, 'm'));

    // Packing is reproducible.
    const QString again = m_dir->filePath(QStringLiteral("again.zantro"));
    QVERIFY(PackageWriter::pack(module, again, &error));
    QFile a(package), b(again);
    QVERIFY(a.open(QIODevice::ReadOnly) && b.open(QIODevice::ReadOnly));
    QCOMPARE(a.readAll(), b.readAll());
}

void TestPackageExtractor::refusals_data()
{
    QTest::addColumn<PackageFill>("fill");
    QTest::addColumn<quint64>("spaceLimit");
    QTest::addColumn<QString>("reason");
    const quint64 plenty = 1ull << 30;
    QTest::newRow("parent") << PackageFill([](PackageWriter& w) { w.addFile(QStringLiteral("../escaped"), "x"); })
                            << plenty << "would leave";
    QTest::newRow("absolute") << PackageFill([](PackageWriter& w) { w.addFile(absoluteTarget(), "x"); }) << plenty
                              << "would leave";
    QTest::newRow("symlink") << PackageFill([](PackageWriter& w) { w.addSymlink(QStringLiteral("m/l"), QStringLiteral("../../")); })
                             << plenty << "not a plain file";
    QTest::newRow("file over a folder")
        << PackageFill([](PackageWriter& w) { w.addDirectory(QStringLiteral("m/d")); w.addFile(QStringLiteral("m/d"), "x"); })
        << plenty << "clashes";
    QTest::newRow("over the space limit")
        << PackageFill([](PackageWriter& w) { w.addFile(QStringLiteral("m/a"), QByteArray(3000, 'a')); }) << quint64(2999)
        << "more room";
    QTest::newRow("ratio") << PackageFill([](PackageWriter& w) { w.addFile(QStringLiteral("m/z"), QByteArray(8 << 20, 0)); })
                           << plenty << "beyond belief";
    QTest::newRow("too many entries") << PackageFill([](PackageWriter& w) {
        for (int i = 0; i <= PackageExtractor::MaxEntries; ++i)
            w.addFile(QStringLiteral("m/%1").arg(i), QByteArray());
    }) << plenty << "entries";
}

void TestPackageExtractor::refusals()
{
    QFETCH(PackageFill, fill);
    QFETCH(quint64, spaceLimit);
    QFETCH(QString, reason);
    const QString package = build(fill);
    QVERIFY(!package.isEmpty());
    PackageExtractor extractor;
    QVERIFY(!extractor.extract(package, m_dir->filePath(QStringLiteral("into")), spaceLimit));
    QVERIFY2(extractor.errorString().contains(reason), qPrintable(extractor.errorString()));
    // Nothing landed beside the target folder.
    const QStringList outside = QDir(m_dir->path()).entryList(QDir::AllEntries | QDir::Hidden | QDir::NoDotAndDotDot);
    QCOMPARE(outside, (QStringList { "into", "p.zantro" }));
    QVERIFY(!QFileInfo::exists(absoluteTarget()));
}

void TestPackageExtractor::sweepRemovesOnlyLeftovers()
{
    const QString root = m_dir->filePath(QStringLiteral("volume"));
    QTemporaryDir outside;
    touch(root + QStringLiteral("/user/keep.txt"));
    touch(root + QStringLiteral("/user/") + TransferTable::PartialPrefix + QStringLiteral("abc"));
    touch(root + QStringLiteral("/usermod/") + TransferTable::StagingPrefix + QStringLiteral("1/new/m/m.mif"));
    touch(outside.filePath(TransferTable::PartialPrefix + QStringLiteral("theirs")));
    QVERIFY(QFile::link(outside.path(), root + QStringLiteral("/user/linked")));

    QCOMPARE(TransferTable::sweep(root), 2);
    QCOMPARE(treeOf(root), (QStringList { "user", "user/keep.txt", "user/linked", "usermod" }));
    QVERIFY(QFileInfo::exists(outside.filePath(TransferTable::PartialPrefix + QStringLiteral("theirs"))));
}

QTEST_GUILESS_MAIN(TestPackageExtractor)
#include "tst_packageextractor.moc"
