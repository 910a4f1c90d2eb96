#include "GatewayComponentWidget.h"

#include "Portlex.h"
#include "SearchSelection.h"

#include <QApplication>
#include <QItemSelectionModel>
#include <QMutexLocker>
#include <QSet>
#include <QTableView>
#include <QTreeWidget>
#include <QVector>

namespace {

// Shows the wait cursor for as long as it lives.
class WaitCursor
{
public:
    WaitCursor() { QApplication::setOverrideCursor(Qt::WaitCursor); }
    ~WaitCursor() { QApplication::restoreOverrideCursor(); }
    WaitCursor(const WaitCursor&) = delete;
    WaitCursor& operator=(const WaitCursor&) = delete;
};

void collectMatches(GatewayComponentWidget* page, const QString& text, QTreeWidgetItem* item, QVector<QTreeWidgetItem*>& hits)
{
    if (page->itemMatches(text, item))
        hits.append(item);
    for (int i = 0; i < item->childCount(); ++i)
        collectMatches(page, text, item->child(i), hits);
}

} // namespace

GatewayComponentWidget::GatewayComponentWidget(QWidget* parent)
    : QWidget(parent)
{
    Portlex::Ref();
}

GatewayComponentWidget::~GatewayComponentWidget()
{
    Portlex::Deref();
}

GatewayComponentWidget::ComponentState GatewayComponentWidget::state() const
{
    QMutexLocker lock(&m_statusLock);
    return m_state;
}

QString GatewayComponentWidget::status() const
{
    QMutexLocker lock(&m_statusLock);
    return m_status;
}

QString GatewayComponentWidget::searchText() const
{
    return m_searchText;
}

void GatewayComponentWidget::setState(ComponentState state)
{
    {
        QMutexLocker lock(&m_statusLock);
        if (m_state == state)
            return;
        m_state = state;
    }
    // Emitted outside the lock: a receiver on this thread may read the state back.
    emit stateChanged(state);
}

void GatewayComponentWidget::setStatus(const QString& status)
{
    {
        QMutexLocker lock(&m_statusLock);
        if (m_status == status)
            return;
        m_status = status;
    }
    emit statusChanged(status);
}

bool GatewayComponentWidget::isComplete()
{
    return state() == Complete;
}

bool GatewayComponentWidget::refresh()
{
    return false;
}

QString GatewayComponentWidget::errorStatus(int result)
{
    return QStringLiteral("Error: ") + QString::number(result);
}

QString GatewayComponentWidget::readyStatus()
{
    return QStringLiteral("Ready");
}

void GatewayComponentWidget::reportNotFound()
{
    emit timedStatusChanged(QLatin1Char('"') + m_searchText + QStringLiteral("\" not found."));
}

void GatewayComponentWidget::deselectTableHits()
{
    if (m_tableTarget) {
        // The selection is rebuilt without the hits in one change: deselecting range by
        // range costs time quadratic in the number of ranges.
        const QModelIndexList hitCells = m_tableHits.indexes();
        const QSet<QModelIndex> hits(hitCells.cbegin(), hitCells.cend());
        QItemSelectionModel* selectionModel = m_tableTarget->selectionModel();
        QItemSelection kept;
        for (const QModelIndex& index : selectionModel->selectedIndexes()) {
            if (!hits.contains(index))
                kept.select(index, index);
        }
        selectionModel->select(kept, QItemSelectionModel::ClearAndSelect);
    }
    m_tableHits.clear();
}

void GatewayComponentWidget::searchTable(const QString& text, QTableView* table)
{
    WaitCursor wait;
    if (m_tableTarget) {
        m_tableTarget->setUpdatesEnabled(false);
        deselectTableHits();
        m_tableTarget->setUpdatesEnabled(true);
        m_tableTarget = nullptr;
    }

    m_searchText = text;
    m_tableTarget = table;
    if (!table || !table->model())
        return;

    // The model's texts are searched, not the view; the view then hides and shows rows with
    // updates off, since with them on every row costs a relayout of the table.
    const QVector<QPair<int, int>> cells = matchingCells(table->model(), text);
    const int rows = table->model()->rowCount();
    table->setUpdatesEnabled(false);
    QVector<bool> hit(rows, false);
    for (const auto& cell : cells)
        hit[cell.first] = true;
    for (int row = 0; row < rows; ++row) {
        if (table->isRowHidden(row) == hit.at(row))
            table->setRowHidden(row, !hit.at(row));
    }
    if (cells.isEmpty()) {
        table->setUpdatesEnabled(true);
        reportNotFound();
        return;
    }
    m_tableHits = compactCellSelection(table->model(), cells);
    table->selectionModel()->select(m_tableHits, QItemSelectionModel::Select);
    table->scrollTo(table->model()->index(cells.first().first, cells.first().second));
    table->setUpdatesEnabled(true);
}

void GatewayComponentWidget::clearTableSearch()
{
    m_searchText.clear();
    if (!m_tableTarget)
        return;

    WaitCursor wait;
    QTableView* table = m_tableTarget;
    table->setUpdatesEnabled(false);
    deselectTableHits();
    const int rows = table->model() ? table->model()->rowCount() : 0;
    for (int row = 0; row < rows; ++row) {
        if (table->isRowHidden(row))
            table->showRow(row);
    }
    table->setUpdatesEnabled(true);
    m_tableTarget = nullptr;
}

void GatewayComponentWidget::searchTree(const QString& text, QTreeWidget* tree)
{
    m_searchText = text;
    m_treeTarget = tree;
    if (!tree)
        return;
    tree->clearSelection();
    tree->collapseAll();

    WaitCursor wait;
    QVector<QTreeWidgetItem*> hits;
    for (int i = 0; i < tree->topLevelItemCount(); ++i)
        collectMatches(this, text, tree->topLevelItem(i), hits);

    if (hits.isEmpty()) {
        reportNotFound();
        return;
    }

    // With updates off the view skips working out the repaint region of every change.
    tree->setUpdatesEnabled(false);
    expandWithAncestors(hits);
    tree->selectionModel()->select(compactRowSelection(tree, hits), QItemSelectionModel::Select);
    for (int column = 0; column < tree->columnCount(); ++column)
        tree->resizeColumnToContents(column);
    // Hits are collected in the tree's order: the first is the topmost.
    tree->scrollToItem(hits.first());
    tree->setUpdatesEnabled(true);
}

void GatewayComponentWidget::clearTreeSearch()
{
    if (m_treeTarget) {
        m_treeTarget->clearSelection();
        m_treeTarget->collapseAll();
        m_treeTarget = nullptr;
    }
    m_searchText.clear();
}

bool GatewayComponentWidget::itemMatches(const QString& text, QTreeWidgetItem* item)
{
    if (!item)
        return false;
    for (int column = 0; column < item->columnCount(); ++column) {
        if (item->text(column).contains(text, Qt::CaseInsensitive))
            return true;
    }
    return false;
}

bool GatewayComponentWidget::applyTableSearch(const QString& text, QTableView* table)
{
    if (text.length() >= MinimumSearchLength)
        searchTable(text, table);
    else
        clearTableSearch();
    return true;
}

bool GatewayComponentWidget::applyTreeSearch(const QString& text, QTreeWidget* tree)
{
    if (text.length() < MinimumSearchLength) {
        clearTreeSearch();
        return false;
    }
    searchTree(text, tree);
    return true;
}
