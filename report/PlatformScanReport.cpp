#include "PlatformScanReport.h"

#include "NameLibrary.h"

QStringList PlatformScanReport::cells(quint32 id, const QString& path)
{
    QString idText, name, family, subFamily;
    lookupClass(id, idText, name, family, subFamily);
    return {name, idText, family, subFamily, path};
}

QVector<QStringList> PlatformScanReport::rows(const std::vector<MifEntry>& entries)
{
    QVector<QStringList> rows;
    for (const MifEntry& entry : entries) {
        for (const quint32 id : entry.classes)
            rows.append(cells(id, entry.filePath));
    }
    return rows;
}

Report PlatformScanReport::build(const QVector<QStringList>& rows)
{
    Report report(QStringLiteral("platform-scan"), QStringLiteral("ZTOINFO"), QStringLiteral("ZTOId"));
    ReportNode& root = report.root();
    root.add(QStringLiteral("ZTOVERSION")).set(QStringLiteral("version"), QString());
    ReportNode& classes = root.add(QStringLiteral("ZantHeaderDataList"));
    classes.children.reserve(rows.size());
    for (const QStringList& cell : rows) {
        classes.add(QStringLiteral("ZTOId"))
            .set(QStringLiteral("name"), cell.at(NameColumn))
            .set(QStringLiteral("value"), cell.at(IdColumn))
            .set(QStringLiteral("family"), cell.at(FamilyColumn))
            .set(QStringLiteral("subfamily"), cell.at(SubFamilyColumn));
    }
    return report;
}
