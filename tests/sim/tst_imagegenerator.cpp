#include "DeviceState.h"
#include "ImageCopy.h"
#include "SampleBuilder.h"
#include "TestSupport.h"

#include <QCoreApplication>
#include <QRegularExpression>
#include <QTemporaryDir>
#include <QtTest>

// The image writers: the committed samples and --reset's copy.
class TestImageGenerator : public QObject
{
    Q_OBJECT

private slots:
    // The committed binaries are exactly what make-samples writes from the descriptions; this
    // also holds the MIF writer to the format the samples were made with. They load, and hang
    // together; their exact contents are theirs to change.
    void committedSamplesMatchTheirDescriptions()
    {
        for (const QString name : {"simulator", "handset"}) {
            QTemporaryDir built;
            SampleBuilder builder;
            const QString image = QStringLiteral(DELVIX_SAMPLES_DIR "/devices/") + name;
            QVERIFY2(builder.build(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/sources/%1.xml").arg(name), built.path()),
                     qPrintable(builder.errorString()));
            const QStringList entries = TestSupport::treeEntries(built.path());
            QVERIFY(entries.size() > 90);
            for (const QString& entry : entries)
                QVERIFY2(TestSupport::readFile(built.filePath(entry)) == TestSupport::readFile(image + '/' + entry),
                         qPrintable(entry + " differs; run samples/devices/make-samples"));

            DeviceState state;
            QVERIFY2(state.load(image, QCoreApplication::applicationDirPath()), qPrintable(state.errorString()));
            QVERIFY(QRegularExpression(QStringLiteral("^[A-Z][a-z]{2} [A-Z][a-z]{2} [ 0-9]\\d \\d\\d:\\d\\d:\\d\\d \\d{4}$"))
                        .match(state.profile().enablement.expires).hasMatch());
            for (const ModuleInfo& module : state.modules()) {
                MifEntry entry;
                QVERIFY2(state.moduleMif(module.path, entry) == 0 && !entry.classes.isEmpty(), qPrintable(module.path));
            }
            const DeviceCache cache = state.cache();
            const auto available = std::count_if(cache.classes.cbegin(), cache.classes.cend(), [](const IdRecord& r) { return r.available; });
            QVERIFY(!state.modules().isEmpty() && available > 0 && available < cache.classes.size()); // some are known but missing
        }
    }

    void imageCopyKeepsLinksAsLinks()
    {
        QTemporaryDir source, outside, target;
        const QString secret = outside.filePath(QStringLiteral("secret.txt"));
        QVERIFY(TestSupport::writeFile(secret, "outside"));
        QVERIFY(TestSupport::writeFile(source.filePath(QStringLiteral("flash/user/a.txt")), "inside"));
        QVERIFY(QFile::link(secret, source.filePath(QStringLiteral("flash/out"))));
        QVERIFY(QFile::link(QStringLiteral("user/a.txt"), source.filePath(QStringLiteral("flash/in"))));

        QString error;
        QVERIFY2(ImageCopy::copyTree(source.path(), target.filePath(QStringLiteral("copy")), &error), qPrintable(error));
        const QString copy = target.filePath(QStringLiteral("copy/flash/"));
        QCOMPARE(QFileInfo(copy + "out").symLinkTarget(), secret); // outside stays outside, and is not copied in
        QCOMPARE(QFile(copy + "in").symLinkTarget(), copy + "user/a.txt"); // relative stays relative
        QVERIFY(QFileInfo(copy + "in").isSymLink());
        QCOMPARE(TestSupport::readFile(copy + "user/a.txt"), "inside");
    }
};

QTEST_GUILESS_MAIN(TestImageGenerator)
#include "tst_imagegenerator.moc"
