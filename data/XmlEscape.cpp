#include "XmlEscape.h"

#include <algorithm>

namespace {

const QLatin1String Introducer("{U+");
constexpr qsizetype EscapeLength = 8; // "{U+XXXX}"

bool carried(QStringView text, qsizetype i)
{
    const char16_t c = text[i].unicode();
    if (c < 0x20)
        return c == u'\t' || c == u'\n' || c == u'\r';
    if (c == 0xFFFE || c == 0xFFFF)
        return false;
    if (QChar::isHighSurrogate(c))
        return i + 1 < text.size() && QChar::isLowSurrogate(text[i + 1].unicode());
    if (QChar::isLowSurrogate(c))
        return i > 0 && QChar::isHighSurrogate(text[i - 1].unicode());
    return c != u'{' || !text.mid(i).startsWith(Introducer);
}

bool isHexDigit(QChar c)
{
    return (c >= u'0' && c <= u'9') || (c >= u'A' && c <= u'F');
}

} // namespace

QString XmlEscape::escaped(QStringView text)
{
    qsizetype i = 0;
    while (i < text.size() && carried(text, i))
        ++i;
    if (i == text.size())
        return text.toString();
    QString out = text.left(i).toString();
    for (; i < text.size(); ++i) {
        if (carried(text, i))
            out += text[i];
        else
            out += QStringLiteral("{U+%1}").arg(QString::number(text[i].unicode(), 16).toUpper().rightJustified(4, u'0'));
    }
    return out;
}

QString XmlEscape::unescaped(QStringView text)
{
    qsizetype from = text.indexOf(Introducer);
    if (from < 0)
        return text.toString();
    QString out;
    qsizetype done = 0;
    for (; from >= 0; from = text.indexOf(Introducer, from)) {
        if (from + EscapeLength <= text.size() && text[from + EscapeLength - 1] == u'}'
            && std::all_of(text.begin() + from + 3, text.begin() + from + 7, isHexDigit)) {
            out += text.mid(done, from - done);
            out += QChar(char16_t(text.mid(from + 3, 4).toUInt(nullptr, 16)));
            done = from + EscapeLength;
            from = done;
        } else {
            from += 1;
        }
    }
    out += text.mid(done);
    return out;
}
