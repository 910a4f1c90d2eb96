#include "ProcessView.h"

#include "ProcessViewThread.h"

ProcessView::ProcessView(QWidget* parent)
    : LiveTreePage(parent)
{
    setupUi(this);
    setTree(_processTree, IdColumn);
}

QString ProcessView::threadStateText(quint32 state)
{
    switch (state) {
    case 0:
        return QStringLiteral("Included");
    case 1:
        return QStringLiteral("Default");
    case 2:
        return QStringLiteral("Excluded");
    case 3:
        return QStringLiteral("Hard Excluded");
    default:
        return QStringLiteral("Unknown:") + QString::number(state);
    }
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
        row->setText(StateColumn, threadStateText(thread.state));
        row->setText(PriorityColumn, QString::number(thread.priority));
    });
}
