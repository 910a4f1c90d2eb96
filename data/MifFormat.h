#pragma once

#include <QtGlobal>

// Layout of a MIF file: a resource container whose module resources have type 0x5000.
// All numbers are little-endian.
namespace MifFormat {

// File header: u8, u8, u16, u16, u16 entry count, then six u32 of which the fourth is the blob count.
constexpr int FileHeaderSize = 32;
constexpr int EntryCountOffset = 6;
constexpr int BlobCountOffset = 20;
constexpr int BlobCountField = 3; // index among the six 32-bit values
constexpr int HeaderWordCount = 6;
// One entry of the table; it covers first id .. first id + span, both included.
struct Entry
{
    quint16 type = 0;
    quint16 firstId = 0;
    quint16 span = 0;
    quint16 firstBlob = 0;
};
constexpr int EntrySize = 8;
constexpr int OffsetSize = 4;
constexpr int MaxEntries = 0xFFFF;
constexpr int MaxId = 0xFFFF;

constexpr quint16 ModuleType = 0x5000;
enum ModuleResource : quint16 {
    HeaderId = 0,
    ClassesId = 1,
    AppletsId = 2,
    ExternalClassesId = 3,
    NotifiersId = 4,
    MimeTypesId = 5
};

// Module header: u32, u32, 16 bytes, u16, the five u16 counts, u16, padding to 40 bytes.
constexpr int ModuleHeaderSize = 40;
constexpr int ModuleHeaderCountsOffset = 26;
constexpr int AppletRecordSize = 20;

} // namespace MifFormat
