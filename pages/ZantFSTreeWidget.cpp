#include "ZantFSTreeWidget.h"

#include "DataFolders.h"
#include "DeviceFileSystemView.h"

#include <QApplication>
#include <QDrag>
#include <QDragEnterEvent>
#include <QFileInfo>
#include <QMenu>
#include <QMimeData>
#include <QMouseEvent>
#include <QUrl>

ZantFSTreeWidget::ZantFSTreeWidget(QWidget* parent)
    : QTreeWidget(parent)
    , m_anchorPath(DataFolders::locate(QStringLiteral("Drag-And-Drop-Anchor.mss")))
{
    setAcceptDrops(true);
}

QString ZantFSTreeWidget::anchorPath() const
{
    return m_anchorPath;
}

QString ZantFSTreeWidget::anchorFileName() const
{
    return QFileInfo(m_anchorPath).fileName();
}

Qt::DropActions ZantFSTreeWidget::supportedDropActions() const
{
    return Qt::CopyAction;
}

QMenu* ZantFSTreeWidget::contextMenuFor(const QString& path, QWidget* parent)
{
    auto* menu = new QMenu(parent);
    QAction* run = menu->addAction(tr("Run"));
    run->setEnabled(path.contains(QLatin1String(".mod"), Qt::CaseInsensitive));
    connect(run, &QAction::triggered, this, [this, path] { emit RunTriggered(path); });
    connect(menu->addAction(tr("Delete")), &QAction::triggered, this, [this, path] { emit DeleteTriggered(path); });
    return menu;
}

void ZantFSTreeWidget::highlightDropTarget(QTreeWidgetItem* item)
{
    const int columns = columnCount();
    if (m_highlighted) {
        for (int column = 0; column < columns; ++column) {
            m_highlighted->setBackground(column, m_savedBackground);
            m_highlighted->setForeground(column, m_savedForeground);
        }
        m_highlighted = nullptr;
    }
    if (!item)
        return;
    m_savedBackground = item->background(0);
    m_savedForeground = item->foreground(0);
    for (int column = 0; column < columns; ++column) {
        item->setBackground(column, m_highlightBackground);
        item->setForeground(column, m_highlightForeground);
    }
    m_highlighted = item;
}

void ZantFSTreeWidget::dragEnterEvent(QDragEnterEvent* event)
{
    if (!event->mimeData()->hasUrls()) {
        event->ignore();
        return;
    }
    clearSelection();
    QTreeWidgetItem* item = itemAt(event->position().toPoint());
    if (item && item->type() == DirectoryItem)
        highlightDropTarget(item);
    event->acceptProposedAction();
}

void ZantFSTreeWidget::dragMoveEvent(QDragMoveEvent* event)
{
    QTreeWidgetItem* item = itemAt(event->position().toPoint());
    if (item && item->type() == DirectoryItem && item != m_highlighted)
        highlightDropTarget(item);
    event->acceptProposedAction();
}

void ZantFSTreeWidget::dragLeaveEvent(QDragLeaveEvent*)
{
    highlightDropTarget(nullptr);
}

void ZantFSTreeWidget::dropEvent(QDropEvent* event)
{
    highlightDropTarget(nullptr);
    QTreeWidgetItem* item = itemAt(event->position().toPoint());
    if (!item) {
        event->acceptProposedAction();
        return;
    }
    QString target;
    if (item->type() == FileItem)
        target = item->parent() ? item->parent()->data(0, Qt::UserRole).toString() : QString();
    else
        target = item->data(0, Qt::UserRole).toString();
    if (target.isEmpty())
        target = property("MountPoint").toString();
    auto* page = qobject_cast<DeviceFileSystemView*>(parentWidget());
    if (!target.isEmpty() && page)
        page->copyDropToDevice(target, event->mimeData()->urls());
    event->acceptProposedAction();
}

void ZantFSTreeWidget::mousePressEvent(QMouseEvent* event)
{
    if (event->button() == Qt::LeftButton) {
        m_pressPosition = event->position().toPoint();
        m_dragStarted = false;
        QTreeWidget::mousePressEvent(event);
        return;
    }
    if (event->button() != Qt::RightButton)
        return;
    QTreeWidgetItem* item = itemAt(event->position().toPoint());
    if (!item)
        return;
    // The press is not passed on: a right click leaves the selection alone.
    QMenu* menu = contextMenuFor(item->data(0, Qt::UserRole).toString(), this);
    menu->exec(event->globalPosition().toPoint());
    delete menu;
}

void ZantFSTreeWidget::mouseMoveEvent(QMouseEvent* event)
{
    if (!(event->buttons() & Qt::LeftButton) || m_anchorPath.isEmpty()
        || (event->position().toPoint() - m_pressPosition).manhattanLength() < QApplication::startDragDistance()) {
        QTreeWidget::mouseMoveEvent(event);
        return;
    }
    m_dragStarted = true;
    auto* mimeData = new QMimeData;
    mimeData->setUrls({QUrl::fromLocalFile(m_anchorPath)});
    auto* drag = new QDrag(this);
    drag->setMimeData(mimeData);
    emit SourceDropStart();
    // What was dropped is worked out by the page afterwards: the drag carries only the anchor.
    if (drag->exec(Qt::CopyAction) == Qt::CopyAction)
        emit SourceDropEnd();
    else
        emit SourceDropCancelled();
}

void ZantFSTreeWidget::mouseReleaseEvent(QMouseEvent* event)
{
    if (m_dragStarted)
        return;
    QTreeWidget::mouseReleaseEvent(event);
}
