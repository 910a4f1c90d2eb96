#include "MifReader.h"

#include "MifEntry.h"
#include "QBinaryStream.h"
#include "QVectorStream.h"

#include "RegularFile.h"

#include <QFile>

using namespace MifFormat;

namespace {

constexpr qint64 WholeReadLimit = 1024 * 1024;

// Ids up to the first 0 or the end of the blob (a failed read yields 0).
QVector<quint32> decodeIds(const QByteArray& blob)
{
    QVector<quint32> ids;
    QVectorStream in(blob);
    for (quint32 id = in.readUInt32(); id != 0; id = in.readUInt32())
        ids.append(id);
    return ids;
}

QVector<MifApplet> decodeApplets(const QByteArray& blob, int count)
{
    QVector<MifApplet> applets;
    QVectorStream in(blob);
    for (int i = 0; i < count; ++i) {
        MifApplet applet;
        applet.classId = in.readUInt32();
        in.readUInt32(); // unused by the system
        applet.baseId = in.readUInt16();
        applet.appType = in.readUInt16();
        applet.host = in.readUInt32();
        applet.privSet = in.readUInt16();
        applet.flags = in.readUInt16();
        if (in.hasError())
            break;
        applets.append(applet);
    }
    return applets;
}

QVector<MifNotifier> decodeNotifiers(const QByteArray& blob, int count)
{
    QVector<MifNotifier> notifiers;
    QVectorStream in(blob);
    for (int i = 0; i < count; ++i) {
        MifNotifier notifier;
        notifier.typeId = in.readUInt32();
        notifier.notifierId = in.readUInt32();
        notifier.mask = in.readUInt32();
        if (in.hasError())
            break;
        notifiers.append(notifier);
    }
    return notifiers;
}

// A text without its terminating zero is an incomplete record and ends the list.
QVector<MifMimeType> decodeMimeTypes(const QByteArray& blob, int count)
{
    QVector<MifMimeType> mimeTypes;
    QVectorStream in(blob);
    for (int i = 0; i < count; ++i) {
        MifMimeType mimeType;
        mimeType.handlerClassId = in.readUInt32();
        mimeType.baseClassId = in.readUInt32();
        QByteArray text;
        for (quint8 c = in.readUInt8(); c != 0; c = in.readUInt8())
            text.append(char(c));
        if (in.hasError())
            break;
        mimeType.mimeType = QString::fromLatin1(text);
        mimeTypes.append(mimeType);
    }
    return mimeTypes;
}

} // namespace

bool MifReader::readFile(const QString& path)
{
    clear();
    QFile file;
    QString error;
    if (!RegularFile::open(file, path, &error))
        return fail(error);
    const qint64 size = file.size();
    if (size > MaxFileSize)
        return fail(QStringLiteral("%1 is larger than %2 bytes").arg(path).arg(MaxFileSize));
    // A small file is read in one go and decoded in memory, which costs less than the
    // stream's many small reads; a large one goes through the stream, which rejects a bad
    // header without loading the rest.
    if (size <= WholeReadLimit)
        return readData(file.read(size));
    QBinaryStream in(&file);
    return read(in, size);
}

bool MifReader::readData(const QByteArray& data)
{
    if (data.size() > MaxFileSize)
        return fail(QStringLiteral("The data (%1 bytes) is larger than %2 bytes").arg(data.size()).arg(MaxFileSize));
    QVectorStream in(data);
    return read(in, data.size());
}

bool MifReader::read(QStream& in, qint64 size)
{
    clear();
    m_error.clear();
    if (size < FileHeaderSize)
        return fail(QStringLiteral("The data (%1 bytes) is too short for a MIF header").arg(size));
    in.readUInt8();
    in.readUInt8();
    in.readUInt16();
    in.readUInt16();
    const quint16 entryCount = in.readUInt16();
    quint32 words[HeaderWordCount] = {};
    for (quint32& word : words)
        in.readUInt32(word);
    if (in.hasError())
        return fail(QStringLiteral("Cannot read the MIF header"));

    const qint64 tableEnd = FileHeaderSize + qint64(entryCount) * EntrySize;
    if (tableEnd > size)
        return fail(QStringLiteral("The entry table (%1 entries) runs past the end of the data").arg(entryCount));
    const quint32 blobCount = words[BlobCountField];
    const qint64 offsetsEnd = tableEnd + (qint64(blobCount) + 1) * OffsetSize;
    if (offsetsEnd > size)
        return fail(QStringLiteral("The offset table (%1 blobs) runs past the end of the data").arg(blobCount));

    return readEntries(in, entryCount, blobCount) && readBlobs(in, blobCount, size - offsetsEnd);
}

