#include "ClassListView.h"

#include "CITableWidgetItem.h"
#include "ClassListViewThread.h"
#include "ClassReport.h"
#include "DeviceCache.h"

#include <QHeaderView>

namespace {

constexpr int RowHeight = 20;
// Rows measured when the columns are fitted to their contents: all of a short list, a
// bounded sample of a long one, where measuring a thousand rows stalls the window.
constexpr int ResizeSampleRows = 100;

} // namespace

ClassListView::ClassListView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    setupUi(this);
    _classIDTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    connect(_classIDTable, &QTableWidget::itemClicked, this, &ClassListView::onTableClick);
    connect(_classIDTable, &QTableWidget::itemDoubleClicked, this, &ClassListView::onTableDoubleClick);
    connect(&m_pacer, &TickPacer::timeout, this, &ClassListView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

void ClassListView::setDeviceRecord(const DeviceCache* record)
{
    m_record = record;
    if (!record || m_worker.exists())
        return;
    m_worker.start(new ClassListViewThread(this, record->classes, m_pending), QThread::NormalPriority);
}

const TickPacer& ClassListView::pacer() const
{
    return m_pacer;
}

QString ClassListView::componentName()
{
    return QStringLiteral("ClassList");
}

void ClassListView::startComponent(const QString&)
{
}

bool ClassListView::canSearch()
{
    return state() == Complete;
}

bool ClassListView::search(const QString& text)
{
    return applyTableSearch(text, _classIDTable);
}

void ClassListView::raisePriority()
{
    m_worker.setPriority(QThread::HighPriority);
}

void ClassListView::lowerPriority()
{
    m_worker.setPriority(QThread::LowestPriority);
}

bool ClassListView::isComplete()
{
    return statusIsReady();
}

void ClassListView::onTimeElapse()
{
    switch (m_pending->drain([this](const IdRecord& record) { appendRow(record); })) {
    case FeedStep::Waiting:
        m_pacer.armIdle();
        break;
    case FeedStep::Drained:
        finish();
        break;
    case FeedStep::Shown:
        if (m_pending->isClosed()) {
            // The worker is done: the rest goes in without repainting.
            setTableQuiet(true);
            m_pacer.armBusy(1);
        } else {
            m_pacer.armBusy(0);
        }
        break;
    }
}

void ClassListView::appendRow(const IdRecord& record)
{
    const int row = _classIDTable->rowCount();
    _classIDTable->setRowCount(row + 1);
    const QStringList cells = ClassReport::cells(record);
    for (int column = 0; column < cells.size(); ++column)
        _classIDTable->setItem(row, column, new CITableWidgetItem(cells.at(column)));
    _classIDTable->setRowHeight(row, RowHeight);

    ++m_processed;
    if (m_processed % ProgressStep == 0) {
        setTableQuiet(false);
        setStatus(QStringLiteral("Processed %1 classes").arg(m_processed));
    }
}

void ClassListView::setTableQuiet(bool quiet)
{
    if (_classIDTable->updatesEnabled() == !quiet)
        return;
    _classIDTable->blockSignals(quiet);
    _classIDTable->setUpdatesEnabled(!quiet);
}

void ClassListView::finish()
{
    setTableQuiet(false);
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _classIDTable->horizontalHeader()->setSortIndicator(ClassReport::NameColumn, Qt::AscendingOrder);
    _classIDTable->setSortingEnabled(true);
    _classIDTable->resizeColumnsToContents();
    setStatus(readyStatus());
    setState(Complete);
}

void ClassListView::onTableClick(QTableWidgetItem* item)
{
    if (item)
        emit singleClick(item->text());
}

void ClassListView::onTableDoubleClick(QTableWidgetItem* item)
{
    if (item)
        emit doubleClick(item->text());
}

QString ClassListView::xmlReport()
{
    // Without a record the document keeps its shape, with empty device texts.
    if (m_report.isEmpty())
        m_report = ClassReport::build(tableRows(_classIDTable), m_record ? m_record->deviceData : DeviceData()).toXml();
    return m_report;
}
