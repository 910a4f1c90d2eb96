#include "LiveTreePage.h"

#include "PageWorkerThread.h"
#include "Portlex.h"

namespace {

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

QTreeWidgetItem* LiveTreePage::newProcessRow(const QString& name, quint32 id) const
{
    auto* row = new CITreeWidgetItem(ProcessType);
    row->setText(ProcessColumn, name);
    if (m_processIdColumn >= 0)
        row->setText(m_processIdColumn, QString::number(id));
    startLife(row, id, ProcessColumn);
    return row;
}

QTreeWidgetItem* LiveTreePage::newEntryRow(quint32 id)
{
    auto* row = new CITreeWidgetItem(EntryType);
    startLife(row, id, EntryColumn);
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
    row->setData(0, AgeRole, 0);
    row->setData(0, StateRole, Gone);
    // A gone process keeps its colour; a gone entry turns red.
    if (column == EntryColumn)
        row->setForeground(column, QBrush(Qt::red));
}

bool LiveTreePage::ageRows()
{
    bool pending = false;
    for (int i = m_tree->topLevelItemCount() - 1; i >= 0; --i) {
        QTreeWidgetItem* row = m_tree->topLevelItem(i);
        if (ageRow(row, ProcessColumn, pending) == Aged::Removed) {
            delete row;
            continue;
        }
        for (int j = row->childCount() - 1; j >= 0; --j) {
            QTreeWidgetItem* child = row->child(j);
            if (ageRow(child, EntryColumn, pending) == Aged::Removed)
                delete child;
        }
    }
    return pending;
}
