#include "DeviceConnection.h"
#include "FrameServer.h"
#include "Portlex.h"
#include "PortlexErrors.h"
#include "ServerConnection.h"
#include "TestSupport.h"
#include "_ZantDevice.h"

#include <QScopeGuard>
#include <QSemaphore>
#include <QTemporaryDir>
#include <QThread>
#include <QtTest>

#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <vector>

using namespace TestSupport;

namespace {

constexpr quint64 CopySize = 3 * Protocol::TransferChunkSize;
constexpr quint32 TransferId = 7;
enum Place { Missing, Folder, Link, Foreign, File, FileLink, Directory, StaleSocket };

// The device: answers a transfer chunk with 1 MiB, hangs at a chunk as a stopped process
// does, works long on RunApplication.
class Handler : public RequestHandler
{
public:
    QString displayName() const override { return QStringLiteral("Zantro Simulator - Limits"); }
    QString deviceId() const override { return QStringLiteral("limits"); }
    void connectionClosed(quint64) override { ++closed; }

    Answer handle(const Request& request) override
    {
        lastConnection = request.connectionId;
        switch (request.operation) {
        case Operation::GetCache:
            return Answer::success(DeviceCache());
        case Operation::CopyToPCBegin:
        case Operation::CopyToDeviceBegin:
        case Operation::InstallPackageBegin:
            transferConnection = request.connectionId;
            return request.operation == Operation::CopyToPCBegin
                ? Answer::success(TransferId, CopySize)
                : Answer::success(TransferId, QStringLiteral("begun"));
        case Operation::CopyToPCChunk:
        case Operation::UploadChunk:
            if (++chunks == hangAtChunk)
                hung.acquire();
            return request.operation == Operation::UploadChunk
                ? Answer::success()
                : Answer::success(QByteArray(Protocol::TransferChunkSize, 'c'));
        case Operation::RunApplication:
            for (int i = 0; i < keepAlives; ++i) {
                request.keepAlive();
                QThread::msleep(50); // the work between two notices
            }
            QThread::msleep(ulong(silenceMs.load()));
            return Answer::success(QStringLiteral("done"));
        default:
            return Answer::success(QString());
        }
    }

    std::atomic<quint64> lastConnection {0}, transferConnection {0};
    std::atomic<int> chunks {0}, closed {0}, hangAtChunk {0}, keepAlives {0}, silenceMs {0};
    QSemaphore hung;
};

// A FrameServer on a thread of its own: the test's thread makes blocking calls and raw
// socket moves while the device serves, or hangs.
class Device
{
public:
    explicit Device(const QString& socketPath, int maxConnections = FrameServer::DefaultMaxConnections)
    {
        m_context.moveToThread(&m_thread);
        m_thread.start();
        onDevice([&] {
            server = new FrameServer(&handler);
            server->setMaxConnections(maxConnections);
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

sockaddr_un addressOf(const QString& path)
{
    sockaddr_un address {};
    address.sun_family = AF_UNIX;
    qstrncpy(address.sun_path, QFile::encodeName(path).constData(), sizeof address.sun_path);
    return address;
}

int connectRaw(const QString& path)
{
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    const sockaddr_un address = addressOf(path);
    if (fd >= 0 && ::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0) {
        ::close(fd);
        return -1;
    }
    return fd;
}

// A bare listener that nobody serves; the kernel records who listens when listen() runs.
int listenRaw(const QString& path, uid_t as)
{
    const uid_t self = ::geteuid();
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0);
    const sockaddr_un address = addressOf(path);
    const bool ok = ::bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0
        && ::seteuid(as) == 0 && ::listen(fd, 8) == 0;
    return ::seteuid(self) == 0 && ok ? fd : -1;
}

qint32 call(const QString& socketPath, Operation operation, QString* error = nullptr)
{
    DeviceConnection connection(socketPath);
    QByteArray body;
    const qint32 result
        = connection.call(operation, QByteArray(), Protocol::NoFlags, &body, QDeadlineTimer(5000));
    if (error)
        *error = connection.errorString();
    return result;
}

mode_t modeOf(const QString& path)
{
    struct stat info;
    return ::lstat(QFile::encodeName(path).constData(), &info) == 0 ? (info.st_mode & 07777) : 0;
}

} // namespace

class TransportLimitsTest : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void cleanup();
    // Memory and descriptors
    void unreadAnswersStopReading();
    void requestBeyondAChunkRefused();
    void connectionsBeyondTheLimitRefused();
    void outOfDescriptorsKeepsListening();
    // Call deadlines
    void hungDeviceCostsOneTimeout_data();
    void hungDeviceCostsOneTimeout();
    void stillWorkingRenewsTheDeadline_data();
    void stillWorkingRenewsTheDeadline();
    // Socket folder, socket path and peer
    void socketPlaceChecked_data();
    void socketPlaceChecked();
    void peerOfAnotherUserRefused();

private:
    std::unique_ptr<QTemporaryDir> m_dir;
    QString m_folder;
    QString m_socketPath;
};

void TransportLimitsTest::init()
{
    m_dir = std::make_unique<QTemporaryDir>();
    QVERIFY(m_dir->isValid());
    m_folder = m_dir->filePath(QStringLiteral("sockets"));
    m_socketPath = m_folder + QStringLiteral("/limits");
    qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_folder));
    Portlex::Initialize();
}

