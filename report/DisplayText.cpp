#include "DisplayText.h"

#include "FormatSize.h"

QString DisplayText::threadState(quint32 state)
{
    switch (state) {
    case 0:
        return QStringLiteral("Included");
    case 1:
        return QStringLiteral("Default");
    case 2:
        return QStringLiteral("Excluded");
    case 3:
        return QStringLiteral("Hard Excluded");
    default:
        return QStringLiteral("Unknown:") + QString::number(state);
    }
}

QString DisplayText::registryFlags(const RegistryInfo& entry)
{
    QString flags;
    if (entry.active)
        flags = QStringLiteral("Active");
    if (entry.restricted) {
        if (!flags.isEmpty())
            flags += QStringLiteral(" | ");
        flags += QStringLiteral("Restricted");
    }
    return flags;
}

QString DisplayText::levelResult(bool available)
{
    return available ? QStringLiteral("Found") : QStringLiteral("Not Found");
}

QString DisplayText::orUnknown(const QString& text)
{
    return text.isEmpty() ? QStringLiteral("unknown") : text;
}

qint64 DisplayText::deviceBytes(const DeviceData& device, const QString& key)
{
    bool ok = false;
    const qint64 value = device.hardwareValue(key, QString()).toLongLong(&ok, 10);
    return ok && value > 0 ? value : 0;
}

QString DisplayText::deviceSize(const DeviceData& device, const QString& key)
{
    return formatSize(quint64(deviceBytes(device, key)));
}

bool DisplayText::hasFeature(const DeviceData& device, const QString& key)
{
    return device.hardwareValue(key, QString()) == QLatin1String("Yes");
}
