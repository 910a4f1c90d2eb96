#pragma once

#include <QString>
#include <QVector>
#include <Qt>

// The key every list of the program sorts a text by: the text without regard to letter case
// (ids and numbers compare as text). Pages, trees and the documents of the command line tool
// all order by it, so that what a page shows and what the tool writes agree.
QString sortKey(const QString& text);

// Orders the indexes of order by their keys, stably in both directions: indexes with equal
// keys keep the order they had, as a table re-sorted by another column keeps its ties.
void sortByKeys(QVector<int>& order, const QVector<QString>& keys, Qt::SortOrder direction);
