#include "Frame.h"
#include "FrameDecoder.h"
#include "ImageCopy.h"
#include "PayloadStream.h"

#include <QCoreApplication>
#include <QCryptographicHash>
#include <QDeadlineTimer>
#include <QDir>
#include <QDirIterator>
#include <QLocalSocket>
#include <QProcess>
#include <QTemporaryDir>
#include <QtTest>

#include <csignal>
#include <sys/stat.h>

// zantro-sim as a real process: start-up, the socket's life, clean ends on signals, --reset.
class TestSimLifecycle : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void cleanup();
    void signalEndsCleanly_data();
    void signalEndsCleanly();
    void resetLeavesTheImageUntouched();
    void startFailures_data();
    void startFailures();

private:
    struct Started
    {
        QString servedImage;
        QString socketPath;
    };
    // Starts zantro-sim and waits for its "serving" line.
    bool start(QProcess& process, const QStringList& arguments, Started& started);
    static bool hello(const QString& socketPath, QString& displayName, QString& deviceId);
    static QMap<QString, QByteArray> treeHashes(const QString& folder);
    static QString executable() { return QCoreApplication::applicationDirPath() + QStringLiteral("/zantro-sim"); }

    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_image;
    QString m_sockets;
};

void TestSimLifecycle::init()
{
    m_dir = std::make_unique<QTemporaryDir>();
    m_image = m_dir->filePath(QStringLiteral("image"));
    m_sockets = m_dir->filePath(QStringLiteral("run/sockets"));
    QString error;
    QVERIFY2(ImageCopy::copyTree(QStringLiteral(DELVIX_SAMPLES_DIR "/devices/simulator"), m_image, &error), qPrintable(error));
}

void TestSimLifecycle::cleanup()
{
    m_dir.reset();
}

bool TestSimLifecycle::start(QProcess& process, const QStringList& arguments, Started& started)
{
    process.setProcessChannelMode(QProcess::SeparateChannels);
    process.start(executable(), arguments);
    const QDeadlineTimer deadline(10000);
    QByteArray output;
    while (!deadline.hasExpired() && !output.contains('\n')) {
        if (!process.waitForReadyRead(int(qMax<qint64>(1, deadline.remainingTime()))))
            break;
        output += process.readAllStandardOutput();
    }
    const QString line = QString::fromLocal8Bit(output).trimmed();
    const qsizetype on = line.lastIndexOf(QLatin1String(" on "));
    if (!line.startsWith(QLatin1String("zantro-sim: serving ")) || on < 0) {
        qWarning() << "zantro-sim did not start:" << line << process.readAllStandardError();
        return false;
    }
    started.servedImage = line.mid(20, on - 20);
    started.socketPath = line.mid(on + 4);
    return true;
}

bool TestSimLifecycle::hello(const QString& socketPath, QString& displayName, QString& deviceId)
{
    QLocalSocket socket;
    socket.connectToServer(socketPath);
    if (!socket.waitForConnected(2000))
        return false;
    Frame request;
    request.requestId = 1;
    request.operation = quint32(Operation::Hello);
    PayloadStream out(&request.payload);
    out << Protocol::ProtocolVersion << QStringLiteral("tst_simlifecycle");
    socket.write(request.encode());

    FrameDecoder decoder;
    Frame answer;
    const QDeadlineTimer deadline(5000);
    while (decoder.next(&answer) != FrameDecoder::Status::Ready) {
        if (deadline.hasExpired() || !socket.waitForReadyRead(int(qMax<qint64>(1, deadline.remainingTime()))))
            return false;
        decoder.feed(socket.readAll());
    }
    PayloadStream in(answer.payload);
    qint32 result = -1;
    in >> result >> displayName >> deviceId;
    return in.ok() && result == 0;
}

QMap<QString, QByteArray> TestSimLifecycle::treeHashes(const QString& folder)
{
    QMap<QString, QByteArray> hashes;
    QDirIterator it(folder, QDir::Files | QDir::Dirs | QDir::NoDotAndDotDot | QDir::Hidden, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        QFile file(path);
        const QByteArray content = it.fileInfo().isFile() && file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray("dir");
        hashes.insert(QDir(folder).relativeFilePath(path), QCryptographicHash::hash(content, QCryptographicHash::Sha1));
    }
    return hashes;
}

