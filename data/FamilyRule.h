#pragma once

#include <QString>

// Which classes share a family and a sub-family: families match without regard to letter
// case, sub-families exactly. The family tree, the level page and the documents of both
// group classes by this one rule, looking groups up by these keys.
class FamilyRule
{
public:
    // Equal for exactly the family names that are one family.
    static QString familyKey(const QString& family);
    // Equal for exactly the sub-family names, within one family, that are one sub-family.
    static QString subFamilyKey(const QString& subFamily);
};
