#pragma once

#include <QMutex>
#include <QString>

#include <set>
#include <utility>

// The crawl queue of the pages that walk a device tree (settings store, file system): the
// smallest priority comes first, and among equal priorities the smaller path in plain
// string order. Every call takes the queue's own lock, so a worker and the GUI thread can
// share it.
class PathPriorityQueue
{
public:
    void push(quint16 priority, const QString& path);
    // Takes the first pair; false when the queue is empty.
    bool pop(quint16& priority, QString& path);
    void clear();
    bool isEmpty() const;
    int size() const;

private:
    mutable QMutex m_mutex;
    std::multiset<std::pair<quint16, QString>> m_entries;
};
