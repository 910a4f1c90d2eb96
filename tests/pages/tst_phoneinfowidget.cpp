#include "DeviceCache.h"
#include "FormatSize.h"
#include "PhoneInfoWidget.h"

#include <QLabel>
#include <QSignalSpy>
#include <QTest>

namespace {

DeviceCache fullRecord()
{
    DeviceCache cache;
    cache.filled = true;
    DeviceData& data = cache.deviceData;
    data.phoneName = "Kestrel";
    data.targetId = "0x00C0FFEE";
    data.zantVersion = "4.2.1";
    data.zantBuildNumber = "4210";
    data.staticBuildId = "S-77";
    data.dynamicBuildId = "D-78";
    data.componentServicesBuild = "CS 9.1";
    data.hardware = {
        {"Manufacturer", "Norvale"}, {"Model", "K-200"}, {"Firmware", "FW 1.0.7"}, {"ChipID", "NV6"},
        {"PlatformID", "0x0A01"}, {"QXEVersion", "3.1"}, {"MobileID", "M-55"}, {"ColorDepth", "24"},
        {"cxScreen", "240"}, {"cyScreen", "320"}, {"FlipPhone", "Yes"}, {"Vibrate", "yes"},
        {"LocationSupport", "1"}, {"DeviceMDN", "5550100"}, {"IMEI", "490154203237518"},
        {"RUIMID", "R-1"}, {"HWID", "HW-2"}, {"DeviceIDHash", "9f2c"}, {"HeapMemory", "10240"},
        {"HeapFree", "9998"}, {"FSTotal", "lots"}, {"FSAvail", "-1"},
    };
    data.image = {{"PNG", "Yes"}, {"BMP", "Yes"}, {"JPEG", "No"}};
    data.video = {{"MPEG4", "Yes"}};
    return cache;
}

QStringList column(const QTableWidget* table, int column)
{
    QStringList texts;
    for (int row = 0; row < table->rowCount(); ++row)
        texts.append(table->item(row, column) ? table->item(row, column)->text() : QString("<none>"));
    return texts;
}

} // namespace

class TestPhoneInfoWidget : public QObject
{
    Q_OBJECT

private slots:
    void formatSize_data()
    {
        QTest::addColumn<quint64>("bytes");
        QTest::addColumn<QString>("text");

        QTest::newRow("zero") << quint64(0) << "0 bytes";
        QTest::newRow("1024 is still bytes") << quint64(1024) << "1024 bytes";
        QTest::newRow("9998") << quint64(9998) << "9998 bytes";
        QTest::newRow("9999") << quint64(9999) << "9.76 kB";
        QTest::newRow("10240") << quint64(10240) << "10.00 kB";
        QTest::newRow("below a MB") << quint64(1048575) << "1024.00 kB";
        QTest::newRow("one MB") << quint64(1048576) << "1.00 MB";
        QTest::newRow("below a GB") << quint64(1073741823) << "1024.00 MB";
        QTest::newRow("one GB") << quint64(1073741824) << "1.00 GB";
        QTest::newRow("64 GB and a half") << quint64(69256347648ULL) << "64.50 GB";
        QTest::newRow("largest") << quint64(~0ULL) << "17179869184.00 GB";
    }

    void formatSize()
    {
        QFETCH(quint64, bytes);
        QFETCH(QString, text);
        QCOMPARE(::formatSize(bytes), text);
    }

