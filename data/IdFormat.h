#pragma once

#include <QString>

// Every id the program shows or writes has one text form: "0x" and upper-case hex digits.

// "0x" and eight upper-case hexadecimal digits, e.g. 0x000000FF.
QString formatId(quint32 number);

// "0x" and four upper-case hexadecimal digits, e.g. 0x00FF.
QString formatShortId(quint16 number);

// Reads an id text leniently: leading blanks, tabs, '0', 'x' and 'X' are skipped, then hex
// digits are taken up to the first other character. Wraps past 32 bits; 0 when no digits.
quint32 parseHexId(const QString& text);

// Brings an id text read from a file to the form formatId writes ('X' to 'x', a-f to A-F)
// without validating or padding it.
QString normalizeIdText(const QString& text);
