#include "PackageWriter.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>

#include <archive.h>
#include <archive_entry.h>

namespace {

constexpr time_t PackageTime = 1262304000;  // 2010-01-01, for reproducible packages

} // namespace

PackageWriter::~PackageWriter()
{
    if (m_archive)
        archive_write_free(m_archive);
}

bool PackageWriter::fail(const QString& message)
{
    m_error = message;
    return false;
}

bool PackageWriter::open(const QString& path)
{
    m_archive = archive_write_new();
    archive_write_set_format_zip(m_archive);
    if (archive_write_open_filename(m_archive, QFile::encodeName(path).constData()) != ARCHIVE_OK)
        return fail(QStringLiteral("cannot write %1: %2").arg(path, QString::fromLocal8Bit(archive_error_string(m_archive))));
    return true;
}

bool PackageWriter::writeEntry(const QString& name, unsigned int type, const QByteArray& bytes,
                               const QString& linkTarget)
{
    if (!m_archive)
        return fail(QStringLiteral("the package is not open"));
    archive_entry* entry = archive_entry_new();
    archive_entry_set_pathname_utf8(entry, name.toUtf8().constData());
    archive_entry_set_filetype(entry, type);
    archive_entry_set_perm(entry, type == AE_IFDIR ? 0755 : 0644);
    archive_entry_set_mtime(entry, PackageTime, 0);
    archive_entry_set_size(entry, bytes.size());
    if (type == AE_IFLNK)
        archive_entry_set_symlink_utf8(entry, linkTarget.toUtf8().constData());
    bool ok = archive_write_header(m_archive, entry) == ARCHIVE_OK;
    if (ok && !bytes.isEmpty())
        ok = archive_write_data(m_archive, bytes.constData(), size_t(bytes.size())) == bytes.size();
    archive_entry_free(entry);
    return ok ? true : fail(QStringLiteral("cannot add %1: %2").arg(name, QString::fromLocal8Bit(archive_error_string(m_archive))));
}

bool PackageWriter::addDirectory(const QString& name)
{
    return writeEntry(name.endsWith(QLatin1Char('/')) ? name : name + QLatin1Char('/'), AE_IFDIR, QByteArray(), QString());
}

bool PackageWriter::addFile(const QString& name, const QByteArray& bytes)
{
    return writeEntry(name, AE_IFREG, bytes, QString());
}

bool PackageWriter::addSymlink(const QString& name, const QString& target)
{
    return writeEntry(name, AE_IFLNK, QByteArray(), target);
}

bool PackageWriter::close()
{
    if (!m_archive)
        return fail(QStringLiteral("the package is not open"));
    const bool ok = archive_write_close(m_archive) == ARCHIVE_OK;
    if (!ok)
        fail(QString::fromLocal8Bit(archive_error_string(m_archive)));
    archive_write_free(m_archive);
    m_archive = nullptr;
    return ok;
}

bool PackageWriter::pack(const QString& dir, const QString& outPath, QString* error)
{
    const QDir source(dir);
    if (!source.exists()) {
        *error = QStringLiteral("%1 is not a folder").arg(dir);
        return false;
    }
    const QString base = QFileInfo(source.absolutePath()).fileName();
    QStringList paths;
    QDirIterator it(dir, QDir::Files | QDir::Dirs | QDir::Hidden | QDir::NoDotAndDotDot | QDir::NoSymLinks,
                    QDirIterator::Subdirectories);
    while (it.hasNext())
        paths.append(it.next());
    paths.sort();

    PackageWriter writer;
    bool ok = writer.open(outPath) && writer.addDirectory(base);
    for (int i = 0; ok && i < paths.size(); ++i) {
        const QFileInfo info(paths.at(i));
        const QString name = base + QLatin1Char('/') + source.relativeFilePath(paths.at(i));
        if (info.isDir()) {
            ok = writer.addDirectory(name);
            continue;
        }
        QFile file(paths.at(i));
        ok = file.open(QIODevice::ReadOnly) ? writer.addFile(name, file.readAll())
                                            : writer.fail(QStringLiteral("cannot read %1").arg(paths.at(i)));
    }
    ok = ok && writer.close();
    if (!ok) {
        *error = writer.errorString();
        QFile::remove(outPath);
    }
    return ok;
}