bool MifReader::readEntries(QStream& in, int count, quint32 blobCount)
{
    m_entries.reserve(count);
    for (int i = 0; i < count; ++i) {
        Entry entry;
        entry.type = in.readUInt16();
        entry.firstId = in.readUInt16();
        entry.span = in.readUInt16();
        entry.firstBlob = in.readUInt16();
        if (in.hasError())
            return fail(QStringLiteral("Cannot read entry %1").arg(i));
        if (quint32(entry.firstBlob) + entry.span >= blobCount)
            return fail(QStringLiteral("Entry %1 refers to blobs beyond the %2 present").arg(i).arg(blobCount));
        if (int(entry.firstId) + entry.span > MaxId)
            return fail(QStringLiteral("Entry %1 covers ids beyond %2").arg(i).arg(MaxId));
        m_entries.append(entry);
    }
    return true;
}

// Blobs follow the offset table back to back; only the differences of the offsets matter,
// and together they must fit in what is left of the data.
bool MifReader::readBlobs(QStream& in, quint32 count, qint64 available)
{
    m_blobStarts.reserve(qsizetype(count) + 1);
    const quint32 base = in.readUInt32();
    if (in.hasError())
        return fail(QStringLiteral("Cannot read the offset table"));
    m_blobStarts.append(0);
    for (quint32 k = 0; k < count; ++k) {
        const quint32 offset = in.readUInt32();
        if (in.hasError())
            return fail(QStringLiteral("Cannot read the offset table"));
        if (offset < base || offset - base < m_blobStarts.last())
            return fail(QStringLiteral("The offsets decrease at blob %1").arg(k));
        if (offset - base > available)
            return fail(QStringLiteral("Blob %1 ends past the end of the data").arg(k));
        m_blobStarts.append(offset - base);
    }
    m_blobs.resize(m_blobStarts.last());
    if (!in.readBytes(m_blobs.data(), m_blobs.size()))
        return fail(QStringLiteral("Cannot read the blobs"));
    return true;
}

void MifReader::clear()
{
    m_entries.clear();
    m_blobStarts.clear();
    m_blobs.clear();
}

bool MifReader::fail(const QString& message)
{
    clear();
    m_error = message;
    return false;
}

int MifReader::blobIndex(quint16 type, quint16 id) const
{
    // Table order decides overlaps, so the first covering entry wins.
    for (const Entry& entry : m_entries) {
        if (entry.type == type && id >= entry.firstId && id - entry.firstId <= entry.span)
            return entry.firstBlob + (id - entry.firstId);
    }
    return -1;
}

bool MifReader::hasResource(quint16 type, quint16 id) const
{
    return blobIndex(type, id) >= 0;
}

QByteArray MifReader::resource(quint16 type, quint16 id) const
{
    const int index = blobIndex(type, id);
    if (index < 0)
        return QByteArray();
    const quint32 start = m_blobStarts.at(index);
    return m_blobs.mid(start, m_blobStarts.at(index + 1) - start);
}

bool MifReader::decodeModule(MifEntry& entry) const
{
    entry = MifEntry();
    const QByteArray header = resource(ModuleType, HeaderId);
    if (header.size() < ModuleHeaderSize)
        return false;

    QVectorStream in(header);
    char unused[ModuleHeaderCountsOffset];
    in.readBytes(unused, sizeof unused);
    entry.classCount = in.readUInt16();
    entry.appletCount = in.readUInt16();
    entry.externalClassCount = in.readUInt16();
    entry.notificationCount = in.readUInt16();
    entry.mimeTypeCount = in.readUInt16();
    entry.header = header;

    entry.classes = decodeIds(resource(ModuleType, ClassesId));
    entry.applets = decodeApplets(resource(ModuleType, AppletsId), entry.appletCount);
    entry.externalClasses = decodeIds(resource(ModuleType, ExternalClassesId));
    entry.notifiers = decodeNotifiers(resource(ModuleType, NotifiersId), entry.notificationCount);
    entry.mimeTypes = decodeMimeTypes(resource(ModuleType, MimeTypesId), entry.mimeTypeCount);
    return true;
}
