// Feeds arbitrary bytes to the name database reader as each of the three databases.
#include "NameDatabases.h"

#include <QBuffer>

#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    const QByteArray bytes = QByteArray::fromRawData(reinterpret_cast<const char*>(data), qsizetype(size));
    for (const char* element : {"class", "interface", "priviledge"}) {
        QBuffer buffer;
        buffer.setData(bytes);
        buffer.open(QIODevice::ReadOnly);

        QList<IdRecord> entries;
        const bool parsed = NameDatabases::readEntries(&buffer, QString::fromLatin1(element), entries);
        if (!parsed && !entries.isEmpty())
            abort();
        for (const IdRecord& e : entries) {
            if (e.id.isEmpty() || e.name.isEmpty())
                abort();
        }
    }
    return 0;
}
