#pragma once

#include "MifEntry.h"
#include "Report.h"

#include <QStringList>
#include <QVector>
#include <vector>

// The classes a platform build's MIF files export: a row per file and class in the scan
// dialog's column order, and the "platform-scan" document of rows in scan order (the
// comparison reads it back).
class PlatformScanReport
{
public:
    enum Column
    {
        NameColumn,
        IdColumn,
        FamilyColumn,
        SubFamilyColumn,
        PathColumn
    };

    // The class named through the class database, in the file at path.
    static QStringList cells(quint32 id, const QString& path);
    // Every class of every entry, in scan order.
    static QVector<QStringList> rows(const std::vector<MifEntry>& entries);
    // The path is not written: the document lists the classes once per file that has them.
    static Report build(const QVector<QStringList>& rows);
};
