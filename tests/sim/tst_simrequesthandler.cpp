#include "DeviceState.h"
#include "PortlexErrors.h"
#include "SimRequestHandler.h"
#include "TestImage.h"

#include <QCoreApplication>
#include <QtTest>

template <typename T>
static T decoded(const QByteArray& body)
{
    PayloadStream in(body);
    T value;
    in >> value;
    return value;
}

class TestSimRequestHandler : public QObject
{
    Q_OBJECT

private slots:
    void init();
    void connectAndRefusal();
    void lockRequestsDisableTheirMode();
    void failRules();
    void malformedRequests();

private:
    static Request request(Operation operation, const QByteArray& payload = QByteArray(),
                           Protocol::RequestFlags flags = Protocol::NoFlags)
    {
        Request r;
        r.connectionId = 1;
        r.operation = operation;
        r.payload = payload;
        r.flags = flags;
        return r;
    }
    static QByteArray pathPayload(const QString& path)
    {
        QByteArray payload;
        PayloadStream out(&payload);
        out << path;
        return payload;
    }
    qint32 tepStatus(Protocol::RequestFlags flags = Protocol::NoFlags);

    std::unique_ptr<TestImage> m_image;
    std::unique_ptr<DeviceState> m_state;
    std::unique_ptr<SimRequestHandler> m_handler;
};

void TestSimRequestHandler::init()
{
    m_image = std::make_unique<TestImage>();
    m_image->fillDefault();
    m_state = std::make_unique<DeviceState>();
    QVERIFY2(m_state->load(m_image->path(), QCoreApplication::applicationDirPath()), qPrintable(m_state->errorString()));
    m_handler = std::make_unique<SimRequestHandler>(*m_state);
}

qint32 TestSimRequestHandler::tepStatus(Protocol::RequestFlags flags)
{
    const Answer answer = m_handler->handle(request(Operation::TepStatus, QByteArray(), flags));
    PayloadStream in(answer.body);
    qint32 status = -1;
    QString mode, owner, expiry;
    in >> status >> mode >> owner >> expiry;
    return in.ok() && answer.result == 0 ? status : -1;
}

void TestSimRequestHandler::connectAndRefusal()
{
    QCOMPARE(m_handler->displayName(), QStringLiteral("Zantro Simulator - Test"));
    QCOMPARE(m_handler->deviceId(), QStringLiteral("test-dev"));

    Answer answer = m_handler->handle(request(Operation::Connect));
    QCOMPARE(answer.result, 0);
    QVERIFY(!decoded<QString>(answer.body).isEmpty());

    m_handler->refuseConnect(1106, QStringLiteral("Device busy"));
    answer = m_handler->handle(request(Operation::Connect));
    QCOMPARE(answer.result, 1106);
    QCOMPARE(decoded<QString>(answer.body), QStringLiteral("Device busy"));
    QCOMPARE(m_handler->handle(request(Operation::GetModules)).result, 0); // only Connect is refused
}

void TestSimRequestHandler::lockRequestsDisableTheirMode()
{
    QCOMPARE(tepStatus(), qint32(EnablementEnabled));
    QCOMPARE(tepStatus(Protocol::SignatureLockRequest), qint32(EnablementEnabled));
    // The flag rides on any request; the mode is disabled before that request is answered.
    QCOMPARE(m_handler->handle(request(Operation::GetVolumes, QByteArray(), Protocol::ServiceLockRequest)).result, 0);
    QCOMPARE(tepStatus(), qint32(EnablementDisabled));
    const Answer privileges = m_handler->handle(request(Operation::GetTepSigPrivs));
    QVector<PriviledgeRecord> list;
    PayloadStream in(privileges.body);
    readList(in, list);
    QVERIFY(in.ok());
    QVERIFY(list.isEmpty());
}

void TestSimRequestHandler::failRules()
{
    FailurePlan plan;
    QString error;
    const QStringList operations = SimRequestHandler::operationNames();
    QVERIFY(plan.addRule(QStringLiteral("GetRegistry=3"), operations, &error));
    QVERIFY(plan.addRule(QStringLiteral("GetChildSettings:/appinfo=0xDEADBEEF"), operations, &error));
    QVERIFY(plan.addRule(QStringLiteral("Connect=1106"), operations, &error));
    m_handler->setFailurePlan(plan);

    QCOMPARE(m_handler->handle(request(Operation::GetRegistry)).result, 3);
    QCOMPARE(m_handler->handle(request(Operation::GetChildSettings, pathPayload(QStringLiteral("/appinfo")))).result,
             qint32(0xDEADBEEF));
    QCOMPARE(m_handler->handle(request(Operation::GetChildSettings, pathPayload(QStringLiteral("/")))).result, 0);
    QCOMPARE(m_handler->handle(request(Operation::GetModules)).result, 0);

    const Answer refused = m_handler->handle(request(Operation::Connect));
    QCOMPARE(refused.result, 1106);
    QString status;
    PayloadStream in(refused.body);
    in >> status;
    QVERIFY(in.ok()); // a refused Connect still carries its status text
    QVERIFY(!status.isEmpty());
}

void TestSimRequestHandler::malformedRequests()
{
    QCOMPARE(m_handler->handle(request(Operation::GetChildSettings)).result, qint32(PortlexError::BadRequest));
    QCOMPARE(m_handler->handle(request(Operation::GetFileSystemLevel, QByteArray("\xff\xff\xff", 3))).result,
             qint32(PortlexError::BadRequest));
    QCOMPARE(m_handler->handle(request(Operation::GetModuleMif, pathPayload(QStringLiteral("/nothing.mif")))).result,
             qint32(PortlexError::NotFound));
    QCOMPARE(m_handler->handle(request(Operation::GetFileSystemLevel, pathPayload(QStringLiteral("/../..")))).result,
             qint32(PortlexError::PathRefused));
    QCOMPARE(m_handler->handle(request(Operation(9999))).result, qint32(PortlexError::UnknownOperation));
}

QTEST_GUILESS_MAIN(TestSimRequestHandler)
#include "tst_simrequesthandler.moc"
