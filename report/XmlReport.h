#pragma once

#include <QString>
#include <QXmlStreamWriter>

// A page's export document: the document type declaration, then the elements indented by
// one space per level, every value an attribute, no XML declaration. Attributes come out
// in the order they are written; a DOM document would shuffle them on every run. Every
// value is written through XmlEscape, whose rule keeps characters XML cannot carry.
class XmlReport
{
public:
    explicit XmlReport(const QString& documentType);
    XmlReport(const XmlReport&) = delete;
    XmlReport& operator=(const XmlReport&) = delete;

    QXmlStreamWriter& writer();
    // Closes the elements still open and returns the document.
    QString text();

private:
    QString m_text;
    QXmlStreamWriter m_writer;
};
