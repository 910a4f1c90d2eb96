#include "DeviceConnection.h"
#include "ImageCopy.h"
#include "TestSupport.h"

#include <QCoreApplication>
#include <QLocalSocket>
#include <QProcess>
#include <QTemporaryDir>
#include <QtTest>

#include <csignal>

// zantro-sim as a real process: clean ends on signals, --reset, start-up failures.
class TestSimLifecycle : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_image;
    QString m_sockets;

    static QString executable() { return QCoreApplication::applicationDirPath() + QStringLiteral("/zantro-sim"); }
    // Starts zantro-sim on the copied sample and reads its "serving IMAGE on SOCKET" line.
    bool start(QProcess& process, const QStringList& extra, QString& servedImage, QString& socketPath)
    {
        process.start(executable(), QStringList {"--image", m_image, "--socket-dir", m_sockets} + extra);
        QByteArray output;
        while (!output.contains('\n') && process.waitForReadyRead(10000))
            output += process.readAllStandardOutput();
        const QString line = QString::fromLocal8Bit(output).trimmed();
        const qsizetype on = line.lastIndexOf(QLatin1String(" on "));
        if (!line.startsWith(QLatin1String("zantro-sim: serving ")) || on < 0) {
            qWarning() << "zantro-sim did not start:" << line << process.readAllStandardError();
            return false;
        }
        servedImage = line.mid(20, on - 20);
        socketPath = line.mid(on + 4);
        return true;
    }
    // "display name|device id" from a handshake, as the gateway sees it.
    static QString greeting(const QString& socketPath)
    {
        DeviceConnection connection(socketPath);
        if (!connection.startHandshake() || connection.finishHandshake(QDeadlineTimer(5000)) != 0)
            return connection.errorString();
        return connection.displayName() + '|' + connection.deviceId();
    }

private slots:
    void init()
    {
        m_dir = std::make_unique<QTemporaryDir>();
        m_image = m_dir->filePath(QStringLiteral("image"));
        m_sockets = m_dir->filePath(QStringLiteral("run/sockets"));
        QString error;
        QVERIFY2(ImageCopy::copyTree(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/simulator"), m_image, &error), qPrintable(error));
    }

    void signalEndsCleanly_data()
    {
        QTest::addColumn<int>("signalNumber");
        QTest::newRow("SIGTERM") << int(SIGTERM);
        QTest::newRow("SIGINT") << int(SIGINT);
    }

    void signalEndsCleanly()
    {
        QFETCH(int, signalNumber);
        QProcess process;
        QString served, socket;
        QVERIFY(start(process, {"--id", "life-1"}, served, socket));
        QCOMPARE(served, m_image);
        QCOMPARE(QFileInfo(socket).absolutePath(), m_sockets);
        QCOMPARE(greeting(socket), "Zantro Simulator - Aurora|life-1");
        QLocalSocket idle; // a connected client must not keep the daemon alive
        idle.connectToServer(socket);
        QVERIFY(idle.waitForConnected(2000));

        QCOMPARE(::kill(pid_t(process.processId()), signalNumber), 0);
        QVERIFY(process.waitForFinished(5000));
        QCOMPARE(process.exitStatus(), QProcess::NormalExit);
        QCOMPARE(process.exitCode(), 0);
        QVERIFY(!QFileInfo::exists(socket) && !QFileInfo(socket).isSymLink());
    }

    void resetLeavesTheImageUntouched()
    {
        const QByteArray before = TestSupport::treeDigest(m_image);
        QProcess process;
        QString served, socket;
        QVERIFY(start(process, {"--reset"}, served, socket));
        QVERIFY(served != m_image);
        QCOMPARE(TestSupport::treeDigest(served), before); // a full copy is served
        QVERIFY(greeting(socket).endsWith("|aurora-sim")); // the image's own id

        QCOMPARE(::kill(pid_t(process.processId()), SIGTERM), 0);
        QVERIFY(process.waitForFinished(5000));
        QCOMPARE(process.exitCode(), 0);
        QVERIFY(!QFileInfo::exists(served)); // the copy goes with the daemon
        QCOMPARE(TestSupport::treeDigest(m_image), before);
    }

    void startFailures_data()
    {
        QTest::addColumn<QStringList>("arguments");
        QTest::addColumn<int>("exitCode");
        QTest::addColumn<QByteArray>("message");
        QTest::newRow("no image") << QStringList {"--image", "/nonexistent/image"} << 1 << QByteArray("device.xml");
        QTest::newRow("bad option") << QStringList {"--image", "x", "--fail", "Nope=3"} << 2 << QByteArray("unknown operation");
        QTest::newRow("help") << QStringList {"--help"} << 0 << QByteArray("--refuse-connect");
    }

    void startFailures()
    {
        QFETCH(QStringList, arguments);
        QFETCH(int, exitCode);
        QFETCH(QByteArray, message);
        QProcess process;
        process.start(executable(), arguments);
        QVERIFY(process.waitForFinished(10000));
        QCOMPARE(process.exitCode(), exitCode);
        // Help goes to the standard output, mistakes to the error output.
        QVERIFY((exitCode == 0 ? process.readAllStandardOutput() : process.readAllStandardError()).contains(message));
    }
};

QTEST_GUILESS_MAIN(TestSimLifecycle)
#include "tst_simlifecycle.moc"
