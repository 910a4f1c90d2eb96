#include "DeviceConnection.h"
#include "FrameServer.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "ServerConnection.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QLocalServer>
#include <QLocalSocket>
#include <QScopeGuard>
#include <QSemaphore>
#include <QTemporaryDir>
#include <QtEndian>
#include <QtTest>

#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <functional>

using namespace TestSupport;

namespace {

constexpr quint64 CopySize = 3 * Protocol::TransferChunkSize;
constexpr quint32 TransferId = 7;
// What the socket folder is, or (from File on) what already sits at the socket path.
enum Place { Missing, Folder, Link, Foreign, FileLink, StaleSocket, ForeignPeer };

// The device: GetVolumes answers 7, GetRegistry fails with 3, a download streams streamSize
// bytes, every stream hangs at its piece hangAtChunk, RunApplication works long.
class Handler : public RequestHandler
{
public:
    QString displayName() const override { return QStringLiteral("Zantro Simulator - Bench"); }
    QString deviceId() const override { return QStringLiteral("bench-1"); }
    void connectionClosed(quint64 id) override { lastClosed = id, ++closed; }

    Answer handle(const Request& request) override
    {
        ++handled;
        lastConnection = request.connectionId;
        switch (request.operation) {
        case Operation::GetVolumes:
            return Answer::success(quint32(7));
        case Operation::GetRegistry:
            return Answer::failure(3);
        case Operation::GetCache:
            return Answer::success(DeviceCache());
        case Operation::CopyToPCBegin:
            transferConnection = request.connectionId;
            return Answer::success(TransferId, streamSize.load());
        case Operation::CopyToDeviceBegin:
        case Operation::InstallPackageBegin:
            transferConnection = request.connectionId;
            return Answer::success(TransferId, QStringLiteral("begun"));
        case Operation::CopyToPCStream:
            streamed = 0;
            return Answer();
        case Operation::RunApplication:
            for (int i = 0; i < keepAlives; ++i) {
                request.keepAlive();
                QThread::msleep(50); // the work between two notices
            }
            return Answer::success(QStringLiteral("done"));
        default:
            return Answer::success(QString());
        }
    }

    qint64 readStream(quint64, quint32, char* data, qint64 max) override
    {
        pieceDone();
        const qint64 size = std::min<qint64>(max, qint64(streamSize - streamed));
        memset(data, 'c', size_t(size));
        streamed += quint64(size);
        return size;
    }
    qint32 writeStream(quint64, quint32, const char*, qint64) override
    {
        pieceDone();
        return 0;
    }
    // A piece of a stream moved; the one at hangAtChunk hangs, as a stopped process does.
    void pieceDone()
    {
        if (++chunks == hangAtChunk)
            hung.acquire();
    }

    std::atomic<quint64> lastConnection {0}, transferConnection {0}, lastClosed {0}, streamSize {CopySize}, streamed {0};
    std::atomic<int> handled {0}, chunks {0}, closed {0}, hangAtChunk {0}, keepAlives {0};
    QSemaphore hung;
};

// A FrameServer on a thread of its own, so that the test's thread can make blocking calls
// and raw socket moves while the device serves, or hangs.
class Device
{
public:
    explicit Device(const QString& socketPath, int maxConnections = FrameServer::DefaultMaxConnections,
                    int halfOpenMs = Protocol::HalfOpenTimeoutMs)
    {
        m_context.moveToThread(&m_thread);
        m_thread.start();
        onDevice([&] {
            server = new FrameServer(&handler);
            server->setMaxConnections(maxConnections);
            server->setHalfOpenTimeout(halfOpenMs);
            listening = server->listen(socketPath);
            error = server->errorString();
        });
    }
    ~Device()
    {
        handler.hung.release(100);
        onDevice([&] { delete server; });
        m_thread.quit();
        m_thread.wait();
    }
    template<typename F> void onDevice(F work, Qt::ConnectionType type = Qt::BlockingQueuedConnection)
    {
        QMetaObject::invokeMethod(&m_context, work, type);
    }

