#include "CliRun.h"
#include "PortlexErrors.h"
#include "SimulatorProcess.h"
#include "TestSupport.h"
#include "XmlEscape.h"
#include "_ZantDevice.h"

#include <QJsonArray>
#include <QJsonDocument>
#include <QTemporaryDir>
#include <QtTest>

#include <sys/stat.h>
#include <sys/sysmacros.h>

using namespace TestSupport;

// The file and device state commands against the sample handset: what they write is what
// the gateway answers, and a refusal reaches the user with the device's reason.
class TestCliFiles : public QObject
{
    Q_OBJECT

    QTemporaryDir m_sockets, m_package;
    std::unique_ptr<QTemporaryDir> m_local;
    SimulatorProcess m_simulator { m_sockets.path() };
    QSharedPointer<_ZantDevice> m_device;
    QString local(const QString& name) const { return m_local->filePath(name); }
    // A command's CSV lines, header first.
    static QStringList csv(const QStringList& arguments)
    {
        return QString::fromUtf8(runCli(QStringList {"--format", "csv"} + arguments).out).split('\n', Qt::SkipEmptyParts);
    }

private slots:
    void initTestCase()
    {
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        m_device = m_simulator.connectDevice(SimulatorProcess::sampleImage("handset"), "kestrel-k7");
        QVERIFY(m_device && writeFile(m_package.filePath("demo/demo.mod"), "module"));
        QCOMPARE(QProcess::execute(SimulatorProcess::executable(), {"pack", m_package.filePath("demo"), m_package.filePath("demo.zantro")}), 0);
    }
    void init() { m_local = std::make_unique<QTemporaryDir>(); }

    void pushThenPull_data()
    {
        QTest::addColumn<int>("size");
        QTest::newRow("empty") << 0;
        QTest::newRow("one byte") << 1;
        QTest::newRow("one over a chunk") << int(Protocol::TransferChunkSize) + 1;
    }
    // A device folder ending in "/" and an existing local folder keep the file's name.
    // Nothing is printed when stderr is no terminal.
    void pushThenPull()
    {
        QFETCH(int, size);
        const QString name = QStringLiteral("sent-%1.bin").arg(size);
        const QByteArray bytes = randomBytes(size, quint32(size) + 7);
        QVERIFY(writeFile(local(name), bytes) && QDir().mkpath(local("back")));
        const CliRun pushed = runCli({"push", "kestrel", local(name), "/user/"});
        const CliRun pulled = runCli({"pull", "kestrel", "/user/" + name, local("back")});
        QVERIFY(pushed.exitCode == 0 && pulled.exitCode == 0);
        QCOMPARE(readFile(local("back/" + name)), bytes);
        QCOMPARE(pushed.out + pushed.err + pulled.out + pulled.err, QByteArray());
    }

