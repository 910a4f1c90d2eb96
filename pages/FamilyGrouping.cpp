#include "FamilyGrouping.h"

#include "CITreeWidgetItem.h"

#include <QTreeWidget>
#include <QXmlStreamWriter>

QTreeWidgetItem* FamilyGrouping::findFamily(const QTreeWidget* tree, const QString& family)
{
    return tree->findItems(family, Qt::MatchFixedString, FamilyColumn).value(0);
}

QTreeWidgetItem* FamilyGrouping::findSubFamily(const QTreeWidgetItem* family, const QString& subFamily)
{
    for (int i = 0; i < family->childCount(); ++i) {
        if (family->child(i)->text(SubFamilyColumn) == subFamily)
            return family->child(i);
    }
    return nullptr;
}

QTreeWidgetItem* FamilyGrouping::addSubFamily(QTreeWidgetItem* family, const QString& subFamily)
{
    auto* item = new CITreeWidgetItem;
    item->setText(SubFamilyColumn, subFamily);
    family->addChild(item);
    return item;
}

void FamilyGrouping::writeFamilies(QXmlStreamWriter& xml, const QTreeWidget* tree,
                                   const QList<QPair<QString, int>>& classAttributes)
{
    for (int f = 0; f < tree->topLevelItemCount(); ++f) {
        const QTreeWidgetItem* family = tree->topLevelItem(f);
        xml.writeStartElement(QStringLiteral("family"));
        xml.writeAttribute(QStringLiteral("name"), family->text(FamilyColumn));
        for (int s = 0; s < family->childCount(); ++s) {
            const QTreeWidgetItem* subFamily = family->child(s);
            xml.writeStartElement(QStringLiteral("subfamily"));
            xml.writeAttribute(QStringLiteral("name"), subFamily->text(SubFamilyColumn));
            for (int c = 0; c < subFamily->childCount(); ++c) {
                xml.writeStartElement(QStringLiteral("class"));
                for (const auto& attribute : classAttributes)
                    xml.writeAttribute(attribute.first, subFamily->child(c)->text(attribute.second));
                xml.writeEndElement();
            }
            xml.writeEndElement();
        }
        xml.writeEndElement();
    }
}
