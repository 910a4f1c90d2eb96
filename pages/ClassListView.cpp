#include "ClassListView.h"

#include "ClassListViewThread.h"
#include "ClassReport.h"
#include "DeviceCache.h"
#include "RecordTableModel.h"

#include <QHeaderView>

namespace {

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
    m_model = new RecordTableModel({QStringLiteral("Class Name"), QStringLiteral("Class ID"), QStringLiteral("Family"),
                                    QStringLiteral("Sub-family"), QStringLiteral("Available"), QStringLiteral("Path")},
                                   this);
    _classIDTable->setModel(m_model);
    _classIDTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    connect(_classIDTable, &QTableView::clicked, this, &ClassListView::onTableClick);
    connect(_classIDTable, &QTableView::doubleClicked, this, &ClassListView::onTableDoubleClick);
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

RecordTableModel* ClassListView::model() const
{
    return m_model;
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
    return isComplete();
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

void ClassListView::onTimeElapse()
{
    QVector<QStringList> rows;
    const FeedStep step = m_pending->drain([&rows](const IdRecord& record) { rows.append(ClassReport::cells(record)); });
    m_model->appendRows(rows);
    if (!rows.isEmpty())
        setStatus(QStringLiteral("Processed %1 classes").arg(m_model->rowCount()));
    if (!m_pacer.pace(step, 0))
        finish();
}

void ClassListView::finish()
{
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _classIDTable->horizontalHeader()->setSortIndicator(ClassReport::NameColumn, Qt::AscendingOrder);
    _classIDTable->setSortingEnabled(true);
    _classIDTable->resizeColumnsToContents();
    setStatus(readyStatus());
    setState(Complete);
}

void ClassListView::onTableClick(const QModelIndex& index)
{
    if (index.isValid())
        emit singleClick(index.data().toString());
}

void ClassListView::onTableDoubleClick(const QModelIndex& index)
{
    if (index.isValid())
        emit doubleClick(index.data().toString());
}

QString ClassListView::xmlReport()
{
    // Without a record the document keeps its shape, with empty device texts.
    if (m_report.isEmpty())
        m_report = ClassReport::build(m_model->rows(), m_record ? m_record->deviceData : DeviceData()).toXml();
    return m_report;
}