    void refusals_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<int>("exitCode");
        QTest::addColumn<QString>("reason");
        const QString readOnly = "system module folders are read-only", code = "error %1";
        QTest::newRow("push outside the volume") << QStringList {"push", "kestrel", "SOURCE", "/../out.bin"} << 4 << code.arg(PortlexError::PathRefused);
        QTest::newRow("push into a system folder") << QStringList {"push", "kestrel", "SOURCE", "/sys/mod/a.bin"} << 4 << readOnly;
        QTest::newRow("remove a system folder") << QStringList {"rm", "kestrel", "/sys/mod"} << 4 << readOnly;
        QTest::newRow("pull a missing file") << QStringList {"pull", "kestrel", "/user/none.bin", "LOCAL"} << 4 << code.arg(PortlexError::NotFound);
        QTest::newRow("install no package") << QStringList {"--volume", "/", "install", "kestrel", "SOURCE"} << 4 << "not a readable ZIP";
        QTest::newRow("install onto no volume") << QStringList {"--volume", "9", "install", "kestrel", "PACKAGE"} << 2 << "no volume 9";
    }
    // The device's reason, or the code when it gives none, and nothing left behind here.
    void refusals()
    {
        QFETCH(QStringList, arguments);
        QFETCH(int, exitCode);
        QFETCH(QString, reason);
        QVERIFY(writeFile(local("source.bin"), "bytes"));
        arguments.replaceInStrings("SOURCE", local("source.bin")).replaceInStrings("LOCAL", m_local->path());
        const CliRun run = runCli(arguments.replaceInStrings("PACKAGE", m_package.filePath("demo.zantro")));
        QCOMPARE(run.exitCode, exitCode);
        QVERIFY2(run.err.contains(reason.toUtf8()), run.err.constData());
        QCOMPARE(treeEntries(m_local->path()), QStringList {"source.bin"});
    }

    // ls, loaded-modules and settings write what the gateway answers; names that need CSV
    // quoting or look like a spreadsheet formula, and every thread state, are written out.
    void stateIsTheGatewaysAnswer()
    {
        for (const char* name : {"a,b.txt", "q\"x.txt", "=1+2.txt", "@sum.txt"})
            QVERIFY(writeFile(local(name), "bytes") && runCli({"push", "kestrel", local(name), "/user/odd/"}).exitCode == 0);
        QStringList listed = csv({"ls", "kestrel", "/user/odd"}), raw = csv({"--csv-raw", "ls", "kestrel", "/user/odd"});
        std::sort(listed.begin() + 1, listed.end());
        std::sort(raw.begin() + 1, raw.end());
        QCOMPARE(listed, (QStringList {"Type,Name,Path,Size,File Attributes", "file,\"a,b.txt\",\"/user/odd/a,b.txt\",5,rw-",
                                       "file,\"q\"\"x.txt\",\"/user/odd/q\"\"x.txt\",5,rw-", "file,'=1+2.txt,/user/odd/=1+2.txt,5,rw-",
                                       "file,'@sum.txt,/user/odd/@sum.txt,5,rw-"}));
        QCOMPARE(raw.mid(3), (QStringList {"file,=1+2.txt,/user/odd/=1+2.txt,5,rw-", "file,@sum.txt,/user/odd/@sum.txt,5,rw-"}));

        // The handset's kernel and messaging threads hold every state.
        QStringList threads;
        for (const QJsonValue& process : QJsonDocument::fromJson(runCli({"--format", "json", "processes", "kestrel"}).out)["process"].toArray())
            for (const QJsonValue& t : process["thread"].toArray())
                if (process["name"] == QJsonValue("Kernel") || process["name"] == QJsonValue("Messaging"))
                    threads << QStringLiteral("%1 %2 %3").arg(t["name"].toString(), t["state"].toString()).arg(t["priority"].toInt());
        QCOMPARE(threads.mid(0, 2) + threads.mid(threads.size() - 3),
                 (QStringList {"idle Default 0", "scheduler Included 250", "inbox Default 140", "mms Excluded 120", "push Hard Excluded 130"}));

        QVector<LoadedModuleInfo> loaded;
        QVERIFY(m_device->GetLoadedModules(loaded) == 0);
        QStringList modules {"Process Name,Process ID,Module Name,Size,Location"};
        for (const LoadedModuleInfo& process : std::as_const(loaded))
            for (const LoadedModuleEntry& m : process.modules)
                modules << QStringList {process.name, QString::number(process.id), m.name, QString::number(m.size), m.location}.join(',');
        QCOMPARE(csv({"loaded-modules", "kestrel"}), modules);
        // Every node with its values, each before its children.
        QStringList nodes, written, pending {"/"};
        while (!pending.isEmpty()) {
            auto node = QSharedPointer<_SettingsInfo>::create("", pending.takeLast());
            QCOMPARE(m_device->GetChildSettings(node), 0);
            QStringList fields {node->Path()};
            for (const auto& value : std::as_const(node->values))
                fields << value.first << value.second;
            nodes << fields.join('|');
            for (auto child = node->children.crbegin(); child != node->children.crend(); ++child)
                pending << (*child)->Path();
        }
        for (const QJsonValue& node : QJsonDocument::fromJson(runCli({"--format", "json", "settings", "kestrel"}).out)["node"].toArray()) {
            QStringList fields {node["path"].toString()};
            for (const QJsonValue& value : node["value"].toArray())
                fields << value["name"].toString() << value["value"].toString();
            written << fields.join('|');
        }
        QVERIFY(nodes.size() > 1 && written == nodes);
    }

    void installRunRemove()
    {
        const CliRun installed = runCli({"install", "kestrel", m_package.filePath("demo.zantro")});
        QVERIFY2(installed.exitCode == 0 && installed.out.contains("demo.zantro installed"), installed.out.constData());
        QCOMPARE(runCli({"run", "kestrel", "/usermod/demo/demo.mod"}).exitCode, 0);
        QVERIFY(!csv({"processes", "kestrel"}).filter(QRegularExpression("^demo,")).isEmpty());
        QCOMPARE(runCli({"rm", "kestrel", "/usermod/demo"}).exitCode, 0);
        QCOMPARE(csv({"ls", "kestrel", "/usermod"}).filter("/usermod/demo"), QStringList());
    }

    // pull and -o write neither through a link at the target (another user may have planted
    // it in a shared folder) nor over a FIFO or a device node; the refusal says why.
    void outputsOnlyReplaceRegularFiles()
    {
        QVERIFY(writeFile(local("victim.txt"), "precious") && QDir().mkpath(local("shared")));
        QVERIFY(QFile::link(local("victim.txt"), local("shared/shopping.txt")) && QFile::link(local("victim.txt"), local("shared/report.xml")));
        QVERIFY(::mkfifo(QFile::encodeName(local("shared/pipe")).constData(), 0600) == 0);
        const bool root = ::geteuid() == 0;
        if (root)
            QVERIFY(::mknod(QFile::encodeName(local("shared/null")).constData(), S_IFCHR | 0666, makedev(1, 3)) == 0);
        const QList<QPair<QStringList, QByteArray>> refused {
            {{"pull", "kestrel", "/user/notes/shopping.txt", local("shared")}, "symbolic link"},
            {{"-o", local("shared/report.xml"), "devices"}, "symbolic link"},
            {{"-o", local("shared/pipe"), "devices"}, "not a regular file"},
            {{"pull", "kestrel", "/user/notes/shopping.txt", local(root ? "shared/null" : "shared/pipe")}, "not a regular file"},
        };
        for (const auto& [arguments, reason] : refused) {
            const CliRun run = runCli(arguments);
            QVERIFY2(run.exitCode == 4 && run.err.contains(reason), run.err.constData());
        }
        QCOMPARE(readFile(local("victim.txt")), QByteArray("precious"));
        QVERIFY(QFileInfo(local("shared/shopping.txt")).isSymLink() && QFileInfo(local("shared/report.xml")).isSymLink());
        // Nothing left behind: no temporary file beside the targets.
        QCOMPARE(QDir(local("shared")).entryList(QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot).size(), root ? 4 : 3);
        struct stat info;
        QVERIFY(::lstat(QFile::encodeName(local("shared/pipe")).constData(), &info) == 0 && S_ISFIFO(info.st_mode));
        QVERIFY(!root || (::lstat(QFile::encodeName(local("shared/null")).constData(), &info) == 0 && S_ISCHR(info.st_mode)));
        // A regular file is replaced, keeping its permissions.
        QVERIFY(writeFile(local("shared/kept.xml"), "old") && QFile::setPermissions(local("shared/kept.xml"), QFile::ReadOwner | QFile::WriteOwner));
        QCOMPARE(runCli({"-o", local("shared/kept.xml"), "devices"}).exitCode, 0);
        QVERIFY(readFile(local("shared/kept.xml")).startsWith("<!DOCTYPE"));
        QVERIFY(::lstat(QFile::encodeName(local("shared/kept.xml")).constData(), &info) == 0 && (info.st_mode & 0777) == 0600);
    }

    // A name with a character XML cannot carry is listed in its escaped form, which our
    // rule turns back into the name of that very file.
    void escapedNamesNameTheirFile()
    {
        const QString name = QStringLiteral("fffe") + QChar(0xFFFE) + QStringLiteral(".txt");
        QVERIFY(writeFile(local("odd.txt"), "odd one") && writeFile(local("plain.txt"), "plain one"));
        QCOMPARE(m_device->CopyFileToDevice(local("odd.txt"), "/user/" + name), 0);
        QCOMPARE(m_device->CopyFileToDevice(local("plain.txt"), "/user/fffe.txt"), 0);
        const QByteArray listing = runCli({"ls", "kestrel", "/user"}).out;
        QVERIFY2(listing.contains("path=\"/user/fffe{U+FFFE}.txt\""), listing.constData());
        QCOMPARE(XmlEscape::unescaped(u"/user/fffe{U+FFFE}.txt"), "/user/" + name);
        QCOMPARE(runCli({"pull", "kestrel", XmlEscape::unescaped(u"/user/fffe{U+FFFE}.txt"), local("back.txt")}).exitCode, 0);
        QCOMPARE(readFile(local("back.txt")), QByteArray("odd one"));
        QCOMPARE(m_device->DeleteDeviceFile("/user/" + name) + m_device->DeleteDeviceFile("/user/fffe.txt"), 0);
    }

    // A device that stops answering once the copy began: the call times out.
    void pausedDeviceEndsTheCommand()
    {
        SimulatorProcess slow(m_sockets.path());
        QVERIFY(slow.start(SimulatorProcess::sampleImage("handset"), "slow-k7", {"--latency", "200"}));
        const QString source = local("slow.bin");
        QVERIFY(writeFile(source, randomBytes(3 * Protocol::TransferChunkSize, 3)));
        QProcess cli;
        cli.start(QCoreApplication::applicationDirPath() + "/delvix-cli", {"push", "slow-k7", source, "/user/slow.bin"});
        // The source is opened once the device is connected.
        QVERIFY(QTest::qWaitFor([&] {
            const QFileInfoList fds = QDir(QStringLiteral("/proc/%1/fd").arg(cli.processId())).entryInfoList(QDir::AllEntries | QDir::System);
            return std::any_of(fds.cbegin(), fds.cend(), [&](const QFileInfo& fd) { return fd.symLinkTarget() == source; });
        }, 30000));
        slow.pause();
        const bool ended = cli.waitForFinished(60000);
        slow.resume();
        QVERIFY(ended && cli.exitCode() == 4);
        QVERIFY(cli.readAllStandardError().contains(QByteArray::number(PortlexError::Timeout)));
    }
};

QTEST_GUILESS_MAIN(TestCliFiles)
#include "tst_clifiles.moc"
