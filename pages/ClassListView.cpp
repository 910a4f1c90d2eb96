#include "ClassListView.h"

#include "CITableWidgetItem.h"
#include "ClassListViewThread.h"
#include "DeviceCache.h"
#include "XmlReport.h"

#include <QHeaderView>

namespace {

enum Column
{
    NameColumn,
    IdColumn,
    FamilyColumn,
    SubFamilyColumn,
    AvailableColumn,
    PathColumn
};

constexpr int RowHeight = 20;
// Rows measured when the columns are fitted to their contents: all of a short list, a
// bounded sample of a long one, where measuring a thousand rows stalls the window.
constexpr int ResizeSampleRows = 100;

QString orUnknown(const QString& text)
{
    return text.isEmpty() ? QStringLiteral("unknown") : text;
}

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

void ClassListView::setDeviceRecord(DeviceCache* record)
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
    _classIDTable->setItem(row, NameColumn, new CITableWidgetItem(orUnknown(record.name)));
    _classIDTable->setItem(row, IdColumn, new CITableWidgetItem(record.id));
    _classIDTable->setItem(row, FamilyColumn, new CITableWidgetItem(orUnknown(record.family)));
    _classIDTable->setItem(row, SubFamilyColumn, new CITableWidgetItem(orUnknown(record.subFamily)));
    _classIDTable->setItem(row, AvailableColumn,
                           new CITableWidgetItem(record.available ? QStringLiteral("Yes") : QStringLiteral("No")));
    _classIDTable->setItem(row, PathColumn, new CITableWidgetItem(record.source));
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
    _classIDTable->horizontalHeader()->setSortIndicator(NameColumn, Qt::AscendingOrder);
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
    if (!m_report.isEmpty())
        return m_report;
    // Without a record the document keeps its shape, with empty device texts.
    const DeviceData data = m_record ? m_record->deviceData : DeviceData();
    XmlReport report(QStringLiteral("zant-class-ids"));
    QXmlStreamWriter& xml = report.writer();
    xml.writeStartElement(QStringLiteral("ZTOINFO"));
    xml.writeStartElement(QStringLiteral("ZTOVERSION"));
    xml.writeAttribute(QStringLiteral("version"), data.zantVersion);
    xml.writeAttribute(QStringLiteral("target"), data.targetId);
    xml.writeAttribute(QStringLiteral("manufacturer"), data.hardwareValue(QStringLiteral("Manufacturer"), QString()));
    xml.writeAttribute(QStringLiteral("model"), data.hardwareValue(QStringLiteral("Model"), QString()));
    xml.writeEndElement();

    xml.writeStartElement(QStringLiteral("ZantHeaderDataList"));
    const auto cell = [this](int row, int column) { return _classIDTable->item(row, column)->text(); };
    for (int row = 0; row < _classIDTable->rowCount(); ++row) {
        xml.writeStartElement(QStringLiteral("ZTOId"));
        xml.writeAttribute(QStringLiteral("path"), cell(row, PathColumn));
        xml.writeAttribute(QStringLiteral("subfamily"), cell(row, SubFamilyColumn));
        xml.writeAttribute(QStringLiteral("family"), cell(row, FamilyColumn));
        xml.writeAttribute(QStringLiteral("value"), cell(row, IdColumn));
        xml.writeAttribute(QStringLiteral("name"), cell(row, NameColumn));
        xml.writeEndElement();
    }
    m_report = report.text();
    return m_report;
}
