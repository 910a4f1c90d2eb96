// Feeds arbitrary bytes to the level definition reader, with and without an id map.
#include "LevelDefinition.h"

#include <QBuffer>

#include <cstdint>
#include <cstdlib>

namespace {

const IdRecordMap& deviceClasses()
{
    static const IdRecordMap map{
        {QStringLiteral("0x01011001"), IdRecord{QStringLiteral("0x01011001"), QStringLiteral("Heap"), QStringLiteral("Kernel"), QStringLiteral("Memory"), QString(), QString(), true}},
        {QStringLiteral("0x0000ABCD"), IdRecord{QStringLiteral("0x0000ABCD"), QString(), QStringLiteral("Ignored"), QString(), QString(), QString(), true}},
    };
    return map;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    const QByteArray bytes = QByteArray::fromRawData(reinterpret_cast<const char*>(data), qsizetype(size));
    for (const IdRecordMap* map : {static_cast<const IdRecordMap*>(nullptr), &deviceClasses()}) {
        QBuffer buffer;
        buffer.setData(bytes);
        buffer.open(QIODevice::ReadOnly);

        LevelDefinition level;
        level.setIdMap(map);
        const bool loaded = level.load(&buffer);
        if (!loaded && !level.records().isEmpty())
            abort();
        for (const IdRecord& r : level.records()) {
            if (r.id.isEmpty())
                abort();
        }
    }
    return 0;
}
