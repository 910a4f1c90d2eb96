#pragma once

#include <QPair>
#include <QSharedPointer>
#include <QString>
#include <QVector>

// One node of the device's settings store. A fresh node names the path to ask for;
// GetChildSettings fills its values and its direct children (name and path only).
class _SettingsInfo
{
public:
    explicit _SettingsInfo(const QString& name = QString(), const QString& path = QString())
        : m_name(name), m_path(path)
    {
    }

    QString Name() const { return m_name; }
    QString Path() const { return m_path; }
    void SetPath(const QString& path) { m_path = path; }
    void SetName(const QString& name) { m_name = name; }

    QVector<QPair<QString, QString>> values;             // (name, value text), device order
    QVector<QSharedPointer<_SettingsInfo>> children;     // device order

    bool operator==(const _SettingsInfo& o) const;

private:
    QString m_name;
    QString m_path;
};
