#include "DeviceConnection.h"
#include "FrameDecoder.h"
#include "FrameServer.h"
#include "PortlexErrors.h"

#include <QEventLoop>
#include <QFutureWatcher>
#include <QLocalServer>
#include <QLocalSocket>
#include <QTemporaryDir>
#include <QThreadPool>
#include <QtConcurrent>
#include <QtTest>

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <memory>

namespace {

constexpr int HalfOpenMs = 300;

class TestHandler : public RequestHandler
{
public:
    QString displayName() const override { return QStringLiteral("Zantro Simulator - Bench"); }
    QString deviceId() const override { return QStringLiteral("bench-1"); }

    Answer handle(const Request& request) override
    {
        flags << request.flags;
        switch (request.operation) {
        case Operation::GetVolumes: {
            VolumeInfo volume;
            volume.mountPoint = QStringLiteral("fs:/");
            volume.volumeId = 7;
            return Answer::success(QVector<VolumeInfo> { volume });
        }
        case Operation::GetRegistry:
            return Answer::failure(3);
        default:
            return Answer::success();
        }
    }

    void connectionClosed(quint64 connectionId) override { closed << connectionId; }

    QList<Protocol::RequestFlags> flags;
    QList<quint64> closed;
};

// A DeviceConnection driven from a thread of its own while the test's thread runs the
// server's event loop, as the GUI's workers use the gateway.
class Client
{
public:
    explicit Client(const QString& socketPath)
        : m_connection(std::make_unique<DeviceConnection>(socketPath))
    {
        m_thread.setMaxThreadCount(1);
        m_thread.setExpiryTimeout(-1);
    }

    ~Client()
    {
        run([this] {
            m_connection.reset();  // its socket belongs to the client thread
            return 0;
        });
    }

    qint32 call(Operation operation, Protocol::RequestFlags flags = Protocol::NoFlags, QByteArray* body = nullptr,
                int timeoutMs = 2000)
    {
        return run([&] {
            QByteArray answer;
            const qint32 result = m_connection->call(operation, QByteArray(), flags, &answer, QDeadlineTimer(timeoutMs));
            if (body)
                *body = answer;
            return result;
        });
    }

    DeviceConnection& connection() { return *m_connection; }

private:
    template <typename F>
    qint32 run(F work)
    {
        QFutureWatcher<qint32> watcher;
        QEventLoop loop;
        QObject::connect(&watcher, &QFutureWatcher<qint32>::finished, &loop, &QEventLoop::quit);
        watcher.setFuture(QtConcurrent::run(&m_thread, work));
        if (!watcher.isFinished())
            loop.exec();
        return watcher.result();
    }

    QThreadPool m_thread;
    std::unique_ptr<DeviceConnection> m_connection;
};

QByteArray helloFrame(quint16 headerVersion, quint16 payloadVersion)
{
    Frame frame;
    frame.version = headerVersion;
    frame.requestId = 1;
    frame.operation = quint32(Operation::Hello);
    PayloadStream out(&frame.payload);
    out << payloadVersion << QStringLiteral("raw test");
    return frame.encode();
}

mode_t modeOf(const QString& path)
{
    struct stat info;
    return ::lstat(QFile::encodeName(path).constData(), &info) == 0 ? (info.st_mode & 07777) : 0;
}

// A socket file nobody listens on, as a crashed device leaves it.
bool makeStaleSocket(const QString& path)
{
    const int fd = ::socket(AF_UNIX, SOCK_STREAM, 0);
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    const QByteArray name = QFile::encodeName(path);
    qstrncpy(address.sun_path, name.constData(), sizeof(address.sun_path));
    const bool bound = ::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0;
    ::close(fd);
    return bound;
}

} // namespace

class FrameServerTest : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void cleanup();
    void handshakeAndAnswers();
    void versionMismatchRefused_data();
    void versionMismatchRefused();
    void misbehavingClientClosedAlone_data();
    void misbehavingClientClosedAlone();
    void greetedIdleConnectionIsKept();
    void closedConnectionsAreReported();
    void socketIsPrivate();
    void clientSurvivesServerOutages();
    void clientReportsVersionMismatch();

private:
    std::unique_ptr<QTemporaryDir> m_dir;
    std::unique_ptr<TestHandler> m_handler;
    std::unique_ptr<FrameServer> m_server;
    QString m_socketPath;
};

void FrameServerTest::init()
{
    m_dir = std::make_unique<QTemporaryDir>();
    QVERIFY(m_dir->isValid());
    m_socketPath = m_dir->filePath(QStringLiteral("sockets/bench-1"));
    m_handler = std::make_unique<TestHandler>();
    m_server = std::make_unique<FrameServer>(m_handler.get());
    m_server->setHalfOpenTimeout(HalfOpenMs);
    QVERIFY2(m_server->listen(m_socketPath), qPrintable(m_server->errorString()));
}

