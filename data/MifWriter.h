#pragma once

#include "MifFormat.h"

#include <QByteArray>
#include <QString>
#include <QVector>

struct MifEntry;

// Builds MIF files that MifReader reads back. Entries are written as given, unchecked,
// so that odd and broken files can be built as well as sound ones.
class MifWriter
{
public:
    // Returns the new blob's index.
    int addBlob(const QByteArray& data);
    // False when the entry table is full.
    bool addEntry(quint16 type, quint16 firstId, quint16 span, quint16 firstBlob);
    // A new blob with an entry for exactly this id; false when it cannot be addressed.
    bool addResource(quint16 type, quint16 id, const QByteArray& data);

    // Empty when the blobs exceed what 32-bit offsets can address.
    QByteArray data() const;
    bool writeFile(const QString& path, QString* error) const;

    // All six module resources under one entry. The header is entry.header padded to
    // 40 bytes with the entry's five counts written in; the counts are written as given,
    // not recomputed. Applet names and the entry's kind and file texts are not stored;
    // a class id 0 ends its list for the reader; a MIME text ends at its first zero and is
    // stored as Latin-1.
    static QByteArray moduleData(const MifEntry& entry);
    static bool writeModuleFile(const QString& path, const MifEntry& entry, QString* error);

private:
    static bool save(const QString& path, const QByteArray& data, QString* error);

    QVector<MifFormat::Entry> m_entries;
    QVector<QByteArray> m_blobs;
};
