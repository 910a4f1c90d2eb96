#include "FormatSize.h"

QString formatSize(quint64 bytes)
{
    constexpr quint64 KiB = 1024;
    constexpr quint64 MiB = KiB * 1024;
    constexpr quint64 GiB = MiB * 1024;

    if (bytes < 9999)
        return QString::number(bytes) + QStringLiteral(" bytes");

    const auto scaled = [bytes](quint64 scale, QLatin1String unit) {
        return QStringLiteral("%1 %2").arg(double(bytes) / double(scale), 3, 'f', 2).arg(unit);
    };
    if (bytes < MiB)
        return scaled(KiB, QLatin1String("kB"));
    if (bytes < GiB)
        return scaled(MiB, QLatin1String("MB"));
    return scaled(GiB, QLatin1String("GB"));
}
