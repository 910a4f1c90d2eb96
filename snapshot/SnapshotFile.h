#pragma once

#include <QJsonObject>
#include <QString>
#include <QStringList>

// A snapshot on disk: one JSON document, "delvix.snapshot" version 1, written through a
// save file. Reading refuses, with a reason, anything that is not a whole snapshot of this
// version: a truncated or corrupt file, another document, a missing part.
class SnapshotFile
{
public:
    static constexpr const char* SchemaName = "delvix.snapshot";
    static constexpr int Version = 1;
    // The documents every snapshot holds.
    static const QStringList& documentNames();

    static bool write(const QString& path, const QJsonObject& snapshot, QString* error);
    static bool read(const QString& path, QJsonObject* snapshot, QString* error);
};
