#include "RegistryReport.h"

#include "DisplayText.h"

QStringList RegistryReport::cells(const RegistryInfo& entry)
{
    return {QString::number(entry.baseClassId), QString::number(entry.handlerClassId), DisplayText::registryFlags(entry), entry.mimeType};
}

Report RegistryReport::build(const QVector<QStringList>& rows)
{
    Report report(QStringLiteral("registrylist"), QStringLiteral("entries"), QStringLiteral("entry"));
    report.declare(QStringLiteral("entry"),
                   {{QStringLiteral("class-type"), ReportField::Integer, QStringLiteral("Class Type")},
                    {QStringLiteral("class-handler"), ReportField::Integer, QStringLiteral("Class Handler")},
                    {QStringLiteral("flags"), ReportField::Flags, QStringLiteral("Flags")},
                    {QStringLiteral("mime-type"), ReportField::Text, QStringLiteral("Mime Type")}});
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
