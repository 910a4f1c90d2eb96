#pragma once

#include <QString>
#include <QTableWidgetItem>

// A table cell that sorts by item type, then by its display text without regard to letter
// case. Ids sort as text too: no cell is ever compared as a number.
class CITableWidgetItem final : public QTableWidgetItem
{
public:
    explicit CITableWidgetItem(const QString& text, int type = Type);

    void setData(int role, const QVariant& value) override;
    bool operator<(const QTableWidgetItem& other) const override;

private:
    // The display text in one letter case, kept with the text: folding both texts on every
    // comparison costs most of the time of sorting a large table.
    QString m_sortKey;
};
