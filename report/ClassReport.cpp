#include "ClassReport.h"

#include "DisplayText.h"

QStringList ClassReport::cells(const IdRecord& record)
{
    return {DisplayText::orUnknown(record.name), record.id, DisplayText::orUnknown(record.family), DisplayText::orUnknown(record.subFamily),
            record.available ? QStringLiteral("Yes") : QStringLiteral("No"), record.source};
}

Report ClassReport::build(const QVector<QStringList>& rows, const DeviceData& device)
{
    Report report(QStringLiteral("zant-class-ids"), QStringLiteral("ZTOINFO"), QStringLiteral("ZTOId"));
    report.root()
        .add(QStringLiteral("ZTOVERSION"))
        .set(QStringLiteral("version"), device.zantVersion)
        .set(QStringLiteral("target"), device.targetId)
        .set(QStringLiteral("manufacturer"), device.hardwareValue(QStringLiteral("Manufacturer"), QString()))
        .set(QStringLiteral("model"), device.hardwareValue(QStringLiteral("Model"), QString()));
    report.declare(QStringLiteral("ZTOVERSION"),
                   {{QStringLiteral("version"), ReportField::Text, QString()},
                    {QStringLiteral("target"), ReportField::Text, QString()},
                    {QStringLiteral("manufacturer"), ReportField::Text, QString()},
                    {QStringLiteral("model"), ReportField::Text, QString()}});
    report.declare(QStringLiteral("ZTOId"),
                   {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Class Name")},
                    {QStringLiteral("value"), ReportField::Id, QStringLiteral("Class ID")},
                    {QStringLiteral("family"), ReportField::Text, QStringLiteral("Family")},
                    {QStringLiteral("subfamily"), ReportField::Text, QStringLiteral("Sub-family")},
                    {QStringLiteral("available"), ReportField::Boolean, QStringLiteral("Available"), false},
                    {QStringLiteral("path"), ReportField::Text, QStringLiteral("Path")}});
    ReportNode& list = report.root().add(QStringLiteral("ZantHeaderDataList"));
    list.children.reserve(rows.size());
    for (const QStringList& cell : rows) {
        list.add(QStringLiteral("ZTOId"))
            .set(QStringLiteral("path"), cell.at(PathColumn))
            .set(QStringLiteral("subfamily"), cell.at(SubFamilyColumn))
            .set(QStringLiteral("family"), cell.at(FamilyColumn))
            .set(QStringLiteral("value"), cell.at(IdColumn))
            .set(QStringLiteral("name"), cell.at(NameColumn))
            .set(QStringLiteral("available"), cell.at(AvailableColumn));
    }
    return report;
}
