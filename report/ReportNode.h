#pragma once

#include <QPair>
#include <QString>
#include <QVector>

// One element of a report: its name, its attributes in the order they are written, and its
// child elements in document order.
struct ReportNode
{
    QString element;
    QVector<QPair<QString, QString>> attributes;
    QVector<ReportNode> children;

    ReportNode() = default;
    explicit ReportNode(const QString& name)
        : element(name)
    {
    }

    // Appends an attribute; returns the node, so that a row's attributes chain.
    ReportNode& set(const QString& name, const QString& value)
    {
        attributes.append(qMakePair(name, value));
        return *this;
    }
    // Appends a child element and returns it. References to earlier children do not survive it.
    ReportNode& add(const QString& name)
    {
        children.append(ReportNode(name));
        return children.last();
    }
};
