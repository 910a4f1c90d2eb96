// Writes the seed corpus of fuzz_mif: sound modules and containers near the edges the
// reader checks. Run: mif-seed-generator fuzz/corpus/mif
#include "MifEntry.h"
#include "MifFormat.h"
#include "MifWriter.h"
#include "QVectorStream.h"

#include <QDir>
#include <QFile>
#include <QTextStream>

using namespace MifFormat;

namespace {

MifEntry fullModule()
{
    MifEntry entry;
    entry.classes = { 0x01000101, 0x01000102, 0x01000103 };
    entry.externalClasses = { 0x01000001, 0x02000040 };
    MifApplet applet;
    applet.classId = 0x01000101;
    applet.baseId = 0x0200;
    applet.appType = 1;
    applet.host = 0x01000101;
    applet.privSet = 0x0003;
    applet.flags = 0x0001;
    entry.applets = { applet };
    MifNotifier notifier;
    notifier.typeId = 0x01000050;
    notifier.notifierId = 0x01000102;
    notifier.mask = 0x0000000F;
    entry.notifiers = { notifier, notifier };
    MifMimeType mimeType;
    mimeType.handlerClassId = 0x01000103;
    mimeType.baseClassId = 0x01000200;
    mimeType.mimeType = "audio/x-zantro";
    entry.mimeTypes = { mimeType };
    entry.classCount = 3;
    entry.appletCount = 1;
    entry.externalClassCount = 2;
    entry.notificationCount = 2;
    entry.mimeTypeCount = 1;
    return entry;
}

// Counts that promise more than the blobs hold, a MIME text without its terminator
// and ids that stop at a zero.
QByteArray shortRecordsModule()
{
    QVectorStream header;
    header.writeBytes(QByteArray(ModuleHeaderCountsOffset, '\0').constData(), ModuleHeaderCountsOffset);
    for (quint16 count : { 3, 4, 0, 9, 3 })
        header.writeUInt16(count);
    header.writeBytes(QByteArray(ModuleHeaderSize - ModuleHeaderCountsOffset - 10, '\0').constData(), ModuleHeaderSize - ModuleHeaderCountsOffset - 10);
    QVectorStream classes;
    for (quint32 id : { 5u, 0u, 6u })
        classes.writeUInt32(id);
    QVectorStream mimeTypes;
    mimeTypes.writeUInt32(quint32(1));
    mimeTypes.writeUInt32(quint32(2));
    mimeTypes.writeBytes("text/plain", 10);

    MifWriter writer;
    writer.addResource(ModuleType, HeaderId, header.data());
    writer.addResource(ModuleType, ClassesId, classes.data());
    writer.addResource(ModuleType, AppletsId, QByteArray(30, '\x11'));
    writer.addResource(ModuleType, NotifiersId, QByteArray(20, '\x22'));
    writer.addResource(ModuleType, MimeTypesId, mimeTypes.data());
    return writer.data();
}

// Several entries: overlap, a shared blob, a zero-size blob, another resource type.
QByteArray mixedContainer()
{
    MifWriter writer;
    writer.addBlob(QByteArray(ModuleHeaderSize, '\0'));
    writer.addBlob(QByteArray());
    writer.addBlob("shared");
    writer.addEntry(ModuleType, HeaderId, 2, 0);
    writer.addEntry(ModuleType, ClassesId, 0, 2);
    writer.addEntry(0x1234, 7, 0, 2);
    writer.addEntry(0x1234, 0, 2, 0);
    return writer.data();
}

bool save(const QDir& dir, const QString& name, const QByteArray& data)
{
    QFile file(dir.filePath(name));
    return file.open(QIODevice::WriteOnly) && file.write(data) == data.size();
}

} // namespace

int main(int argc, char** argv)
{
    QTextStream err(stderr);
    if (argc != 2) {
        err << "usage: mif-seed-generator FOLDER\n";
        return 2;
    }
    const QDir dir(QString::fromLocal8Bit(argv[1]));
    if (!dir.mkpath(".")) {
        err << "cannot create " << dir.path() << "\n";
        return 1;
    }

    MifWriter tiny;
    tiny.addResource(1, 1, "x");

    const bool saved = save(dir, "full-module.mif", MifWriter::moduleData(fullModule()))
        && save(dir, "empty-module.mif", MifWriter::moduleData(MifEntry()))
        && save(dir, "short-records.mif", shortRecordsModule())
        && save(dir, "mixed-container.mif", mixedContainer())
        && save(dir, "one-resource.mif", tiny.data())
        && save(dir, "no-entries.mif", MifWriter().data());
    if (!saved) {
        err << "cannot write the seeds to " << dir.path() << "\n";
        return 1;
    }
    return 0;
}
