#pragma once

#include <QByteArray>
#include <QString>
#include <QVector>

struct MifApplet
{
    quint32 classId = 0;
    QString name;
    quint16 baseId = 0;
    quint16 appType = 0;
    quint32 host = 0;
    quint16 privSet = 0;
    quint16 flags = 0;

    bool operator==(const MifApplet& o) const
    {
        return classId == o.classId && name == o.name && baseId == o.baseId && appType == o.appType && host == o.host && privSet == o.privSet && flags == o.flags;
    }
};

struct MifNotifier
{
    quint32 typeId = 0;
    quint32 notifierId = 0;
    quint32 mask = 0;

    bool operator==(const MifNotifier& o) const
    {
        return typeId == o.typeId && notifierId == o.notifierId && mask == o.mask;
    }
};

struct MifMimeType
{
    quint32 handlerClassId = 0;
    quint32 baseClassId = 0;
    QString mimeType;

    bool operator==(const MifMimeType& o) const
    {
        return handlerClassId == o.handlerClassId && baseClassId == o.baseClassId && mimeType == o.mimeType;
    }
};

// One module's information as its MIF file states it. The counts are kept as stored in
// the module header; they are not recomputed from the sequences.
struct MifEntry
{
    quint32 kind = 0;
    QString fileName;
    QString filePath;

    quint16 classCount = 0;
    quint16 appletCount = 0;
    quint16 externalClassCount = 0;
    quint16 notificationCount = 0;
    quint16 mimeTypeCount = 0;

    QVector<quint32> classes;
    QVector<MifApplet> applets;
    QVector<quint32> externalClasses;
    QVector<MifNotifier> notifiers;
    QVector<MifMimeType> mimeTypes;

    QByteArray header; // the module header resource as read (40 bytes or more)

    bool operator==(const MifEntry& o) const
    {
        return kind == o.kind && fileName == o.fileName && filePath == o.filePath && classCount == o.classCount && appletCount == o.appletCount && externalClassCount == o.externalClassCount && notificationCount == o.notificationCount && mimeTypeCount == o.mimeTypeCount && classes == o.classes && applets == o.applets && externalClasses == o.externalClasses && notifiers == o.notifiers && mimeTypes == o.mimeTypes && header == o.header;
    }
};
