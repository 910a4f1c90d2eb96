#include "PhoneInfoReport.h"

#include "DisplayText.h"

namespace {

void addFormats(ReportNode& formats, const QString& kind, const QMap<QString, QString>& supported)
{
    for (auto it = supported.cbegin(); it != supported.cend(); ++it) {
        formats.add(QStringLiteral("format"))
            .set(QStringLiteral("kind"), kind)
            .set(QStringLiteral("format"), it.key())
            .set(QStringLiteral("supported"), it.value());
    }
}

} // namespace

Report PhoneInfoReport::build(const DeviceData& device)
{
    const auto hardware = [&device](const char* key) { return device.hardwareValue(QLatin1String(key), QString()); };
    const auto feature = [&device](const char* key) {
        return DisplayText::hasFeature(device, QLatin1String(key)) ? QStringLiteral("Yes") : QStringLiteral("No");
    };
    const auto size = [&device](const char* key) { return DisplayText::deviceSize(device, QLatin1String(key)); };
    const auto bytes = [&device](const char* key) { return QJsonValue(DisplayText::deviceBytes(device, QLatin1String(key))); };

    Report report(QStringLiteral("phone-info"), QStringLiteral("phone-info"), QStringLiteral("format"));
    report.declare(QStringLiteral("hardware"),
                   {{QStringLiteral("manufacturer"), ReportField::Text, QString()},
                    {QStringLiteral("model"), ReportField::Text, QString()},
                    {QStringLiteral("phone-name"), ReportField::Text, QString()},
                    {QStringLiteral("firmware"), ReportField::Text, QString()},
                    {QStringLiteral("platform-id"), ReportField::Text, QString()},
                    {QStringLiteral("mobile-id"), ReportField::Text, QString()},
                    {QStringLiteral("chip-id"), ReportField::Text, QString()},
                    {QStringLiteral("imei"), ReportField::Text, QString()},
                    {QStringLiteral("hwid"), ReportField::Text, QString()},
                    {QStringLiteral("qxe-version"), ReportField::Text, QString()},
                    {QStringLiteral("color-depth"), ReportField::Integer, QString()},
                    {QStringLiteral("screen-width"), ReportField::Integer, QString()},
                    {QStringLiteral("screen-height"), ReportField::Integer, QString()},
                    {QStringLiteral("flip-phone"), ReportField::Boolean, QString()},
                    {QStringLiteral("vibrate"), ReportField::Boolean, QString()},
                    {QStringLiteral("location-support"), ReportField::Boolean, QString()},
                    {QStringLiteral("pen-support"), ReportField::Boolean, QString()}});
    report.declare(QStringLiteral("device"),
                   {{QStringLiteral("target-id"), ReportField::Text, QString()},
                    {QStringLiteral("mdn"), ReportField::Text, QString()},
                    {QStringLiteral("ruimid"), ReportField::Text, QString()},
                    {QStringLiteral("device-id-hash"), ReportField::Text, QString()},
                    {QStringLiteral("memory"), ReportField::Text, QString()},
                    {QStringLiteral("free-memory"), ReportField::Text, QString()},
                    {QStringLiteral("file-system-size"), ReportField::Text, QString()},
                    {QStringLiteral("file-system-available-size"), ReportField::Text, QString()}});
    report.declare(QStringLiteral("zant"),
                   {{QStringLiteral("version"), ReportField::Text, QString()},
                    {QStringLiteral("build-number"), ReportField::Text, QString()},
                    {QStringLiteral("component-services-build"), ReportField::Text, QString()},
                    {QStringLiteral("dynamic-build-id"), ReportField::Text, QString()},
                    {QStringLiteral("static-build-id"), ReportField::Text, QString()}});
    report.declare(QStringLiteral("format"),
                   {{QStringLiteral("kind"), ReportField::Text, QStringLiteral("Kind")},
                    {QStringLiteral("format"), ReportField::Text, QStringLiteral("Format")},
                    {QStringLiteral("supported"), ReportField::Text, QStringLiteral("Supported")}});
    ReportNode& root = report.root();
    root.add(QStringLiteral("hardware"))
        .set(QStringLiteral("manufacturer"), hardware("Manufacturer"))
        .set(QStringLiteral("model"), hardware("Model"))
        .set(QStringLiteral("phone-name"), device.phoneName)
        .set(QStringLiteral("firmware"), hardware("Firmware"))
        .set(QStringLiteral("platform-id"), hardware("PlatformID"))
        .set(QStringLiteral("mobile-id"), hardware("MobileID"))
        .set(QStringLiteral("chip-id"), hardware("ChipID"))
        .set(QStringLiteral("imei"), hardware("IMEI"))
        .set(QStringLiteral("hwid"), hardware("HWID"))
        .set(QStringLiteral("qxe-version"), hardware("QXEVersion"))
        .set(QStringLiteral("color-depth"), hardware("ColorDepth"))
        .set(QStringLiteral("screen-width"), hardware("cxScreen"))
        .set(QStringLiteral("screen-height"), hardware("cyScreen"))
        .set(QStringLiteral("flip-phone"), feature("FlipPhone"))
        .set(QStringLiteral("vibrate"), feature("Vibrate"))
        .set(QStringLiteral("location-support"), feature("LocationSupport"))
        .set(QStringLiteral("pen-support"), feature("PenSupport"));
    root.add(QStringLiteral("device"))
        .set(QStringLiteral("target-id"), device.targetId)
        .set(QStringLiteral("mdn"), hardware("DeviceMDN"))
        .set(QStringLiteral("ruimid"), hardware("RUIMID"))
        .set(QStringLiteral("device-id-hash"), hardware("DeviceIDHash"))
        .set(QStringLiteral("memory"), size("HeapMemory"), bytes("HeapMemory"))
        .set(QStringLiteral("free-memory"), size("HeapFree"), bytes("HeapFree"))
        .set(QStringLiteral("file-system-size"), size("FSTotal"), bytes("FSTotal"))
        .set(QStringLiteral("file-system-available-size"), size("FSAvail"), bytes("FSAvail"));
    root.add(QStringLiteral("zant"))
        .set(QStringLiteral("version"), device.zantVersion)
        .set(QStringLiteral("build-number"), device.zantBuildNumber)
        .set(QStringLiteral("component-services-build"), device.componentServicesBuild)
        .set(QStringLiteral("dynamic-build-id"), device.dynamicBuildId)
        .set(QStringLiteral("static-build-id"), device.staticBuildId);
    // The tables' own order: by format, as the map keeps them.
    ReportNode& formats = root.add(QStringLiteral("media-formats"));
    addFormats(formats, QStringLiteral("image"), device.imageValues());
    addFormats(formats, QStringLiteral("audio"), device.audioValues());
    addFormats(formats, QStringLiteral("video"), device.videoValues());
    return report;
}
