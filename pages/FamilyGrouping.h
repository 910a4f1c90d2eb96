#pragma once

#include "FamilyReport.h"

#include <QList>
#include <QString>

class QTreeWidget;
class QTreeWidgetItem;

// The shape that the family tree and level pages share: families at the top level (text in
// column 0), sub-families below them (column 1), classes below those.
class FamilyGrouping
{
public:
    static constexpr int FamilyColumn = 0;
    static constexpr int SubFamilyColumn = 1;

    // The first family whose text equals family without regard to letter case; null if none.
    static QTreeWidgetItem* findFamily(const QTreeWidget* tree, const QString& family);
    // The first sub-family of family whose text equals subFamily exactly; null if none.
    static QTreeWidgetItem* findSubFamily(const QTreeWidgetItem* family, const QString& subFamily);
    // A new sub-family below family.
    static QTreeWidgetItem* addSubFamily(QTreeWidgetItem* family, const QString& subFamily);

    // The tree's grouping for its export: the families in the tree's order, each with its
    // sub-families and their classes' texts in the given columns.
    static FamilyReport::Families families(const QTreeWidget* tree, const QList<int>& classColumns);
};
