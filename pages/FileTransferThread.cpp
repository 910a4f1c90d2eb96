#include "FileTransferThread.h"

#include "PortlexErrors.h"
#include "_ZantDevice.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>

namespace {

QString copyMessage(const QString& source, int result)
{
    return result == 0 ? QStringLiteral("File %1 Copied").arg(source)
                       : QStringLiteral("Error copying file %1 Error: %2").arg(source).arg(result);
}

} // namespace

FileTransferThread::FileTransferThread(QSharedPointer<_ZantDevice> device, QVector<Job> jobs, quint16 volumeId)
    : m_device(std::move(device))
    , m_jobs(std::move(jobs))
    , m_volumeId(volumeId)
{
}

FileTransferThread::~FileTransferThread()
{
    cancel();
    wait();
}

bool FileTransferThread::isPlainName(const QString& name)
{
    return !name.isEmpty() && name != QLatin1String(".") && name != QLatin1String("..")
        && !name.contains(QLatin1Char('/')) && !name.contains(QChar(0));
}

void FileTransferThread::cancel()
{
    m_cancel = true;
}

bool FileTransferThread::onProgress(void* context, int value, int, const QString&)
{
    auto* self = static_cast<FileTransferThread*>(context);
    const Job& job = self->m_jobs.at(self->m_current);
    if (value >= 0) {
        const quint64 done = std::min<quint64>(quint64(value) * 1024, job.size);
        emit self->progress(self->m_current, self->m_doneBefore + done, QFileInfo(job.source).fileName());
    }
    return self->m_cancel;
}

void FileTransferThread::run()
{
    expandFolders();
    quint64 total = 0;
    for (const Job& job : std::as_const(m_jobs))
        total += job.size;
    emit sized(int(m_jobs.size()), total);
    for (m_current = 0; m_current < m_jobs.size() && !m_cancel; ++m_current) {
        const Job& job = m_jobs.at(m_current);
        emit progress(m_current, m_doneBefore, QFileInfo(job.source).fileName());
        QString reason;
        const int result = transfer(job, &reason);
        if (job.kind == Job::Install) {
            emit fileDone(result == 0 ? job.source + QStringLiteral(" installed.")
                                      : QStringLiteral("Error intalling package %1: %2").arg(job.source, reason));
        } else {
            emit fileDone(copyMessage(job.source, result));
        }
        m_doneBefore += job.size;
    }
}

int FileTransferThread::transfer(const Job& job, QString* reason)
{
    switch (job.kind) {
    case Job::ToDevice:
        return m_device->CopyFileToDevice(job.source, job.target, &FileTransferThread::onProgress, this, reason);
    case Job::Install:
        return m_device->InstallPackage(job.source, m_volumeId, reason);
    case Job::ToPC:
        return m_device->CopyFileToPC(job.source, job.target, &FileTransferThread::onProgress, this, reason);
    case Job::FolderToPC:
        break;
    }
    return PortlexError::InvalidArgument;
}

void FileTransferThread::expandFolders()
{
    const QVector<Job> given = std::exchange(m_jobs, {});
    for (const Job& job : given) {
        if (m_cancel)
            return;
        if (job.kind == Job::FolderToPC)
            expandFolder(job.source, job.target);
        else
            m_jobs.append(job);
    }
}

void FileTransferThread::expandFolder(const QString& devicePath, const QString& localFolder)
{
    QSharedPointer<_DirectoryInfo> level;
    const int result = m_device->GetFileSystemLevel(devicePath, level, nullptr, nullptr);
    if (result != 0 || !QDir().mkpath(localFolder)) {
        emit fileDone(copyMessage(devicePath, result != 0 ? result : int(PortlexError::LocalFileError)));
        return;
    }
    for (const QSharedPointer<_FileInfo>& file : std::as_const(level->files)) {
        if (isPlainName(file->Name()))
            m_jobs.append({Job::ToPC, file->Path(), localFolder + QLatin1Char('/') + file->Name(), file->size});
    }
    for (const QSharedPointer<_DirectoryInfo>& folder : std::as_const(level->directories)) {
        if (!m_cancel && isPlainName(folder->Name()))
            expandFolder(folder->Path(), localFolder + QLatin1Char('/') + folder->Name());
    }
}
