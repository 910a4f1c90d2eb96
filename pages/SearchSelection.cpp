#include "SearchSelection.h"

#include <QAbstractItemModel>
#include <QSet>
#include <QTreeWidget>

#include <algorithm>
#include <functional>

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
    struct Row
    {
        const QTreeWidgetItem* parent;
        int row;
        QTreeWidgetItem* item;
    };
    QVector<Row> rows;
    rows.reserve(items.size());
    for (QTreeWidgetItem* item : items) {
        const QModelIndex index = tree->indexFromItem(item);
        if (index.isValid())
            rows.append({item->parent(), index.row(), item});
    }
    std::sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) {
        if (a.parent != b.parent)
            return std::less<const QTreeWidgetItem*>()(a.parent, b.parent);
        return a.row < b.row;
    });

    const int lastColumn = std::max(0, tree->columnCount() - 1);
    QItemSelection selection;
    for (int first = 0; first < rows.size();) {
        int last = first;
        while (last + 1 < rows.size() && rows[last + 1].parent == rows[first].parent && rows[last + 1].row == rows[last].row + 1)
            ++last;
        selection.select(tree->indexFromItem(rows[first].item, 0), tree->indexFromItem(rows[last].item, lastColumn));
        first = last + 1;
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