void FrameServerTest::cleanup()
{
    m_server.reset();
    m_handler.reset();
    m_dir.reset();
}

void FrameServerTest::handshakeAndAnswers()
{
    Client client(m_socketPath);
    QByteArray body;
    QCOMPARE(client.call(Operation::GetVolumes, Protocol::NoFlags, &body), 0);
    QCOMPARE(client.connection().displayName(), QStringLiteral("Zantro Simulator - Bench"));
    QCOMPARE(client.connection().deviceId(), QStringLiteral("bench-1"));
    QVector<VolumeInfo> volumes;
    PayloadStream in(body);
    readList(in, volumes);
    QVERIFY(in.ok());
    QCOMPARE(volumes.size(), 1);
    QCOMPARE(volumes.first().volumeId, 7u);

    QCOMPARE(client.call(Operation::GetRegistry), 3);
    QCOMPARE(client.call(Operation(999)), qint32(PortlexError::UnknownOperation));

    // Lock requests travel in the header of the request they ride on, and only there.
    QCOMPARE(client.call(Operation::TepStatus, Protocol::ServiceLockRequest | Protocol::SignatureLockRequest), 0);
    QCOMPARE(client.call(Operation::TepStatus), 0);
    QCOMPARE(m_handler->flags.size(), 4);  // the unknown operation never reached the handler
    QCOMPARE(m_handler->flags.at(2), Protocol::ServiceLockRequest | Protocol::SignatureLockRequest);
    QCOMPARE(m_handler->flags.at(3), Protocol::RequestFlags());

    // Everything above went over the one connection.
    QVERIFY(m_handler->closed.isEmpty());
}

void FrameServerTest::versionMismatchRefused_data()
{
    QTest::addColumn<quint16>("headerVersion");
    QTest::addColumn<quint16>("payloadVersion");
    QTest::newRow("newer client") << quint16(Protocol::ProtocolVersion + 1) << quint16(Protocol::ProtocolVersion + 1);
    QTest::newRow("payload disagrees with header") << Protocol::ProtocolVersion << quint16(0);
}

void FrameServerTest::versionMismatchRefused()
{
    QFETCH(quint16, headerVersion);
    QFETCH(quint16, payloadVersion);

    QLocalSocket raw;
    QByteArray received;
    connect(&raw, &QLocalSocket::readyRead, this, [&] { received += raw.readAll(); });
    raw.connectToServer(m_socketPath);
    QVERIFY(raw.waitForConnected());
    raw.write(helloFrame(headerVersion, payloadVersion));
    // The device answers, then closes the connection.
    QTRY_COMPARE(raw.state(), QLocalSocket::UnconnectedState);

    FrameDecoder decoder;
    decoder.feed(received);
    Frame answer;
    QCOMPARE(decoder.next(&answer), FrameDecoder::Status::Ready);
    QCOMPARE(answer.requestId, 1u);
    PayloadStream in(answer.payload);
    qint32 result = 0;
    QString message;
    in >> result >> message;
    QCOMPARE(result, qint32(PortlexError::VersionMismatch));
    QVERIFY2(message.contains(QStringLiteral("version %1").arg(payloadVersion)), qPrintable(message));
    QVERIFY2(message.contains(QStringLiteral("speaks version %1").arg(Protocol::ProtocolVersion)), qPrintable(message));
}

void FrameServerTest::misbehavingClientClosedAlone_data()
{
    Frame partial;
    partial.operation = quint32(Operation::GetModules);
    partial.payload = QByteArray(100, 'p');
    Frame early;
    early.operation = quint32(Operation::GetModules);
    QByteArray oversized(Protocol::HeaderSize, '\0');
    qToBigEndian<quint32>(Protocol::FrameMagic, oversized.data());
    qToBigEndian<quint32>(Protocol::MaxPayloadSize + 1, oversized.data() + 4);

    QTest::addColumn<QByteArray>("bytes");
    QTest::newRow("garbage") << QByteArray("\x01\x02\x03 definitely not a frame \xff\xfe");
    QTest::newRow("oversized frame") << helloFrame(Protocol::ProtocolVersion, Protocol::ProtocolVersion) + oversized;
    QTest::newRow("half-sent frame") << helloFrame(Protocol::ProtocolVersion, Protocol::ProtocolVersion) + partial.encode().left(60);
    QTest::newRow("request before handshake") << early.encode();
    QTest::newRow("silent connection") << QByteArray();
    QTest::newRow("half-sent header") << QByteArray("ZN");
}

void FrameServerTest::misbehavingClientClosedAlone()
{
    QFETCH(QByteArray, bytes);

    Client good(m_socketPath);
    QCOMPARE(good.call(Operation::GetModules), 0);

    QLocalSocket bad;
    bad.connectToServer(m_socketPath);
    QVERIFY(bad.waitForConnected());
    bad.write(bytes);
    bad.flush();
    QTRY_COMPARE(bad.state(), QLocalSocket::UnconnectedState);
    QTRY_COMPARE(m_handler->closed.size(), 1);

    // The well-behaved client is still served on its own, unbroken connection.
    QCOMPARE(good.call(Operation::GetModules), 0);
    QCOMPARE(m_handler->closed.size(), 1);
}

