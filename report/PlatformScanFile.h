#pragma once

#include <QString>
#include <QVector>

// A "platform-scan" file as the comparison reads it: the header its column gets and its
// class entries in document order. The file may come from anyone: it is read through the
// program's XML policy, and missing attributes read as empty texts.
struct PlatformScanFile
{
    enum Status
    {
        Read,
        Unreadable, // cannot be opened, is no XML, or breaks the XML policy
        WrongFormat, // XML without a "ZantHeaderDataList" or "classes" element
    };

    struct Entry
    {
        QString name;
        QString value;
        QString family;
        QString subFamily;
    };

    Status status = Unreadable;
    // Why the file is Unreadable, naming it: the policy's or the parser's own words.
    QString errorString;
    // The first "ZTOVERSION"'s "version", or the file's base name when that is empty.
    QString header;
    QVector<Entry> entries;

    static PlatformScanFile read(const QString& path);
    // An id that reads as a 32-bit hexadecimal number (with or without "0x") in the form every
    // id is shown in, so letter case and padding do not matter; other texts unchanged.
    static QString comparableId(const QString& value);
};
