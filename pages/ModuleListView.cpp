#include "ModuleListView.h"

#include "CITableWidgetItem.h"
#include "ModuleListViewThread.h"
#include "Portlex.h"
#include "ModuleReport.h"

#include <QHeaderView>

namespace {

constexpr int RowHeight = 20;
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
    _moduleTable->horizontalHeader()->setSectionResizeMode(QHeaderView::ResizeToContents);
    _moduleTable->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    connect(_moduleTable, &QTableWidget::itemClicked, this, &ModuleListView::onTableClick);
    connect(_moduleTable, &QTableWidget::itemDoubleClicked, this, &ModuleListView::onTableDoubleClick);
    connect(&m_pacer, &TickPacer::timeout, this, &ModuleListView::onTimeElapse);
    m_pacer.armFirst(FirstTickMs);
}

const TickPacer& ModuleListView::pacer() const
{
    return m_pacer;
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
    return statusIsReady();
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

bool ModuleListView::isComplete()
{
    return statusIsReady();
}

void ModuleListView::onTimeElapse()
{
    const FeedStep step = m_pending->drain([this](const ModuleInfo& module) { appendRow(module); });
    if (!m_pacer.pace(step, 0))
        finish();
}

void ModuleListView::appendRow(const ModuleInfo& module)
{
    const int row = _moduleTable->rowCount();
    _moduleTable->setRowCount(row + 1);
    const QStringList cells = ModuleReport::cells(module);
    for (int column = 0; column < cells.size(); ++column)
        _moduleTable->setItem(row, column, new CITableWidgetItem(cells.at(column)));
    // The numbers behind the type and signature texts, for the module information dialog.
    _moduleTable->item(row, ModuleReport::TypeColumn)->setData(Qt::UserRole, module.type);
    _moduleTable->item(row, ModuleReport::SignatureColumn)->setData(Qt::UserRole, module.signature);
    _moduleTable->setRowHeight(row, RowHeight);
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
    const auto text = [this, row](int column) { return _moduleTable->item(row, column)->text(); };
    ModuleInfo module;
    module.name = text(ModuleReport::NameColumn);
    module.version = text(ModuleReport::VersionColumn);
    module.type = _moduleTable->item(row, ModuleReport::TypeColumn)->data(Qt::UserRole).toUInt();
    module.signature = _moduleTable->item(row, ModuleReport::SignatureColumn)->data(Qt::UserRole).toUInt();
    module.path = text(ModuleReport::PathColumn);
    module.copyright = text(ModuleReport::CopyrightColumn);
    return module;
}

void ModuleListView::onTableClick(QTableWidgetItem* item)
{
    if (item && item->tableWidget())
        emit singleClick(moduleAt(item->row()));
}

void ModuleListView::onTableDoubleClick(QTableWidgetItem* item)
{
    if (item && item->tableWidget())
        emit doubleClick(moduleAt(item->row()));
}

QString ModuleListView::xmlReport()
{
    if (m_report.isEmpty())
        m_report = ModuleReport::build(tableRows(_moduleTable)).toXml();
    return m_report;
}
