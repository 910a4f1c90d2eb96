#include "FamilyGrouping.h"

#include "CITreeWidgetItem.h"
#include "FamilyRule.h"

#include <QTreeWidget>

#include <algorithm>

namespace {

QTreeWidgetItem* newGroup(int column, const QString& text)
{
    auto* item = new CITreeWidgetItem;
    item->setText(column, text);
    return item;
}

} // namespace

FamilyGrouping::FamilyGrouping(QTreeWidget* tree)
    : m_tree(tree)
{
}

void FamilyGrouping::place(const QString& family, const QString& subFamily, QTreeWidgetItem* classItem)
{
    const QString familyKey = FamilyRule::familyKey(family);
    auto known = m_families.find(familyKey);
    if (known == m_families.end()) {
        known = m_families.insert(familyKey, Family{newGroup(FamilyColumn, family), {}});
        m_newFamilies.append(known->item);
    }
    const QString subFamilyKey = FamilyRule::subFamilyKey(subFamily);
    QTreeWidgetItem*& subFamilyItem = known->subFamilies[subFamilyKey];
    if (!subFamilyItem) {
        subFamilyItem = newGroup(SubFamilyColumn, subFamily);
        attach(known->item, subFamilyItem);
    }
    attach(subFamilyItem, classItem);
}

void FamilyGrouping::attach(QTreeWidgetItem* parent, QTreeWidgetItem* child)
{
    if (!parent->treeWidget()) {
        parent->addChild(child);
        return;
    }
    QList<QTreeWidgetItem*>& waiting = m_waiting[parent];
    if (waiting.isEmpty())
        m_parents.append(parent);
    waiting.append(child);
}

void FamilyGrouping::flush()
{
    for (QTreeWidgetItem* parent : std::as_const(m_parents))
        parent->addChildren(m_waiting.value(parent));
    m_parents.clear();
    m_waiting.clear();
    insertFamilies();
}

// Each new family goes after every family that does not sort after it, as the tree's own
// (stable) sort would put it; new families bound for one place go in together.
void FamilyGrouping::insertFamilies()
{
    if (m_newFamilies.isEmpty())
        return;
    const auto before = [](const QTreeWidgetItem* a, const QTreeWidgetItem* b) { return *a < *b; };
    std::stable_sort(m_newFamilies.begin(), m_newFamilies.end(), before);
    QVector<QTreeWidgetItem*> shown;
    shown.reserve(m_tree->topLevelItemCount());
    for (int i = 0; i < m_tree->topLevelItemCount(); ++i)
        shown.append(m_tree->topLevelItem(i));
    // From the last place to the first, so that the places still to fill keep their rows.
    for (auto end = m_newFamilies.end(); end != m_newFamilies.begin();) {
        const int place = int(std::upper_bound(shown.cbegin(), shown.cend(), *(end - 1), before) - shown.cbegin());
        auto first = end - 1;
        while (first != m_newFamilies.begin()
               && std::upper_bound(shown.cbegin(), shown.cend(), *(first - 1), before) - shown.cbegin() == place)
            --first;
        m_tree->insertTopLevelItems(place, QList<QTreeWidgetItem*>(first, end));
        end = first;
    }
    m_newFamilies.clear();
}

QList<QTreeWidgetItem*> FamilyGrouping::items(const FamilyReport::Families& families,
                                              const std::function<QTreeWidgetItem*(const QStringList&)>& classItem)
{
    QList<QTreeWidgetItem*> items;
    items.reserve(families.size());
    for (const FamilyReport::Family& family : families) {
        QTreeWidgetItem* familyItem = items.emplace_back(newGroup(FamilyColumn, family.name));
        for (const FamilyReport::SubFamily& subFamily : family.subFamilies) {
            QTreeWidgetItem* subFamilyItem = newGroup(SubFamilyColumn, subFamily.name);
            QList<QTreeWidgetItem*> classes;
            classes.reserve(subFamily.classes.size());
            for (const QStringList& cells : subFamily.classes)
                classes.append(classItem(cells));
            subFamilyItem->addChildren(classes);
            familyItem->addChild(subFamilyItem);
        }
    }
    return items;
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
