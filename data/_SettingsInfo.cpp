#include "_SettingsInfo.h"

#include "SharedPointees.h"

bool _SettingsInfo::operator==(const _SettingsInfo& o) const
{
    return m_name == o.m_name && m_path == o.m_path && values == o.values && samePointees(children, o.children);
}
