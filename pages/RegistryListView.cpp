#include "RegistryListView.h"

#include "Portlex.h"
#include "RecordTableModel.h"
#include "RegistryListViewThread.h"
#include "RegistryReport.h"

#include <QHeaderView>

namespace {

// Rows the header measures when it fits the columns to their contents: every row of a
// short list, a bounded sample of a long one.
constexpr int ResizeSampleRows = 100;

} // namespace

RegistryListView::RegistryListView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setupUi(this);
    m_model = new RecordTableModel(
        {QStringLiteral("Class Type"), QStringLiteral("Class Handler"), QStringLiteral("Flags"), QStringLiteral("Mime Type")},
        this);
    _registryTable->setModel(m_model);
    QHeaderView* header = _registryTable->horizontalHeader();
    header->setSectionResizeMode(QHeaderView::ResizeToContents);
    header->setResizeContentsPrecision(ResizeSampleRows);
    connect(_registryTable, &QTableView::clicked, this, &RegistryListView::onTableClick);
    connect(_registryTable, &QTableView::doubleClicked, this, &RegistryListView::onTableDoubleClick);
    connect(&m_pacer, &TickPacer::timeout, this, &RegistryListView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& RegistryListView::pacer() const
{
    return m_pacer;
}

RecordTableModel* RegistryListView::model() const
{
    return m_model;
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
    return m_model->rowCount() > 0;
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

void RegistryListView::onTimeElapse()
{
    QVector<QStringList> rows;
    const FeedStep step = m_pending->drain([&rows](const RegistryInfo& entry) { rows.append(RegistryReport::cells(entry)); });
    m_model->appendRows(rows);
    if (!m_pacer.pace(step, 0))
        finish();
}

void RegistryListView::finish()
{
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _registryTable->horizontalHeader()->setSortIndicator(RegistryReport::ClassTypeColumn, Qt::AscendingOrder);
    _registryTable->setSortingEnabled(true);
    setStatus(readyStatus());
    setState(Complete);
}

void RegistryListView::onTableClick(const QModelIndex& index)
{
    if (index.isValid())
        emit singleClick(index.data().toString());
}

void RegistryListView::onTableDoubleClick(const QModelIndex& index)
{
    if (index.isValid())
        emit doubleClick(index.data().toString());
}

QString RegistryListView::xmlReport()
{
    if (m_report.isEmpty())
        m_report = RegistryReport::build(m_model->rows()).toXml();
    return m_report;
}
