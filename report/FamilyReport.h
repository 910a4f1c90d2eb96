#pragma once

#include "DeviceData.h"
#include "IdRecord.h"
#include "Report.h"

#include <QStringList>
#include <QVector>

#include <functional>

// Classes grouped as the family tree and level pages show them: families, sub-families
// below them, the classes' texts below those. Builds the "familyTree" and "levelreport"
// documents from such a grouping.
class FamilyReport
{
public:
    // A class's texts: its name, its id and, in a level check, its result.
    enum ClassColumn
    {
        NameColumn,
        IdColumn,
        ResultColumn
    };

    struct SubFamily
    {
        QString name;
        QVector<QStringList> classes;
    };
    struct Family
    {
        QString name;
        QVector<SubFamily> subFamilies;
    };
    using Families = QVector<Family>;

    // The classes the family tree shows: the available ones in the map's order, missing
    // names given as "unknown".
    static QVector<IdRecord> availableClasses(const IdRecordMap& classes);

    // Families matched without regard to letter case, sub-families exactly, each in the
    // order they first appear, classes in the records' order; then the families sorted as
    // a tree sorts them, equal ones keeping their order.
    static Families group(const QVector<IdRecord>& records, const std::function<QStringList(const IdRecord&)>& cells);
    // Name and id of a class on the family tree.
    static QStringList treeCells(const IdRecord& record);

    static Report familyTree(const Families& families, const DeviceData& device);
    static Report levelReport(const Families& families);
};
