#include "FamilyTreeView.h"

#include "CITreeWidgetItem.h"
#include "DeviceCache.h"
#include "FamilyGrouping.h"
#include "FamilyTreeViewThread.h"

namespace {

enum Column
{
    FamilyColumn = FamilyGrouping::FamilyColumn,
    SubFamilyColumn = FamilyGrouping::SubFamilyColumn,
    NameColumn,
    IdColumn
};

QTreeWidgetItem* classItem(const IdRecord& record)
{
    auto* item = new CITreeWidgetItem;
    item->setText(NameColumn, record.name);
    item->setText(IdColumn, record.id);
    return item;
}

} // namespace

FamilyTreeView::FamilyTreeView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    setupUi(this);
    m_grouping = FamilyGrouping(_familyTree);
    _familyTree->sortByColumn(FamilyColumn, Qt::AscendingOrder);
    connect(&m_pacer, &TickPacer::timeout, this, &FamilyTreeView::onTimeElapse);
}

void FamilyTreeView::setDeviceRecord(const DeviceCache* record)
{
    m_record = record;
    if (!record || m_worker.exists())
        return;
    // A sorting tree sorts itself whole after every insertion, at a cost that grows with
    // the tree; the fill keeps the families in order itself, and sorting returns at the end.
    _familyTree->setSortingEnabled(false);
    m_worker.start(new FamilyTreeViewThread(this, record->classes, m_pending), QThread::HighPriority);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& FamilyTreeView::pacer() const
{
    return m_pacer;
}

QString FamilyTreeView::componentName()
{
    return QStringLiteral("FamilyTree");
}

void FamilyTreeView::startComponent(const QString&)
{
}

bool FamilyTreeView::canSearch()
{
    return state() == Complete;
}

bool FamilyTreeView::search(const QString& text)
{
    return applyTreeSearch(text, _familyTree);
}

void FamilyTreeView::raisePriority()
{
    m_worker.setPriority(QThread::HighPriority);
}

void FamilyTreeView::lowerPriority()
{
    m_worker.setPriority(QThread::LowPriority);
}

void FamilyTreeView::onTimeElapse()
{
    const FeedStep step = m_pending->drain([this](const IdRecord& record) { placeClass(record); }, SliceMs);
    m_grouping.flush();
    if (m_placed > 0)
        setStatus(QStringLiteral("Processed %1 classes").arg(m_placed));
    if (!m_pacer.pace(step, 0))
        finish();
}

void FamilyTreeView::placeClass(const IdRecord& record)
{
    m_grouping.place(record.family, record.subFamily, classItem(record));
    ++m_placed;
}

void FamilyTreeView::finish()
{
    // The fill kept the tree in the order of its sort: sorting comes back without sorting again.
    CITreeWidgetItem::enableSortingInOrder(_familyTree, FamilyColumn, Qt::AscendingOrder);
    // Only the families show yet; the other columns have their width from the form.
    _familyTree->resizeColumnToContents(FamilyColumn);
    setStatus(readyStatus());
    setState(Complete);
}

QString FamilyTreeView::xmlReport()
{
    // Without a record the document keeps its shape, with empty device texts.
    if (m_report.isEmpty()) {
        m_report = FamilyReport::familyTree(FamilyGrouping::families(_familyTree, {NameColumn, IdColumn}),
                                            m_record ? m_record->deviceData : DeviceData())
                       .toXml();
    }
    return m_report;
}
