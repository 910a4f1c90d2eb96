#pragma once

#include <QItemSelection>
#include <QPair>
#include <QVector>

class QAbstractItemModel;
class QTreeWidget;
class QTreeWidgetItem;

// Helpers of the page search that keep large result sets fast. Item views take time that
// grows with the number of selection ranges times the rows (header highlighting, row
// lookups), so hits are selected as few rectangles, in one change.

// The (row, column) cells of a table model whose display text contains text, without regard
// to letter case, row by row.
QVector<QPair<int, int>> matchingCells(const QAbstractItemModel* model, const QString& text);

// (row, column) cells as runs of adjacent columns within a row, joined over adjacent rows
// that have the same runs.
QItemSelection compactCellSelection(const QAbstractItemModel* model, QVector<QPair<int, int>> cells);

// Whole rows of the tree items, adjacent siblings joined into one range.
QItemSelection compactRowSelection(const QTreeWidget* tree, const QVector<QTreeWidgetItem*>& items);

// Expands the items that have children and every ancestor of the items. Deepest first, so that each item is
// expanded while its parent is still collapsed: expanding a visible item costs a relayout.
void expandWithAncestors(const QVector<QTreeWidgetItem*>& items);
