#include "ISettingsTreeView.h"

#include "CITableWidgetItem.h"
#include "CITreeWidgetItem.h"
#include "Portlex.h"
#include "_SettingsInfo.h"

#include <QHeaderView>

#include <algorithm>

namespace {

enum TableColumn
{
    NameColumn,
    ValueColumn
};

constexpr int RowHeight = 20;

CITreeWidgetItem* newItem(ISettingsTreeView::ItemKind kind, const QString& name, const QString& parentPath)
{
    auto* item = new CITreeWidgetItem;
    item->setKind(kind);
    item->setText(0, name);
    item->setData(0, Qt::UserRole, parentPath);
    return item;
}

int kindOf(const QTreeWidgetItem* item)
{
    return static_cast<const CITreeWidgetItem*>(item)->kind();
}

} // namespace

ISettingsTreeView::ISettingsTreeView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    setupUi(this);
    _settingsTree->sortByColumn(0, Qt::AscendingOrder);
    connect(_settingsTree, &QTreeWidget::currentItemChanged, this, &ISettingsTreeView::onCurrentItemChanged);
    connect(&m_pacer, &TickPacer::timeout, this, &ISettingsTreeView::onTimeElapse);
}

const TickPacer& ISettingsTreeView::pacer() const
{
    return m_pacer;
}

QString ISettingsTreeView::componentName()
{
    return QStringLiteral("Settings");
}

void ISettingsTreeView::startComponent(const QString& deviceId)
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
    m_crawl->push(0, QStringLiteral("/"));
    // A sorting tree sorts itself whole after every insertion; the fill inserts each
    // node's items in order, and sorting returns when the fill ends.
    _settingsTree->setSortingEnabled(false);
    m_worker.start(new ISettingsTreeViewThread(this, m_device, m_crawl, m_answered), QThread::HighPriority);
    m_pacer.armFirst(FirstTickMs);
}

bool ISettingsTreeView::canSearch()
{
    return state() == Complete;
}

bool ISettingsTreeView::search(const QString& text)
{
    return applyTreeSearch(text, _settingsTree);
}

void ISettingsTreeView::raisePriority()
{
    m_worker.setPriority(QThread::NormalPriority);
}

void ISettingsTreeView::lowerPriority()
{
    m_worker.setPriority(QThread::LowPriority);
}

// The settings store is not part of the device's export.
QString ISettingsTreeView::xmlReport()
{
    return QString();
}

void ISettingsTreeView::onTimeElapse()
{
    // Read before the feed: a failure comes after the worker's last node, so a failed page
    // whose feed is empty has nothing more coming.
    const bool failed = state() == Failed;
    const FeedStep step =
        m_answered->drain([this](const ISettingsTreeViewThread::Node& node) { insertNode(*node); }, SliceMs);
    if (failed && step == FeedStep::Waiting) {
        m_pacer.stop();
        endFill();
        return;
    }
    if (m_pacer.pace(step, 0))
        return;
    endFill();
    setStatus(readyStatus());
    setState(Complete);
}

void ISettingsTreeView::insertNode(const _SettingsInfo& node)
{
    const QString path = node.Path();
    QTreeWidgetItem* parent = m_items.value(path);
    if (parent && !node.values.isEmpty())
        static_cast<CITreeWidgetItem*>(parent)->setKind(ValuedNodeKind);

    QList<QTreeWidgetItem*> items;
    items.reserve(node.values.size() + node.children.size());
    for (const auto& value : node.values) {
        CITreeWidgetItem* item = newItem(ValueKind, value.first, path);
        item->setText(1, value.second);
        items.append(item);
    }
    for (const ISettingsTreeViewThread::Node& child : node.children) {
        CITreeWidgetItem* item = newItem(NodeKind, child->Name(), path);
        items.append(item);
        m_items.insert(child->Path(), item);
    }
    // In the order the tree's own sort gives them, inserted at once.
    std::stable_sort(items.begin(), items.end(), [](const QTreeWidgetItem* a, const QTreeWidgetItem* b) { return *a < *b; });
    if (parent)
        parent->addChildren(items);
    else
        _settingsTree->addTopLevelItems(items);
    for (QTreeWidgetItem* item : std::as_const(items)) {
        if (kindOf(item) == ValueKind)
            item->setHidden(true);
    }
}

void ISettingsTreeView::endFill()
{
    // Each node's items went in sorted, so the tree is in the order of its sort already.
    CITreeWidgetItem::enableSortingInOrder(_settingsTree, 0, Qt::AscendingOrder);
}

void ISettingsTreeView::onCurrentItemChanged(QTreeWidgetItem* current, QTreeWidgetItem*)
{
    _nameValueTable->clearContents();
    _nameValueTable->setRowCount(0);
    _nameValueTable->setSortingEnabled(false);
    if (current && kindOf(current) == ValuedNodeKind) {
        for (int i = 0; i < current->childCount(); ++i) {
            const QTreeWidgetItem* value = current->child(i);
            if (kindOf(value) != ValueKind)
                continue;
            const int row = _nameValueTable->rowCount();
            _nameValueTable->setRowCount(row + 1);
            auto* name = new CITableWidgetItem(value->text(0));
            name->setFlags(Qt::NoItemFlags);
            _nameValueTable->setItem(row, NameColumn, name);
            _nameValueTable->setItem(row, ValueColumn, new CITableWidgetItem(value->text(1)));
            _nameValueTable->setRowHeight(row, RowHeight);
        }
    }
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _nameValueTable->horizontalHeader()->setSortIndicator(NameColumn, Qt::AscendingOrder);
    _nameValueTable->setSortingEnabled(true);
    _nameValueTable->resizeColumnToContents(NameColumn);
}
