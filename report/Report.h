#pragma once

#include "ReportNode.h"

#include <QByteArray>
#include <QString>
#include <QStringList>
#include <QVector>

// A document the program writes: a page's export, a tool's result, a command line answer.
// Built once from records or table cells, it is written as XML (the export format: the
// document type, then the elements indented by one space per level, every value an
// attribute), as JSON (each element an object of its attributes, children grouped in
// arrays by element name) or as CSV (one line per record element, its ancestors'
// attributes first).
class Report
{
public:
    enum class Format
    {
        Xml,
        Json,
        Csv
    };

    // recordElement names the elements that are the CSV lines.
    Report(const QString& documentType, const QString& rootElement, const QString& recordElement);

    ReportNode& root() { return m_root; }
    const ReportNode& root() const { return m_root; }

    QString toXml() const;
    QByteArray toJson() const;
    QByteArray toCsv() const;
    QByteArray write(Format format) const;

    // "xml", "json" or "csv"; false for anything else.
    static bool parseFormat(const QString& name, Format* format);

    // Rows of cells sorted as a table sorts them by one column: by the cell's text without
    // regard to letter case, equal cells keeping their order.
    static void sortRows(QVector<QStringList>& rows, int column);

private:
    QString m_documentType;
    QString m_recordElement;
    ReportNode m_root;
};
