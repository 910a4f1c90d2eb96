#include "XmlReadPolicy.h"

#include <QDomDocument>
#include <QFile>
#include <QXmlStreamReader>

#include <algorithm>

namespace {

constexpr qint64 ChunkBytes = qint64(1) << 20;

} // namespace

bool XmlReadPolicy::fail(const QString& message)
{
    m_error = message;
    return false;
}

bool XmlReadPolicy::failTooLarge(const QString& source)
{
    return fail(QStringLiteral("%1: larger than %2 bytes").arg(source).arg(m_maxFileBytes));
}

bool XmlReadPolicy::readFile(const QString& path, QDomDocument& document)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return fail(QStringLiteral("cannot open %1: %2").arg(path, file.errorString()));
    return read(&file, document);
}

bool XmlReadPolicy::read(QIODevice* device, QDomDocument& document)
{
    const QString source = sourceName(device);
    QByteArray xml;
    return readLimited(device, source, xml) && parse(xml, source, document);
}

bool XmlReadPolicy::readLimited(QIODevice* device, const QString& source, QByteArray& xml)
{
    if (!device->isSequential()) {
        const qint64 remaining = device->size() - device->pos();
        if (remaining > m_maxFileBytes)
            return failTooLarge(source);
        xml.reserve(qsizetype(remaining));
    }
    // A pipe's size is unknown: read no more than one byte past the limit.
    while (xml.size() <= m_maxFileBytes) {
        const QByteArray chunk = device->read(std::min(ChunkBytes, m_maxFileBytes + 1 - xml.size()));
        if (chunk.isEmpty())
            break;
        xml += chunk;
    }
    if (xml.size() > m_maxFileBytes)
        return failTooLarge(source);
    return true;
}

bool XmlReadPolicy::parse(const QByteArray& xml, const QString& source, QDomDocument& document)
{
    m_error.clear();
    if (xml.size() > m_maxFileBytes)
        return failTooLarge(source);
    if (!check(xml, source))
        return false;
    QString message;
    int line = 0;
    if (!document.setContent(xml, &message, &line))
        return fail(QStringLiteral("%1 line %2: %3").arg(source).arg(line).arg(message));
    return true;
}

bool XmlReadPolicy::readFileBytes(const QString& path, QByteArray& xml)
{
    m_error.clear();
    m_depth = 0;
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return fail(QStringLiteral("cannot open %1: %2").arg(path, file.errorString()));
    return readLimited(&file, path, xml);
}

bool XmlReadPolicy::readBytes(QIODevice* device, QByteArray& xml)
{
    m_error.clear();
    m_depth = 0;
    return readLimited(device, sourceName(device), xml);
}

QString XmlReadPolicy::sourceName(const QIODevice* device)
{
    const auto* file = qobject_cast<const QFileDevice*>(device);
    return file ? file->fileName() : QStringLiteral("XML input");
}

bool XmlReadPolicy::check(const QByteArray& xml, const QString& source)
{
    QXmlStreamReader reader(xml);
    // As the DOM parse reads it: an undeclared prefix is not a breach.
    reader.setNamespaceProcessing(false);
    m_depth = 0;
    while (!reader.atEnd()) {
        reader.readNext();
        if (!checkToken(reader, source))
            return false;
    }
    return true;
}

bool XmlReadPolicy::checkToken(const QXmlStreamReader& reader, const QString& source)
{
    switch (reader.tokenType()) {
    case QXmlStreamReader::DTD:
        // Entity declarations are what makes expansion blow up; none of our files
        // needs a DTD, and our own exports write only a bare one.
        if (!reader.dtdSystemId().isEmpty() || !reader.dtdPublicId().isEmpty()
            || reader.text().contains(QLatin1Char('[')))
            return fail(QStringLiteral("%1: a DTD is not accepted (only a bare <!DOCTYPE name>)").arg(source));
        break;
    case QXmlStreamReader::StartElement:
        if (++m_depth > MaxDepth)
            return fail(QStringLiteral("%1: nesting deeper than %2 levels").arg(source).arg(MaxDepth));
        for (const QXmlStreamAttribute& attribute : reader.attributes()) {
            if (attribute.value().size() > MaxAttributeChars)
                return fail(QStringLiteral("%1: attribute \"%2\" on line %3 longer than %4 characters")
                                .arg(source, attribute.qualifiedName().toString())
                                .arg(reader.lineNumber())
                                .arg(MaxAttributeChars));
        }
        break;
    case QXmlStreamReader::EndElement:
        --m_depth;
        break;
    default:
        break;
    }
    return true;
}
