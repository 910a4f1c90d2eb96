#include "PlatformScanFile.h"

#include "IdFormat.h"
#include "XmlEscape.h"
#include "XmlReadPolicy.h"

#include <QFileInfo>
#include <QXmlStreamReader>

#include <algorithm>

QString PlatformScanFile::comparableId(const QString& value)
{
    // Our own scans write every id in the shown form already: no number to build.
    if (value.size() == 10 && value.startsWith(QLatin1String("0x"))
        && std::all_of(value.begin() + 2, value.end(), [](QChar c) {
               return (c >= u'0' && c <= u'9') || (c >= u'A' && c <= u'F');
           }))
        return value;
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
    QByteArray bytes;
    XmlReadPolicy policy(XmlReadPolicy::DatabaseFileBytes);
    if (!policy.readFileBytes(path, bytes)) {
        file.errorString = policy.errorString();
        return file;
    }

    // Streamed, not a DOM: the entries of each kind of container below the root, kept apart
    // since "classes" counts only in a file without "ZantHeaderDataList".
    enum Container
    {
        None = -1,
        HeaderDataList,
        Classes
    };
    QVector<Entry> listed[2];
    bool found[2] = {false, false};
    bool versionRead = false;
    QVector<int> open; // the container kind of each open element
    // Neighbouring entries mostly share their family texts (and unknown classes their name):
    // one string each, shared, instead of three new ones per entry.
    QString lastName, lastFamily, lastSubFamily;
    QXmlStreamReader xml(bytes);
    while (!xml.atEnd()) {
        const QXmlStreamReader::TokenType token = xml.readNext();
        if (!policy.checkToken(xml, path)) {
            file.errorString = policy.errorString();
            return file;
        }
        if (token == QXmlStreamReader::EndElement) {
            open.removeLast();
            continue;
        }
        if (token != QXmlStreamReader::StartElement)
            continue;
        int kind = None;
        if (!open.isEmpty()) {
            const QStringView name = xml.name();
            if (name == u"ZantHeaderDataList") {
                kind = HeaderDataList;
            } else if (name == u"classes") {
                kind = Classes;
            } else if (name == u"ZTOVERSION" && !versionRead) {
                versionRead = true;
                file.header = XmlEscape::unescaped(xml.attributes().value(QLatin1String("version")));
            } else if (name == u"ZTOId" && open.last() != None) {
                const QXmlStreamAttributes attributes = xml.attributes();
                const auto text = [&attributes](const char* attribute, QString& last) {
                    const QStringView value = attributes.value(QLatin1String(attribute));
                    if (value != last)
                        last = XmlEscape::unescaped(value);
                    return last;
                };
                listed[open.last()].append({text("name", lastName),
                    comparableId(XmlEscape::unescaped(attributes.value(QLatin1String("value")))),
                    text("family", lastFamily), text("subfamily", lastSubFamily)});
            }
        }
        if (kind != None)
            found[kind] = true;
        open.append(kind);
    }
    if (xml.hasError()) {
        file.errorString = QStringLiteral("%1 line %2: %3").arg(path).arg(xml.lineNumber()).arg(xml.errorString());
        return file;
    }

    if (file.header.isEmpty())
        file.header = QFileInfo(path).baseName();
    if (!found[HeaderDataList] && !found[Classes]) {
        file.status = WrongFormat;
        return file;
    }
    file.status = Read;
    file.entries = std::move(listed[found[HeaderDataList] ? HeaderDataList : Classes]);
    return file;
}
