#include "ModuleListView.h"

#include "ModuleListViewThread.h"
#include "ModuleReport.h"
#include "Portlex.h"
#include "RecordTableModel.h"

#include <QHeaderView>

namespace {

// Rows the header measures when it fits the columns to their contents: every row of a
// short list, a bounded sample of a long one, which would otherwise cost every repaint
// during the fill a measurement of a thousand rows.
constexpr int ResizeSampleRows = 100;

} // namespace

ModuleListView::ModuleListView(QWidget* parent)
    : GatewayComponentWidget(parent)
{
    setStatus(QStringLiteral("Starting"));
    setState(Starting);
    setupUi(this);
    m_model = new RecordTableModel({QStringLiteral("Module Name"), QStringLiteral("Component Services Version"),
                                    QStringLiteral("Module Type"), QStringLiteral("Signature"), QStringLiteral("Path"),
                                    QStringLiteral("Copyright")},
                                   this);
    _moduleTable->setModel(m_model);
    _moduleTable->horizontalHeader()->setSectionResizeMode(QHeaderView::ResizeToContents);
    _moduleTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    connect(_moduleTable, &QTableView::clicked, this, &ModuleListView::onTableClick);
    connect(_moduleTable, &QTableView::doubleClicked, this, &ModuleListView::onTableDoubleClick);
    connect(&m_pacer, &TickPacer::timeout, this, &ModuleListView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& ModuleListView::pacer() const
{
    return m_pacer;
}

RecordTableModel* ModuleListView::model() const
{
    return m_model;
}

QString ModuleListView::componentName()
{
    return QStringLiteral("ModuleList");
}

void ModuleListView::startComponent(const QString& deviceId)
{
    if (m_device)
        return;
    m_device = Portlex::GetDevice(deviceId);
    if (!m_device || m_worker.exists())
        return;
    m_worker.start(new ModuleListViewThread(this, m_device, m_pending), QThread::LowPriority);
}

bool ModuleListView::canSearch()
{
    return isComplete();
}

bool ModuleListView::search(const QString& text)
{
    return applyTableSearch(text, _moduleTable);
}

void ModuleListView::raisePriority()
{
    m_worker.setPriority(QThread::HighestPriority);
}

void ModuleListView::lowerPriority()
{
    m_worker.setPriority(QThread::LowestPriority);
}

void ModuleListView::onTimeElapse()
{
    QVector<QStringList> rows;
    const FeedStep step = m_pending->drain([this, &rows](const ModuleInfo& module) {
        m_modules.append(module);
        rows.append(ModuleReport::cells(module));
    }, SliceMs);
    m_model->appendRows(rows);
    if (!m_pacer.pace(step, 0))
        finish();
}

void ModuleListView::finish()
{
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _moduleTable->horizontalHeader()->setSortIndicator(ModuleReport::NameColumn, Qt::AscendingOrder);
    _moduleTable->setSortingEnabled(true);
    setStatus(readyStatus());
    setState(Complete);
}

ModuleInfo ModuleListView::moduleAt(int row) const
{
    const ModuleInfo& shown = m_modules.at(m_model->arrivalIndex(row));
    ModuleInfo module;
    module.name = shown.name;
    module.version = shown.version;
    module.type = shown.type;
    module.signature = shown.signature;
    module.path = shown.path;
    module.copyright = shown.copyright;
    return module;
}

void ModuleListView::onTableClick(const QModelIndex& index)
{
    if (index.isValid() && index.model() == m_model)
        emit singleClick(moduleAt(index.row()));
}

void ModuleListView::onTableDoubleClick(const QModelIndex& index)
{
    if (index.isValid() && index.model() == m_model)
        emit doubleClick(moduleAt(index.row()));
}

QString ModuleListView::xmlReport()
{
    if (m_report.isEmpty())
        m_report = ModuleReport::build(m_model->rows()).toXml();
    return m_report;
}
