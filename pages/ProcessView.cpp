#include "ProcessView.h"

#include "DisplayText.h"
#include "ProcessReport.h"
#include "ProcessViewThread.h"

ProcessView::ProcessView(QWidget* parent)
    : LiveTreePage(parent)
{
    setupUi(this);
    setTree(_processTree, IdColumn);
}

QString ProcessView::componentName()
{
    return QStringLiteral("ProcessView");
}

PageWorkerThread* ProcessView::createWorker(const QSharedPointer<_ZantDevice>& device)
{
    return new ProcessViewThread(this, device, m_processes);
}

LiveTreePage::Poll ProcessView::mergeSnapshot()
{
    return mergeFrom(*m_processes, &ProcessInfo::threads, [](QTreeWidgetItem* row, const ThreadEntry& thread) {
        row->setText(ThreadNameColumn, thread.name);
        row->setText(IdColumn, QString::number(thread.id));
        row->setText(StateColumn, DisplayText::threadState(thread.state));
        row->setText(PriorityColumn, QString::number(thread.priority));
    });
}
