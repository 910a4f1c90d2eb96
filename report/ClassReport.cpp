#include "ClassReport.h"

QString ClassReport::orUnknown(const QString& text)
{
    return text.isEmpty() ? QStringLiteral("unknown") : text;
}

QStringList ClassReport::cells(const IdRecord& record)
{
    return {orUnknown(record.name), record.id, orUnknown(record.family), orUnknown(record.subFamily),
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
    ReportNode& list = report.root().add(QStringLiteral("ZantHeaderDataList"));
    list.children.reserve(rows.size());
    for (const QStringList& cell : rows) {
        list.add(QStringLiteral("ZTOId"))
            .set(QStringLiteral("path"), cell.at(PathColumn))
            .set(QStringLiteral("subfamily"), cell.at(SubFamilyColumn))
            .set(QStringLiteral("family"), cell.at(FamilyColumn))
            .set(QStringLiteral("value"), cell.at(IdColumn))
            .set(QStringLiteral("name"), cell.at(NameColumn));
    }
    return report;
}
