#include "FamilyRule.h"

QString FamilyRule::familyKey(const QString& family)
{
    return family.toCaseFolded();
}

QString FamilyRule::subFamilyKey(const QString& subFamily)
{
    return subFamily;
}
