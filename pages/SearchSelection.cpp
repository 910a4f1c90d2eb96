#include "SearchSelection.h"

#include <QAbstractItemModel>
#include <QSet>
#include <QTreeWidget>

#include <algorithm>

namespace {

int depth(const QTreeWidgetItem* item)
{
    int levels = 0;
    for (const QTreeWidgetItem* parent = item->parent(); parent; parent = parent->parent())
        ++levels;
    return levels;
}

} // namespace

QVector<QPair<int, int>> matchingCells(const QAbstractItemModel* model, const QString& text)
{
    QVector<QPair<int, int>> cells;
    const int rows = model->rowCount();
    const int columns = model->columnCount();
    for (int row = 0; row < rows; ++row) {
        for (int column = 0; column < columns; ++column) {
            if (model->index(row, column).data().toString().contains(text, Qt::CaseInsensitive))
                cells.append({row, column});
        }
    }
    return cells;
}

QItemSelection compactCellSelection(const QAbstractItemModel* model, QVector<QPair<int, int>> cells)
{
    using Spans = QVector<QPair<int, int>>; // first and last column of each run
    std::sort(cells.begin(), cells.end());

    QItemSelection selection;
    const auto addBlock = [&](int top, int bottom, const Spans& spans) {
        for (const auto& span : spans)
            selection.select(model->index(top, span.first), model->index(bottom, span.second));
    };
    int top = -1;
    int bottom = -1;
    Spans blockSpans;
    for (int i = 0; i < cells.size();) {
        const int row = cells[i].first;
        Spans spans;
        for (; i < cells.size() && cells[i].first == row; ++i) {
            const int column = cells[i].second;
            if (!spans.isEmpty() && spans.last().second + 1 == column)
                spans.last().second = column;
            else
                spans.append({column, column});
        }
        if (top >= 0 && row == bottom + 1 && spans == blockSpans) {
            bottom = row;
            continue;
        }
        if (top >= 0)
            addBlock(top, bottom, blockSpans);
        top = bottom = row;
        blockSpans = spans;
    }
    if (top >= 0)
        addBlock(top, bottom, blockSpans);
    return selection;
}

QItemSelection compactRowSelection(const QTreeWidget* tree, const QVector<QTreeWidgetItem*>& items)
{
    // The view finds an item's row by searching its siblings, which for 20,000 hits among
    // 20,000 siblings is 10^8 comparisons. Instead one walk from the root reads the rows off
    // the children of every item that holds hits, keeping each one's index on the way down.
    const QSet<const QTreeWidgetItem*> hits(items.cbegin(), items.cend());
    QSet<const QTreeWidgetItem*> holders {tree->invisibleRootItem()};
    for (const QTreeWidgetItem* item : items) {
        if (item->treeWidget() != tree)
            continue;
        for (const QTreeWidgetItem* parent = item->parent(); parent && !holders.contains(parent); parent = parent->parent())
            holders.insert(parent);
    }
    const QAbstractItemModel* model = tree->model();
    const int lastColumn = std::max(0, tree->columnCount() - 1);
    QItemSelection selection;
    QVector<QPair<const QTreeWidgetItem*, QModelIndex>> pending {{tree->invisibleRootItem(), QModelIndex()}};
    while (!pending.isEmpty()) {
        const QTreeWidgetItem* parent = pending.last().first;
        const QModelIndex parentIndex = pending.takeLast().second;
        const auto selectRun = [&](int first, int last) {
            selection.select(model->index(first, 0, parentIndex), model->index(last, lastColumn, parentIndex));
        };
        int runStart = -1;
        for (int row = 0; row < parent->childCount(); ++row) {
            const QTreeWidgetItem* child = parent->child(row);
            if (holders.contains(child))
                pending.append({child, model->index(row, 0, parentIndex)});
            if (hits.contains(child) && runStart < 0) {
                runStart = row;
            } else if (!hits.contains(child) && runStart >= 0) {
                selectRun(runStart, row - 1);
                runStart = -1;
            }
        }
        if (runStart >= 0)
            selectRun(runStart, parent->childCount() - 1);
    }
    return selection;
}

void expandWithAncestors(const QVector<QTreeWidgetItem*>& items)
{
    QSet<QTreeWidgetItem*> seen;
    QVector<QPair<int, QTreeWidgetItem*>> toExpand; // depth and item
    for (QTreeWidgetItem* item : items) {
        // A leaf shows nothing more expanded, and the view would keep a persistent index for each.
        QTreeWidgetItem* first = item->childCount() > 0 ? item : item->parent();
        for (QTreeWidgetItem* current = first; current && !seen.contains(current); current = current->parent()) {
            seen.insert(current);
            toExpand.append({depth(current), current});
        }
    }
    std::stable_sort(toExpand.begin(), toExpand.end(),
                     [](const auto& a, const auto& b) { return a.first > b.first; });
    for (const auto& entry : std::as_const(toExpand))
        entry.second->setExpanded(true);
}
