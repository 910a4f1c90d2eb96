#include "IdFormat.h"

namespace {

QString hexText(quint32 number, int digits)
{
    return QStringLiteral("0x") + QString::number(number, 16).toUpper().rightJustified(digits, QLatin1Char('0'));
}

int hexDigitValue(QChar c)
{
    const ushort u = c.unicode();
    if (u >= '0' && u <= '9')
        return u - '0';
    if (u >= 'A' && u <= 'F')
        return u - 'A' + 10;
    if (u >= 'a' && u <= 'f')
        return u - 'a' + 10;
    return -1;
}

bool isIdPrefixChar(QChar c)
{
    const ushort u = c.unicode();
    return u == ' ' || u == '\t' || u == '0' || u == 'x' || u == 'X';
}

} // namespace

QString formatId(quint32 number)
{
    return hexText(number, 8);
}

QString formatShortId(quint16 number)
{
    return hexText(number, 4);
}

quint32 parseHexId(const QString& text)
{
    int i = 0;
    while (i < text.size() && isIdPrefixChar(text.at(i)))
        ++i;

    quint32 value = 0;
    for (; i < text.size(); ++i) {
        const int digit = hexDigitValue(text.at(i));
        if (digit < 0)
            break;
        value = (value << 4) | quint32(digit);
    }
    return value;
}

QString normalizeIdText(const QString& text)
{
    QString result = text;
    for (QChar& c : result) {
        const ushort u = c.unicode();
        if (u == 'X')
            c = QLatin1Char('x');
        else if (u >= 'a' && u <= 'f')
            c = QChar(ushort(u - 'a' + 'A'));
    }
    return result;
}