void FrameServerTest::greetedIdleConnectionIsKept()
{
    Client client(m_socketPath);
    QCOMPARE(client.call(Operation::GetModules), 0);
    QTest::qWait(3 * HalfOpenMs);
    QCOMPARE(client.call(Operation::GetModules), 0);
    QVERIFY(m_handler->closed.isEmpty());
}

void FrameServerTest::closedConnectionsAreReported()
{
    {
        Client first(m_socketPath);
        Client second(m_socketPath);
        QCOMPARE(first.call(Operation::GetModules), 0);
        QCOMPARE(second.call(Operation::GetModules), 0);
    }
    QTRY_COMPARE(m_handler->closed.size(), 2);
    QVERIFY(m_handler->closed.at(0) != m_handler->closed.at(1));
}

void FrameServerTest::socketIsPrivate()
{
    QCOMPARE(modeOf(QFileInfo(m_socketPath).absolutePath()), mode_t(0700));
    QCOMPARE(modeOf(m_socketPath), mode_t(0600));

    FrameServer second(m_handler.get());
    QVERIFY(!second.listen(m_socketPath));
    QVERIFY2(second.errorString().contains(QStringLiteral("already listens")), qPrintable(second.errorString()));

    // A folder left open by someone else is tightened; a stale socket is replaced.
    const QString folder = m_dir->filePath(QStringLiteral("loose"));
    QVERIFY(QDir().mkpath(folder));
    QVERIFY(::chmod(QFile::encodeName(folder).constData(), 0755) == 0);
    const QString stale = folder + QStringLiteral("/stale");
    QVERIFY(makeStaleSocket(stale));
    FrameServer third(m_handler.get());
    QVERIFY2(third.listen(stale), qPrintable(third.errorString()));
    QCOMPARE(modeOf(folder), mode_t(0700));
    Client client(stale);
    QCOMPARE(client.call(Operation::GetModules), 0);

    // close() takes the socket file away.
    third.close();
    QVERIFY(!QFileInfo::exists(stale));
}

void FrameServerTest::clientSurvivesServerOutages()
{
    Client client(m_socketPath);
    QCOMPARE(client.call(Operation::GetModules), 0);

    // An answer slower than the caller's deadline is a timeout, and the late answer must
    // not be mistaken for the answer to the next request.
    m_server->setLatency(800);
    QCOMPARE(client.call(Operation::GetRegistry, Protocol::NoFlags, nullptr, 200), qint32(PortlexError::Timeout));
    m_server->setLatency(0);
    QCOMPARE(client.call(Operation::GetModules), 0);

    m_server->close();
    QCOMPARE(client.call(Operation::GetModules), qint32(PortlexError::Unreachable));
    QVERIFY(!client.connection().errorString().isEmpty());

    FrameServer again(m_handler.get());
    QVERIFY(again.listen(m_socketPath));
    QCOMPARE(client.call(Operation::GetModules), 0);

    Client nobody(m_dir->filePath(QStringLiteral("sockets/none")));
    QCOMPARE(nobody.call(Operation::GetModules), qint32(PortlexError::Unreachable));
    QVERIFY(nobody.connection().errorString().contains(QStringLiteral("sockets/none")));
}

void FrameServerTest::clientReportsVersionMismatch()
{
    // A device of a later protocol generation refuses the handshake and says why.
    const QString older = m_dir->filePath(QStringLiteral("sockets/older"));
    const QString refusal = QStringLiteral("Protocol version 1 is not supported; this device speaks version 9");
    QLocalServer device;
    QVERIFY(device.listen(older));
    connect(&device, &QLocalServer::newConnection, this, [&] {
        QLocalSocket* socket = device.nextPendingConnection();
        connect(socket, &QLocalSocket::readyRead, socket, [socket, refusal] {
            FrameDecoder decoder;
            decoder.feed(socket->readAll());
            Frame hello;
            if (decoder.next(&hello) != FrameDecoder::Status::Ready)
                return;
            Frame answer;
            answer.version = 9;
            answer.requestId = hello.requestId;
            answer.operation = hello.operation;
            PayloadStream out(&answer.payload);
            out << qint32(PortlexError::VersionMismatch) << refusal;
            socket->write(answer.encode());
            socket->disconnectFromServer();
        });
    });

    Client client(older);
    QCOMPARE(client.call(Operation::GetModules), qint32(PortlexError::VersionMismatch));
    QCOMPARE(client.connection().errorString(), refusal);
}

QTEST_GUILESS_MAIN(FrameServerTest)
#include "tst_frameserver.moc"
