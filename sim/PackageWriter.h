#pragma once

#include <QString>

struct archive;

// Writes a .zantro package: a ZIP archive, deflated, with fixed timestamps so that the
// same content always gives the same bytes. pack() is what `zantro-sim pack` runs; the
// single-entry calls also let tests and fuzz seeds build hostile packages.
class PackageWriter
{
public:
    PackageWriter() = default;
    ~PackageWriter();
    PackageWriter(const PackageWriter&) = delete;
    PackageWriter& operator=(const PackageWriter&) = delete;

    bool open(const QString& path);
    bool addDirectory(const QString& name);
    bool addFile(const QString& name, const QByteArray& bytes);
    bool addSymlink(const QString& name, const QString& target);
    bool close();
    QString errorString() const { return m_error; }

    // Packs the module folder dir as "<dir's name>/...", files and folders only (links
    // are left out), in name order.
    static bool pack(const QString& dir, const QString& outPath, QString* error);

private:
    bool fail(const QString& message);
    bool writeEntry(const QString& name, unsigned int type, const QByteArray& bytes, const QString& linkTarget);

    archive* m_archive = nullptr;
    QString m_error;
};
