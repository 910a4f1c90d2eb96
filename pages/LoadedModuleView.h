#pragma once

#include "LiveTreePage.h"
#include "LoadedModuleInfo.h"
#include "ui_LoadedModuleView.h"

// The loaded modules page: the device's processes with the modules each has loaded, kept live.
class LoadedModuleView : public LiveTreePage, public Ui::LoadedModuleViewClass
{
    Q_OBJECT

public:
    enum Column
    {
        ProcessNameColumn,
        ModuleNameColumn,
        SizeColumn,
        LocationColumn
    };

    explicit LoadedModuleView(QWidget* parent = nullptr);

public slots:
    QString componentName() override;

protected:
    PageWorkerThread* createWorker(const QSharedPointer<_ZantDevice>& device) override;
    Poll mergeSnapshot() override;

private:
    QSharedPointer<LiveSnapshot<LoadedModuleInfo>> m_loadedModules =
        QSharedPointer<LiveSnapshot<LoadedModuleInfo>>::create();
};
