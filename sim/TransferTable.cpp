#include "TransferTable.h"

#include <QDir>
#include <QDirIterator>
#include <QRandomGenerator>

#include <algorithm>

const QString TransferTable::PartialPrefix = QStringLiteral(".zantro-partial-");
const QString TransferTable::StagingPrefix = QStringLiteral(".zantro-staging-");

namespace {

void removeFile(std::unique_ptr<QFile>& file)
{
    if (file) {
        file->close();
        file->remove();
    }
}

} // namespace

bool TransferTable::hasReservedName(const QString& path)
{
    const QStringList parts = path.split(QLatin1Char('/'), Qt::SkipEmptyParts);
    return std::any_of(parts.cbegin(), parts.cend(), [](const QString& part) {
        return part.startsWith(PartialPrefix) || part.startsWith(StagingPrefix);
    });
}

TransferTable::~TransferTable()
{
    while (!m_transfers.empty())
        discard(m_transfers.begin()->first);
}

quint32 TransferTable::add(Transfer transfer)
{
    while (m_nextId == 0 || m_transfers.count(m_nextId) > 0)
        ++m_nextId;
    const quint32 id = m_nextId++;
    m_transfers.emplace(id, std::move(transfer));
    return id;
}

TransferTable::Transfer* TransferTable::find(quint32 id, quint64 connectionId, Kind kind)
{
    const auto it = m_transfers.find(id);
    if (it == m_transfers.end() || it->second.connectionId != connectionId || it->second.kind != kind)
        return nullptr;
    return &it->second;
}

TransferTable::Transfer TransferTable::take(quint32 id)
{
    const auto it = m_transfers.find(id);
    if (it == m_transfers.end())
        return Transfer();
    Transfer transfer = std::move(it->second);
    m_transfers.erase(it);
    return transfer;
}

void TransferTable::discard(quint32 id)
{
    Transfer transfer = take(id);
    if (transfer.kind == Kind::Download) {
        if (transfer.file)
            transfer.file->close();
        return;
    }
    removeFile(transfer.file);
}

void TransferTable::discardConnection(quint64 connectionId)
{
    QList<quint32> ids;
    for (const auto& [id, transfer] : m_transfers) {
        if (transfer.connectionId == connectionId)
            ids.append(id);
    }
    for (quint32 id : std::as_const(ids))
        discard(id);
}

void TransferTable::discardIdle(qint64 cutoff)
{
    QList<quint32> ids;
    for (const auto& [id, transfer] : m_transfers) {
        if (transfer.lastActive < cutoff)
            ids.append(id);
    }
    for (quint32 id : std::as_const(ids))
        discard(id);
}

bool TransferTable::full(quint64 connectionId) const
{
    const auto open = std::count_if(m_transfers.cbegin(), m_transfers.cend(),
                                    [connectionId](const auto& entry) { return entry.second.connectionId == connectionId; });
    return open >= MaxOpenPerConnection;
}

quint64 TransferTable::reservedBytes(int volume) const
{
    quint64 total = 0;
    for (const auto& entry : m_transfers) {
        if (entry.second.kind != Kind::Download && entry.second.volume == volume)
            total += entry.second.size;
    }
    return total;
}

std::unique_ptr<QFile> TransferTable::createPartial(const QString& folder)
{
    for (int attempt = 0; attempt < 16; ++attempt) {
        const QString name = PartialPrefix + QString::number(QRandomGenerator::global()->generate64(), 36);
        auto file = std::make_unique<QFile>(QDir(folder).filePath(name));
        if (file->open(QIODevice::WriteOnly | QIODevice::NewOnly))
            return file;
        if (QFileInfo::exists(file->fileName()) || QFileInfo(file->fileName()).isSymLink())
            continue;
        return nullptr;
    }
    return nullptr;
}

int TransferTable::sweep(const QString& root)
{
    QStringList leftovers;
    QDirIterator it(root, QDir::AllEntries | QDir::Hidden | QDir::System | QDir::NoDotAndDotDot | QDir::NoSymLinks,
                    QDirIterator::Subdirectories);
    while (it.hasNext()) {
        it.next();
        if (hasReservedName(it.fileName()))
            leftovers.append(it.filePath());
    }
    int removed = 0;
    for (const QString& path : std::as_const(leftovers)) {
        const QFileInfo info(path);
        if (!info.exists() && !info.isSymLink())
            continue;  // inside a staging folder removed before
        const bool ok = info.isDir() && !info.isSymLink() ? QDir(path).removeRecursively() : QFile::remove(path);
        removed += ok ? 1 : 0;
    }
    return removed;
}
