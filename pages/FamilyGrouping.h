#pragma once

#include "FamilyReport.h"

#include <QHash>
#include <QList>
#include <QString>
#include <QVector>

#include <functional>

class QTreeWidget;
class QTreeWidgetItem;

// The shape that the family tree and level pages share: families at the top level (text in
// column 0), sub-families below them (column 1), classes below those, grouped by FamilyRule.
// An instance places the classes of a tree that fills in turns: each turn's items are
// gathered first and join the tree together at flush(), one insertion per parent, so that a
// turn costs time for its own items only. The tree stays in the order its sort gives it.
class FamilyGrouping
{
public:
    static constexpr int FamilyColumn = 0;
    static constexpr int SubFamilyColumn = 1;

    explicit FamilyGrouping(QTreeWidget* tree);

    // Puts classItem (in no tree yet) under its family and sub-family, made when new.
    void place(const QString& family, const QString& subFamily, QTreeWidgetItem* classItem);
    // Inserts what place() gathered: below each parent after its children, new families
    // where the tree's sort would put them.
    void flush();

    // The items of a whole grouping, in no tree: built off the GUI thread, they join a tree
    // in one insertion. classItem makes the item of a class from its texts.
    static QList<QTreeWidgetItem*> items(const FamilyReport::Families& families,
                                         const std::function<QTreeWidgetItem*(const QStringList&)>& classItem);

    // The tree's grouping for its export: the families in the tree's order, each with its
    // sub-families and their classes' texts in the given columns.
    static FamilyReport::Families families(const QTreeWidget* tree, const QList<int>& classColumns);

private:
    struct Family
    {
        QTreeWidgetItem* item;
        QHash<QString, QTreeWidgetItem*> subFamilies; // by FamilyRule::subFamilyKey
    };

    // child goes below parent: at once when parent is in no tree yet, else at flush().
    void attach(QTreeWidgetItem* parent, QTreeWidgetItem* child);
    void insertFamilies();

    QTreeWidget* m_tree;
    QHash<QString, Family> m_families; // by FamilyRule::familyKey
    QVector<QTreeWidgetItem*> m_newFamilies;
    QVector<QTreeWidgetItem*> m_parents; // in the tree, with children waiting, first come first
    QHash<QTreeWidgetItem*, QList<QTreeWidgetItem*>> m_waiting;
};