    Handler handler;
    FrameServer* server = nullptr;
    bool listening = false;
    QString error;

private:
    QThread m_thread;
    QObject m_context;
};

// A device written by hand, to send what the real server never would: every frame it
// receives is answered with reply(frame).
class ScriptedDevice : public QLocalServer
{
public:
    ScriptedDevice(const QString& path, std::function<Frame(const Frame&)> reply, QObject* parent)
        : QLocalServer(parent)
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

qint32 ask(DeviceConnection& connection, Operation operation, int allowedMs = 5000, QByteArray* body = nullptr)
{
    QByteArray ignored;
    return connection.call(operation, QByteArray(), Protocol::NoFlags, body ? body : &ignored, QDeadlineTimer(allowedMs));
}

// One call over a fresh connection.
qint32 call(const QString& socketPath, Operation operation, QString* error = nullptr)
{
    DeviceConnection connection(socketPath);
    const qint32 result = ask(connection, operation);
    if (error)
        *error = connection.errorString();
    return result;
}

// A raw client connected to path, or a bare listener at path that nobody serves (the kernel
// records who listens when listen() runs); -1 on failure.
int rawSocket(const QString& path, bool listener = false, uid_t as = ::geteuid())
{
    const uid_t self = ::geteuid();
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | (listener ? SOCK_NONBLOCK : 0), 0);
    if (fd < 0)
        return -1; // errno tells why
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    qstrncpy(address.sun_path, QFile::encodeName(path).constData(), sizeof address.sun_path);
    const auto* at = reinterpret_cast<const sockaddr*>(&address);
    const bool ok = listener ? ::bind(fd, at, sizeof address) == 0 && ::seteuid(as) == 0 && ::listen(fd, 8) == 0
                             : ::connect(fd, at, sizeof address) == 0;
    if (::seteuid(self) == 0 && ok)
        return fd;
    ::close(fd);
    return -1;
}

mode_t modeOf(const QString& path)
{
    struct stat info;
    return ::lstat(QFile::encodeName(path).constData(), &info) == 0 ? (info.st_mode & 07777) : 0;
}

} // namespace

