#include "DeviceConnection.h"
#include "FrameDecoder.h"
#include "FrameServer.h"
#include "PortlexErrors.h"
#include "TestSupport.h"

#include <QEventLoop>
#include <QFutureWatcher>
#include <QLocalServer>
#include <QLocalSocket>
#include <QTemporaryDir>
#include <QThreadPool>
#include <QtConcurrent>
#include <QtEndian>
#include <QtTest>

#include <sys/stat.h>

#include <functional>
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
        ++handled;
        if (request.operation == Operation::GetVolumes)
            return Answer::success(quint32(7));
        return request.operation == Operation::GetRegistry ? Answer::failure(3) : Answer::success();
    }

    void connectionClosed(quint64 connectionId) override { closed << connectionId; }

    int handled = 0;
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
    ~Client() { run([this] { m_connection.reset(); return 0; }); }  // its socket belongs to the client thread

    qint32 call(Operation operation, QByteArray* body = nullptr, int timeoutMs = 2000)
    {
        QByteArray answer;
        const qint32 result = run([&] {
            return m_connection->call(operation, QByteArray(), Protocol::NoFlags, &answer, QDeadlineTimer(timeoutMs));
        });
        if (body)
            *body = answer;
        return result;
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

// A device written by hand, to send what the real server never would: every frame it
// receives is answered with reply(frame).
class ScriptedDevice : public QLocalServer
{
public:
    ScriptedDevice(const QString& path, std::function<Frame(const Frame&)> reply)
    {
        listen(path);
        connect(this, &QLocalServer::newConnection, this, [this, reply] {
            QLocalSocket* socket = nextPendingConnection();
            auto decoder = std::make_shared<FrameDecoder>();
            connect(socket, &QLocalSocket::readyRead, socket, [socket, decoder, reply] {
                decoder->feed(socket->readAll());
                Frame frame;
                while (decoder->next(&frame) == FrameDecoder::Status::Ready)
                    socket->write(reply(frame).encode());
            });
        });
    }
};

Frame answer(const Frame& request, qint32 result, const QString& text1 = QString(), const QString& text2 = QString())
{
    Frame frame = request;
    frame.payload.clear();
    PayloadStream(&frame.payload) << result << text1 << text2;
    return frame;
}

QByteArray helloFrame(quint16 headerVersion, quint16 payloadVersion)
{
    QByteArray payload;
    PayloadStream(&payload) << payloadVersion << QStringLiteral("raw test");
    return Frame { headerVersion, 0, 1, quint32(Operation::Hello), payload }.encode();
}

mode_t modeOf(const QString& path)
{
    struct stat info;
    return ::lstat(QFile::encodeName(path).constData(), &info) == 0 ? (info.st_mode & 07777) : 0;
}

} // namespace

class FrameServerTest : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_dir;
    std::unique_ptr<TestHandler> m_handler;
    std::unique_ptr<FrameServer> m_server;
    QString m_socketPath;

