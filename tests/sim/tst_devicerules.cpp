#include "DeviceState.h"
#include "ImageCopy.h"
#include "PackageExtractor.h"
#include "PackageWriter.h"
#include "PortlexErrors.h"
#include "SimOptions.h"
#include "SimRequestHandler.h"
#include "SimulatorDaemon.h"
#include "TestImage.h"
#include "TestSupport.h"

#include <QProcess>
#include <QRegularExpression>
#include <QtTest>

#include <functional>

namespace {

template <typename... Values>
QByteArray pack(const Values&... values)
{
    QByteArray bytes;
    PayloadStream out(&bytes);
    ((out << values), ...);
    return bytes;
}

Request request(Operation operation, const QByteArray& payload, quint64 connection = 1,
                Protocol::RequestFlags flags = Protocol::NoFlags, std::function<void()> keepAlive = {})
{
    return Request { connection, operation, flags, payload, std::move(keepAlive) };
}

// The first field of an answer: a status text or a transfer id.
template <typename T>
T leading(const Answer& answer)
{
    PayloadStream in(answer.body);
    T value {};
    in >> value;
    return value;
}

enum ConnectState { NeverSent, Refused, FailedByRule, RefusedLater };

} // namespace

// The rules the device keeps for itself: read-only system module folders, names kept for its
// own temporary files, Connect before anything else, reservations that expire, rescans that
// read only what changed (and no huge MIF), keep-alives while unpacking and the sweep of
// orphaned --reset copies.
class TestDeviceRules : public QObject
{
    Q_OBJECT

    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<DeviceState> m_state;
    std::unique_ptr<SimRequestHandler> m_handler;
    std::unique_ptr<QTemporaryDir> m_scratch;

    QString flash(const QString& relative) const { return m_image->path() + QStringLiteral("/flash/") + relative; }
    Answer act(Operation operation, const QByteArray& payload, quint64 connection = 1)
    {
        return m_handler->actions().handle(request(operation, payload, connection));
    }
    Answer upload(const QString& path, const QByteArray& bytes)
    {
        const Answer begun = act(Operation::CopyToDeviceBegin, pack(path, quint64(bytes.size())));
        if (begun.result != 0)
            return begun;
        act(Operation::UploadChunk, pack(leading<quint32>(begun), bytes));
        return act(Operation::CopyToDeviceCommit, pack(leading<quint32>(begun)));
    }
    QString writePackage(const std::function<void(PackageWriter&)>& fill)
    {
        const QString path = m_scratch->filePath(QStringLiteral("p%1.zantro").arg(QDir(m_scratch->path()).count()));
        PackageWriter writer;
        writer.open(path);
        fill(writer);
        return writer.close() ? path : QString();
    }
    Answer install(const QString& package, const std::function<void()>& keepAlive = {})
    {
        const QByteArray bytes = TestSupport::readFile(package);
        const Answer begun = act(Operation::InstallPackageBegin, pack(quint16(1), QStringLiteral("p.zantro"), quint64(bytes.size())));
        act(Operation::UploadChunk, pack(leading<quint32>(begun), bytes));
        return m_handler->actions().handle(request(Operation::InstallPackageCommit, pack(leading<quint32>(begun)), 1, {}, keepAlive));
    }
    void load()
    {
        m_handler.reset();
        m_state = std::make_unique<DeviceState>();
        QVERIFY2(m_state->load(m_image->path(), QCoreApplication::applicationDirPath()), qPrintable(m_state->errorString()));
        m_handler = std::make_unique<SimRequestHandler>(*m_state);
    }

private slots:
    void init()
    {
        m_image = std::make_unique<TestImage>();
        m_image->fillDefault();
        m_scratch = std::make_unique<QTemporaryDir>();
        load();
    }

