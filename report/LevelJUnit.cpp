#include "LevelJUnit.h"

#include "XmlEscape.h"

#include <QXmlStreamWriter>

QByteArray LevelJUnit::write(const FamilyReport::Families& families, const QString& level, const QString& device)
{
    int tests = 0;
    int failures = 0;
    for (const FamilyReport::Family& family : families) {
        for (const FamilyReport::SubFamily& subFamily : family.subFamilies) {
            for (const QStringList& cells : subFamily.classes) {
                ++tests;
                failures += cells.value(FamilyReport::ResultColumn) == QLatin1String("Found") ? 0 : 1;
            }
        }
    }
    QByteArray bytes;
    QXmlStreamWriter xml(&bytes);
    xml.setAutoFormatting(true);
    xml.writeStartDocument();
    xml.writeStartElement(QStringLiteral("testsuites"));
    xml.writeAttribute(QStringLiteral("name"), XmlEscape::escaped(QStringLiteral("%1 on %2").arg(level, device)));
    xml.writeAttribute(QStringLiteral("tests"), QString::number(tests));
    xml.writeAttribute(QStringLiteral("failures"), QString::number(failures));
    for (const FamilyReport::Family& family : families) {
        int familyTests = 0;
        int familyFailures = 0;
        for (const FamilyReport::SubFamily& subFamily : family.subFamilies) {
            familyTests += int(subFamily.classes.size());
            for (const QStringList& cells : subFamily.classes)
                familyFailures += cells.value(FamilyReport::ResultColumn) == QLatin1String("Found") ? 0 : 1;
        }
        xml.writeStartElement(QStringLiteral("testsuite"));
        xml.writeAttribute(QStringLiteral("name"), XmlEscape::escaped(family.name));
        xml.writeAttribute(QStringLiteral("tests"), QString::number(familyTests));
        xml.writeAttribute(QStringLiteral("failures"), QString::number(familyFailures));
        xml.writeAttribute(QStringLiteral("errors"), QStringLiteral("0"));
        for (const FamilyReport::SubFamily& subFamily : family.subFamilies) {
            for (const QStringList& cells : subFamily.classes) {
                const QString name = cells.value(FamilyReport::NameColumn);
                const QString id = cells.value(FamilyReport::IdColumn);
                xml.writeStartElement(QStringLiteral("testcase"));
                xml.writeAttribute(QStringLiteral("name"), XmlEscape::escaped(QStringLiteral("%1 (%2)").arg(name, id)));
                xml.writeAttribute(QStringLiteral("classname"), XmlEscape::escaped(family.name + QLatin1Char('.') + subFamily.name));
                if (cells.value(FamilyReport::ResultColumn) != QLatin1String("Found")) {
                    xml.writeStartElement(QStringLiteral("failure"));
                    xml.writeAttribute(QStringLiteral("type"), QStringLiteral("Not Found"));
                    xml.writeAttribute(QStringLiteral("message"),
                                       XmlEscape::escaped(QStringLiteral("class %1 (%2), family %3, sub-family %4: Not Found")
                                                              .arg(name, id, family.name, subFamily.name)));
                    xml.writeEndElement();
                }
                xml.writeEndElement();
            }
        }
        xml.writeEndElement();
    }
    xml.writeEndDocument();
    return bytes;
}
