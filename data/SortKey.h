#pragma once

#include <QString>

// The key every list of the program sorts a text by: the text without regard to letter case
// (ids and numbers compare as text). Pages, trees and the documents of the command line tool
// all order by it, so that what a page shows and what the tool writes agree.
QString sortKey(const QString& text);
