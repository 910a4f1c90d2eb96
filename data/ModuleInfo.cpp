#include "ModuleInfo.h"

#include <QStringList>

QString ModuleInfo::GetModuleProperty() const
{
    static const struct
    {
        quint32 bit;
        const char* text;
    } names[] = {
        { Application, "Application" },
        { Library, "Library" },
        { Extension, "Extension" },
        { System, "System" },
        { Preinstalled, "Preinstalled" },
    };
    QStringList parts;
    quint32 known = 0;
    for (const auto& n : names) {
        known |= n.bit;
        if (type & n.bit)
            parts << QString::fromLatin1(n.text);
    }
    if (type & ~known)
        parts << QStringLiteral("0x%1").arg(type & ~known, 0, 16);
    return parts.isEmpty() ? QStringLiteral("None") : parts.join(QStringLiteral(" | "));
}

QString ModuleInfo::GetModuleSig() const
{
    switch (signature) {
    case Unsigned:
        return QStringLiteral("Unsigned");
    case TestSigned:
        return QStringLiteral("Test Signed");
    case DeveloperSigned:
        return QStringLiteral("Developer Signed");
    case MakerSigned:
        return QStringLiteral("Maker Signed");
    case SignatureInvalid:
        return QStringLiteral("Invalid Signature");
    }
    return QStringLiteral("Unknown (%1)").arg(signature);
}