void TestSimLifecycle::signalEndsCleanly_data()
{
    QTest::addColumn<int>("signalNumber");
    QTest::newRow("SIGTERM") << int(SIGTERM);
    QTest::newRow("SIGINT") << int(SIGINT);
}

void TestSimLifecycle::signalEndsCleanly()
{
    QFETCH(int, signalNumber);
    QProcess process;
    Started started;
    QVERIFY(start(process, {QStringLiteral("--image"), m_image, QStringLiteral("--socket-dir"), m_sockets, QStringLiteral("--id"),
                            QStringLiteral("life-1")}, started));
    QCOMPARE(started.servedImage, m_image);
    QCOMPARE(QFileInfo(started.socketPath).absolutePath(), m_sockets);

    struct stat info;
    QCOMPARE(::stat(QFile::encodeName(m_sockets).constData(), &info), 0);
    QCOMPARE(info.st_mode & 07777, mode_t(0700));
    QCOMPARE(::lstat(QFile::encodeName(started.socketPath).constData(), &info), 0);
    QVERIFY(S_ISSOCK(info.st_mode));
    QCOMPARE(info.st_mode & 07777, mode_t(0600));

    QString name;
    QString id;
    QVERIFY(hello(started.socketPath, name, id));
    QCOMPARE(name, QStringLiteral("Zantro Simulator - Aurora"));
    QCOMPARE(id, QStringLiteral("life-1"));

    QLocalSocket idle; // a connected client must not keep the daemon alive
    idle.connectToServer(started.socketPath);
    QVERIFY(idle.waitForConnected(2000));

    QCOMPARE(::kill(pid_t(process.processId()), signalNumber), 0);
    QVERIFY(process.waitForFinished(5000));
    QCOMPARE(process.exitStatus(), QProcess::NormalExit);
    QCOMPARE(process.exitCode(), 0);
    QVERIFY(!QFileInfo::exists(started.socketPath));
    QVERIFY(!QFileInfo(started.socketPath).isSymLink());
}

void TestSimLifecycle::resetLeavesTheImageUntouched()
{
    const auto before = treeHashes(m_image);
    QProcess process;
    Started started;
    QVERIFY(start(process, {QStringLiteral("--image"), m_image, QStringLiteral("--socket-dir"), m_sockets, QStringLiteral("--reset")},
                  started));
    QVERIFY(started.servedImage != m_image);
    QCOMPARE(treeHashes(started.servedImage), before); // a full copy is served
    QString name;
    QString id;
    QVERIFY(hello(started.socketPath, name, id));
    QCOMPARE(id, QStringLiteral("aurora-sim")); // the image's own id

    ::kill(pid_t(process.processId()), SIGTERM);
    QVERIFY(process.waitForFinished(5000));
    QCOMPARE(process.exitCode(), 0);
    QVERIFY(!QFileInfo::exists(started.servedImage)); // the copy goes with the daemon
    QCOMPARE(treeHashes(m_image), before);
}

void TestSimLifecycle::startFailures_data()
{
    QTest::addColumn<QStringList>("arguments");
    QTest::addColumn<int>("exitCode");
    QTest::addColumn<QString>("message");
    QTest::newRow("no image") << QStringList{"--image", "/nonexistent/image"} << 1 << "device.xml";
    QTest::newRow("bad option") << QStringList{"--image", "x", "--fail", "Nope=3"} << 2 << "unknown operation";
    QTest::newRow("help") << QStringList{"--help"} << 0 << "";
}

void TestSimLifecycle::startFailures()
{
    QFETCH(QStringList, arguments);
    QFETCH(int, exitCode);
    QFETCH(QString, message);
    QProcess process;
    process.start(executable(), arguments);
    QVERIFY(process.waitForFinished(10000));
    QCOMPARE(process.exitCode(), exitCode);
    if (exitCode == 0)
        QVERIFY(process.readAllStandardOutput().contains("--refuse-connect"));
    else
        QVERIFY(QString::fromLocal8Bit(process.readAllStandardError()).contains(message));
}

QTEST_GUILESS_MAIN(TestSimLifecycle)
#include "tst_simlifecycle.moc"
