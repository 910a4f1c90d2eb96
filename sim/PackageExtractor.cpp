#include "PackageExtractor.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <archive.h>
#include <archive_entry.h>

#include <algorithm>
#include <memory>

namespace {

struct ArchiveCloser
{
    void operator()(archive* a) const { archive_read_free(a); }
};

QString entryName(archive_entry* entry)
{
    if (const char* utf8 = archive_entry_pathname_utf8(entry))
        return QString::fromUtf8(utf8);
    if (const char* local = archive_entry_pathname(entry))
        return QString::fromLocal8Bit(local);
    return QString();
}

} // namespace

bool PackageExtractor::fail(const QString& message)
{
    m_error = message;
    return false;
}

void PackageExtractor::progress(quint64 bytes, int entries)
{
    m_bytesSinceBeat += bytes;
    m_entriesSinceBeat += entries;
    if (m_bytesSinceBeat < KeepAliveBytes && m_entriesSinceBeat < KeepAliveEntries)
        return;
    m_bytesSinceBeat = 0;
    m_entriesSinceBeat = 0;
    if (m_keepAlive)
        m_keepAlive();
}

QString PackageExtractor::safeRelativePath(const QString& name)
{
    if (name.isEmpty() || name.size() > MaxEntryPathLength || name.startsWith(QLatin1Char('/')))
        return QString();
    for (const QChar c : name) {
        if (c.unicode() < 0x20 || c.unicode() == 0x7f || c == QLatin1Char('\\') || c == QLatin1Char(':'))
            return QString();
    }
    QStringList parts;
    for (const QString& part : name.split(QLatin1Char('/'), Qt::SkipEmptyParts)) {
        if (part == QLatin1String(".."))
            return QString();
        if (part != QLatin1String("."))
            parts.append(part);
    }
    return parts.join(QLatin1Char('/'));
}

bool PackageExtractor::extract(const QString& packagePath, const QString& folder, quint64 spaceLimit)
{
    m_error.clear();
    m_topLevel.clear();
    m_bytesSinceBeat = 0;
    m_entriesSinceBeat = 0;
    const quint64 packedBytes = quint64(std::max<qint64>(0, QFileInfo(packagePath).size()));
    const quint64 ratioLimit = std::max(RatioFreeBytes, packedBytes * MaxCompressionRatio);

    std::unique_ptr<archive, ArchiveCloser> reader(archive_read_new());
    archive_read_support_format_zip(reader.get());
    if (archive_read_open_filename(reader.get(), QFile::encodeName(packagePath).constData(), 64 * 1024) != ARCHIVE_OK)
        return fail(QStringLiteral("the package is not a readable ZIP archive"));

    const QDir root(folder);
    quint64 unpacked = 0;
    int entries = 0;
    QByteArray buffer(64 * 1024, Qt::Uninitialized);
    for (;;) {
        archive_entry* entry = nullptr;
        const int status = archive_read_next_header(reader.get(), &entry);
        if (status == ARCHIVE_EOF)
            break;
        if (status != ARCHIVE_OK)
            return fail(QStringLiteral("the package is damaged (%1)").arg(QString::fromLocal8Bit(archive_error_string(reader.get()))));
        if (++entries > MaxEntries)
            return fail(QStringLiteral("the package holds more than %1 entries").arg(MaxEntries));

        const QString name = entryName(entry);
        const QString relative = safeRelativePath(name);
        if (relative.isEmpty())
            return fail(QStringLiteral("the entry \"%1\" would leave the install folder").arg(name));
        if (archive_entry_hardlink(entry))
            return fail(QStringLiteral("the entry \"%1\" is a hard link").arg(name));
        if (m_check) {
            const QString refusal = m_check(relative);
            if (!refusal.isEmpty())
                return fail(refusal);
        }
        const mode_t type = archive_entry_filetype(entry);
        if (type == AE_IFDIR) {
            if (!root.mkpath(relative))
                return fail(QStringLiteral("cannot create the folder \"%1\"").arg(name));
        } else if (type != AE_IFREG) {
            return fail(QStringLiteral("the entry \"%1\" is not a plain file (a link or a device)").arg(name));
        } else {
            if (archive_entry_size_is_set(entry) && quint64(archive_entry_size(entry)) > spaceLimit)
                return fail(QStringLiteral("the package needs more room than the volume has free"));
            const int slash = relative.lastIndexOf(QLatin1Char('/'));
            if (slash > 0 && !root.mkpath(relative.left(slash)))
                return fail(QStringLiteral("cannot create the folder of \"%1\"").arg(name));
            QFile out(root.filePath(relative));
            if (!out.open(QIODevice::WriteOnly | QIODevice::NewOnly))
                return fail(QStringLiteral("the entry \"%1\" appears twice or clashes with a folder").arg(name));
            for (;;) {
                const la_ssize_t got = archive_read_data(reader.get(), buffer.data(), size_t(buffer.size()));
                if (got == 0)
                    break;
                if (got < 0)
                    return fail(QStringLiteral("the package is damaged (%1)").arg(QString::fromLocal8Bit(archive_error_string(reader.get()))));
                unpacked += quint64(got);
                if (unpacked > spaceLimit)
                    return fail(QStringLiteral("the package needs more room than the volume has free"));
                if (unpacked > MaxUnpackedBytes)
                    return fail(QStringLiteral("the package unpacks to more than %1 bytes").arg(MaxUnpackedBytes));
                if (unpacked > ratioLimit)
                    return fail(QStringLiteral("the package is compressed beyond belief (more than %1:1)").arg(MaxCompressionRatio));
                if (out.write(buffer.constData(), got) != got)
                    return fail(QStringLiteral("cannot write \"%1\"").arg(name));
                progress(quint64(got), 0);
            }
            if (!out.flush())
                return fail(QStringLiteral("cannot write \"%1\"").arg(name));
        }
        const QString top = relative.section(QLatin1Char('/'), 0, 0);
        if (!m_topLevel.contains(top))
            m_topLevel.append(top);
        progress(0, 1);
    }
    if (m_topLevel.isEmpty())
        return fail(QStringLiteral("the package is empty"));
    return true;
}
