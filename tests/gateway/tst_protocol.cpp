#include "DeviceConnection.h"
#include "FrameDecoder.h"
#include "FrameServer.h"
#include "PayloadStream.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "RecordStreams.h"
#include "ServerConnection.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QLocalServer>
#include <QLocalSocket>
#include <QScopeGuard>
#include <QSemaphore>
#include <QSet>
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
// bytes, every stream hangs at its piece hangAtChunk, RunApplication works long; its
// settings root and its folder /user name themselves (or their parent) as a child.
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
        case Operation::GetChildSettings: {
            _SettingsInfo root(QStringLiteral("/"), QStringLiteral("/"));
            root.children.append(QSharedPointer<_SettingsInfo>::create(QStringLiteral("a"), QStringLiteral("/a")));
            root.children.append(QSharedPointer<_SettingsInfo>::create(QString(), QStringLiteral("/")));
            return Answer::success(root);
        }
        case Operation::GetFileSystemLevel: {
            _DirectoryInfo user(QStringLiteral("user"), QStringLiteral("/user"));
            user.directories.append(QSharedPointer<_DirectoryInfo>::create(QStringLiteral(".."), QStringLiteral("/user/..")));
            return Answer::success(user);
        }
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

Frame makeFrame(quint32 requestId, const QByteArray& payload)
{
    return Frame { Protocol::ProtocolVersion, 0x3, requestId, quint32(Operation::GetModules), payload };
}

QByteArray header(quint32 magic, quint32 size)
{
    QByteArray bytes(Protocol::HeaderSize, '\0');
    qToBigEndian<quint32>(magic, bytes.data());
    qToBigEndian<quint32>(size, bytes.data() + 4);
    return bytes;
}

template <typename T>
QByteArray encode(const T& value)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    out << value;
    return bytes;
}

template <typename T>
QDataStream::Status decode(const QByteArray& bytes, T& value)
{
    PayloadStream in(bytes);
    in >> value;
    return in.status();
}

// Writes value, reads it back as the same record, and refuses every shorter prefix of its bytes.
template <typename T>
void checkRoundTrip(const T& value)
{
    const QByteArray bytes = encode(value);
    T back;
    QCOMPARE(decode(bytes, back), QDataStream::Ok);
    QCOMPARE(encode(back), bytes);
    QVERIFY(back == value);
    for (int cut = 0; cut < bytes.size(); ++cut) {
        T partial;
        PayloadStream truncated(bytes.left(cut));
        truncated >> partial;
        QVERIFY2(!truncated.ok(), qPrintable(QStringLiteral("accepted %1 of %2 bytes").arg(cut).arg(bytes.size())));
    }
}

QSharedPointer<_SettingsInfo> settingsChain(int depth)
{
    auto root = QSharedPointer<_SettingsInfo>::create(QStringLiteral("n0"), QStringLiteral("/n0"));
    for (auto node = root; depth > 1; --depth) {
        node->children << QSharedPointer<_SettingsInfo>::create(QStringLiteral("n"), node->Path() + QStringLiteral("/n"));
        node = node->children.last();
    }
    return root;
}

} // namespace

