#include "LoadedModuleView.h"

#include "LoadedModuleViewThread.h"

LoadedModuleView::LoadedModuleView(QWidget* parent)
    : LiveTreePage(parent)
{
    setupUi(this);
    // Process rows show no id here.
    setTree(_loadedModuleTree, -1);
}

QString LoadedModuleView::componentName()
{
    return QStringLiteral("LoadedModuleView");
}

PageWorkerThread* LoadedModuleView::createWorker(const QSharedPointer<_ZantDevice>& device)
{
    return new LoadedModuleViewThread(this, device, m_loadedModules);
}

LiveTreePage::Poll LoadedModuleView::mergeSnapshot()
{
    return mergeFrom(*m_loadedModules, &LoadedModuleInfo::modules,
                     [](QTreeWidgetItem* row, const LoadedModuleEntry& module) {
                         row->setText(ModuleNameColumn, module.name);
                         row->setText(SizeColumn, QString::number(module.size));
                         row->setText(LocationColumn, module.location);
                     });
}
