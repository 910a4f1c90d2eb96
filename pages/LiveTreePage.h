#pragma once

#include "CITreeWidgetItem.h"
#include "GatewayComponentWidget.h"
#include "LiveSnapshot.h"
#include "PageWorker.h"
#include "TickPacer.h"

#include <QBrush>
#include <QHash>
#include <QSet>
#include <QSharedPointer>
#include <QTreeWidget>
#include <QVector>

#include <algorithm>

class PageWorkerThread;
class _ZantDevice;

// A page that keeps a tree of the device's processes live, each with its entries below it
// (the threads page, the loaded modules page). Its worker polls the device for as long as the
// page lives; the tick merges each changed list into the tree. Rows that appear are dark green
// for AgingTicks ticks, entries that vanish are red as long, and rows that are gone are then
// removed. Every row carries its id, its state and its age in column 0.
class LiveTreePage : public GatewayComponentWidget
{
    Q_OBJECT

public:
    // Pacing of the tick: the first FirstTickMs after construction and one more StartTickMs
    // after the start, MergeTickMs after a merge, then 100 ms longer per quiet tick up to
    // IdleCapMs.
    static constexpr int FirstTickMs = 1000;
    static constexpr int StartTickMs = 500;
    static constexpr int MergeTickMs = 500;
    static constexpr int IdleCapMs = 2000;
    // Ticks a new row stays green and a gone row stays red.
    static constexpr int AgingTicks = 5;

    enum ItemType
    {
        ProcessType = 1,
        EntryType = 2
    };
    enum Role
    {
        IdRole = Qt::UserRole,
        StateRole, // a RowState
        AgeRole    // ticks spent in the state
    };
    enum RowState
    {
        Shown = 1,
        New = 2,
        Gone = 3
    };
    // The column that carries a row's colour.
    static constexpr int ProcessColumn = 0;
    static constexpr int EntryColumn = 1;

    explicit LiveTreePage(QWidget* parent = nullptr);

    const TickPacer& pacer() const;
    // Whether the worker still polls the device: false before the start and after a failure.
    bool isPolling() const;

public slots:
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

    void onTimeElapse();

protected:
    enum class Poll
    {
        NoAnswer,  // the device has not answered yet
        Unchanged, // nothing new since the last merge
        Merged
    };

    // The tree the page keeps, and the column that shows a process's id (-1: none).
    void setTree(QTreeWidget* tree, int processIdColumn);

    virtual PageWorkerThread* createWorker(const QSharedPointer<_ZantDevice>& device) = 0;
    // Merges the worker's latest list when it changed (through mergeFrom).
    virtual Poll mergeSnapshot() = 0;

    // Merges snapshot's list, if it changed, into the tree: processes by id, and below each
    // its entries (process.*entries, in ascending id order); fill writes an entry row's texts.
    template <typename Process, typename Entry, typename Fill>
    Poll mergeFrom(LiveSnapshot<Process>& snapshot, QVector<Entry> Process::*entries, Fill fill)
    {
        QVector<Process> list;
        if (!snapshot.take(list))
            return snapshot.hasAnswered() ? Poll::Unchanged : Poll::NoAnswer;
        // A sorting tree sorts itself whole at the next look at a row after every insertion;
        // the merge sorts it once, at its end.
        const bool sorting = m_tree->isSortingEnabled();
        m_tree->setSortingEnabled(false);
        const QVector<QTreeWidgetItem*> noted = topLevelRows();
        QHash<quint32, QVector<QTreeWidgetItem*>> rowsById;
        for (QTreeWidgetItem* row : noted)
            rowsById[rowId(row)].append(row);
        QSet<quint32> listed;
        for (const Process& process : std::as_const(list)) {
            listed.insert(process.id);
            const auto rows = rowsById.constFind(process.id);
            if (rows == rowsById.cend()) {
                QTreeWidgetItem* row = newProcessRow(process.name, process.id);
                mergeEntries(row, process.*entries, fill);
                addProcessRow(row);
                continue;
            }
            for (QTreeWidgetItem* row : *rows) {
                markListed(row, ProcessColumn);
                mergeEntries(row, process.*entries, fill);
            }
        }
        for (QTreeWidgetItem* row : noted) {
            if (!listed.contains(rowId(row)))
                markGone(row, ProcessColumn);
        }
        m_tree->setSortingEnabled(sorting);
        return Poll::Merged;
    }

private:
    template <typename Entry, typename Fill>
    void mergeEntries(QTreeWidgetItem* row, const QVector<Entry>& entries, Fill fill)
    {
        const QVector<QTreeWidgetItem*> noted = childRows(row);
        QHash<quint32, QTreeWidgetItem*> known;
        for (QTreeWidgetItem* child : noted)
            known.insert(rowId(child), child);
        for (const Entry& entry : entries) {
            if (QTreeWidgetItem* child = known.value(entry.id)) {
                markListed(child, EntryColumn);
                continue;
            }
            QTreeWidgetItem* child = newEntryRow(entry.id);
            fill(child, entry);
            row->addChild(child);
        }
        // The entries ascend by id, so the search for one ends at the first greater id.
        for (QTreeWidgetItem* child : noted) {
            const quint32 id = rowId(child);
            const auto at = std::lower_bound(entries.cbegin(), entries.cend(), id,
                                             [](const Entry& entry, quint32 value) { return entry.id < value; });
            if (at == entries.cend() || at->id != id)
                markGone(child, EntryColumn);
        }
    }

    static quint32 rowId(const QTreeWidgetItem* row);
    static QVector<QTreeWidgetItem*> childRows(const QTreeWidgetItem* row);
    QVector<QTreeWidgetItem*> topLevelRows() const;
    QTreeWidgetItem* newProcessRow(const QString& name, quint32 id);
    QTreeWidgetItem* newEntryRow(quint32 id);
    void addProcessRow(QTreeWidgetItem* row);
    void markGone(QTreeWidgetItem* row, int column);
    // A row marked gone whose id is listed again is shown as before; ids can come back.
    void markListed(QTreeWidgetItem* row, int column);
    // One aging pass over the rows that count their ticks; true while some still do.
    bool ageRows();

    QTreeWidget* m_tree = nullptr;
    int m_processIdColumn = -1;
    bool m_agingPending = false;
    // The rows that are new or gone, so that an aging pass need not walk the whole tree.
    QVector<QTreeWidgetItem*> m_counting;
    QSharedPointer<_ZantDevice> m_device;
    TickPacer m_pacer{0, IdleCapMs};
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
