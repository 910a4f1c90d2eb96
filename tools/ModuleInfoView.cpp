#include "ModuleInfoView.h"

#include "IdFormat.h"
#include "MifReader.h"
#include "NameLibrary.h"
#include "XmlReport.h"

#include <QFileInfo>
#include <QHeaderView>

namespace {

// Rows the header measures when it fits a column to its contents: a module with thousands
// of classes would otherwise cost a measurement of every row.
constexpr int ResizeSampleRows = 100;

struct NamedClass
{
    QString id;
    QString name;
    QString family;
    QString subFamily;
};

// An id the class database does not know is named "not found", "unknown", "unknown".
NamedClass namedClass(quint32 id)
{
    NamedClass named;
    lookupClass(id, named.id, named.name, named.family, named.subFamily);
    return named;
}

// One tab of the view and its part of the export: a row's cells are also the attributes
// of the row's element, in the same order.
struct Section
{
    QString element;
    QString item;
    QStringList attributes;
    int numberColumn = -1; // shown aligned right
    QVector<QStringList> rows;
};

const QStringList ClassAttributes = {"name", "id", "family", "subfamily"};

Section classSection(const QString& element, const QString& item, const QVector<quint32>& ids)
{
    Section section{element, item, ClassAttributes, -1, {}};
    section.rows.reserve(ids.size());
    for (const quint32 id : ids) {
        const NamedClass named = namedClass(id);
        section.rows.append({named.name, named.id, named.family, named.subFamily});
    }
    return section;
}

Section appletSection(const QVector<MifApplet>& applets)
{
    Section section{"applets", "applet", ClassAttributes + QStringList{"baseid", "apptype", "host", "privset", "flags"},
                    4, {}};
    for (const MifApplet& applet : applets) {
        const NamedClass named = namedClass(applet.classId);
        section.rows.append({named.name, named.id, named.family, named.subFamily, QString::number(applet.baseId),
                             formatShortId(applet.appType), formatId(applet.host), formatShortId(applet.privSet),
                             formatShortId(applet.flags)});
    }
    return section;
}

Section notifierSection(const QVector<MifNotifier>& notifiers)
{
    Section section{"notifiers", "notifier",
                    {"typename", "typeid", "typefamily", "typesubfamily", "notifiername", "notifierid",
                     "notifierfamily", "notifiersubfamily", "mask"},
                    -1, {}};
    for (const MifNotifier& notifier : notifiers) {
        const NamedClass type = namedClass(notifier.typeId);
        const NamedClass named = namedClass(notifier.notifierId);
        section.rows.append({type.name, type.id, type.family, type.subFamily, named.name, named.id, named.family,
                             named.subFamily, formatId(notifier.mask)});
    }
    return section;
}

Section mimeTypeSection(const QVector<MifMimeType>& mimeTypes)
{
    Section section{"mimetypes", "mimetype",
                    {"value", "handlerid", "handlername", "handlerfamily", "handlersubfamily", "baseid", "basename",
                     "basefamily", "basesubfamily"},
                    -1, {}};
    for (const MifMimeType& mimeType : mimeTypes) {
        const NamedClass handler = namedClass(mimeType.handlerClassId);
        const NamedClass base = namedClass(mimeType.baseClassId);
        section.rows.append({mimeType.mimeType, handler.id, handler.name, handler.family, handler.subFamily, base.id,
                             base.name, base.family, base.subFamily});
    }
    return section;
}

// In the order of the tabs and of the export.
QVector<Section> sectionsOf(const MifEntry& entry)
{
    return {classSection("classes", "class", entry.classes), appletSection(entry.applets),
            classSection("externalClasses", "externalClass", entry.externalClasses),
            notifierSection(entry.notifiers), mimeTypeSection(entry.mimeTypes)};
}

void fillTable(QTableWidget* table, const Section& section)
{
    table->clearContents();
    table->setRowCount(0);
    table->setRowCount(int(section.rows.size()));
    for (int row = 0; row < section.rows.size(); ++row) {
        const QStringList& cells = section.rows.at(row);
        for (int column = 0; column < cells.size(); ++column) {
            auto* item = new QTableWidgetItem(cells.at(column));
            if (column == section.numberColumn)
                item->setTextAlignment(Qt::AlignRight | Qt::AlignVCenter);
            table->setItem(row, column, item);
        }
    }
    table->resizeColumnsToContents();
}

} // namespace

ModuleInfoView::ModuleInfoView(QWidget* parent)
    : QWidget(parent)
{
    initializeLibrary();
    setupUi(this);
    for (QTableWidget* table : {_classIDTable, _appletTable, _externalClassesTable, _notifiersTable, _mimeTypeTable}) {
        table->verticalHeader()->setSectionResizeMode(QHeaderView::Fixed);
        table->horizontalHeader()->setResizeContentsPrecision(ResizeSampleRows);
    }
}

bool ModuleInfoView::loadMifFile(const QString& path)
{
    MifReader reader;
    if (!reader.readFile(path))
        return false;
    if (reader.decodeModule(m_entry)) {
        m_entry.fileName = QFileInfo(path).fileName();
        m_entry.filePath = path;
        refresh();
    }
    return true;
}

bool ModuleInfoView::setMifEntry(const MifEntry& entry)
{
    m_entry = entry;
    refresh();
    return true;
}

void ModuleInfoView::refresh()
{
    _classCount->setText(QString::number(m_entry.classCount));
    _appletCount->setText(QString::number(m_entry.appletCount));
    _extClassCount->setText(QString::number(m_entry.externalClassCount));
    _notifierCount->setText(QString::number(m_entry.notificationCount));
    _mimeTypeCount->setText(QString::number(m_entry.mimeTypeCount));

    const QVector<Section> sections = sectionsOf(m_entry);
    const QList<QTableWidget*> tables = {_classIDTable, _appletTable, _externalClassesTable, _notifiersTable,
                                         _mimeTypeTable};
    for (int i = 0; i < tables.size(); ++i)
        fillTable(tables.at(i), sections.at(i));
}

QString ModuleInfoView::mifEntryXml() const
{
    XmlReport report(QStringLiteral("zant-mif-entry"));
    QXmlStreamWriter& xml = report.writer();
    xml.writeStartElement(QStringLiteral("mifEntry"));
    xml.writeAttribute(QStringLiteral("classCount"), QString::number(m_entry.classCount));
    xml.writeAttribute(QStringLiteral("appletCount"), QString::number(m_entry.appletCount));
    xml.writeAttribute(QStringLiteral("extClassCount"), QString::number(m_entry.externalClassCount));
    xml.writeAttribute(QStringLiteral("notificationCount"), QString::number(m_entry.notificationCount));
    xml.writeAttribute(QStringLiteral("mimeTypeCount"), QString::number(m_entry.mimeTypeCount));

    const QVector<Section> sections = sectionsOf(m_entry);
    for (const Section& section : sections) {
        // An empty list leaves its section out; the counts above still say what the module states.
        if (section.rows.isEmpty())
            continue;
        xml.writeStartElement(section.element);
        for (const QStringList& cells : section.rows) {
            xml.writeStartElement(section.item);
            for (int i = 0; i < cells.size(); ++i)
                xml.writeAttribute(section.attributes.at(i), cells.at(i));
            xml.writeEndElement();
        }
        xml.writeEndElement();
    }
    return report.text();
}
