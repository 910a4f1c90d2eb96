#pragma once

#include "ReportField.h"
#include "ReportNode.h"

#include <QByteArray>
#include <QHash>
#include <QJsonObject>
#include <QString>
#include <QStringList>
#include <QVector>

class QXmlStreamWriter;

// A document the program writes: a page's export, a tool's result, a command line answer.
// Built once from records or table cells, it is written as XML (the export format: the
// document type, then the elements indented by one space per level, every value an
// attribute), as JSON (one object naming its schema and version, each element an object
// of its fields, children grouped in arrays by element name) or as CSV (one line per
// record element, its ancestors' columns first).
//
// A builder declares the fields of its elements once; every writer checks each declared
// element against its declaration, so that a record with a field too many or too few is a
// fault the first test run shows, not a shifted CSV column.
class Report
{
public:
    enum class Format
    {
        Xml,
        Json,
        Csv
    };
    // Text cells a spreadsheet would evaluate (starting with =, +, -, @, tab or CR) get a
    // leading ' so that it shows them as text; Raw keeps them as the device said.
    enum class CsvCells
    {
        Guarded,
        Raw
    };
    // The version of every JSON document's shape; raised when a field is renamed or removed.
    static constexpr int SchemaVersion = 1;

    // recordElement names the elements that are the CSV lines.
    Report(const QString& documentType, const QString& rootElement, const QString& recordElement);

    ReportNode& root() { return m_root; }
    const ReportNode& root() const { return m_root; }

    // The fields of every element of that name, in the page's column order.
    void declare(const QString& element, const QVector<ReportField>& fields);
    // The device the document describes, written in JSON as "identity": {"id", "name"}.
    void setDevice(const QString& id, const QString& name);

    // "delvix." and the document type without its "zant-" prefix ("delvix.modules").
    QString schemaName() const;

    QString toXml() const;
    QByteArray toJson() const;
    // The JSON document as an object, for documents that hold others (a snapshot).
    QJsonObject toJsonObject() const;
    QByteArray toCsv(CsvCells cells = CsvCells::Guarded) const;
    QByteArray write(Format format, CsvCells cells = CsvCells::Guarded) const;

    // "xml", "json" or "csv"; false for anything else.
    static bool parseFormat(const QString& name, Format* format);

    // Rows of cells sorted as a table sorts them by one column: by the cell's text without
    // regard to letter case, equal cells keeping their order.
    static void sortRows(QVector<QStringList>& rows, int column);

private:
    // Stops the program when node's attributes are not its declared fields.
    void check(const ReportNode& node) const;
    // The node's fields as JSON values, declared ones in their declared order.
    QVector<QPair<QString, QJsonValue>> jsonFields(const ReportNode& node) const;
    QJsonObject jsonObject(const ReportNode& node) const;
    // Writes the node as indented JSON, keys in the fields' order (QJsonObject would sort them).
    void appendJson(QByteArray& out, const ReportNode& node, int depth, const QVector<QPair<QString, QJsonValue>>& head) const;
    // "schema", "version" and, when known, "identity".
    QVector<QPair<QString, QJsonValue>> header() const;
    void writeXml(QXmlStreamWriter& xml, const ReportNode& node) const;
    void writeCsv(QByteArray& csv, const ReportNode& node, QStringList& names, QStringList& values, bool& headerWritten,
                  CsvCells cells) const;
    void csvColumns(const ReportNode& node, QStringList& names, QStringList& values, CsvCells cells) const;

    QString m_documentType;
    QString m_recordElement;
    QString m_deviceId;
    QString m_deviceName;
    QHash<QString, QVector<ReportField>> m_fields;
    ReportNode m_root;
};
