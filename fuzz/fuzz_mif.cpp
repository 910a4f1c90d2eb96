// MIF reader: any bytes must be refused or read without fault, and a decoded module
// must survive the writer unchanged.
#include "MifEntry.h"
#include "MifFormat.h"
#include "MifReader.h"
#include "MifWriter.h"

#include <cstdint>
#include <cstdlib>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    MifReader reader;
    if (!reader.readData(QByteArray::fromRawData(reinterpret_cast<const char*>(data), qsizetype(size))))
        return 0;

    MifEntry entry;
    if (!reader.decodeModule(entry))
        return 0;

    MifReader again;
    MifEntry decoded;
    if (!again.readData(MifWriter::moduleData(entry)) || !again.decodeModule(decoded) || !(decoded == entry))
        std::abort();
    return 0;
}