void TransportLimitsTest::cleanup()
{
    Portlex::Destroy();
    DeviceConnection::setCallTimeoutMs(Protocol::CallTimeoutMs);
    m_dir.reset();
}

void TransportLimitsTest::unreadAnswersStopReading()
{
    constexpr quint32 Requests = 48; // 48 MiB of answers
    Device device(m_socketPath);
    const int flooder = connectRaw(m_socketPath);
    QVERIFY(flooder >= 0);
    const timeval patience {10, 0};
    ::setsockopt(flooder, SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    Frame request;
    request.operation = quint32(Operation::Hello);
    PayloadStream(&request.payload) << Protocol::ProtocolVersion << QStringLiteral("flooder");
    QByteArray flood = request.encode();
    request.operation = quint32(Operation::CopyToPCChunk);
    request.payload.clear();
    PayloadStream(&request.payload) << TransferId << Protocol::TransferChunkSize;
    for (request.requestId = 1; request.requestId <= Requests; ++request.requestId)
        flood += request.encode();
    QCOMPARE(::write(flooder, flood.constData(), size_t(flood.size())), ssize_t(flood.size()));

    // The device stops serving the flooder, not everyone: another client's call is
    // answered, after the device's pass over what the flooder sent.
    QTRY_VERIFY(device.handler.chunks > 0);
    QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
    qint64 buffered = 0;
    device.onDevice([&] { buffered = device.server->bufferedBytes(); });
    QVERIFY2(device.handler.chunks < int(Requests), qPrintable(QString::number(device.handler.chunks)));
    QVERIFY2(buffered <= ServerConnection::MaxUnsentBytes + 2 * Protocol::TransferChunkSize,
        qPrintable(QStringLiteral("%1 bytes held").arg(buffered)));

    // Once the flooder reads, every answer comes, in order.
    FrameDecoder decoder;
    Frame answer;
    for (quint32 expected = 0; expected <= Requests;) {
        QByteArray bytes(256 * 1024, Qt::Uninitialized);
        const ssize_t got = ::read(flooder, bytes.data(), size_t(bytes.size()));
        QVERIFY2(got > 0, "the device stopped answering");
        decoder.feed(bytes.left(got));
        while (decoder.next(&answer) == FrameDecoder::Status::Ready)
            QCOMPARE(answer.requestId, expected++);
    }
    ::close(flooder);
}

void TransportLimitsTest::requestBeyondAChunkRefused()
{
    Device device(m_socketPath);
    const int client = connectRaw(m_socketPath);
    QVERIFY(client >= 0);
    // Only the header: the device must not wait for, nor hold, more than a request can need.
    Frame request;
    request.operation = quint32(Operation::UploadChunk);
    QByteArray header = request.encode();
    qToBigEndian<quint32>(Protocol::MaxRequestSize + 1, header.data() + 4);
    QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("Closing connection.*exceeds the limit")));
    QCOMPARE(::write(client, header.constData(), size_t(header.size())), ssize_t(header.size()));
    QTRY_COMPARE(device.handler.closed.load(), 1);
    ::close(client);
}

void TransportLimitsTest::connectionsBeyondTheLimitRefused()
{
    Device device(m_socketPath, 2);
    const int first = connectRaw(m_socketPath), second = connectRaw(m_socketPath);
    QVERIFY(first >= 0 && second >= 0);
    QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("Refusing new connections.*limit")));
    QCOMPARE(call(m_socketPath, Operation::GetVolumes), qint32(PortlexError::Unreachable));
    ::close(first);
    QTRY_COMPARE(device.handler.closed.load(), 1); // the refused one never became a connection
    QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("again, after refusing 1")));
    QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
    ::close(second);
}

