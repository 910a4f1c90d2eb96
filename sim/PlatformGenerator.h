#pragma once

#include <QByteArray>
#include <QString>
#include <QStringList>
#include <QVector>

class QTextStream;

// Writes a synthetic platform build folder for the platform scan's tests and benchmark
// ("zantro-sim platform OUT --mifs N"): N files with a MIF suffix in mixed case spread over
// nested folders, a few of them broken, beside files and a folder that only look like MIFs.
// The same count and classes always give the same bytes.
class PlatformGenerator
{
public:
    // knownClasses (usually those of ClassDB.xml) are exported round-robin, so several
    // modules export the same class; a module with classes also exports one id of the same
    // sub-family that no database names. Without known classes a private range is used.
    // outputDir must be missing or empty, so that the folder holds exactly this platform.
    bool generate(const QString& outputDir, int mifCount, const QVector<quint32>& knownClasses);
    QString errorString() const { return m_error; }

    // Whether MIF file index is written broken: empty, truncated, random bytes, or a
    // resource container without a module header, in turn.
    static bool isBroken(int index);
    static int brokenCount(int mifCount);
    // Where MIF file index goes, relative to the output folder.
    static QString relativePath(int index);
    // The class ids named in folder/ClassDB.xml, ascending; empty when it cannot be read.
    static QVector<quint32> classDatabaseIds(const QString& folder);

    // The command line "platform OUT --mifs N [--names DIR]" after the program name;
    // returns the exit code.
    static int run(const QStringList& arguments, QTextStream& out, QTextStream& err);

private:
    static QByteArray moduleData(int index, const QVector<quint32>& knownClasses);
    static QByteArray brokenData(int index, const QByteArray& sound);
    bool writeDecoys(const QString& outputDir);
    bool write(const QString& path, const QByteArray& data);

    QString m_error;
};