    void writesTheDeviceRefuses_data()
    {
        QTest::addColumn<QString>("action");
        QTest::addColumn<QString>("path"); // for an install: the package's one entry
        QTest::addColumn<int>("code");
        QTest::addColumn<QString>("because");
        const auto row = [](const char* name, const char* action, const char* path, int code, const char* because) {
            QTest::newRow(name) << QString::fromUtf8(action) << QString::fromUtf8(path) << code << QString::fromUtf8(because);
        };
        const int refused = PortlexError::PathRefused, refusedPackage = PortlexError::Refused;
        row("upload over a system module", "upload", "/sys/mod/sysm/sysm.mif", refused, "read-only");
        row("upload into a system folder", "upload", "/sys/mod/sysm/extra.txt", refused, "read-only");
        row("upload through a link into one", "upload", "/user/syslink/extra.txt", refused, "read-only");
        row("delete a system module", "delete", "/sys/mod/sysm", refused, "read-only");
        row("delete in a system module", "delete", "/sys/mod/sysm/sysm.mod", refused, "read-only");
        row("delete what holds one", "delete", "/sys", refused, "read-only");
        row("install over a system module", "install", "sysm/SYSM.mif", refusedPackage, "would replace the system module");
        row("upload a partial name", "upload", "/user/.zantro-partial-mine", refused, ".zantro-partial-");
        row("upload a staging name", "upload", "/user/.zantro-staging-1", refused, ".zantro-staging-");
        row("install a staging folder", "install", ".zantro-staging-evil/m.mif", refusedPackage, "temporary files");
        row("install a nested partial name", "install", "m/.zantro-partial-x", refusedPackage, "temporary files");
        // The install folder stays writable.
        row("upload beside a user module", "upload", "/usermod/userm/extra.txt", 0, "");
        row("delete a user module", "delete", "/usermod/userm", 0, "");
        row("install a new module", "install", "radio/radio.mif", 0, "installed");
    }

    void writesTheDeviceRefuses()
    {
        QFETCH(QString, action);
        QFETCH(QString, path);
        QFETCH(int, code);
        QFETCH(QString, because);
        QVERIFY(QFile::link(flash(QStringLiteral("sys/mod/sysm")), flash(QStringLiteral("user/syslink"))));
        const QByteArray before = TestSupport::treeDigest(m_image->path());

        Answer answer;
        if (action == QLatin1String("upload"))
            answer = upload(path, "new");
        else if (action == QLatin1String("delete"))
            answer = act(Operation::DeleteDeviceFile, pack(path));
        else
            answer = install(writePackage([&path](PackageWriter& w) { w.addFile(path, "x"); }));
        QCOMPARE(answer.result, code);
        QVERIFY2(leading<QString>(answer).contains(because), qPrintable(leading<QString>(answer)));
        QCOMPARE(TestSupport::treeDigest(m_image->path()) == before, code != 0);
    }

    void reservationExpiresWhenIdle_data()
    {
        QTest::addColumn<bool>("package");
        QTest::newRow("upload") << false;
        QTest::newRow("package") << true;
    }

    void reservationExpiresWhenIdle()
    {
        QFETCH(bool, package);
        qint64 now = 0;
        m_handler->actions().setClock([&now] { return now; });
        const quint64 room = m_state->freeSpace(0);
        const Answer hog = package ? act(Operation::InstallPackageBegin, pack(quint16(1), QStringLiteral("all.zantro"), room))
                                   : act(Operation::CopyToDeviceBegin, pack(QStringLiteral("/user/all.bin"), room));
        QCOMPARE(hog.result, 0);
        const quint32 id = leading<quint32>(hog);
        const auto other = [this] { return act(Operation::CopyToDeviceBegin, pack(QStringLiteral("/user/b.bin"), quint64(1)), 2).result; };
        QCOMPARE(other(), int(PortlexError::NoSpace));

        constexpr qint64 limit = DeviceActions::TransferIdleLimitMs;
        now = limit - 1;
        QCOMPARE(act(Operation::UploadChunk, pack(id, QByteArray("x"))).result, 0); // moving keeps it
        now = 2 * limit - 1;
        QCOMPARE(other(), int(PortlexError::NoSpace));
        now = 2 * limit; // quiet for longer than the limit
        QCOMPARE(other(), 0);
        QCOMPARE(act(Operation::UploadChunk, pack(id, QByteArray("y"))).result, int(PortlexError::NotFound));
        const QStringList partials = QStringList { TransferTable::PartialPrefix + QLatin1Char('*') };
        QCOMPARE(QDir(flash(QStringLiteral("user"))).entryList(partials, QDir::Files | QDir::Hidden).size(), 1); // b.bin's
        QCOMPARE(QDir(flash(QStringLiteral("usermod"))).entryList(partials, QDir::Files | QDir::Hidden).size(), 0);
    }

