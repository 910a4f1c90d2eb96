#include "DeviceData.h"

#include <QTest>

class TestDeviceData : public QObject
{
    Q_OBJECT

private slots:
    void hardwareValue_data();
    void hardwareValue();
    void mediaMapsAreCopies();
};

void TestDeviceData::hardwareValue_data()
{
    QTest::addColumn<QString>("key");
    QTest::addColumn<QString>("value");

    QTest::newRow("exact key") << "Camera" << "yes";
    QTest::newRow("differs in case") << "camera" << "default";
    QTest::newRow("upper case") << "CAMERA" << "default";
    QTest::newRow("absent") << "Radio" << "default";
    QTest::newRow("trailing blank") << "Camera " << "default";
    QTest::newRow("stored empty value") << "Flash" << "";
    QTest::newRow("empty key") << "" << "default";
}

void TestDeviceData::hardwareValue()
{
    QFETCH(QString, key);
    QFETCH(QString, value);

    DeviceData data;
    data.hardware.insert("Camera", "yes");
    data.hardware.insert("Flash", "");
    QCOMPARE(data.hardwareValue(key, "default"), value);
}

void TestDeviceData::mediaMapsAreCopies()
{
    DeviceData data;
    data.audio.insert("mp3", "yes");
    data.image.insert("png", "yes");
    data.video.insert("mp4", "no");

    QMap<QString, QString> audio = data.audioValues();
    audio.insert("wav", "yes");
    QCOMPARE(data.audio.size(), 1);
    QCOMPARE(data.imageValues(), data.image);
    QCOMPARE(data.videoValues().value("mp4"), QString("no"));
}

QTEST_APPLESS_MAIN(TestDeviceData)
#include "tst_devicedata.moc"
