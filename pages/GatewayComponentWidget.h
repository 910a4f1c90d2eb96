#pragma once

#include <QItemSelection>
#include <QMutex>
#include <QPointer>
#include <QString>
#include <QWidget>

class QTableView;
class QTreeWidget;
class QTreeWidgetItem;

// One page of the device window. The window sees every page through this class: its name,
// its start, its search, the priority of its background work, whether it is complete and
// its XML export. The page's status text and state are announced by signals; worker threads
// may set them, so they are stored under a lock.
class GatewayComponentWidget : public QWidget
{
    Q_OBJECT

public:
    enum ComponentState
    {
        Starting = 0,
        Processing = 1,
        Complete = 2,
        Failed = 3
    };
    Q_ENUM(ComponentState)

    // Searches shorter than this clear the search instead.
    static constexpr int MinimumSearchLength = 3;

    explicit GatewayComponentWidget(QWidget* parent = nullptr);
    ~GatewayComponentWidget() override;

    ComponentState state() const;
    QString status() const;
    QString searchText() const;

    // Each emits its signal only when the value changes. Safe from any thread.
    void setState(ComponentState state);
    void setStatus(const QString& status);

    void searchTable(const QString& text, QTableView* table);
    void clearTableSearch();
    void searchTree(const QString& text, QTreeWidget* tree);
    void clearTreeSearch();
    bool itemMatches(const QString& text, QTreeWidgetItem* item);

    // "Error: " and the result code of a failed device query.
    static QString errorStatus(int result);
    static QString readyStatus();

public slots:
    virtual QString componentName() = 0;
    virtual void startComponent(const QString& deviceId) = 0;
    virtual bool canSearch() = 0;
    virtual bool search(const QString& text) = 0;
    virtual void raisePriority() = 0;
    virtual void lowerPriority() = 0;
    // Every fetched record is shown: the state is Complete, whatever the status reads.
    virtual bool isComplete();
    virtual QString xmlReport() = 0;
    // Asks the device again in place (keeping what the user opened, say) and returns true;
    // a page that cannot returns false, the default, and the window replaces it by a new one.
    virtual bool refresh();

signals:
    void statusChanged(QString statusMessage);
    void timedStatusChanged(QString statusMessage);
    void stateChanged(GatewayComponentWidget::ComponentState state);
    // An action of this page (an install, a delete, a run) changed what the device holds:
    // the window asks its other pages again when they are next shown.
    void deviceContentChanged();

protected:
    // The search entry of a table page: from three characters on searches the table,
    // below that clears the search. Always true.
    bool applyTableSearch(const QString& text, QTableView* table);
    // The same for a tree page; true when it searched, false when it cleared.
    bool applyTreeSearch(const QString& text, QTreeWidget* tree);

private:
    void reportNotFound();
    void deselectTableHits();

    ComponentState m_state = Starting;
    QPointer<QTreeWidget> m_treeTarget;
    QPointer<QTableView> m_tableTarget;
    // Cells found by the last table search, as few ranges; their corners are persistent,
    // so rows removed since are not touched.
    QItemSelection m_tableHits;
    QString m_status;
    QString m_searchText;
    mutable QMutex m_statusLock; // guards m_state and m_status
};
