#include "FamilyReport.h"

#include "ClassReport.h"
#include "DisplayText.h"
#include "FamilyRule.h"

#include <QHash>

#include <algorithm>

namespace {

// The family, sub-family and class elements' fields, with the page's column titles.
void declareFamilies(Report& report, const QString& subFamilyTitle, bool withResult)
{
    report.declare(QStringLiteral("family"), {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Family")}});
    report.declare(QStringLiteral("subfamily"), {{QStringLiteral("name"), ReportField::Text, subFamilyTitle}});
    QVector<ReportField> classFields {{QStringLiteral("name"), ReportField::Text, QStringLiteral("Class Name")},
                                      {QStringLiteral("classid"), ReportField::Id, QStringLiteral("Class ID")}};
    if (withResult)
        classFields.append({QStringLiteral("available"), ReportField::Boolean, QStringLiteral("Result")});
    report.declare(QStringLiteral("class"), classFields);
}

void addFamilies(ReportNode& parent, const FamilyReport::Families& families, const QStringList& classAttributes)
{
    for (const FamilyReport::Family& family : families) {
        ReportNode& familyNode = parent.add(QStringLiteral("family")).set(QStringLiteral("name"), family.name);
        for (const FamilyReport::SubFamily& subFamily : family.subFamilies) {
            ReportNode& subFamilyNode = familyNode.add(QStringLiteral("subfamily")).set(QStringLiteral("name"), subFamily.name);
            for (const QStringList& cells : subFamily.classes) {
                ReportNode& classNode = subFamilyNode.add(QStringLiteral("class"));
                for (int column = 0; column < classAttributes.size(); ++column)
                    classNode.set(classAttributes.at(column), cells.value(column));
            }
        }
    }
}

} // namespace

QVector<IdRecord> FamilyReport::availableClasses(const IdRecordMap& classes)
{
    QVector<IdRecord> shown;
    for (const IdRecord& known : classes) {
        if (!known.available)
            continue;
        IdRecord record = known;
        record.name = DisplayText::orUnknown(record.name);
        record.family = DisplayText::orUnknown(record.family);
        record.subFamily = DisplayText::orUnknown(record.subFamily);
        shown.append(record);
    }
    return shown;
}

FamilyReport::Families FamilyReport::group(const QVector<IdRecord>& records,
                                           const std::function<QStringList(const IdRecord&)>& cells)
{
    Families families;
    // Where each family and sub-family went, by their keys: a level of 40,000 classes is
    // grouped in one pass instead of a search through the families for each class.
    QHash<QString, int> familyAt;
    QVector<QHash<QString, int>> subFamilyAt;
    for (const IdRecord& record : records) {
        const QString familyKey = FamilyRule::familyKey(record.family);
        auto family = familyAt.constFind(familyKey);
        if (family == familyAt.cend()) {
            family = familyAt.insert(familyKey, int(families.size()));
            families.append(Family{record.family, {}});
            subFamilyAt.append(QHash<QString, int>());
        }
        Family& into = families[*family];
        QHash<QString, int>& subFamilies = subFamilyAt[*family];
        const QString subFamilyKey = FamilyRule::subFamilyKey(record.subFamily);
        auto subFamily = subFamilies.constFind(subFamilyKey);
        if (subFamily == subFamilies.cend()) {
            subFamily = subFamilies.insert(subFamilyKey, int(into.subFamilies.size()));
            into.subFamilies.append(SubFamily{record.subFamily, {}});
        }
        into.subFamilies[*subFamily].classes.append(cells(record));
    }
    std::stable_sort(families.begin(), families.end(), [](const Family& a, const Family& b) {
        return QString::compare(a.name, b.name, Qt::CaseInsensitive) < 0;
    });
    return families;
}

QStringList FamilyReport::treeCells(const IdRecord& record)
{
    return {record.name, record.id};
}

Report FamilyReport::familyTree(const Families& families, const DeviceData& device)
{
    Report report(QStringLiteral("familyTree"), QStringLiteral("deviceTree"), QStringLiteral("class"));
    report.root()
        .set(QStringLiteral("device"), device.targetId)
        .set(QStringLiteral("manufacturer"), device.hardwareValue(QStringLiteral("Manufacturer"), QString()));
    declareFamilies(report, QStringLiteral("Sub-Family"), false);
    addFamilies(report.root(), families, {QStringLiteral("name"), QStringLiteral("classid")});
    return report;
}

Report FamilyReport::levelReport(const Families& families)
{
    Report report(QStringLiteral("levelreport"), QStringLiteral("device"), QStringLiteral("class"));
    declareFamilies(report, QStringLiteral("Subfamily"), true);
    addFamilies(report.root(), families, {QStringLiteral("name"), QStringLiteral("classid"), QStringLiteral("available")});
    return report;
}
