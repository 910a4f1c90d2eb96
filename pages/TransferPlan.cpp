#include "TransferPlan.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>

namespace {

// Gathers the plain files below folder (no hidden or system entries, no links) and
// returns their total size.
quint64 gatherFolder(const QString& folder, QStringList& files)
{
    quint64 total = 0;
    const QFileInfoList entries = QDir(folder).entryInfoList(
        QDir::Files | QDir::Dirs | QDir::NoDotAndDotDot | QDir::NoSymLinks, QDir::NoSort);
    for (const QFileInfo& entry : entries) {
        if (entry.isDir()) {
            total += gatherFolder(entry.absoluteFilePath(), files);
        } else {
            total += quint64(entry.size());
            files.append(entry.absoluteFilePath());
        }
    }
    return total;
}

bool existsLocally(const QString& path)
{
    // A dangling link is there too: the copy would replace it.
    const QFileInfo info(path);
    return info.exists() || info.isSymLink();
}

} // namespace

QString TransferPlan::joinDevicePath(const QString& target, QString remainder)
{
    while (remainder.startsWith(QLatin1Char('/')))
        remainder.remove(0, 1);
    return target.endsWith(QLatin1Char('/')) ? target + remainder : target + QLatin1Char('/') + remainder;
}

TransferPlan TransferPlan::forDrop(const QString& targetFolder, const QStringList& localPaths, quint64 freeSpace)
{
    TransferPlan plan;
    QStringList files;
    QString base;
    quint64 total = 0;
    for (const QString& path : localPaths) {
        const QFileInfo dropped(path);
        if (base.isEmpty())
            base = dropped.absolutePath();
        if (dropped.isDir()) {
            total += gatherFolder(dropped.absoluteFilePath(), files);
        } else if (dropped.isFile() && !dropped.isSymLink()) {
            total += quint64(dropped.size());
            files.append(dropped.absoluteFilePath());
        }
        if (total >= freeSpace) {
            plan.m_outcome = Outcome::NoSpace;
            return plan;
        }
    }
    if (files.isEmpty()) {
        plan.m_outcome = Outcome::NothingToCopy;
        return plan;
    }
    files.sort();
    plan.m_jobs.reserve(files.size());
    for (const QString& source : std::as_const(files)) {
        const QString remainder = source.startsWith(base) ? source.mid(base.size()) : source;
        const bool package = source.endsWith(QLatin1String(".zantro"), Qt::CaseInsensitive);
        plan.m_jobs.append({package ? FileTransferThread::Job::Install : FileTransferThread::Job::ToDevice, source,
                            joinDevicePath(targetFolder, remainder), quint64(QFileInfo(source).size())});
    }
    return plan;
}

TransferPlan TransferPlan::forDragOut(const QVector<DeviceEntry>& entries, const QString& localFolder)
{
    TransferPlan plan;
    for (const DeviceEntry& entry : entries) {
        if (entry.insideSelection || !FileTransferThread::isPlainName(entry.name))
            continue;
        plan.m_jobs.append({entry.folder ? FileTransferThread::Job::FolderToPC : FileTransferThread::Job::ToPC, entry.path,
                            localFolder + QLatin1Char('/') + entry.name, entry.folder ? 0 : entry.size});
    }
    if (plan.m_jobs.isEmpty())
        plan.m_outcome = Outcome::NothingToCopy;
    return plan;
}

TransferPlan::Outcome TransferPlan::outcome() const
{
    return m_outcome;
}

const QVector<FileTransferThread::Job>& TransferPlan::jobs() const
{
    return m_jobs;
}

QStringList TransferPlan::existingTargets() const
{
    QStringList existing;
    for (const FileTransferThread::Job& job : m_jobs) {
        const bool local = job.kind == FileTransferThread::Job::ToPC || job.kind == FileTransferThread::Job::FolderToPC;
        if (local && existsLocally(job.target))
            existing.append(job.target);
    }
    return existing;
}

void TransferPlan::skipExisting()
{
    const QStringList existing = existingTargets();
    m_jobs.erase(std::remove_if(m_jobs.begin(), m_jobs.end(),
                                [&existing](const FileTransferThread::Job& job) { return existing.contains(job.target); }),
                 m_jobs.end());
    if (m_jobs.isEmpty())
        m_outcome = Outcome::NothingToCopy;
}
