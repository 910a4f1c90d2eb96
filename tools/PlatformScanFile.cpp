#include "PlatformScanFile.h"

#include "IdFormat.h"
#include "XmlReadPolicy.h"

#include <QDomDocument>
#include <QFileInfo>

QString PlatformScanFile::comparableId(const QString& value)
{
    QStringView digits = QStringView(value).trimmed();
    if (digits.startsWith(QLatin1String("0x"), Qt::CaseInsensitive))
        digits = digits.mid(2);
    // Unsigned, so ids of 0x80000000 and above are brought to the same form as the others.
    bool ok = false;
    const uint number = digits.toUInt(&ok, 16);
    return ok && !digits.isEmpty() && !digits.startsWith(QLatin1Char('+')) ? formatId(number) : value;
}

PlatformScanFile PlatformScanFile::read(const QString& path)
{
    PlatformScanFile file;
    QDomDocument document;
    XmlReadPolicy policy(XmlReadPolicy::DatabaseFileBytes);
    if (!policy.readFile(path, document))
        return file;

    const QDomElement root = document.documentElement();
    file.header = root.elementsByTagName(QStringLiteral("ZTOVERSION"))
                      .item(0)
                      .toElement()
                      .attribute(QStringLiteral("version"));
    if (file.header.isEmpty())
        file.header = QFileInfo(path).baseName();

    QDomNodeList lists = root.elementsByTagName(QStringLiteral("ZantHeaderDataList"));
    if (lists.isEmpty())
        lists = root.elementsByTagName(QStringLiteral("classes"));
    if (lists.isEmpty()) {
        file.status = WrongFormat;
        return file;
    }
    file.status = Read;
    for (int i = 0; i < lists.size(); ++i) {
        for (QDomElement e = lists.item(i).firstChildElement(QStringLiteral("ZTOId")); !e.isNull();
             e = e.nextSiblingElement(QStringLiteral("ZTOId"))) {
            file.entries.append(
                {e.attribute(QStringLiteral("name")), comparableId(e.attribute(QStringLiteral("value"))),
                    e.attribute(QStringLiteral("family")), e.attribute(QStringLiteral("subfamily"))});
        }
    }
    return file;
}