    void servesOnlyAfterConnect_data()
    {
        QTest::addColumn<int>("state");
        QTest::newRow("Connect never sent") << int(NeverSent);
        QTest::newRow("Connect refused") << int(Refused);
        QTest::newRow("Connect failed by a rule") << int(FailedByRule);
        QTest::newRow("refused after an accepted Connect") << int(RefusedLater);
    }

    void servesOnlyAfterConnect()
    {
        QFETCH(int, state);
        const auto handle = [this](Operation operation, const QByteArray& payload, quint64 connection,
                                   Protocol::RequestFlags flags = Protocol::NoFlags) {
            return m_handler->handle(request(operation, payload, connection, flags)).result;
        };
        QCOMPARE(handle(Operation::Connect, pack(QString(), QString()), 2), 0); // another client is connected
        if (state == RefusedLater)
            QCOMPARE(handle(Operation::Connect, pack(QString(), QString()), 1), 0);
        if (state == Refused || state == RefusedLater)
            m_handler->refuseConnect(77, QStringLiteral("Not now"));
        if (state == FailedByRule) {
            FailurePlan plan;
            QString error;
            QVERIFY(plan.addRule(QStringLiteral("Connect=1106"), SimRequestHandler::operationNames(), &error));
            m_handler->setFailurePlan(plan);
        }
        if (state != NeverSent)
            QVERIFY(handle(Operation::Connect, pack(QString(), QString()), 1) != 0);

        const int notConnected = PortlexError::NotConnected;
        QCOMPARE(handle(Operation::GetFileSystemLevel, pack(QStringLiteral("/user")), 1), notConnected);
        QCOMPARE(handle(Operation::DeleteDeviceFile, pack(QStringLiteral("/user/notes.txt")), 1), notConnected);
        QCOMPARE(handle(Operation::GetVolumes, QByteArray(), 1, Protocol::ServiceLockRequest), notConnected);
        QVERIFY(QFileInfo::exists(flash(QStringLiteral("user/notes.txt"))));
        QString mode, owner, expires;
        QCOMPARE(m_state->tepStatus(mode, owner, expires), EnablementEnabled); // the lock request was not applied
        QCOMPARE(handle(Operation::GetVolumes, QByteArray(), 2), 0);
    }

    void orphanedResetCopiesAreSwept()
    {
        QTemporaryDir temp, canary;
        QVERIFY(TestSupport::writeFile(canary.filePath(QStringLiteral("keep.txt")), "canary"));
        QProcess ended;
        ended.start(QStringLiteral("true"), QStringList());
        QVERIFY(ended.waitForStarted());
        const qint64 dead = ended.processId();
        QVERIFY(ended.waitForFinished());
        const QDir tmp(temp.path());
        const QString copy = QStringLiteral("zantro-sim-image-%1-%2");
        const QString orphan = copy.arg(dead).arg(QStringLiteral("abc123"));
        QVERIFY(TestSupport::writeFile(tmp.filePath(orphan + QStringLiteral("/device.xml")), "x"));
        QVERIFY(QFile::link(canary.path(), tmp.filePath(orphan + QStringLiteral("/outside"))));
        const QStringList kept { copy.arg(QCoreApplication::applicationPid()).arg(QStringLiteral("def456")), // owner runs
                                 copy.arg(dead).arg(QStringLiteral("lnk789")), copy.arg(dead).arg(QStringLiteral("fil000")),
                                 QStringLiteral("zantro-sim-image-Ab12Cd") };
        QVERIFY(tmp.mkdir(kept.at(0)) && tmp.mkdir(kept.at(3)));
        QVERIFY(QFile::link(canary.path(), tmp.filePath(kept.at(1))));
        QVERIFY(TestSupport::writeFile(tmp.filePath(kept.at(2)), "f"));

        const QByteArray savedTemp = qgetenv("TMPDIR");
        qputenv("TMPDIR", QFile::encodeName(temp.path()));
        SimOptions options;
        options.imageDir = m_image->path();
        options.reset = true;
        options.socketDir = tmp.filePath(QStringLiteral("sockets"));
        options.namesDir = QCoreApplication::applicationDirPath();
        auto daemon = std::make_unique<SimulatorDaemon>();
        const bool started = daemon->start(options);
        qputenv("TMPDIR", savedTemp);
        QVERIFY2(started, qPrintable(daemon->errorString()));

        QVERIFY(!QFileInfo::exists(tmp.filePath(orphan)));
        for (const QString& name : kept)
            QVERIFY2(QFileInfo(tmp.filePath(name)).exists(), qPrintable(name));
        QCOMPARE(TestSupport::readFile(canary.filePath(QStringLiteral("keep.txt"))), QByteArray("canary"));
        const QFileInfo served(daemon->servedImage());
        QCOMPARE(served.absolutePath(), QFileInfo(temp.path()).absoluteFilePath());
        QVERIFY2(served.fileName().startsWith(copy.arg(QCoreApplication::applicationPid()).arg(QString())),
                 qPrintable(served.fileName()));
        daemon.reset();
        QVERIFY(!served.exists());
    }

