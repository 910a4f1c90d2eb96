#pragma once

#include "MifEntry.h"

#include <QByteArray>
#include <QString>

class QDomElement;

// Writes the binary parts of a device image from a readable description, so that sample
// images can be rebuilt byte for byte ("zantro-sim make-sample DESCRIPTION IMAGE"):
//
//   <sample>
//     <module volume="flash" folder="usermod/calc" name="calc" version="1.2.0"
//             type="Application" signature="developer" copyright="..." size="8192">
//       <class id="0x010A6001"/>  <external id="..."/>
//       <applet id="..." baseId="1" appType="0x0001" host="0x0" privSet="0x0003" flags="0x0000"/>
//       <notifier type="..." notifier="..." mask="..."/>
//       <mime type="text/plain" handler="..." base="..."/>
//     </module>
//     <file path="flash/shared/tones/chime.ztn" size="4096"/>   deterministic filler bytes
//     <text path="flash/user/readme.txt">the file's text</text>
//   </sample>
//
// A module becomes folder/name.mif, name.mod (filler of the given size) and name.inf.
class SampleBuilder
{
public:
    struct ModuleSpec
    {
        QString name;
        QString version;
        QString type;
        QString signature;
        QString copyright;
        quint32 codeSize = 8192;
        MifEntry mif; // counts are taken from the sequences
    };

    bool build(const QString& descriptionPath, const QString& imageDir);
    QString errorString() const { return m_error; }

    // Writes one module's three files into folder (created as needed).
    static bool writeModule(const QString& folder, const ModuleSpec& module, QString* error);
    // Bytes that depend only on seedText and size.
    static QByteArray fillerBytes(const QString& seedText, quint32 size);
    static bool writeFile(const QString& path, const QByteArray& data, QString* error);

private:
    bool fail(const QString& message);
    bool readModule(const QDomElement& e, ModuleSpec& module);
    bool imagePath(const QString& imageDir, const QString& relative, QString& path);
    bool number(const QDomElement& e, const QString& attribute, quint64 max, quint64& value);

    QString m_error;
};