void TransportLimitsTest::outOfDescriptorsKeepsListening()
{
    Device device(m_socketPath);
    rlimit saved {};
    QVERIFY(::getrlimit(RLIMIT_NOFILE, &saved) == 0);
    int highest = 0;
    for (const QString& fd : QDir(QStringLiteral("/proc/self/fd"))
                                 .entryList(QDir::AllEntries | QDir::System | QDir::NoDotAndDotDot))
        highest = std::max(highest, fd.toInt());
    // Hold the device while this process's descriptors run out, so that its next accept fails.
    QSemaphore entered, gate;
    device.onDevice([&] { entered.release(); gate.acquire(); }, Qt::QueuedConnection);
    entered.acquire();
    bool held = true;
    const auto restore = qScopeGuard([&] {
        if (held)
            gate.release();
        ::setrlimit(RLIMIT_NOFILE, &saved);
    });
    rlimit lowered = saved;
    lowered.rlim_cur = rlim_t(highest + 16);
    QVERIFY(::setrlimit(RLIMIT_NOFILE, &lowered) == 0);
    std::vector<int> clients;
    for (int fd; (fd = connectRaw(m_socketPath)) >= 0;)
        clients.push_back(fd);
    QCOMPARE(errno, EMFILE);

    QTest::ignoreMessage(QtWarningMsg,
        QRegularExpression(QStringLiteral("Refusing new connections.*out of file descriptors")));
    gate.release();
    held = false;
    // Every waiting client is closed at once rather than left waiting for a handshake.
    const auto allClosed = [&] {
        char byte;
        return std::all_of(
            clients.begin(), clients.end(), [&](int fd) { return ::recv(fd, &byte, 1, MSG_DONTWAIT) == 0; });
    };
    QTRY_VERIFY(allClosed());
    for (const int fd : clients)
        ::close(fd);
    QVERIFY(::setrlimit(RLIMIT_NOFILE, &saved) == 0);
    QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("again, after refusing")));
    QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
}

void TransportLimitsTest::hungDeviceCostsOneTimeout_data()
{
    QTest::addColumn<int>("action");
    QTest::newRow("copy to the PC") << 0;
    QTest::newRow("copy to the device") << 1;
    QTest::newRow("install a package") << 2;
}

void TransportLimitsTest::hungDeviceCostsOneTimeout()
{
    QFETCH(int, action);
    DeviceConnection::setCallTimeoutMs(300);
    Device device(m_socketPath);
    QList<QPair<QString, QString>> devices;
    QCOMPARE(Portlex::GetDevices(devices), 1u);
    const QSharedPointer<_ZantDevice> zant = Portlex::GetDevice(QStringLiteral("limits"));
    QVERIFY(Portlex::ConnectDevice(zant, QString(), QString()));
    const QString local = m_dir->filePath(QStringLiteral("local.zantro"));
    QVERIFY(writeFile(local, randomBytes(qsizetype(CopySize), 5)));

    // The device stops answering in the middle of the transfer.
    device.handler.hangAtChunk = 2;
    const int result = action == 0
        ? zant->CopyFileToPC(QStringLiteral("/user/big.bin"), m_dir->filePath(QStringLiteral("copy")))
        : action == 1 ? zant->CopyFileToDevice(local, QStringLiteral("/user/big.bin"))
                      : zant->InstallPackage(local, 1);
    QCOMPARE(result, int(PortlexError::Timeout));
    device.handler.hung.release();

    // No clean-up call went after the timeout: the next caller's connection is the first
    // the device has seen since the transfer's.
    QCOMPARE(call(m_socketPath, Operation::GetVolumes), 0);
    QCOMPARE(device.handler.lastConnection.load(), device.handler.transferConnection + 1);
}

void TransportLimitsTest::stillWorkingRenewsTheDeadline_data()
{
    QTest::addColumn<int>("keepAlives");
    QTest::addColumn<int>("silenceMs");
    QTest::addColumn<qint32>("expected");
    // The call allows 400 ms of silence.
    QTest::newRow("notices all through 800 ms of work") << 16 << 0 << 0;
    QTest::newRow("silence after a few notices") << 3 << 1200 << qint32(PortlexError::Timeout);
}

void TransportLimitsTest::stillWorkingRenewsTheDeadline()
{
    QFETCH(int, keepAlives);
    QFETCH(int, silenceMs);
    QFETCH(qint32, expected);
    Device device(m_socketPath);
    device.handler.keepAlives = keepAlives;
    device.handler.silenceMs = silenceMs;
    DeviceConnection connection(m_socketPath);
    QByteArray body;
    const auto ask = [&](Operation operation, int allowedMs) {
        return connection.call(operation, QByteArray(), Protocol::NoFlags, &body, QDeadlineTimer(allowedMs));
    };
    QCOMPARE(ask(Operation::RunApplication, 400), expected);
    if (expected != 0)
        return;
    QString said;
    PayloadStream in(body);
    in >> said;
    QCOMPARE(said, QStringLiteral("done"));
    // The notices left the connection in step for the next call.
    const quint64 served = device.handler.lastConnection;
    QCOMPARE(ask(Operation::GetVolumes, 5000), 0);
    QCOMPARE(device.handler.lastConnection.load(), served);
}