    void catalogReadsOnlyWhatChanged()
    {
        const auto reads = [this] { return m_state->catalog().mifReads(); };
        QCOMPARE(reads(), 2); // sysm and userm, once each
        QCOMPARE(upload(QStringLiteral("/user/song.mp3"), "la").result, 0);
        QCOMPARE(reads(), 2);

        const auto putUserModule = [this] {
            m_image->addModule(QStringLiteral("flash/usermod/userm"), TestImage::module(QStringLiteral("userm"), {0x01011002}));
            m_state->filesChanged();
        };
        putUserModule();
        QCOMPARE(reads(), 3);
        QVERIFY(m_state->cache().classes.value(QStringLiteral("0x01011002")).available); // the new MIF counts
        QCOMPARE(act(Operation::DeleteDeviceFile, pack(QStringLiteral("/usermod/userm"))).result, 0);
        QCOMPARE(reads(), 3);
        QCOMPARE(m_state->modules().size(), 1);
        putUserModule();
        QCOMPARE(reads(), 4); // a module put back is read again

        // A MIF above the limit is listed but never read; sparse files take no room.
        QVERIFY(QDir().mkpath(flash(QStringLiteral("usermod/big"))));
        QFile mif(flash(QStringLiteral("usermod/big/big.mif")));
        QVERIFY(mif.open(QIODevice::WriteOnly) && mif.resize(ModuleCatalog::MaxMifSize));
        m_state->filesChanged();
        QCOMPARE(reads(), 5);
        QVERIFY(mif.resize(ModuleCatalog::MaxMifSize + 1));
        QTest::ignoreMessage(QtWarningMsg, QRegularExpression(QStringLiteral("Not reading .*big\\.mif")));
        m_state->filesChanged();
        QCOMPARE(reads(), 5);
        MifEntry entry;
        QCOMPARE(m_state->moduleMif(QStringLiteral("big"), entry), qint32(PortlexError::IoError));
    }

    void keepAliveWhileUnpacking_data()
    {
        QTest::addColumn<int>("files");
        QTest::addColumn<int>("fileSize");
        QTest::addColumn<int>("atLeast");
        QTest::newRow("one 4 MiB file") << 1 << (4 << 20) << 16;
        QTest::newRow("320 empty files") << 320 << 0 << 5;
    }

    void keepAliveWhileUnpacking()
    {
        QFETCH(int, files);
        QFETCH(int, fileSize);
        QFETCH(int, atLeast);
        const QString package = writePackage([&](PackageWriter& w) {
            for (int i = 0; i < files; ++i)
                w.addFile(QStringLiteral("m/f%1").arg(i), TestSupport::randomBytes(fileSize, quint32(i)));
        });
        int beats = 0;
        PackageExtractor extractor;
        extractor.setKeepAlive([&beats] { ++beats; });
        QVERIFY2(extractor.extract(package, m_scratch->filePath(QStringLiteral("into")), 1ull << 30),
                 qPrintable(extractor.errorString()));
        QVERIFY2(beats >= atLeast, qPrintable(QString::number(beats)));

        m_image->writeProfile(TestImage::defaultProfile().replace("size=\"1000000\"", "size=\"100000000\""));
        load();
        int installBeats = 0; // the device passes its request's keep-alive down
        QCOMPARE(install(package, [&installBeats] { ++installBeats; }).result, 0);
        QCOMPARE(installBeats, beats);
    }
};

QTEST_GUILESS_MAIN(TestDeviceRules)
#include "tst_devicerules.moc"
