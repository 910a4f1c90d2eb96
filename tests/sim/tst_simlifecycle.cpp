#include "DeviceConnection.h"
#include "DeviceState.h"
#include "FailurePlan.h"
#include "ImageCopy.h"
#include "SampleBuilder.h"
#include "SimOptions.h"
#include "SimRequestHandler.h"
#include "TestSupport.h"

#include <QCoreApplication>
#include <QLocalSocket>
#include <QProcess>
#include <QRegularExpression>
#include <QTemporaryDir>
#include <QtTest>

#include <csignal>

using namespace TestSupport;

// zantro-sim's command line, and the daemon as a real process: clean ends on signals, --reset
// and its sweep of the copies that killed simulators left, start-up failures; the image
// writers: the committed samples and --reset's copy.
class TestSimLifecycle : public QObject
{
    Q_OBJECT

    QTemporaryDir m_imageDir; // the copied sample, which no test may change
    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_image;
    QByteArray m_imageDigest;

    static QString executable() { return QCoreApplication::applicationDirPath() + QStringLiteral("/zantro-sim"); }

    // Serves the copied sample with a client connected, ends it with signalNumber and checks
    // that it went cleanly; the greeting is "display name|device id" as the gateway sees it.
    void serveAndEnd(QProcess& process, const QStringList& extra, int signalNumber, const QString& greeting, QString& served)
    {
        const QString sockets = m_dir->filePath(QStringLiteral("run/sockets"));
        process.start(executable(), QStringList {"--image", m_image, "--socket-dir", sockets} + extra);
        QByteArray output;
        while (!output.contains('\n') && process.waitForReadyRead(10000))
            output += process.readAllStandardOutput();
        const QString line = QString::fromLocal8Bit(output).trimmed();
        const qsizetype on = line.lastIndexOf(QLatin1String(" on "));
        QVERIFY2(line.startsWith(QLatin1String("zantro-sim: serving ")) && on > 0, qPrintable(line));
        served = line.mid(20, on - 20);
        const QString socket = line.mid(on + 4);
        QCOMPARE(QFileInfo(socket).absolutePath(), sockets);
        QCOMPARE(treeDigest(served), m_imageDigest); // all of the image is served
        // A copy carries its owner's pid, by which a later --reset tells an orphan.
        const QString owned = QStringLiteral("zantro-sim-image-%1-").arg(process.processId());
        QVERIFY(served == m_image || QFileInfo(served).fileName().startsWith(owned));
        DeviceConnection connection(socket);
        QVERIFY(connection.startHandshake() && connection.finishHandshake(QDeadlineTimer(5000)) == 0);
        QCOMPARE(connection.displayName() + '|' + connection.deviceId(), greeting);

        QLocalSocket idle; // a connected client must not keep the daemon alive
        idle.connectToServer(socket);
        QVERIFY(idle.waitForConnected(2000));
        QCOMPARE(::kill(pid_t(process.processId()), signalNumber), 0);
        QVERIFY(process.waitForFinished(5000));
        QCOMPARE(process.exitStatus(), QProcess::NormalExit);
        QCOMPARE(process.exitCode(), 0);
        QVERIFY(!QFileInfo::exists(socket) && !QFileInfo(socket).isSymLink());
        QCOMPARE(treeDigest(m_image), m_imageDigest);
    }

private slots:
    void initTestCase()
    {
        m_image = m_imageDir.filePath(QStringLiteral("image"));
        QString error;
        QVERIFY2(ImageCopy::copyTree(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/simulator"), m_image, &error), qPrintable(error));
        m_imageDigest = treeDigest(m_image);
    }

    void init() { m_dir = std::make_unique<QTemporaryDir>(); }

    // Rules are separated by blanks here; a code of 0 means no rule matches, an empty
    // operation that the rules are refused.
    void failRules_data()
    {
        QTest::addColumn<QString>("rules");
        QTest::addColumn<QString>("operation");
        QTest::addColumn<QString>("path");
        QTest::addColumn<qint32>("code");
        const QString levels = QStringLiteral("GetFileSystemLevel=5 GetFileSystemLevel:/user=0xDEADBEEF GetFileSystemLevel=6");
        QTest::newRow("whole operation") << "GetRegistry=3" << "GetRegistry" << "" << 3;
        QTest::newRow("another operation") << "GetRegistry=3" << "GetModules" << "" << 0;
        QTest::newRow("path") << "GetChildSettings:/appinfo=0xdeadbeef" << "GetChildSettings" << "/appinfo" << qint32(0xDEADBEEF);
        QTest::newRow("path below") << "GetChildSettings:/appinfo=3" << "GetChildSettings" << "/appinfo/x" << 0;
        QTest::newRow("path with = and :") << "GetFileSystemLevel:/a=b:c=7" << "GetFileSystemLevel" << "/a=b:c" << 7;
        QTest::newRow("largest code") << "GetModules=4294967295" << "GetModules" << "" << qint32(-1);
        // The rule for the path wins, whatever the order; else the first for the operation.
        QTest::newRow("path first") << levels << "GetFileSystemLevel" << "/user" << qint32(0xDEADBEEF);
        QTest::newRow("first whole rule") << levels << "GetFileSystemLevel" << "/shared" << 5;
        for (const char* refused : {"GetRegistry=0", "GetRegistry=0x100000000", "GetWeather=3", "getregistry=3", "Hello=3",
                                    "GetChildSettings:=3"})
            QTest::newRow(refused) << refused << "" << "" << 0;
    }
    void failRules()
    {
        QFETCH(QString, rules);
        QFETCH(QString, operation);
        QFETCH(QString, path);
        QFETCH(qint32, code);
        FailurePlan plan;
        QString error;
        for (const QString& rule : rules.split(QLatin1Char(' ')))
            QCOMPARE(plan.addRule(rule, SimRequestHandler::operationNames(), &error), !operation.isEmpty());
        QCOMPARE(error.isEmpty() && !plan.isEmpty(), !operation.isEmpty());
        qint32 matched = 0;
        QCOMPARE(!operation.isEmpty() && plan.match(operation, path, matched), code != 0);
        QCOMPARE(matched, code);
    }

    void accepted()
    {
        SimOptions options;
        QVERIFY2(options.parse({"zantro-sim", "--image", "/img", "--id", "dev-1.a_b", "--socket-dir", "/s", "--reset",
                                "--refuse-connect", "0x10:Busy: try later", "--latency", "250", "--fail", "GetRegistry=3",
                                "--fail", "GetModules=4"}),
                 qPrintable(options.errorString()));
        QCOMPARE(options.command, SimOptions::Command::Serve);
        QCOMPARE((QStringList {options.imageDir, options.deviceId, options.socketDir, options.refuseText}),
                 (QStringList {"/img", "dev-1.a_b", "/s", "Busy: try later"}));
        QCOMPARE((QList<int> {options.reset, options.refuseCode, options.latencyMs}), (QList<int> {1, 16, 250}));
        qint32 registry = 0, modules = 0;
        QVERIFY(options.failures.match("GetRegistry", QString(), registry) && options.failures.match("GetModules", QString(), modules));
        QCOMPARE((QList<int> {registry, modules}), (QList<int> {3, 4}));
        SimOptions defaults;
        QVERIFY(defaults.parse({"zantro-sim", "--image=/img"}));
        QCOMPARE(defaults.imageDir, "/img");
        QVERIFY(!defaults.reset && defaults.refuseCode == 0 && defaults.deviceId.isEmpty() && defaults.failures.isEmpty());
        SimOptions generate;
        QVERIFY(generate.parse({"zantro-sim", "generate", "out", "--modules", "10000", "--classes", "20", "--files", "0",
                                "--processes", "3"}));
        const ImageGenerator::Counts& counts = generate.counts;
        QCOMPARE((QList<int> {counts.modules, counts.classes, counts.files, counts.processes}), (QList<int> {10000, 20, 0, 3}));
        QVERIFY(generate.command == SimOptions::Command::Generate && generate.outputDir == "out");
        SimOptions sample;
        QVERIFY(sample.parse({"zantro-sim", "make-sample", "d.xml", "img"}));
        QVERIFY(sample.command == SimOptions::Command::MakeSample);
        QCOMPARE(sample.descriptionPath + ' ' + sample.outputDir, "d.xml img");
    }

    void refused()
    {
        const QStringList refused[] = {
            {}, // no image
            {"--image", "/i", "--turbo"},
            {"--image", "/i", "--id", "../x"},
            {"--image", "/i", "--latency", "-1"},
            {"--image", "/i", "--refuse-connect", "0:ok"},
            {"generate", "--modules", "5"}, // no folder
            {"generate", "out", "--files", "-5"},
            {"make-sample", "desc.xml"},
        };
        for (const QStringList& arguments : refused) {
            SimOptions options;
            QVERIFY2(!options.parse(QStringList {"zantro-sim"} + arguments) && !options.errorString().isEmpty(),
                     qPrintable(arguments.join(' ')));
        }
    }

    void inPlaceEndsOnSigint()
    {
        QProcess process;
        QString served;
        serveAndEnd(process, {"--id", "life-1"}, SIGINT, "Zantro Simulator - Aurora|life-1", served);
        QVERIFY(!QTest::currentTestFailed());
        QCOMPARE(served, m_image);
    }

    void resetServesACopyAndSweepsOrphans()
    {
        // In the temporary folder: a copy whose simulator was killed, with a link out that the
        // sweep must not follow, and what only looks like one.
        const QString temp = m_dir->filePath(QStringLiteral("tmp")), canary = m_dir->filePath(QStringLiteral("canary"));
        QVERIFY(writeFile(canary + QStringLiteral("/keep.txt"), "canary"));
        QProcess ended;
        ended.start(QStringLiteral("true"), QStringList());
        QVERIFY(ended.waitForStarted());
        const qint64 dead = ended.processId();
        QVERIFY(ended.waitForFinished());
        const QString copy = temp + QStringLiteral("/zantro-sim-image-%1-%2");
        const QString orphan = copy.arg(dead).arg(QStringLiteral("abc123"));
        QVERIFY(writeFile(orphan + QStringLiteral("/device.xml"), "x"));
        QVERIFY(QFile::link(canary, orphan + QStringLiteral("/outside")));
        const QStringList kept { copy.arg(QCoreApplication::applicationPid()).arg(QStringLiteral("def456")), // its owner runs
                                 copy.arg(dead).arg(QStringLiteral("lnk789")), copy.arg(dead).arg(QStringLiteral("fil000")),
                                 temp + QStringLiteral("/zantro-sim-image-Ab12Cd") };
        QVERIFY(QDir().mkpath(kept.at(0)) && QDir().mkpath(kept.at(3)));
        QVERIFY(QFile::link(canary, kept.at(1)) && writeFile(kept.at(2), "f"));

        QProcess process;
        QProcessEnvironment environment = QProcessEnvironment::systemEnvironment();
        environment.insert(QStringLiteral("TMPDIR"), temp);
        process.setProcessEnvironment(environment);
        QString served;
        serveAndEnd(process, {"--reset"}, SIGTERM, "Zantro Simulator - Aurora|aurora-sim", served); // the image's own id
        QVERIFY(!QTest::currentTestFailed());
        QCOMPARE(QFileInfo(served).absolutePath(), temp);
        QVERIFY(!QFileInfo::exists(served)); // the copy goes with the daemon
        QVERIFY(!QFileInfo::exists(orphan));
        for (const QString& path : kept)
            QVERIFY2(QFileInfo(path).exists(), qPrintable(path));
        QCOMPARE(readFile(canary + QStringLiteral("/keep.txt")), QByteArray("canary"));
    }

    // Help goes to the standard output, mistakes to the error output.
    void exitCodes()
    {
        const struct { QStringList arguments; int exitCode; const char* message; } runs[] = {
            {{"--image", "/nonexistent/image"}, 1, "device.xml"},
            {{"--image", "x", "--fail", "Nope=3"}, 2, "unknown operation"},
            {{"--help"}, 0, "--refuse-connect"},
        };
        for (const auto& [arguments, exitCode, message] : runs) {
            QProcess process;
            process.start(executable(), arguments);
            QVERIFY(process.waitForFinished(10000));
            QCOMPARE(process.exitCode(), exitCode);
            QVERIFY((exitCode == 0 ? process.readAllStandardOutput() : process.readAllStandardError()).contains(message));
        }
    }

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

QTEST_GUILESS_MAIN(TestSimLifecycle)
#include "tst_simlifecycle.moc"
