#include "_DirectoryInfo.h"

#include "SharedPointees.h"

bool _DirectoryInfo::operator==(const _DirectoryInfo& o) const
{
    return m_name == o.m_name && m_path == o.m_path && samePointees(files, o.files) && samePointees(directories, o.directories);
}
