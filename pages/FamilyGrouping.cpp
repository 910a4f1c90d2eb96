#include "FamilyGrouping.h"

#include "CITreeWidgetItem.h"

#include <QTreeWidget>

QTreeWidgetItem* FamilyGrouping::findFamily(const QTreeWidget* tree, const QString& family)
{
    return tree->findItems(family, Qt::MatchFixedString, FamilyColumn).value(0);
}

QTreeWidgetItem* FamilyGrouping::findSubFamily(const QTreeWidgetItem* family, const QString& subFamily)
{
    for (int i = 0; i < family->childCount(); ++i) {
        if (family->child(i)->text(SubFamilyColumn) == subFamily)
            return family->child(i);
    }
    return nullptr;
}

QTreeWidgetItem* FamilyGrouping::addSubFamily(QTreeWidgetItem* family, const QString& subFamily)
{
    auto* item = new CITreeWidgetItem;
    item->setText(SubFamilyColumn, subFamily);
    family->addChild(item);
    return item;
}

FamilyReport::Families FamilyGrouping::families(const QTreeWidget* tree, const QList<int>& classColumns)
{
    FamilyReport::Families families;
    families.reserve(tree->topLevelItemCount());
    for (int f = 0; f < tree->topLevelItemCount(); ++f) {
        const QTreeWidgetItem* familyItem = tree->topLevelItem(f);
        FamilyReport::Family& family = families.emplace_back(FamilyReport::Family{familyItem->text(FamilyColumn), {}});
        for (int s = 0; s < familyItem->childCount(); ++s) {
            const QTreeWidgetItem* subFamilyItem = familyItem->child(s);
            FamilyReport::SubFamily& subFamily =
                family.subFamilies.emplace_back(FamilyReport::SubFamily{subFamilyItem->text(SubFamilyColumn), {}});
            for (int c = 0; c < subFamilyItem->childCount(); ++c) {
                QStringList cells;
                for (const int column : classColumns)
                    cells.append(subFamilyItem->child(c)->text(column));
                subFamily.classes.append(cells);
            }
        }
    }
    return families;
}
