#pragma once

#include <QList>
#include <QPair>
#include <QString>

class QTreeWidget;
class QTreeWidgetItem;
class QXmlStreamWriter;

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

    // One "family" element per top-level item in the tree's order, a "subfamily" element per
    // child, and a "class" element per grandchild carrying the given (attribute, column)
    // pairs in their order.
    static void writeFamilies(QXmlStreamWriter& xml, const QTreeWidget* tree,
                              const QList<QPair<QString, int>>& classAttributes);
};