    void placeholdersUntilFilled()
    {
        PhoneInfoWidget page;
        QCOMPARE(page._manufacturer->text(), QString("_manufacturer"));
        QCOMPARE(page._fsFree->text(), QString("_fsFree"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QVERIFY(page.status().isEmpty());
        QVERIFY(!page.isComplete());

        QSignalSpy status(&page, &GatewayComponentWidget::statusChanged);
        page.setDeviceRecord(nullptr);
        QCOMPARE(page._imei->text(), QString("_imei"));
        QCOMPARE(page.state(), GatewayComponentWidget::Starting);
        QCOMPARE(status.count(), 0);
    }

    void filledFromRecord_data()
    {
        QTest::addColumn<QString>("label");
        QTest::addColumn<QString>("text");

        const QList<QPair<QString, QString>> expected = {
            {"_manufacturer", "Norvale"}, {"_model", "K-200"}, {"_firmware", "FW 1.0.7"}, {"_chipID", "NV6"},
            {"_platformID", "0x0A01"}, {"_qxeVersion", "3.1"}, {"_mobileID", "M-55"}, {"_colorDepth", "24"},
            {"_screenWidth", "240"}, {"_screenHeight", "320"}, {"_mdn", "5550100"}, {"_imei", "490154203237518"},
            {"_ruimid", "R-1"}, {"_hwid", "HW-2"}, {"_deviceIDHash", "9f2c"}, {"_phoneName", "Kestrel"},
            {"_targetID", "0x00C0FFEE"}, {"_zantVersion", "4.2.1"}, {"_zantBuild", "4210"}, {"_staticBuild", "S-77"},
            {"_dynamicBuild", "D-78"}, {"_csBuild", "CS 9.1"},
            // Sizes: a number, the bytes threshold, text that is no number, a negative count.
            {"_totalMemory", "10.00 kB"}, {"_freeMemory", "9998 bytes"}, {"_fsSpace", "0 bytes"}, {"_fsFree", "0 bytes"},
        };
        for (const auto& [label, text] : expected)
            QTest::newRow(qPrintable(label)) << label << text;
    }

    void filledFromRecord()
    {
        QFETCH(QString, label);
        QFETCH(QString, text);
        DeviceCache cache = fullRecord();
        PhoneInfoWidget page;
        page.setDeviceRecord(&cache);
        const QLabel* value = page.findChild<QLabel*>(label);
        QVERIFY(value);
        QCOMPARE(value->text(), text);
    }

    void filledBoxesTablesAndState()
    {
        DeviceCache cache = fullRecord();
        PhoneInfoWidget page;
        QSignalSpy status(&page, &GatewayComponentWidget::statusChanged);
        QSignalSpy state(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(&cache);

        // Only the exact "Yes" checks a box; the boxes only display.
        QVERIFY(page._flipPhone->isChecked());
        QVERIFY(!page._vibrate->isChecked());
        QVERIFY(!page._locationSupport->isChecked());
        QVERIFY(!page._penSupport->isChecked());
        QVERIFY(!page._flipPhone->isEnabled());

        // Formats sorted ascending by name; an empty map leaves an empty table with its headers.
        QCOMPARE(column(page._imageFormats, 0), (QStringList{"BMP", "JPEG", "PNG"}));
        QCOMPARE(column(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
        QCOMPARE(column(page._videoFormats, 0), QStringList{"MPEG4"});
        QCOMPARE(page._audioFormats->rowCount(), 0);
        QCOMPARE(page._audioFormats->columnCount(), 2);
        QCOMPARE(page._audioFormats->horizontalHeaderItem(0)->text(), QString("Format"));
        QCOMPARE(page._audioFormats->horizontalHeaderItem(1)->text(), QString("Supported"));

        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(page.state(), GatewayComponentWidget::Complete);
        QCOMPARE(status.count(), 1);
        QCOMPARE(state.count(), 1);
        QVERIFY(page.isComplete());
    }

    void missingKeysLeaveLabelsEmpty()
    {
        DeviceCache cache;
        cache.deviceData.hardware = {{"imei", "lower-case key"}, {"Vibrate", "Yes"}};
        PhoneInfoWidget page;
        page.setDeviceRecord(&cache);

        QVERIFY(page._imei->text().isEmpty());
        QVERIFY(page._manufacturer->text().isEmpty());
        QVERIFY(page._phoneName->text().isEmpty());
        QCOMPARE(page._totalMemory->text(), QString("0 bytes"));
        QVERIFY(page._vibrate->isChecked());
        QVERIFY(!page._flipPhone->isChecked());
        QCOMPARE(page._imageFormats->rowCount(), 0);
        QCOMPARE(page._videoFormats->rowCount(), 0);
        QCOMPARE(page.status(), QString("Ready"));
    }

    // Device texts are shown as they are, never as markup.
    void valuesArePlainText()
    {
        DeviceCache cache;
        cache.deviceData.phoneName = "<b>Bold</b> & co";
        PhoneInfoWidget page;
        page.setDeviceRecord(&cache);
        QCOMPARE(page._phoneName->textFormat(), Qt::PlainText);
        QCOMPARE(page._phoneName->text(), QString("<b>Bold</b> & co"));
    }

    // A second record replaces the format rows, each name still beside its own value.
    void refillReplacesFormats()
    {
        DeviceCache cache = fullRecord();
        PhoneInfoWidget page;
        page.setDeviceRecord(&cache);
        cache.deviceData.image = {{"GIF", "No"}, {"AVIF", "Yes"}, {"TIFF", "Yes"}};
        page.setDeviceRecord(&cache);
        QCOMPARE(column(page._imageFormats, 0), (QStringList{"AVIF", "GIF", "TIFF"}));
        QCOMPARE(column(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
    }

    void pageOperations()
    {
        PhoneInfoWidget page;
        DeviceCache cache = fullRecord();
        page.setDeviceRecord(&cache);
        QSignalSpy timed(&page, &GatewayComponentWidget::timedStatusChanged);

        QCOMPARE(page.componentName(), QString("PhoneInformation"));
        QVERIFY(!page.canSearch());
        QVERIFY(!page.search("Norvale"));
        QVERIFY(page.searchText().isEmpty());
        QCOMPARE(timed.count(), 0);
        QVERIFY(page.xmlReport().isEmpty());
        page.startComponent("any");
        page.raisePriority();
        page.lowerPriority();
        QCOMPARE(page.status(), QString("Ready"));
    }
};

QTEST_MAIN(TestPhoneInfoWidget)
#include "tst_phoneinfowidget.moc"
