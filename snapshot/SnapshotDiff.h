#pragma once

#include <QJsonObject>
#include <QMap>
#include <QPair>
#include <QString>
#include <QStringList>
#include <QVector>

// What changed between two snapshots, in the parts a new build changes: modules (added,
// removed, version or signature changed, by path), classes (added, removed, availability
// changed, by id), registry entries (by class type and MIME type), settings (nodes by path,
// values by node path and name) and files (added, removed, size or content hash changed,
// by path). Processes and loaded modules differ from run to run and are not compared.
class SnapshotDiff
{
public:
    enum Change
    {
        Added,
        Removed,
        Changed
    };
    struct Difference
    {
        QString kind;   // "module", "class", "registry", "setting", "file"
        Change change;
        QString key;    // what identifies the record: a path, an id
        QString before; // the record's compared texts in A ("" when added)
        QString after;  // and in B ("" when removed)
    };

    // The kinds in the order they are reported, with their group titles.
    static const QVector<QPair<QString, QString>>& kinds();

    SnapshotDiff(const QJsonObject& a, const QJsonObject& b);

    const QVector<Difference>& differences() const { return m_differences; }
    bool isEmpty() const { return m_differences.isEmpty(); }
    int count(const QString& kind, Change change) const;

    // "N differences: ..." with the counts per kind, then each group of differences.
    QString text() const;
    // The "delvix.diff" document (share/delvix/schema/diff.json).
    QJsonObject json() const;

    static QString changeName(Change change);

private:
    // Compares two keyed maps of record texts, adding the differences of one kind.
    void compare(const QString& kind, const QMap<QString, QString>& a, const QMap<QString, QString>& b);

    QJsonObject m_manifestA;
    QJsonObject m_manifestB;
    QVector<Difference> m_differences;
};
