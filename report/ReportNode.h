#pragma once

#include <QJsonValue>
#include <QString>
#include <QVector>

// One attribute of a report element: its name, the text the page shows, and, when the text
// is no plain rendering of it, the value machine output carries (a size in bytes behind
// "32.00 MB").
struct ReportAttribute
{
    QString name;
    QString text;
    QJsonValue value = QJsonValue::Undefined;
};

// One element of a report: its name, its attributes in the order the export writes them,
// and its child elements in document order.
struct ReportNode
{
    QString element;
    QVector<ReportAttribute> attributes;
    QVector<ReportNode> children;

    ReportNode() = default;
    explicit ReportNode(const QString& name)
        : element(name)
    {
    }

    // Appends an attribute; returns the node, so that a row's attributes chain.
    ReportNode& set(const QString& name, const QString& text, const QJsonValue& value = QJsonValue::Undefined)
    {
        attributes.append({name, text, value});
        return *this;
    }
    // Appends a child element and returns it. References to earlier children do not survive it.
    ReportNode& add(const QString& name)
    {
        children.append(ReportNode(name));
        return children.last();
    }
};