// The transport: FrameServer against DeviceConnection, raw sockets and hand-written devices.
class FrameServerTest : public QObject
{
    Q_OBJECT

    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_folder;
    QString m_socketPath;

private slots:
    void init()
    {
        m_dir = std::make_unique<QTemporaryDir>();
        m_folder = m_dir->filePath(QStringLiteral("sockets"));
        m_socketPath = m_folder + QStringLiteral("/bench-1");
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_folder));
        Portlex::Initialize();
    }

    void cleanup()
    {
        Portlex::Destroy();
        DeviceConnection::setCallTimeoutMs(Protocol::CallTimeoutMs);
        m_dir.reset();
    }

    void badClientClosedAlone_data()
    {
        const Frame partial { Protocol::ProtocolVersion, 0, 2, quint32(Operation::GetModules), QByteArray(100, 'p') };
        const Frame early { Protocol::ProtocolVersion, 0, 1, quint32(Operation::GetModules), QByteArray() };
        QByteArray beyondAChunk(Protocol::HeaderSize, '\0');
        qToBigEndian<quint32>(Protocol::FrameMagic, beyondAChunk.data());
        qToBigEndian<quint32>(Protocol::MaxRequestSize + 1, beyondAChunk.data() + 4);
        const QByteArray hello = helloFrame(Protocol::ProtocolVersion, Protocol::ProtocolVersion);

        QTest::addColumn<QByteArray>("bytes");
        QTest::addColumn<QString>("reason");    // logged on closing
        QTest::addColumn<quint16>("mismatch");  // the version the refusal names, if any
        QTest::newRow("garbage") << QByteArray("\x01\x02\x03 definitely not a frame \xff\xfe")
                                 << "Not a protocol frame" << quint16(0);
        // Refused from the header: the device neither waits for nor holds more than a request can need.
        QTest::newRow("request beyond a chunk") << hello + beyondAChunk << "exceeds the limit" << quint16(0);
        QTest::newRow("half-sent frame") << hello + partial.encode().left(60) << "half open" << quint16(0);
        QTest::newRow("request before handshake") << early.encode() << "before the handshake" << quint16(0);
        const quint16 newer = Protocol::ProtocolVersion + 1;
        QTest::newRow("newer client") << helloFrame(newer, newer) << QString() << newer;
    }

    void badClientClosedAlone()
    {
        QFETCH(QByteArray, bytes);
        QFETCH(QString, reason);
        QFETCH(quint16, mismatch);
        Device device(m_socketPath, FrameServer::DefaultMaxConnections, 300);
        auto good = std::make_unique<DeviceConnection>(m_socketPath);
        QCOMPARE(ask(*good, Operation::GetModules), 0);

        if (!reason.isEmpty())
            QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("Closing connection 2: .*") + reason));
        QLocalSocket bad;
        QByteArray received;
        connect(&bad, &QLocalSocket::readyRead, this, [&] { received += bad.readAll(); });
        bad.connectToServer(m_socketPath);
        QVERIFY(bad.waitForConnected());
        bad.write(bytes);
        bad.flush();
        QTRY_COMPARE(bad.state(), QLocalSocket::UnconnectedState);
        QTRY_COMPARE(device.handler.closed.load(), 1);
        const quint64 badId = device.handler.lastClosed;

        // A version mismatch is answered, with why, before the device closes.
        if (reason.isEmpty()) {
            FrameDecoder decoder;
            decoder.feed(received + bad.readAll());
            Frame refusal;
            QCOMPARE(decoder.next(&refusal), FrameDecoder::Status::Ready);
            qint32 result = 0;
            QString message;
            PayloadStream(refusal.payload) >> result >> message;
            QVERIFY2(refusal.requestId == 1 && result == PortlexError::VersionMismatch
                         && message.contains(QStringLiteral("version %1 ").arg(mismatch))
                         && message.contains(QStringLiteral("speaks version %1").arg(Protocol::ProtocolVersion)),
                     qPrintable(message));
        }

        // The well-behaved client is still served on its own, unbroken connection, whose end
        // is reported in turn, as another connection.
        QCOMPARE(ask(*good, Operation::GetModules), 0);
        QCOMPARE(device.handler.closed.load(), 1);
        good.reset();
        QTRY_COMPARE(device.handler.closed.load(), 2);
        QVERIFY(device.handler.lastClosed != badId);
    }

    void oneClientThroughOutages()
    {
        Device device(m_socketPath);
        DeviceConnection client(m_socketPath);
        QByteArray body;
        QCOMPARE(ask(client, Operation::GetVolumes, 5000, &body), 0);
        QCOMPARE(body, Answer::success(quint32(7)).body);
        QCOMPARE(client.displayName() + '|' + client.deviceId(), QStringLiteral("Zantro Simulator - Bench|bench-1"));
        QCOMPARE(ask(client, Operation::GetRegistry), 3);
        QCOMPARE(ask(client, Operation(999)), qint32(PortlexError::UnknownOperation));
        QCOMPARE(device.handler.handled.load(), 2); // the unknown operation never reached the handler
        QCOMPARE(device.handler.closed.load(), 0);  // all of it over the one connection

        // An answer slower than the caller's deadline is a timeout, and the late answer must
        // not be mistaken for the answer to the next request.
        device.onDevice([&] { device.server->setLatency(800); });
        QCOMPARE(ask(client, Operation::GetRegistry, 200), qint32(PortlexError::Timeout));
        device.onDevice([&] { device.server->setLatency(0); });
        QCOMPARE(ask(client, Operation::GetModules), 0);

        // A socket someone listens on is not taken over; close() takes the socket file away.
        FrameServer second(&device.handler);
        QVERIFY(!second.listen(m_socketPath));
        QVERIFY2(second.errorString().contains(QStringLiteral("already listens")), qPrintable(second.errorString()));
        device.onDevice([&] { device.server->close(); });
        QVERIFY(!QFileInfo::exists(m_socketPath));
        QCOMPARE(ask(client, Operation::GetModules), qint32(PortlexError::Unreachable));
        QVERIFY(!client.errorString().isEmpty());

        device.onDevice([&] { device.listening = device.server->listen(m_socketPath); });
        QVERIFY(device.listening);
        QCOMPARE(ask(client, Operation::GetModules), 0);
    }

    void clientRefusesAnswersThatDoNotMatch()
    {
        Device device(m_socketPath);
        // A device of a later protocol generation refuses the handshake and says why.
        const QString refusal = QStringLiteral("Protocol version 1 is not supported; this device speaks version 9");
        const QString newer = m_folder + QStringLiteral("/newer"), confused = m_folder + QStringLiteral("/confused");
        device.onDevice([&] {
            new ScriptedDevice(newer, [refusal](const Frame& hello) {
                Frame frame = answer(hello, PortlexError::VersionMismatch, refusal);
                frame.version = 9;
                return frame;
            }, device.server);
            // An answer carrying another request's id is no answer to this one.
            new ScriptedDevice(confused, [](const Frame& request) {
                if (request.operation == quint32(Operation::Hello))
                    return answer(request, 0, QStringLiteral("Confused"), QStringLiteral("confused"));
                Frame frame = answer(request, 0);
                frame.requestId = request.requestId - 1;
                return frame;
            }, device.server);
        });
        QString error;
        QCOMPARE(call(newer, Operation::GetModules, &error), qint32(PortlexError::VersionMismatch));
        QCOMPARE(error, refusal);
        QCOMPARE(call(confused, Operation::GetModules), qint32(PortlexError::ProtocolError));
    }

    void unreadAnswersStopReading()
    {
        constexpr quint32 Requests = 48; // a 48 MiB download, then requests behind it
        Device device(m_socketPath);
        device.handler.streamSize = Requests * quint64(Protocol::TransferChunkSize);
        const int flooder = rawSocket(m_socketPath);
        QVERIFY(flooder >= 0);
        const timeval patience {10, 0};
        ::setsockopt(flooder, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
        QByteArray flood = helloFrame(Protocol::ProtocolVersion, Protocol::ProtocolVersion);
        Frame request;
        request.requestId = 2;
        request.operation = quint32(Operation::CopyToPCStream);
        PayloadStream(&request.payload) << TransferId;
        flood += request.encode();
        request.operation = quint32(Operation::GetVolumes);
        request.payload.clear();
        for (request.requestId = 3; request.requestId <= Requests + 1; ++request.requestId)
            flood += request.encode();
        QCOMPARE(::write(flooder, flood.constData(), size_t(flood.size())), ssize_t(flood.size()));

        // The device stops serving the flooder, not everyone: another client's call is
        // answered while the flooder's download waits for it to read.
        QTRY_VERIFY(device.handler.chunks > 0);
        QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
        qint64 buffered = 0;
        device.onDevice([&] { buffered = device.server->bufferedBytes(); });
        QVERIFY2(device.handler.chunks < int(Requests), qPrintable(QString::number(device.handler.chunks)));
        QVERIFY2(buffered <= ServerConnection::MaxUnsentBytes + 2 * Protocol::TransferChunkSize,
                 qPrintable(QStringLiteral("%1 bytes held").arg(buffered)));

        // Once the flooder reads, the whole download comes, then every answer, in order.
        FrameDecoder decoder;
        Frame answer;
        quint64 downloaded = 0;
        for (quint32 expected = 1; expected <= Requests + 1;) {
            QByteArray bytes(256 * 1024, Qt::Uninitialized);
            const ssize_t got = ::read(flooder, bytes.data(), size_t(bytes.size()));
            QVERIFY2(got > 0, "the device stopped answering");
            decoder.feed(bytes.left(got));
            while (decoder.next(&answer) == FrameDecoder::Status::Ready) {
                QCOMPARE(answer.requestId, expected);
                if (answer.flags & Protocol::DataFlag)
                    downloaded += quint64(answer.payload.size());
                else
                    ++expected;
            }
        }
        QCOMPARE(downloaded, device.handler.streamSize.load());
        ::close(flooder);
    }

    void connectionsBeyondTheLimitRefused()
    {
        Device device(m_socketPath, 2);
        const int first = rawSocket(m_socketPath), second = rawSocket(m_socketPath);
        QVERIFY(first >= 0 && second >= 0);
        QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("Refusing new connections.*limit")));
        QCOMPARE(call(m_socketPath, Operation::GetVolumes), qint32(PortlexError::Unreachable));
        ::close(first);
        QTRY_COMPARE(device.handler.closed.load(), 1); // the refused one never became a connection
        QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("again, after refusing 1")));
        QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
        ::close(second);
    }

    // A device that stops answering in the middle of a transfer costs the caller one timeout:
    // no clean-up call goes after it, so the next caller's connection is the first the device
    // has seen since the transfer's.
    void hungDeviceCostsOneTimeout()
    {
        DeviceConnection::setCallTimeoutMs(300);
        const QString local = m_dir->filePath(QStringLiteral("local.zantro"));
        QVERIFY(writeFile(local, randomBytes(qsizetype(CopySize), 5)));
        for (const char* action : {"copy to the PC", "copy to the device", "install a package"}) {
            Device device(m_socketPath);
            QList<QPair<QString, QString>> devices;
            QCOMPARE(Portlex::GetDevices(devices), 1u);
            const QSharedPointer<_ZantDevice> zant = Portlex::GetDevice(QStringLiteral("bench-1"));
            QVERIFY(Portlex::ConnectDevice(zant, QString(), QString()));
            device.handler.hangAtChunk = 2;
            const QString what = QLatin1String(action);
            const int result = what.endsWith("PC") ? zant->CopyFileToPC(QStringLiteral("/user/big.bin"), m_dir->filePath(QStringLiteral("copy")))
                : what.endsWith("device")          ? zant->CopyFileToDevice(local, QStringLiteral("/user/big.bin"))
                                                   : zant->InstallPackage(local, 1);
            QVERIFY2(result == PortlexError::Timeout, action);
            device.handler.hung.release();
            QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
            QVERIFY2(device.handler.lastConnection == device.handler.transferConnection + 1, action);
        }
    }

    // The call allows 400 ms of silence: notices all through 800 ms of work keep it going
    // and leave the connection in step.
    void stillWorkingRenewsTheDeadline()
    {
        Device device(m_socketPath);
        device.handler.keepAlives = 16;
        DeviceConnection connection(m_socketPath);
        QByteArray body;
        QCOMPARE(ask(connection, Operation::RunApplication, 400, &body), 0);
        QCOMPARE(body, Answer::success(QStringLiteral("done")).body);
        const quint64 served = device.handler.lastConnection;
        QCOMPARE(ask(connection, Operation::GetVolumes), 0);
        QCOMPARE(device.handler.lastConnection.load(), served);
    }

    void socketPlaceChecked_data()
    {
        QTest::addColumn<int>("place"); // what is there before the device starts
        QTest::addColumn<int>("mode");  // of the socket folder
        QTest::addColumn<qint32>("client");
        const qint32 untrusted = PortlexError::Untrusted, unreachable = PortlexError::Unreachable;
        QTest::newRow("missing folder, created private") << int(Missing) << 0700 << 0;
        QTest::newRow("folder others may read") << int(Folder) << 0755 << 0;
        QTest::newRow("world-writable folder") << int(Folder) << 0777 << untrusted;
        QTest::newRow("folder reached through a link") << int(Link) << 0700 << untrusted;
        QTest::newRow("another user's folder") << int(Foreign) << 0700 << untrusted;
        QTest::newRow("symlink at the socket path") << int(FileLink) << 0700 << unreachable;
        QTest::newRow("stale socket, replaced") << int(StaleSocket) << 0700 << 0;
        QTest::newRow("another user's device at the socket path") << int(ForeignPeer) << 0700 << untrusted;
    }

    void socketPlaceChecked()
    {
        QFETCH(int, place);
        QFETCH(int, mode);
        QFETCH(qint32, client);
        if ((place == Foreign || place == ForeignPeer) && ::geteuid() != 0)
            QSKIP("acting as another user needs root");
        const QByteArray folder = QFile::encodeName(m_folder);
        const QString target = m_dir->filePath(QStringLiteral("target"));
        QVERIFY(place == Missing || (QDir().mkpath(m_folder) && ::chmod(folder.constData(), mode_t(mode)) == 0));
        QVERIFY(place != Foreign || ::chown(folder.constData(), 65534, 65534) == 0);
        QVERIFY(place != Link || QFile::link(m_folder, m_dir->filePath(QStringLiteral("link"))));
        QVERIFY(place != FileLink || (writeFile(target, "keep me") && QFile::link(target, m_socketPath)));
        QVERIFY(place != StaleSocket || makeStaleSocket(m_socketPath));
        const int listener = place == ForeignPeer ? rawSocket(m_socketPath, true, 65534) : -1;
        const auto closeListener = qScopeGuard([listener] { ::close(listener); });
        QVERIFY(place != ForeignPeer || listener >= 0);
        const QString socketPath = place == Link ? m_dir->filePath(QStringLiteral("link/bench-1")) : m_socketPath;
        const QByteArray before = treeDigest(m_dir->path());

        // The device refuses the place and says where; the client will not even connect
        // through an unsafe folder; nothing there is changed, the folder's mode included.
        Device device(socketPath);
        QString error;
        QCOMPARE(call(socketPath, Operation::GetVolumes, &error), client);
        QCOMPARE(modeOf(m_folder), mode_t(mode));
        if (client == 0) {
            QVERIFY2(device.listening, qPrintable(device.error));
            QCOMPARE(modeOf(socketPath), mode_t(0600));
            return;
        }
        QVERIFY(!device.listening);
        const QString named = place >= FileLink ? socketPath : QFileInfo(socketPath).path();
        QVERIFY2(device.error.contains(named), qPrintable(device.error));
        QVERIFY2(client != PortlexError::Untrusted || error.contains(named), qPrintable(error));
        QCOMPARE(treeDigest(m_dir->path()), before);
        if (place == ForeignPeer) { // the client went without a word: the connection ends before any byte
            const int peer = ::accept(listener, nullptr, nullptr);
            char byte;
            QCOMPARE(::recv(peer, &byte, 1, MSG_DONTWAIT), ssize_t(0));
            ::close(peer);
        }
    }
};

QTEST_GUILESS_MAIN(FrameServerTest)
#include "tst_frameserver.moc"
