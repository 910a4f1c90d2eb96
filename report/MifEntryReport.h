#pragma once

#include "MifEntry.h"
#include "Report.h"

#include <QStringList>
#include <QVector>

// One module's MIF entry: its five lists as rows, every id named through the class
// database, and the "zant-mif-entry" document of them. The counts are written as the
// module states them, not recomputed from the lists.
class MifEntryReport
{
public:
    // One list of the entry: a row's cells are also the attributes of the row's element,
    // in the same order.
    struct Section
    {
        QString element;
        QString item;
        QStringList attributes;
        int numberColumn = -1; // the column holding a plain number, or -1
        QVector<QStringList> rows;
    };

    // Classes, applets, external classes, notifiers, MIME types: the order of the document.
    static QVector<Section> sections(const MifEntry& entry);
    // The root always carries the five counts; an empty list leaves its section out. The
    // CSV lines are the module's classes.
    static Report build(const MifEntry& entry);
};
