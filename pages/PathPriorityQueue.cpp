#include "PathPriorityQueue.h"

#include <QMutexLocker>

void PathPriorityQueue::push(quint16 priority, const QString& path)
{
    QMutexLocker lock(&m_mutex);
    m_entries.emplace(priority, path);
}

bool PathPriorityQueue::pop(quint16& priority, QString& path)
{
    QMutexLocker lock(&m_mutex);
    if (m_entries.empty())
        return false;
    auto first = m_entries.begin();
    priority = first->first;
    path = first->second;
    m_entries.erase(first);
    return true;
}

void PathPriorityQueue::clear()
{
    QMutexLocker lock(&m_mutex);
    m_entries.clear();
}

bool PathPriorityQueue::isEmpty() const
{
    QMutexLocker lock(&m_mutex);
    return m_entries.empty();
}

int PathPriorityQueue::size() const
{
    QMutexLocker lock(&m_mutex);
    return int(m_entries.size());
}
