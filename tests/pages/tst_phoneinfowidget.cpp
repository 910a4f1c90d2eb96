#include "FormatSize.h"
#include "PageFixtures.h"
#include "PhoneInfoWidget.h"

#include <QLabel>
#include <QSignalSpy>

using namespace PageFixtures;

// The phone information page: every label and box from its key of the device's record, the
// format tables, and the size texts.
class TestPhoneInfoWidget : public QObject
{
    Q_OBJECT

private slots:
    void formatSize()
    {
        const QList<QPair<quint64, QString>> sizes = {
            {9998, "9998 bytes"},           {9999, "9.76 kB"},           {1048575, "1024.00 kB"},
            {1048576, "1.00 MB"},           {1073741823, "1024.00 MB"},  {1073741824, "1.00 GB"},
            {~0ULL, "17179869184.00 GB"},
        };
        for (const auto& [bytes, text] : sizes)
            QCOMPARE(::formatSize(bytes), text);
    }

    void filledFromRecord()
    {
        DeviceCache cache;
        DeviceData& data = cache.deviceData;
        data.phoneName = "<b>Kestrel</b> & co";
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
            {"LocationSupport", "1"}, {"DeviceMDN", "5550100"}, {"IMEI", "490154203237518"}, {"RUIMID", "R-1"},
            {"HWID", "HW-2"}, {"DeviceIDHash", "9f2c"}, {"HeapMemory", "10240"}, {"HeapFree", "9998"},
            {"FSTotal", "lots"}, {"FSAvail", "-1"}, {"imei", "lower-case key"},
        };
        data.image = {{"PNG", "Yes"}, {"BMP", "Yes"}, {"JPEG", "No"}};
        data.video = {{"MPEG4", "Yes"}};
        PhoneInfoWidget page;
        QSignalSpy states(&page, &GatewayComponentWidget::stateChanged);
        page.setDeviceRecord(nullptr);
        QCOMPARE(states.count(), 0);
        page.setDeviceRecord(&cache);

        // Device texts are shown as they are, never as markup. Sizes: a number, the bytes
        // threshold, text that is no number, a negative count.
        const QList<QPair<const char*, QString>> labels = {
            {"_manufacturer", "Norvale"}, {"_model", "K-200"}, {"_firmware", "FW 1.0.7"}, {"_chipID", "NV6"},
            {"_platformID", "0x0A01"}, {"_qxeVersion", "3.1"}, {"_mobileID", "M-55"}, {"_colorDepth", "24"},
            {"_screenWidth", "240"}, {"_screenHeight", "320"}, {"_mdn", "5550100"}, {"_imei", "490154203237518"},
            {"_ruimid", "R-1"}, {"_hwid", "HW-2"}, {"_deviceIDHash", "9f2c"}, {"_phoneName", "<b>Kestrel</b> & co"},
            {"_targetID", "0x00C0FFEE"}, {"_zantVersion", "4.2.1"}, {"_zantBuild", "4210"}, {"_staticBuild", "S-77"},
            {"_dynamicBuild", "D-78"}, {"_csBuild", "CS 9.1"}, {"_totalMemory", "10.00 kB"}, {"_freeMemory", "9998 bytes"},
            {"_fsSpace", "0 bytes"}, {"_fsFree", "0 bytes"},
        };
        for (const auto& [name, text] : labels) {
            const QLabel* label = page.findChild<QLabel*>(name);
            QVERIFY2(label && label->text() == text && label->textFormat() == Qt::PlainText, name);
        }
        // Only the exact "Yes" checks a box.
        QVERIFY(page._flipPhone->isChecked());
        QVERIFY(!page._vibrate->isChecked() && !page._locationSupport->isChecked() && !page._penSupport->isChecked());
        // Formats sorted by name, each beside its own value.
        QCOMPARE(columnTexts(page._imageFormats, 0), (QStringList{"BMP", "JPEG", "PNG"}));
        QCOMPARE(columnTexts(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
        QCOMPARE(columnTexts(page._videoFormats, 0), QStringList{"MPEG4"});
        QCOMPARE(page._audioFormats->rowCount(), 0);
        QCOMPARE(page.status(), QString("Ready"));
        QCOMPARE(signalTexts(states), QStringList{"Complete"});

        // A second record replaces the rows and the texts.
        data.image = {{"GIF", "No"}, {"AVIF", "Yes"}, {"TIFF", "Yes"}};
        data.hardware.remove("IMEI");
        page.setDeviceRecord(&cache);
        QCOMPARE(columnTexts(page._imageFormats, 0), (QStringList{"AVIF", "GIF", "TIFF"}));
        QCOMPARE(columnTexts(page._imageFormats, 1), (QStringList{"Yes", "No", "Yes"}));
        QCOMPARE(page._imei->text(), QString());
    }
};

QTEST_MAIN(TestPhoneInfoWidget)
#include "tst_phoneinfowidget.moc"