void TransportLimitsTest::socketPlaceChecked_data()
{
    QTest::addColumn<int>("place");  // what is there before the device starts
    QTest::addColumn<int>("mode");   // of the socket folder
    QTest::addColumn<qint32>("client");
    const qint32 untrusted = PortlexError::Untrusted, unreachable = PortlexError::Unreachable;
    QTest::newRow("missing folder, created private") << int(Missing) << 0700 << 0;
    QTest::newRow("folder others may read") << int(Folder) << 0755 << 0;
    QTest::newRow("world-writable folder") << int(Folder) << 0777 << untrusted;
    QTest::newRow("group-writable folder") << int(Folder) << 0770 << untrusted;
    QTest::newRow("shared, sticky folder") << int(Folder) << 01777 << untrusted;
    QTest::newRow("folder reached through a link") << int(Link) << 0700 << untrusted;
    QTest::newRow("another user's folder") << int(Foreign) << 0700 << untrusted;
    QTest::newRow("regular file at the socket path") << int(File) << 0700 << unreachable;
    QTest::newRow("symlink at the socket path") << int(FileLink) << 0700 << unreachable;
    QTest::newRow("directory at the socket path") << int(Directory) << 0700 << unreachable;
    QTest::newRow("stale socket, replaced") << int(StaleSocket) << 0700 << 0;
}

void TransportLimitsTest::socketPlaceChecked()
{
    QFETCH(int, place);
    QFETCH(int, mode);
    QFETCH(qint32, client);
    if (place == Foreign && ::geteuid() != 0)
        QSKIP("giving a folder to another user needs root");
    const QByteArray folder = QFile::encodeName(m_folder);
    const QString target = m_dir->filePath(QStringLiteral("target"));
    QVERIFY(place == Missing || (QDir().mkpath(m_folder) && ::chmod(folder.constData(), mode_t(mode)) == 0));
    QVERIFY(place != Foreign || ::chown(folder.constData(), 65534, 65534) == 0);
    QVERIFY(place != Link || QFile::link(m_folder, m_dir->filePath(QStringLiteral("link"))));
    QVERIFY(place != File || writeFile(m_socketPath, "keep me"));
    QVERIFY(place != FileLink || (writeFile(target, "keep me") && QFile::link(target, m_socketPath)));
    QVERIFY(place != Directory || QDir().mkpath(m_socketPath + QStringLiteral("/inside")));
    QVERIFY(place != StaleSocket || makeStaleSocket(m_socketPath));
    const QString socketPath = place == Link ? m_dir->filePath(QStringLiteral("link/limits")) : m_socketPath;
    const QByteArray before = treeDigest(m_dir->path());

    // The device refuses the place and says where; the client will not even connect
    // through an unsafe folder; nothing there is changed, the folder's mode included.
    Device device(socketPath);
    QString error;
    QCOMPARE(call(socketPath, Operation::GetVolumes, &error), client);
    QCOMPARE(modeOf(m_folder), mode_t(mode));
    if (client == 0) {
        QVERIFY2(device.listening, qPrintable(device.error));
        return;
    }
    QVERIFY(!device.listening);
    const QString named = place == File || place == FileLink || place == Directory ? socketPath
                                                                                   : QFileInfo(socketPath).path();
    QVERIFY2(device.error.contains(named), qPrintable(device.error));
    QVERIFY2(client != PortlexError::Untrusted || error.contains(named), qPrintable(error));
    QCOMPARE(treeDigest(m_dir->path()), before);
}

void TransportLimitsTest::peerOfAnotherUserRefused()
{
    if (::geteuid() != 0)
        QSKIP("listening as another user needs root");
    QVERIFY(QDir().mkpath(m_folder) && ::chmod(QFile::encodeName(m_folder).constData(), 0700) == 0);
    const int listener = listenRaw(m_socketPath, 65534);
    QVERIFY(listener >= 0);

    QString error;
    QCOMPARE(call(m_socketPath, Operation::GetVolumes, &error), qint32(PortlexError::Untrusted));
    QVERIFY2(error.contains(QStringLiteral("another user")), qPrintable(error));
    // It went without a word: the connection ends before any byte.
    const int peer = ::accept(listener, nullptr, nullptr);
    QVERIFY(peer >= 0);
    char byte;
    QCOMPARE(::recv(peer, &byte, 1, MSG_DONTWAIT), ssize_t(0));
    ::close(peer);
    ::close(listener);
}

QTEST_GUILESS_MAIN(TransportLimitsTest)
#include "tst_transportlimits.moc"
