#pragma once

#include <QString>

// One field of a report's record: its name, how machine output types it, and the title of
// the page's column that shows it. The page's column order is the field order of JSON and CSV.
struct ReportField
{
    enum Type
    {
        Text,
        Integer, // a decimal text; JSON writes a number (an empty text as null)
        Boolean, // "Yes" or "No" (also "Found", "Not Found"); JSON writes true or false
        Flags,   // names joined by " | "; JSON writes an array of the names
        Id,      // a "0x" text; JSON writes it and, as "<name>-number", its number
    };

    QString name;
    Type type = Text;
    QString column;        // the CSV header; empty: not a CSV column
    bool exported = true;  // written to the XML export (false: machine output only)
};
