#pragma once

#include "LiveTreePage.h"
#include "ProcessInfo.h"
#include "ui_ProcessView.h"

// The threads page: the device's processes with their threads, kept live.
class ProcessView : public LiveTreePage, public Ui::ProcessViewClass
{
    Q_OBJECT

public:
    enum Column
    {
        ProcessNameColumn,
        ThreadNameColumn,
        IdColumn,
        StateColumn,
        PriorityColumn
    };

    explicit ProcessView(QWidget* parent = nullptr);

public slots:
    QString componentName() override;

protected:
    PageWorkerThread* createWorker(const QSharedPointer<_ZantDevice>& device) override;
    Poll mergeSnapshot() override;

private:
    QSharedPointer<LiveSnapshot<ProcessInfo>> m_processes = QSharedPointer<LiveSnapshot<ProcessInfo>>::create();
};
