#pragma once

#include "GatewayComponentWidget.h"
#include "ISettingsTreeViewThread.h"
#include "PageFeed.h"
#include "PageWorker.h"
#include "PathPriorityQueue.h"
#include "TickPacer.h"
#include "ui_ISettingsTreeView.h"

#include <QHash>
#include <QSharedPointer>

class QTreeWidgetItem;
class _SettingsInfo;
class _ZantDevice;

// The settings tree page: the device's settings store as a tree of nodes, and the names and
// values of the selected node in a table beside it. The worker crawls the store node by
// node; each tick inserts answered nodes for a slice of SliceMs (at least one) and then lets
// the event loop run.
class ISettingsTreeView : public GatewayComponentWidget, public Ui::ISettingsTreeViewClass
{
    Q_OBJECT

public:
    static constexpr int FirstTickMs = 20;
    static constexpr int IdleStartMs = 0;
    static constexpr int IdleCapMs = 500;
    static constexpr int SliceMs = 8;

    // The kind every tree item carries.
    enum ItemKind
    {
        NodeKind = 1,       // a node
        ValuedNodeKind = 2, // a node known to hold values
        ValueKind = 3       // a value of its parent, hidden: values show in the table
    };

    explicit ISettingsTreeView(QWidget* parent = nullptr);

    const TickPacer& pacer() const;

public slots:
    QString componentName() override;
    void startComponent(const QString& deviceId) override;
    bool canSearch() override;
    bool search(const QString& text) override;
    void raisePriority() override;
    void lowerPriority() override;
    QString xmlReport() override;

    void onTimeElapse();
    void onCurrentItemChanged(QTreeWidgetItem* current, QTreeWidgetItem* previous);

private:
    void insertNode(const _SettingsInfo& node);
    // Nothing more will come: the tree sorts itself again.
    void endFill();

    QSharedPointer<_ZantDevice> m_device;
    QSharedPointer<PathPriorityQueue> m_crawl = QSharedPointer<PathPriorityQueue>::create();
    QSharedPointer<PageFeed<ISettingsTreeViewThread::Node>> m_answered =
        QSharedPointer<PageFeed<ISettingsTreeViewThread::Node>>::create();
    TickPacer m_pacer{IdleStartMs, IdleCapMs};
    // The item of every node path seen as a child so far.
    QHash<QString, QTreeWidgetItem*> m_items;
    // Last, so the worker is stopped before anything it reports to goes.
    PageWorker m_worker;
};
