#pragma once

#include <QByteArray>
#include <QString>

class QDomDocument;
class QIODevice;
class QXmlStreamReader;

// Every XML file the programs read (device profiles, name databases, level files, platform
// scans) may come from anyone, so it passes one streaming check, before the DOM parse or
// token by token inside a streaming reader: no DTD beyond a bare <!DOCTYPE name> (so no
// entity can expand), bounded nesting, attribute length and file size. The check is linear
// in the input and stops at the first breach, so a hostile file costs no more time or
// memory than reading it.
class XmlReadPolicy
{
public:
    static constexpr int MaxDepth = 64;
    static constexpr qsizetype MaxAttributeChars = 64 * 1024;
    // Name databases and level files: one short element per id, far below this.
    static constexpr qint64 DatabaseFileBytes = qint64(64) << 20;
    // device.xml: the largest one `zantro-sim generate` writes that still passes the
    // profile's own checks (99,992 processes) is about 25 MB.
    static constexpr qint64 ProfileFileBytes = qint64(32) << 20;

    explicit XmlReadPolicy(qint64 maxFileBytes)
        : m_maxFileBytes(maxFileBytes)
    {
    }

    // Reads the file once and parses it. On failure errorString() names the path.
    bool readFile(const QString& path, QDomDocument& document);
    // The same for an open device; messages name its file, or "XML input" for other devices.
    bool read(QIODevice* device, QDomDocument& document);
    // Checks and parses bytes already read; source names them in messages.
    bool parse(const QByteArray& xml, const QString& source, QDomDocument& document);
    // For readers that stream the file themselves (the DOM of a large file costs far more
    // than reading it): reads the bytes within the size limit and leaves the check to the
    // reader, which calls checkToken() after every readNext(), so the file is parsed once.
    bool readFileBytes(const QString& path, QByteArray& xml);
    bool readBytes(QIODevice* device, QByteArray& xml);
    // The name messages give the device: its file's, or "XML input".
    static QString sourceName(const QIODevice* device);
    // False with the message set when the token just read breaks a limit; source names the
    // input. Keeps the nesting depth, so one policy object serves one reader.
    bool checkToken(const QXmlStreamReader& reader, const QString& source);

    QString errorString() const { return m_error; }

private:
    bool fail(const QString& message);
    bool failTooLarge(const QString& source);
    bool readLimited(QIODevice* device, const QString& source, QByteArray& xml);
    // False with the message set when the bytes break a limit; true otherwise, also when
    // they are malformed: the DOM parse reports that.
    bool check(const QByteArray& xml, const QString& source);

    qint64 m_maxFileBytes;
    int m_depth = 0;
    QString m_error;
};
