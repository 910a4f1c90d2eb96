#pragma once

#include <QString>
#include <QStringView>

// The rule every XML document we write follows for the characters XML 1.0 cannot carry
// (controls other than tab, line feed and carriage return, U+FFFE, U+FFFF and lone
// surrogates): each is written as "{U+XXXX}", its UTF-16 code unit in four upper-case hex
// digits, and a "{" that starts the text "{U+" is written "{U+007B}" so that the rule can
// be undone exactly. Everything else, which is nearly every text, stays as it is. A
// writer would otherwise drop such characters without a word, and an exported path
// could name another file. Our readers of these documents (scan files, level files)
// undo the rule; JSON and CSV carry the characters themselves.
class XmlEscape
{
public:
    static QString escaped(QStringView text);
    static QString unescaped(QStringView text);
};
