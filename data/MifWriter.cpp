#include "MifWriter.h"

#include "MifEntry.h"
#include "QVectorStream.h"

#include <QSaveFile>

using namespace MifFormat;

namespace {

QByteArray idsBlob(const QVector<quint32>& ids)
{
    QVectorStream out;
    for (quint32 id : ids)
        out.writeUInt32(id);
    return out.data();
}

QByteArray headerBlob(const MifEntry& entry)
{
    QByteArray header = entry.header;
    if (header.size() < ModuleHeaderSize)
        header.append(ModuleHeaderSize - header.size(), '\0');
    QVectorStream counts;
    for (quint16 count : { entry.classCount, entry.appletCount, entry.externalClassCount, entry.notificationCount, entry.mimeTypeCount })
        counts.writeUInt16(count);
    header.replace(ModuleHeaderCountsOffset, counts.data().size(), counts.data());
    return header;
}

QByteArray appletsBlob(const QVector<MifApplet>& applets)
{
    QVectorStream out;
    for (const MifApplet& applet : applets) {
        out.writeUInt32(applet.classId);
        out.writeUInt32(quint32(0));
        out.writeUInt16(applet.baseId);
        out.writeUInt16(applet.appType);
        out.writeUInt32(applet.host);
        out.writeUInt16(applet.privSet);
        out.writeUInt16(applet.flags);
    }
    return out.data();
}

QByteArray notifiersBlob(const QVector<MifNotifier>& notifiers)
{
    QVectorStream out;
    for (const MifNotifier& notifier : notifiers) {
        out.writeUInt32(notifier.typeId);
        out.writeUInt32(notifier.notifierId);
        out.writeUInt32(notifier.mask);
    }
    return out.data();
}

QByteArray mimeTypesBlob(const QVector<MifMimeType>& mimeTypes)
{
    QVectorStream out;
    for (const MifMimeType& mimeType : mimeTypes) {
        out.writeUInt32(mimeType.handlerClassId);
        out.writeUInt32(mimeType.baseClassId);
        // A zero inside the text would end it early and shift every later record.
        const QByteArray text = mimeType.mimeType.toLatin1();
        const qsizetype end = text.indexOf('\0');
        out.writeBytes(text.constData(), end < 0 ? text.size() : end);
        out.writeUInt8(quint8(0));
    }
    return out.data();
}

} // namespace

int MifWriter::addBlob(const QByteArray& data)
{
    m_blobs.append(data);
    return m_blobs.size() - 1;
}

bool MifWriter::addEntry(quint16 type, quint16 firstId, quint16 span, quint16 firstBlob)
{
    if (m_entries.size() >= MaxEntries)
        return false;
    Entry entry;
    entry.type = type;
    entry.firstId = firstId;
    entry.span = span;
    entry.firstBlob = firstBlob;
    m_entries.append(entry);
    return true;
}

bool MifWriter::addResource(quint16 type, quint16 id, const QByteArray& data)
{
    if (m_blobs.size() > 0xFFFF || m_entries.size() >= MaxEntries)
        return false;
    return addEntry(type, id, 0, quint16(addBlob(data)));
}

QByteArray MifWriter::data() const
{
    QVectorStream out;
    out.writeUInt8(quint8(0));
    out.writeUInt8(quint8(0));
    out.writeUInt16(quint16(0));
    out.writeUInt16(quint16(0));
    out.writeUInt16(quint16(m_entries.size()));
    for (int word = 0; word < HeaderWordCount; ++word)
        out.writeUInt32(word == BlobCountField ? quint32(m_blobs.size()) : quint32(0));

    for (const Entry& entry : m_entries) {
        out.writeUInt16(entry.type);
        out.writeUInt16(entry.firstId);
        out.writeUInt16(entry.span);
        out.writeUInt16(entry.firstBlob);
    }

    // Offsets are file positions; the blobs follow the offset table.
    qint64 offset = out.data().size() + (qint64(m_blobs.size()) + 1) * OffsetSize;
    out.writeUInt32(quint32(offset));
    for (const QByteArray& blob : m_blobs) {
        offset += blob.size();
        if (offset > 0xFFFFFFFFLL)
            return QByteArray();
        out.writeUInt32(quint32(offset));
    }
    for (const QByteArray& blob : m_blobs)
        out.writeBytes(blob.constData(), blob.size());
    return out.data();
}

bool MifWriter::writeFile(const QString& path, QString* error) const
{
    return save(path, data(), error);
}

QByteArray MifWriter::moduleData(const MifEntry& entry)
{
    MifWriter writer;
    writer.addBlob(headerBlob(entry));
    writer.addBlob(idsBlob(entry.classes));
    writer.addBlob(appletsBlob(entry.applets));
    writer.addBlob(idsBlob(entry.externalClasses));
    writer.addBlob(notifiersBlob(entry.notifiers));
    writer.addBlob(mimeTypesBlob(entry.mimeTypes));
    writer.addEntry(ModuleType, HeaderId, MimeTypesId - HeaderId, 0);
    return writer.data();
}

bool MifWriter::writeModuleFile(const QString& path, const MifEntry& entry, QString* error)
{
    return save(path, moduleData(entry), error);
}

bool MifWriter::save(const QString& path, const QByteArray& data, QString* error)
{
    QSaveFile file(path);
    const bool saved = !data.isEmpty() && file.open(QIODevice::WriteOnly) && file.write(data) == data.size() && file.commit();
    if (!saved && error)
        *error = data.isEmpty() ? QStringLiteral("The blobs are too large for a MIF file") : QStringLiteral("Cannot write %1: %2").arg(path, file.errorString());
    return saved;
}
