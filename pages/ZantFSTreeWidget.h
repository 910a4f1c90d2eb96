#pragma once

#include <QBrush>
#include <QPoint>
#include <QTreeWidget>

class QMenu;

// The tree of the device file system page. It takes local files dropped on it to the
// device folder under the drop point (through its page), highlights that folder while a
// drag hovers, offers Run and Delete on the entry under the cursor, and starts drags out
// that carry the anchor file, so that the page can learn where the user dropped. Item type
// 1 is a folder, 2 a file; column 0's user-role data is the entry's device path.
class ZantFSTreeWidget : public QTreeWidget
{
    Q_OBJECT

public:
    enum ItemType
    {
        DirectoryItem = 1,
        FileItem = 2
    };

    explicit ZantFSTreeWidget(QWidget* parent = nullptr);

    // The anchor beside the program, or empty when there is none (no drags out then).
    QString anchorPath() const;
    QString anchorFileName() const;
    // The Run/Delete menu for an entry; Run only for a path naming a .mod.
    QMenu* contextMenuFor(const QString& path, QWidget* parent);

    Qt::DropActions supportedDropActions() const override;

signals:
    void SourceDropStart();
    void SourceDropEnd();
    void SourceDropCancelled();
    void RunTriggered(QString path);
    void DeleteTriggered(QString path);

protected:
    void mousePressEvent(QMouseEvent* event) override;
    void mouseReleaseEvent(QMouseEvent* event) override;
    void mouseMoveEvent(QMouseEvent* event) override;
    void dragEnterEvent(QDragEnterEvent* event) override;
    void dragMoveEvent(QDragMoveEvent* event) override;
    void dragLeaveEvent(QDragLeaveEvent* event) override;
    void dropEvent(QDropEvent* event) override;

private:
    void highlightDropTarget(QTreeWidgetItem* item);

    QTreeWidgetItem* m_highlighted = nullptr;
    QString m_anchorPath;
    QPoint m_pressPosition;
    QBrush m_savedBackground;
    QBrush m_savedForeground;
    const QBrush m_highlightBackground{QColor(49, 106, 197, 255)};
    const QBrush m_highlightForeground{Qt::white};
    bool m_dragStarted = false;
};
