#include "SortKey.h"

#include <algorithm>

QString sortKey(const QString& text)
{
    return text.toCaseFolded();
}

void sortByKeys(QVector<int>& order, const QVector<QString>& keys, Qt::SortOrder direction)
{
    if (direction == Qt::AscendingOrder)
        std::stable_sort(order.begin(), order.end(), [&keys](int a, int b) { return keys.at(a) < keys.at(b); });
    else
        std::stable_sort(order.begin(), order.end(), [&keys](int a, int b) { return keys.at(b) < keys.at(a); });
}
