#include "RegistryListView.h"

#include "CITableWidgetItem.h"
#include "Portlex.h"
#include "RegistryListViewThread.h"
#include "RegistryReport.h"

#include <QHeaderView>

namespace {

constexpr int RowHeight = 20;
// Rows the header measures when it fits the columns to their contents: every row of a
// short list, a bounded sample of a long one.
constexpr int ResizeSampleRows = 100;

} // namespace

RegistryListView::RegistryListView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setupUi(this);
    QHeaderView* header = _registryTable->horizontalHeader();
    header->setSectionResizeMode(QHeaderView::ResizeToContents);
    header->setResizeContentsPrecision(ResizeSampleRows);
    connect(_registryTable, &QTableWidget::itemClicked, this, &RegistryListView::onTableClick);
    connect(_registryTable, &QTableWidget::itemDoubleClicked, this, &RegistryListView::onTableDoubleClick);
    connect(&m_pacer, &TickPacer::timeout, this, &RegistryListView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& RegistryListView::pacer() const
{
    return m_pacer;
}

QString RegistryListView::componentName()
{
    return QStringLiteral("Registry");
}

void RegistryListView::startComponent(const QString& deviceId)
{
    if (m_device)
        return;
    m_device = Portlex::GetDevice(deviceId);
    if (!m_device || m_worker.exists())
        return;
    m_worker.start(new RegistryListViewThread(this, m_device, m_pending), QThread::LowPriority);
}

bool RegistryListView::canSearch()
{
    return _registryTable->rowCount() > 0;
}

bool RegistryListView::search(const QString& text)
{
    return applyTableSearch(text, _registryTable);
}

void RegistryListView::raisePriority()
{
    m_worker.setPriority(QThread::HighestPriority);
}

void RegistryListView::lowerPriority()
{
    m_worker.setPriority(QThread::LowestPriority);
}

bool RegistryListView::isComplete()
{
    return statusIsReady();
}

void RegistryListView::onTimeElapse()
{
    const int shownBefore = _registryTable->rowCount();
    const FeedStep step = m_pending->drain([this](const RegistryInfo& entry) { appendRow(entry); });
    // The closing sort of a long table gets a tick of its own, not the end of a batch's.
    if (step == FeedStep::Drained && _registryTable->rowCount() != shownBefore) {
        m_pacer.armBusy(0);
        return;
    }
    if (!m_pacer.pace(step, 0))
        finish();
}

void RegistryListView::appendRow(const RegistryInfo& entry)
{
    const int row = _registryTable->rowCount();
    _registryTable->setRowCount(row + 1);
    const QStringList cells = RegistryReport::cells(entry);
    for (int column = 0; column < cells.size(); ++column)
        _registryTable->setItem(row, column, new CITableWidgetItem(cells.at(column)));
    _registryTable->setRowHeight(row, RowHeight);
}

void RegistryListView::finish()
{
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _registryTable->horizontalHeader()->setSortIndicator(RegistryReport::ClassTypeColumn, Qt::AscendingOrder);
    _registryTable->setSortingEnabled(true);
    setStatus(readyStatus());
    setState(Complete);
}

void RegistryListView::onTableClick(QTableWidgetItem* item)
{
    if (item)
        emit singleClick(item->text());
}

void RegistryListView::onTableDoubleClick(QTableWidgetItem* item)
{
    if (item)
        emit doubleClick(item->text());
}

QString RegistryListView::xmlReport()
{
    if (m_report.isEmpty())
        m_report = RegistryReport::build(tableRows(_registryTable)).toXml();
    return m_report;
}
