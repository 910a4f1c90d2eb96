#pragma once

#include "_FileInfo.h"

#include <QList>
#include <QSharedPointer>
#include <QString>

// One directory level: the directory and its direct children. Sub-directories come
// without contents; they are fetched as levels of their own.
class _DirectoryInfo
{
public:
    explicit _DirectoryInfo(const QString& name = QString(), const QString& path = QString())
        : m_name(name), m_path(path)
    {
    }

    QString Name() const { return m_name; }
    QString Path() const { return m_path; }
    void SetName(const QString& name) { m_name = name; }
    void SetPath(const QString& path) { m_path = path; }

    QList<QSharedPointer<_FileInfo>> files;
    QList<QSharedPointer<_DirectoryInfo>> directories;

    bool operator==(const _DirectoryInfo& o) const;

private:
    QString m_name;
    QString m_path;
};
