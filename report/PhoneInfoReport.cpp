#include "PhoneInfoReport.h"

#include "FormatSize.h"

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

QString PhoneInfoReport::sizeText(const DeviceData& device, const QString& key)
{
    bool ok = false;
    const qint64 value = device.hardwareValue(key, QString()).toLongLong(&ok, 10);
    return formatSize(ok && value > 0 ? quint64(value) : 0);
}

bool PhoneInfoReport::hasFeature(const DeviceData& device, const QString& key)
{
    return device.hardwareValue(key, QString()) == QLatin1String("Yes");
}

Report PhoneInfoReport::build(const DeviceData& device)
{
    const auto hardware = [&device](const char* key) { return device.hardwareValue(QLatin1String(key), QString()); };
    const auto feature = [&device](const char* key) {
        return hasFeature(device, QLatin1String(key)) ? QStringLiteral("Yes") : QStringLiteral("No");
    };
    const auto size = [&device](const char* key) { return sizeText(device, QLatin1String(key)); };

    Report report(QStringLiteral("phone-info"), QStringLiteral("phone-info"), QStringLiteral("format"));
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
        .set(QStringLiteral("memory"), size("HeapMemory"))
        .set(QStringLiteral("free-memory"), size("HeapFree"))
        .set(QStringLiteral("file-system-size"), size("FSTotal"))
        .set(QStringLiteral("file-system-available-size"), size("FSAvail"));
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
