#include "RegistryReport.h"

QString RegistryReport::flagsText(const RegistryInfo& entry)
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

QStringList RegistryReport::cells(const RegistryInfo& entry)
{
    return {QString::number(entry.baseClassId), QString::number(entry.handlerClassId), flagsText(entry), entry.mimeType};
}

Report RegistryReport::build(const QVector<QStringList>& rows)
{
    Report report(QStringLiteral("registrylist"), QStringLiteral("entries"), QStringLiteral("entry"));
    ReportNode& entries = report.root();
    entries.children.reserve(rows.size());
    for (const QStringList& cell : rows) {
        entries.add(QStringLiteral("entry"))
            .set(QStringLiteral("mime-type"), cell.at(MimeTypeColumn))
            .set(QStringLiteral("flags"), cell.at(FlagsColumn))
            .set(QStringLiteral("class-handler"), cell.at(ClassHandlerColumn))
            .set(QStringLiteral("class-type"), cell.at(ClassTypeColumn));
    }
    return report;
}