// The transport: FrameServer against DeviceConnection, raw sockets and hand-written devices;
// and the wire format under it: framing in any chunks, and every record's encoding.
class TestProtocol : public QObject
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

    // A device whose tree names an ancestor as a child would send every walk round for
    // ever: the gateway refuses such an answer and says why.
    void cyclicTreesRefused()
    {
        Device device(m_socketPath);
        QList<QPair<QString, QString>> devices;
        QCOMPARE(Portlex::GetDevices(devices), 1u);
        const QSharedPointer<_ZantDevice> zant = Portlex::GetDevice(QStringLiteral("bench-1"));
        QVERIFY(Portlex::ConnectDevice(zant, QString(), QString()));
        auto node = QSharedPointer<_SettingsInfo>::create(QString(), QStringLiteral("/"));
        QString reason;
        QCOMPARE(zant->GetChildSettings(node, &reason), int(PortlexError::ProtocolError));
        QCOMPARE(reason, QStringLiteral("The device named / as a child of /"));
        QSharedPointer<_DirectoryInfo> level;
        QCOMPARE(zant->GetFileSystemLevel(QStringLiteral("/user"), level, nullptr, nullptr, &reason), int(PortlexError::ProtocolError));
        QCOMPARE(reason, QStringLiteral("The device named /user/.. as a child of /user"));
        QVERIFY(node->children.isEmpty() && !level);
    }

    // A request of exactly the largest size is served (one byte more: badClientClosedAlone);
    // the client does not even send a larger one.
    void requestOfTheMaximumSize()
    {
        Device device(m_socketPath);
        DeviceConnection connection(m_socketPath);
        QByteArray body;
        QCOMPARE(connection.call(Operation::GetVolumes, QByteArray(Protocol::MaxRequestSize, 'r'), Protocol::NoFlags, &body, QDeadlineTimer(5000)), 0);
        QCOMPARE(connection.call(Operation::GetVolumes, QByteArray(Protocol::MaxRequestSize + 1, 'r'), Protocol::NoFlags, &body, QDeadlineTimer(5000)),
                 qint32(PortlexError::InvalidArgument));
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

    void framesSurviveAnyChunking()
    {
        const QByteArrayList sent = { makeFrame(1, "first").encode(), makeFrame(2, QByteArray()).encode(),
                                      makeFrame(3, QByteArray(5000, 'x')).encode() };
        const QByteArray stream = sent.join();
        // The whole stream at once, byte by byte, in odd chunks, in header-sized ones.
        for (const int chunk : { 0, 1, 7, Protocol::HeaderSize }) {
            FrameDecoder decoder;
            QByteArrayList received;
            bool partialSeen = false;  // drives the server's half-open timer
            const int step = chunk == 0 ? int(stream.size()) : chunk;
            for (int offset = 0; offset < stream.size(); offset += step) {
                decoder.feed(stream.mid(offset, step));
                Frame frame;
                FrameDecoder::Status status;
                while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready)
                    received << frame.encode();
                QCOMPARE(status, FrameDecoder::Status::NeedMore);
                partialSeen |= decoder.hasPartialFrame();
            }
            QCOMPARE(received, sent);
            QCOMPARE(partialSeen, chunk != 0);
            QVERIFY(!decoder.hasPartialFrame());
        }
    }

    void malformedStreams_data()
    {
        QTest::addColumn<QByteArray>("bytes");
        QTest::addColumn<QString>("reason");  // empty: not malformed
        QTest::newRow("text instead of a frame") << QByteArray("GET / HTTP/1.1\r\nHost: x\r\n\r\n") << "magic";
        QTest::newRow("one byte over the limit") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize + 1) << "limit";
        QTest::newRow("largest size claimed") << header(Protocol::FrameMagic, 0xFFFFFFFF) << "limit";
        QTest::newRow("exactly the limit waits for the payload") << header(Protocol::FrameMagic, Protocol::MaxPayloadSize) << "";
        QTest::newRow("bad magic after a good frame") << makeFrame(9, "ok").encode() + header(0x12345678, 0) << "magic";
    }

    void malformedStreams()
    {
        QFETCH(QByteArray, bytes);
        QFETCH(QString, reason);
        FrameDecoder decoder;
        decoder.feed(bytes);
        Frame frame;
        FrameDecoder::Status status;
        while ((status = decoder.next(&frame)) == FrameDecoder::Status::Ready) {
        }
        QCOMPARE(status == FrameDecoder::Status::Malformed, !reason.isEmpty());
        QVERIFY(decoder.errorString().contains(reason));
        if (!reason.isEmpty()) {
            // Once out of step, the stream stays refused even if good bytes follow.
            decoder.feed(makeFrame(1, "late").encode());
            QCOMPARE(decoder.next(&frame), FrameDecoder::Status::Malformed);
        }
    }

    // Every field is set apart from its default, so that a field left out on either side shows.
    void recordsRoundTrip()
    {
        checkRoundTrip(ModuleInfo { QStringLiteral("player"), ModuleInfo::Application | ModuleInfo::Preinstalled,
                                    ModuleInfo::MakerSigned, QStringLiteral("/usermod/player/player.mif"), QStringLiteral("3.1.0"),
                                    QString::fromUtf8("© Norvale"), 123456, 77 });
        checkRoundTrip(RegistryInfo { QStringLiteral("audio/x-zmf"), 0x01001000, 0x01002000, 2, 77, true, true });
        checkRoundTrip(ProcessInfo { QStringLiteral("shell"), 12,
                                     { ThreadEntry { QStringLiteral("ui"), 13, 250, 3, 12, 0x100000000ULL }, ThreadEntry() } });
        checkRoundTrip(LoadedModuleInfo { QStringLiteral("shell"), 12,
                                          { LoadedModuleEntry { QStringLiteral("core.mod"), QStringLiteral("/sys/core.mod"), 4096, 5, 0x80000000, 2 } } });
        checkRoundTrip(VolumeInfo { QStringLiteral("Internal"), QStringLiteral("fs:/"), 0x200000000ULL, 1, true, true, 0xFFFFFFFF });
        checkRoundTrip(PriviledgeRecord { QStringLiteral("0x0100"), QStringLiteral("PL_FILE"), QStringLiteral("File"), QStringLiteral("x") });
        checkRoundTrip(MifEntry { 0x5000, QStringLiteral("player.mif"), QStringLiteral("/usermod/player/player.mif"),
                                  9, 1, 1, 1, 1,  // counts as stored, not recomputed
                                  { 0x01001000, 0x01001001 },
                                  { MifApplet { 0x01001000, QStringLiteral("Player"), 0x10, 2, 0xABCDEF01, 7, 0x8000 } },
                                  { 0x0100F000 }, { MifNotifier { 1, 2, 0xFFFFFFFF } },
                                  { MifMimeType { 0x01001000, 0x01000001, QStringLiteral("audio/x-zmf") } }, QByteArray(40, '\x5A') });

        _SettingsInfo settings(QStringLiteral("appinfo"), QStringLiteral("/appinfo"));
        settings.values << qMakePair(QStringLiteral("vendor"), QStringLiteral("Norvale")) << qMakePair(QString(), QString());
        settings.children << QSharedPointer<_SettingsInfo>::create(QStringLiteral("cache"), QStringLiteral("/appinfo/cache"));
        checkRoundTrip(settings);
        checkRoundTrip(*settingsChain(MaxRecordNesting));

        _DirectoryInfo level(QStringLiteral("user"), QStringLiteral("fs:/user"));
        level.files << QSharedPointer<_FileInfo>::create(QStringLiteral("a.txt"), QStringLiteral("fs:/user/a.txt"), QStringLiteral("rw-"), 0x1FFFFFFFFULL);
        level.directories << QSharedPointer<_DirectoryInfo>::create(QStringLiteral("usermod"), QStringLiteral("fs:/user/usermod"));
        checkRoundTrip(level);

        // A null child cannot travel; it arrives as an empty record, never as null.
        _DirectoryInfo withNull, back;
        withNull.files << QSharedPointer<_FileInfo>();
        QCOMPARE(decode(encode(withNull), back), QDataStream::Ok);
        QCOMPARE(back.files.size(), 1);
        QVERIFY(back.files.first());
        QCOMPARE(*back.files.first(), _FileInfo());
    }

    void hostileInputIsRefused()
    {
        // A count of four billion modules backed by a few bytes: refused, nothing kept.
        QVector<ModuleInfo> modules { ModuleInfo() };
        PayloadStream in(encode(quint32(0xFFFFFFFF)) + encode(QStringLiteral("only one name")));
        readList(in, modules);
        QVERIFY(!in.ok());
        QVERIFY(modules.isEmpty());

        // The same for a list of plain numbers inside a MIF entry.
        QByteArray mifBytes = encode(MifEntry());
        const int classesOffset = 4 + 4 + 4 + 5 * 2;  // kind, two null texts, five counts
        mifBytes.replace(classesOffset, 4, QByteArray("\xFF\xFF\xFF\xF0", 4));
        MifEntry mif;
        QVERIFY(decode(mifBytes, mif) != QDataStream::Ok);
        QVERIFY(mif.classes.isEmpty());

        // Trees one level deeper than allowed are corrupt, not a stack overflow.
        _SettingsInfo tooDeep;
        QCOMPARE(decode(encode(*settingsChain(MaxRecordNesting + 1)), tooDeep), QDataStream::ReadCorruptData);
        QByteArray nested = encode(_DirectoryInfo());
        for (int i = 0; i < 1000; ++i)  // name, path, no file, one folder
            nested = encode(QString()) + encode(QString()) + encode(quint32(0)) + encode(quint32(1)) + nested;
        _DirectoryInfo deepDirectory;
        QCOMPARE(decode(nested, deepDirectory), QDataStream::ReadCorruptData);

        // A text with an odd byte count cannot be UTF-16.
        VolumeInfo volume;
        QVERIFY(decode(QByteArray("\3\0\0\0abc", 7), volume) != QDataStream::Ok);  // byte count 3
    }

    // GetVolumes answers a QSet: records equal by value must hash alike.
    void volumesWorkInSets()
    {
        const VolumeInfo a { QStringLiteral("Internal"), QStringLiteral("fs:/"), 0, 1, true, true, 1 };
        VolumeInfo fuller = a, other = a;
        fuller.freeSpace = 10;
        other.volumeId = 2;
        const QSet<VolumeInfo> set { a, VolumeInfo(a), fuller, other };
        QCOMPARE(set.size(), 3);
        QVERIFY(set.contains(fuller));
    }

    void moduleDisplayTexts()
    {
        const struct { quint32 type; quint32 signature; const char* texts; } modules[] = {
            { ModuleInfo::Library | ModuleInfo::System, ModuleInfo::MakerSigned, "Library | System, Maker Signed" },
            { 0, ModuleInfo::TestSigned, "None, Test Signed" },
            { ModuleInfo::Extension | 0x100, 42, "Extension | 0x100, Unknown (42)" }, // unknown bits and signature
        };
        for (const auto& [type, signature, texts] : modules) {
            ModuleInfo module;
            module.type = type;
            module.signature = signature;
            QCOMPARE(module.GetModuleProperty() + QStringLiteral(", ") + module.GetModuleSig(), QLatin1String(texts));
        }
    }
};

QTEST_GUILESS_MAIN(TestProtocol)
#include "tst_protocol.moc"
