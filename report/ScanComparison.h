#pragma once

#include "Report.h"

#include <QBitArray>
#include <QHash>
#include <QString>
#include <QStringList>
#include <QVector>

// Several platform scans merged by class id: each class once, with the names it was first
// met with and where it is present. Finding a class by its id costs the same however many
// there are.
class ScanComparison
{
public:
    struct Class
    {
        QString name;
        QString id;
        QString family;
        QString subFamily;
        QBitArray presence; // by scan; scans added after the class was last marked are absent
    };

    // Room for that many classes in all, so a large scan fills without regrowing.
    void reserve(qsizetype classes);
    // A new scan, named by header; returns its index.
    int addScan(const QString& header);
    // Marks the class with that id present in scan, adding it (with these names) when new.
    // Returns the class's index; *added tells whether it was new.
    int add(int scan, const QString& name, const QString& id, const QString& family, const QString& subFamily,
        bool* added = nullptr);

    const QStringList& scans() const { return m_scans; }
    const QVector<Class>& classes() const { return m_classes; }
    bool isPresent(int classIndex, int scan) const;
    bool isInEveryScan(int classIndex) const;

    // "N classes in both, A only in X, B only in Y" ("all" beyond two scans); empty with no scan.
    QString summary() const;
    // The "platform-comparison" document: the scans, then every class in the order first met,
    // with one presence attribute per scan (the CSV lines are the classes).
    Report report() const;

private:
    QStringList m_scans;
    QVector<Class> m_classes;
    QHash<QString, int> m_index;
};
