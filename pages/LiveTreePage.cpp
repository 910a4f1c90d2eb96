#include "LiveTreePage.h"

#include "PageWorkerThread.h"
#include "Portlex.h"

#include <QSignalBlocker>

namespace {

constexpr int ProcessColumnWidth = 200;

enum class Aged
{
    Kept,
    Removed
};

// One tick of one row's life: a new row turns shown, a gone row is due for removal, after
// AgingTicks ticks. pending is set while the row is still counting.
Aged ageRow(QTreeWidgetItem* row, int column, bool& pending)
{
    const int state = row->data(0, LiveTreePage::StateRole).toInt();
    if (state != LiveTreePage::New && state != LiveTreePage::Gone)
        return Aged::Kept;
    const int age = row->data(0, LiveTreePage::AgeRole).toInt() + 1;
    if (age <= LiveTreePage::AgingTicks) {
        row->setData(0, LiveTreePage::AgeRole, age);
        pending = true;
        return Aged::Kept;
    }
    if (state == LiveTreePage::Gone)
        return Aged::Removed;
    row->setData(0, LiveTreePage::StateRole, LiveTreePage::Shown);
    row->setForeground(column, QBrush(Qt::black));
    return Aged::Kept;
}

void startLife(QTreeWidgetItem* row, quint32 id, int column)
{
    row->setData(0, LiveTreePage::IdRole, id);
    row->setData(0, LiveTreePage::StateRole, LiveTreePage::New);
    row->setData(0, LiveTreePage::AgeRole, 0);
    row->setForeground(column, QBrush(Qt::darkGreen));
}

} // namespace

LiveTreePage::LiveTreePage(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    connect(&m_pacer, &TickPacer::timeout, this, &LiveTreePage::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& LiveTreePage::pacer() const
{
    return m_pacer;
}

bool LiveTreePage::isPolling() const
{
    return m_worker.isRunning();
}

void LiveTreePage::setTree(QTreeWidget* tree, int processIdColumn)
{
    m_tree = tree;
    m_processIdColumn = processIdColumn;
    m_tree->sortByColumn(ProcessColumn, Qt::AscendingOrder);
    // Wide enough for a process name beside the branch marks.
    m_tree->setColumnWidth(ProcessColumn, ProcessColumnWidth);
}

void LiveTreePage::startComponent(const QString& deviceId)
{
    if (m_device)
        return;
    m_device = Portlex::GetDevice(deviceId);
    if (!m_device) {
        setStatus(QStringLiteral("Device not found"));
        return;
    }
    if (m_worker.exists())
        return;
    m_worker.start(createWorker(m_device), QThread::HighPriority);
    m_pacer.armExtra(StartTickMs);
}

bool LiveTreePage::canSearch()
{
    return false;
}

bool LiveTreePage::search(const QString&)
{
    return false;
}

void LiveTreePage::raisePriority()
{
    m_worker.setPriority(QThread::HighPriority);
}

void LiveTreePage::lowerPriority()
{
    m_worker.setPriority(QThread::LowPriority);
}

QString LiveTreePage::xmlReport()
{
    return QString();
}

void LiveTreePage::onTimeElapse()
{
    const Poll poll = mergeSnapshot();
    if (poll == Poll::Merged)
        m_agingPending = true;
    // "Ready" says the tree shows the device's list: not before the device has answered,
    // and not over the error of a failed poll.
    else if (poll == Poll::Unchanged && state() != Failed) {
        setStatus(readyStatus());
        setState(Complete);
    }
    if (m_agingPending)
        m_agingPending = ageRows();
    if (poll == Poll::Merged)
        m_pacer.armBusy(MergeTickMs);
    else
        m_pacer.armIdle();
}

quint32 LiveTreePage::rowId(const QTreeWidgetItem* row)
{
    return row->data(0, IdRole).toUInt();
}

QVector<QTreeWidgetItem*> LiveTreePage::childRows(const QTreeWidgetItem* row)
{
    QVector<QTreeWidgetItem*> rows;
    rows.reserve(row->childCount());
    for (int i = 0; i < row->childCount(); ++i)
        rows.append(row->child(i));
    return rows;
}

QVector<QTreeWidgetItem*> LiveTreePage::topLevelRows() const
{
    QVector<QTreeWidgetItem*> rows;
    rows.reserve(m_tree->topLevelItemCount());
    for (int i = 0; i < m_tree->topLevelItemCount(); ++i)
        rows.append(m_tree->topLevelItem(i));
    return rows;
}

QTreeWidgetItem* LiveTreePage::newProcessRow(const QString& name, quint32 id)
{
    auto* row = new CITreeWidgetItem(ProcessType);
    row->setText(ProcessColumn, name);
    if (m_processIdColumn >= 0)
        row->setText(m_processIdColumn, QString::number(id));
    startLife(row, id, ProcessColumn);
    m_counting.append(row);
    return row;
}

QTreeWidgetItem* LiveTreePage::newEntryRow(quint32 id)
{
    auto* row = new CITreeWidgetItem(EntryType);
    // Said outright, it spares the view a look for children at every layout of the tree.
    row->setFlags(row->flags() | Qt::ItemNeverHasChildren);
    startLife(row, id, EntryColumn);
    m_counting.append(row);
    return row;
}

// The row arrives with its entries: one insertion for the view to handle.
void LiveTreePage::addProcessRow(QTreeWidgetItem* row)
{
    m_tree->addTopLevelItem(row);
    row->setExpanded(true);
}

void LiveTreePage::markGone(QTreeWidgetItem* row, int column)
{
    if (row->data(0, StateRole).toInt() == Gone)
        return;
    // As in the aging pass: the tick repaints the tree once.
    const QSignalBlocker quiet(row->treeWidget()->model());
    if (row->data(0, StateRole).toInt() == Shown)
        m_counting.append(row);
    row->setData(0, AgeRole, 0);
    row->setData(0, StateRole, Gone);
    // A gone process keeps its colour; a gone entry turns red.
    if (column == EntryColumn)
        row->setForeground(column, QBrush(Qt::red));
}

void LiveTreePage::markListed(QTreeWidgetItem* row, int column)
{
    if (row->data(0, StateRole).toInt() != Gone)
        return;
    const QSignalBlocker quiet(row->treeWidget()->model());
    // Still in the counting list: the next aging pass drops it, as it does any shown row.
    row->setData(0, StateRole, Shown);
    row->setData(0, AgeRole, 0);
    if (column == EntryColumn)
        row->setForeground(column, QBrush(Qt::black));
}

bool LiveTreePage::ageRows()
{
    QVector<QTreeWidgetItem*> counting;
    QVector<QTreeWidgetItem*> removals;
    {
        // A row's state, age and colour do not move it in the sort; unannounced, they spare
        // the view a search for every changed row, and it repaints once instead.
        const QSignalBlocker quiet(m_tree->model());
        for (QTreeWidgetItem* row : std::as_const(m_counting)) {
            bool pending = false;
            if (ageRow(row, row->type() == ProcessType ? ProcessColumn : EntryColumn, pending) == Aged::Removed)
                removals.append(row);
            else if (pending)
                counting.append(row);
        }
    }
    // A removed process takes its entries with it.
    const QSet<QTreeWidgetItem*> removed(removals.cbegin(), removals.cend());
    const auto goesWithParent = [&removed](QTreeWidgetItem* row) { return row->parent() && removed.contains(row->parent()); };
    counting.removeIf(goesWithParent);
    removals.removeIf(goesWithParent);
    qDeleteAll(removals);
    m_counting = counting;
    m_tree->viewport()->update();
    return !m_counting.isEmpty();
}