private slots:
    void init()
    {
        m_dir = std::make_unique<QTemporaryDir>();
        QVERIFY(m_dir->isValid());
        m_socketPath = m_dir->filePath(QStringLiteral("sockets/bench-1"));
        m_handler = std::make_unique<TestHandler>();
        m_server = std::make_unique<FrameServer>(m_handler.get());
        m_server->setHalfOpenTimeout(HalfOpenMs);
        QVERIFY2(m_server->listen(m_socketPath), qPrintable(m_server->errorString()));
    }

    void cleanup()
    {
        m_server.reset();
        m_handler.reset();
        m_dir.reset();
    }

    void handshakeAndAnswers()
    {
        Client client(m_socketPath);
        QByteArray body;
        QCOMPARE(client.call(Operation::GetVolumes, &body), 0);
        QCOMPARE(client.connection().displayName(), QStringLiteral("Zantro Simulator - Bench"));
        QCOMPARE(client.connection().deviceId(), QStringLiteral("bench-1"));
        quint32 seven = 0;
        PayloadStream(body) >> seven;
        QCOMPARE(seven, 7u);

        QCOMPARE(client.call(Operation::GetRegistry), 3);
        QCOMPARE(client.call(Operation(999)), qint32(PortlexError::UnknownOperation));
        QCOMPARE(m_handler->handled, 2);  // the unknown operation never reached the handler
        QVERIFY(m_handler->closed.isEmpty());  // all of it over the one connection
    }

    void versionMismatchRefused_data()
    {
        QTest::addColumn<quint16>("headerVersion");
        QTest::addColumn<quint16>("payloadVersion");
        QTest::newRow("newer client") << quint16(Protocol::ProtocolVersion + 1) << quint16(Protocol::ProtocolVersion + 1);
        QTest::newRow("payload disagrees with header") << Protocol::ProtocolVersion << quint16(0);
    }

    void versionMismatchRefused()
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

    void misbehavingClientClosedAlone_data()
    {
        const Frame partial { Protocol::ProtocolVersion, 0, 2, quint32(Operation::GetModules), QByteArray(100, 'p') };
        const Frame early { Protocol::ProtocolVersion, 0, 1, quint32(Operation::GetModules), QByteArray() };
        QByteArray oversized(Protocol::HeaderSize, '\0');
        qToBigEndian<quint32>(Protocol::FrameMagic, oversized.data());
        qToBigEndian<quint32>(Protocol::MaxPayloadSize + 1, oversized.data() + 4);
        const QByteArray hello = helloFrame(Protocol::ProtocolVersion, Protocol::ProtocolVersion);

        QTest::addColumn<QByteArray>("bytes");
        QTest::newRow("garbage") << QByteArray("\x01\x02\x03 definitely not a frame \xff\xfe");
        QTest::newRow("oversized frame") << hello + oversized;
        QTest::newRow("half-sent frame") << hello + partial.encode().left(60);
        QTest::newRow("request before handshake") << early.encode();
        QTest::newRow("half-sent header") << QByteArray("ZN");
        // Closed by the half-open timer, which the greeted client, idle longer, outlives.
        QTest::newRow("silent connection") << QByteArray();
    }

    void misbehavingClientClosedAlone()
    {
        QFETCH(QByteArray, bytes);
        auto good = std::make_unique<Client>(m_socketPath);
        QCOMPARE(good->call(Operation::GetModules), 0);

        QLocalSocket bad;
        bad.connectToServer(m_socketPath);
        QVERIFY(bad.waitForConnected());
        bad.write(bytes);
        bad.flush();
        QTRY_COMPARE(bad.state(), QLocalSocket::UnconnectedState);
        QTRY_COMPARE(m_handler->closed.size(), 1);

        // The well-behaved client is still served on its own, unbroken connection...
        QCOMPARE(good->call(Operation::GetModules), 0);
        QCOMPARE(m_handler->closed.size(), 1);
        // ...whose end is reported in turn, as another connection.
        good.reset();
        QTRY_COMPARE(m_handler->closed.size(), 2);
        QVERIFY(m_handler->closed.at(0) != m_handler->closed.at(1));
    }

    void socketIsPrivate()
    {
        QCOMPARE(modeOf(QFileInfo(m_socketPath).absolutePath()), mode_t(0700));
        QCOMPARE(modeOf(m_socketPath), mode_t(0600));

        FrameServer second(m_handler.get());
        QVERIFY(!second.listen(m_socketPath));
        QVERIFY2(second.errorString().contains(QStringLiteral("already listens")), qPrintable(second.errorString()));

        // A socket file nobody listens on any more is replaced.
        const QString stale = QFileInfo(m_socketPath).absolutePath() + QStringLiteral("/stale");
        QVERIFY(TestSupport::makeStaleSocket(stale));
        FrameServer third(m_handler.get());
        QVERIFY2(third.listen(stale), qPrintable(third.errorString()));
        Client client(stale);
        QCOMPARE(client.call(Operation::GetModules), 0);

        // close() takes the socket file away.
        third.close();
        QVERIFY(!QFileInfo::exists(stale));
    }

    void clientSurvivesServerOutages()
    {
        Client client(m_socketPath);
        QCOMPARE(client.call(Operation::GetModules), 0);

        // An answer slower than the caller's deadline is a timeout, and the late answer must
        // not be mistaken for the answer to the next request.
        m_server->setLatency(800);
        QCOMPARE(client.call(Operation::GetRegistry, nullptr, 200), qint32(PortlexError::Timeout));
        m_server->setLatency(0);
        QCOMPARE(client.call(Operation::GetModules), 0);

        m_server->close();
        QCOMPARE(client.call(Operation::GetModules), qint32(PortlexError::Unreachable));
        QVERIFY(!client.connection().errorString().isEmpty());

        FrameServer again(m_handler.get());
        QVERIFY(again.listen(m_socketPath));
        QCOMPARE(client.call(Operation::GetModules), 0);
    }

    void clientRefusesAnswersThatDoNotMatch()
    {
        // A device of a later protocol generation refuses the handshake and says why.
        const QString refusal = QStringLiteral("Protocol version 1 is not supported; this device speaks version 9");
        ScriptedDevice newer(m_dir->filePath(QStringLiteral("sockets/newer")), [&](const Frame& hello) {
            Frame frame = answer(hello, PortlexError::VersionMismatch, refusal);
            frame.version = 9;
            return frame;
        });
        Client client(newer.fullServerName());
        QCOMPARE(client.call(Operation::GetModules), qint32(PortlexError::VersionMismatch));
        QCOMPARE(client.connection().errorString(), refusal);

        // An answer carrying another request's id is no answer to this one.
        ScriptedDevice confused(m_dir->filePath(QStringLiteral("sockets/confused")), [](const Frame& request) {
            if (request.operation == quint32(Operation::Hello))
                return answer(request, 0, QStringLiteral("Confused"), QStringLiteral("confused"));
            Frame frame = answer(request, 0);
            frame.requestId = request.requestId - 1;
            return frame;
        });
        Client mixedUp(confused.fullServerName());
        QCOMPARE(mixedUp.call(Operation::GetModules), qint32(PortlexError::ProtocolError));
    }
};

QTEST_GUILESS_MAIN(FrameServerTest)
#include "tst_frameserver.moc"
