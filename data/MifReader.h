#pragma once

#include "MifFormat.h"

#include <QByteArray>
#include <QString>
#include <QVector>

struct MifEntry;
class QStream;

// Reads a MIF resource container and decodes its module resources. The input is never
// trusted: every count, offset and span is checked against the data before use, and
// nothing larger than the input is allocated.
class MifReader
{
public:
    // No module file comes near this; a larger one is refused before anything is read.
    static constexpr qint64 MaxFileSize = 64 * 1024 * 1024;

    // False with errorString() when the file cannot be opened or the data is malformed;
    // a failed read leaves no resources behind. Only a regular file is read (a FIFO or a
    // device, even through a link, is refused without waiting), and no further than the
    // size it had when opened.
    bool readFile(const QString& path);
    bool readData(const QByteArray& data);

    bool hasResource(quint16 type, quint16 id) const;
    QByteArray resource(quint16 type, quint16 id) const;
    int entryCount() const { return m_entries.size(); }
    int blobCount() const { return m_blobStarts.isEmpty() ? 0 : m_blobStarts.size() - 1; }

    // Resets entry and fills it; false when there is no module header of 40 bytes or more.
    bool decodeModule(MifEntry& entry) const;

    QString errorString() const { return m_error; }

private:
    bool read(QStream& in, qint64 size);
    bool readEntries(QStream& in, int count, quint32 blobCount);
    bool readBlobs(QStream& in, quint32 count, qint64 available);
    void clear();
    bool fail(const QString& message);
    int blobIndex(quint16 type, quint16 id) const;

    QVector<MifFormat::Entry> m_entries;
    QVector<quint32> m_blobStarts; // blob k is m_blobs[start k, start k+1)
    QByteArray m_blobs;
    QString m_error;
};
