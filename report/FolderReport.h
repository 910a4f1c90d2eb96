#pragma once

#include "Report.h"
#include "_DirectoryInfo.h"

// One directory level of a device: the "zant-folder" document, the folder's name and path,
// then an entry per sub-folder and per file in the device's order. Every entry has the same
// attributes (a folder's size and attributes are empty), so that every CSV line has the
// same fields.
class FolderReport
{
public:
    static Report build(const _DirectoryInfo& level);
};
