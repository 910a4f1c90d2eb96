#include "FormatSize.h"
#include "PhoneInfoWidget.h"
#include "Portlex.h"
#include "SimulatorProcess.h"

#include <QTemporaryDir>
#include <QTest>

// The phone information page filled from the cache that a real simulator hands the gateway.
class TestPhoneInfoSimulator : public QObject
{
    Q_OBJECT

private slots:
    void initTestCase()
    {
        QVERIFY(m_sockets.isValid());
        qputenv("ZANTRO_SIM_DIR", QFile::encodeName(m_sockets.path()));
        QVERIFY(Portlex::Initialize());
    }

    void cleanupTestCase()
    {
        Portlex::Destroy();
    }

    void filledFromHandset()
    {
        SimulatorProcess simulator(m_sockets.path());
        QVERIFY2(simulator.start(SimulatorProcess::sampleImage("handset"), "kestrel"), qPrintable(simulator.errorString()));

        QList<QPair<QString, QString>> devices;
        QCOMPARE(Portlex::GetDevices(devices), 1u);
        const QSharedPointer<_ZantDevice> device = Portlex::GetDevice(devices.first().second);
        QVERIFY(device);
        QVERIFY2(Portlex::ConnectDevice(device, QString(), QString()), qPrintable(Portlex::LastStatus()));
        const DeviceData& data = device->cache.deviceData;

        PhoneInfoWidget page;
        page.setDeviceRecord(&device->cache);

        QCOMPARE(page._manufacturer->text(), QString("Kestrel Mobile"));
        QCOMPARE(page._imei->text(), QString("356938035643809"));
        QCOMPARE(page._phoneName->text(), data.phoneName);
        QCOMPARE(page._targetID->text(), data.targetId);
        QCOMPARE(page._csBuild->text(), data.componentServicesBuild);
        QCOMPARE(page._totalMemory->text(), QString("8.00 MB"));
        QCOMPARE(page._fsFree->text(), formatSize(data.hardwareValue("FSAvail", "").toULongLong()));
        QVERIFY(page._flipPhone->isChecked());
        // The handset writes "yes" in lower case for location support.
        QCOMPARE(data.hardwareValue("LocationSupport", ""), QString("yes"));
        QVERIFY(!page._locationSupport->isChecked());
        QCOMPARE(page._audioFormats->rowCount(), data.audio.size());
        QCOMPARE(page._videoFormats->rowCount(), data.video.size());
        QCOMPARE(page._videoFormats->item(1, 1)->text(), data.video.value(page._videoFormats->item(1, 0)->text()));
        QCOMPARE(page.status(), QString("Ready"));
        QVERIFY(page.isComplete());
    }

private:
    QTemporaryDir m_sockets;
};

QTEST_MAIN(TestPhoneInfoSimulator)
#include "tst_phoneinfosimulator.moc"
