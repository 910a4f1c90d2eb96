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

void addClass(QTreeWidgetItem* subFamily, const IdRecord& record)
{
    auto* item = new CITreeWidgetItem;
    item->setText(NameColumn, record.name);
    item->setText(IdColumn, record.id);
    subFamily->addChild(item);
}

} // namespace

FamilyTreeView::FamilyTreeView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    setupUi(this);
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

bool FamilyTreeView::isComplete()
{
    return statusIsReady();
}

void FamilyTreeView::onTimeElapse()
{
    const FeedStep step = m_pending->step([this](const IdRecord& record) { insertClass(record); });
    if (!m_pacer.pace(step, BusyMs))
        finish();
}

void FamilyTreeView::insertClass(const IdRecord& record)
{
    QTreeWidgetItem* family = FamilyGrouping::findFamily(_familyTree, record.family);
    if (!family) {
        // Built whole before it joins the tree: one insertion for the view to handle.
        family = new CITreeWidgetItem;
        family->setText(FamilyColumn, record.family);
        addClass(FamilyGrouping::addSubFamily(family, record.subFamily), record);
        _familyTree->insertTopLevelItem(familyPosition(family), family);
        return;
    }
    QTreeWidgetItem* subFamily = FamilyGrouping::findSubFamily(family, record.subFamily);
    if (!subFamily)
        subFamily = FamilyGrouping::addSubFamily(family, record.subFamily);
    addClass(subFamily, record);
}

// Where the tree's own sort would put a new family: after every family that does not sort
// after it.
int FamilyTreeView::familyPosition(const QTreeWidgetItem* family) const
{
    int low = 0;
    int high = _familyTree->topLevelItemCount();
    while (low < high) {
        const int middle = low + (high - low) / 2;
        if (*family < *_familyTree->topLevelItem(middle))
            high = middle;
        else
            low = middle + 1;
    }
    return low;
}

void FamilyTreeView::finish()
{
    _familyTree->setSortingEnabled(true);
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
