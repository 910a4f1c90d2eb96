#pragma once

#include <QSharedPointer>

#include <algorithm>

// Lists of shared records compare by the records they point to.
template <typename List>
bool samePointees(const List& a, const List& b)
{
    using Pointer = typename List::value_type;
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](const Pointer& x, const Pointer& y) { return x && y ? *x == *y : x == y; });
}
