#include "XmlReport.h"

XmlReport::XmlReport(const QString& documentType)
    : m_writer(&m_text)
{
    // Formatting starts after the declaration: before it, the writer would open the
    // document with an empty line.
    m_writer.writeDTD(QStringLiteral("<!DOCTYPE ") + documentType + QStringLiteral(">\n"));
    m_writer.setAutoFormatting(true);
    m_writer.setAutoFormattingIndent(1);
}

QXmlStreamWriter& XmlReport::writer()
{
    return m_writer;
}

QString XmlReport::text()
{
    m_writer.writeEndDocument();
    return m_text;
}
