#include "ModuleListView.h"

#include "CITableWidgetItem.h"
#include "ModuleListViewThread.h"
#include "Portlex.h"
#include "XmlReport.h"

#include <QHeaderView>

namespace {

enum Column
{
    NameColumn,
    VersionColumn,
    TypeColumn,
    SignatureColumn,
    PathColumn,
    CopyrightColumn
};

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
    _moduleTable->setItem(row, NameColumn, new CITableWidgetItem(module.name));
    _moduleTable->setItem(row, VersionColumn, new CITableWidgetItem(module.version));
    auto* type = new CITableWidgetItem(module.GetModuleProperty());
    type->setData(Qt::UserRole, module.type);
    _moduleTable->setItem(row, TypeColumn, type);
    auto* signature = new CITableWidgetItem(module.GetModuleSig());
    signature->setData(Qt::UserRole, module.signature);
    _moduleTable->setItem(row, SignatureColumn, signature);
    _moduleTable->setItem(row, PathColumn, new CITableWidgetItem(module.path));
    _moduleTable->setItem(row, CopyrightColumn, new CITableWidgetItem(module.copyright));
    _moduleTable->setRowHeight(row, RowHeight);
}

void ModuleListView::finish()
{
    // Enabling sorting sorts by the indicator; sortByColumn afterwards would sort again.
    _moduleTable->horizontalHeader()->setSortIndicator(NameColumn, Qt::AscendingOrder);
    _moduleTable->setSortingEnabled(true);
    setStatus(readyStatus());
    setState(Complete);
}

ModuleInfo ModuleListView::moduleAt(int row) const
{
    const auto text = [this, row](int column) { return _moduleTable->item(row, column)->text(); };
    ModuleInfo module;
    module.name = text(NameColumn);
    module.version = text(VersionColumn);
    module.type = _moduleTable->item(row, TypeColumn)->data(Qt::UserRole).toUInt();
    module.signature = _moduleTable->item(row, SignatureColumn)->data(Qt::UserRole).toUInt();
    module.path = text(PathColumn);
    module.copyright = text(CopyrightColumn);
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
    if (!m_report.isEmpty())
        return m_report;
    XmlReport report(QStringLiteral("zant-modules"));
    QXmlStreamWriter& xml = report.writer();
    xml.writeStartElement(QStringLiteral("modules"));
    const auto cell = [this](int row, int column) { return _moduleTable->item(row, column)->text(); };
    for (int row = 0; row < _moduleTable->rowCount(); ++row) {
        xml.writeStartElement(QStringLiteral("module"));
        xml.writeAttribute(QStringLiteral("copyright"), cell(row, CopyrightColumn));
        xml.writeAttribute(QStringLiteral("path"), cell(row, PathColumn));
        xml.writeAttribute(QStringLiteral("signature"), cell(row, SignatureColumn));
        xml.writeAttribute(QStringLiteral("type"), cell(row, TypeColumn));
        xml.writeAttribute(QStringLiteral("version"), cell(row, VersionColumn));
        xml.writeAttribute(QStringLiteral("name"), cell(row, NameColumn));
        xml.writeEndElement();
    }
    m_report = report.text();
    return m_report;
}
