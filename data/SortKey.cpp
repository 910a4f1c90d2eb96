#include "SortKey.h"

QString sortKey(const QString& text)
{
    return text.toCaseFolded();
}
