#include "PackageExtractor.h"
#include "PackageWriter.h"
#include "TestSupport.h"
#include "TransferTable.h"

#include <QTemporaryDir>
#include <QtTest>

#include <functional>

using PackageFill = std::function<void(PackageWriter&)>;
// Turns the written package into the bytes that reach the extractor.
using Damage = std::function<QByteArray(const QByteArray&)>;

// Where an absolute entry would land if it were obeyed.
static QString absoluteTarget() { return QDir::tempPath() + QStringLiteral("/delvix-package-escape-probe"); }

// Package extraction on its own: what may be unpacked, where, and how much; and the sweep
// of what cut transfers leave.
class TestPackageExtractor : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_dir;

private slots:
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

QTEST_GUILESS_MAIN(TestPackageExtractor)
#include "tst_packageextractor.moc"
