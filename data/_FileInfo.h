#pragma once

#include <QString>

// One file of a directory level.
class _FileInfo
{
public:
    explicit _FileInfo(const QString& name = QString(), const QString& path = QString(),
                       const QString& attributes = QString(), quint64 size = 0)
        : size(size), m_name(name), m_path(path), m_attributes(attributes)
    {
    }

    QString Name() const { return m_name; }
    QString Path() const { return m_path; }
    QString Attributes() const { return m_attributes; }

    quint64 size = 0;  // bytes

    bool operator==(const _FileInfo& o) const
    {
        return size == o.size && m_name == o.m_name && m_path == o.m_path && m_attributes == o.m_attributes;
    }

private:
    QString m_name;
    QString m_path;
    QString m_attributes;  // e.g. "rw-" plus "h" for hidden, "s" for system
};
