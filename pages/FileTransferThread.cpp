#include "FileTransferThread.h"

#include "PortlexErrors.h"
#include "_ZantDevice.h"

#include <QDir>
#include <QFileInfo>

#include <algorithm>

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

QString FileTransferThread::summary() const
{
    QStringList parts;
    if (m_copied > 0) {
        const QString files = m_copies == 1 ? QStringLiteral("file") : QStringLiteral("files");
        parts.append(m_copied == m_copies ? QStringLiteral("Copied %1 %2").arg(m_copies).arg(files)
                                          : QStringLiteral("Copied %1 of %2 %3").arg(m_copied).arg(m_copies).arg(files));
    }
    parts += m_done;
    parts += m_failures.mid(0, NamedFailures);
    if (m_failures.size() > NamedFailures)
        parts.append(QStringLiteral("%1 more failed").arg(m_failures.size() - NamedFailures));
    if (m_cancel)
        parts.append(QStringLiteral("Cancelled"));
    QString text = parts.join(QStringLiteral("; "));
    if (!text.isEmpty())
        text[0] = text.at(0).toUpper();
    return text;
}

bool FileTransferThread::changedDevice() const
{
    return m_changedDevice;
}

QStringList FileTransferThread::arrived() const
{
    return m_arrived;
}

bool FileTransferThread::onProgress(void* context, int value, int, const QString&)
{
    auto* self = static_cast<FileTransferThread*>(context);
    if (value >= 0) {
        const quint64 done = std::min<quint64>(quint64(value) * 1024, self->m_jobs.at(self->m_current).size);
        self->reportProgress(self->m_doneBefore + done, false);
    }
    return self->m_cancel;
}

void FileTransferThread::reportProgress(quint64 bytes, bool force)
{
    // Every chunk would be a queued event for the GUI thread: a fast copy would flood it.
    if (!force && m_sinceProgress.isValid() && m_sinceProgress.elapsed() < ProgressIntervalMs)
        return;
    m_sinceProgress.start();
    const Job& job = m_jobs.at(m_current);
    emit progress(m_current, bytes, QFileInfo(job.source).fileName());
}

void FileTransferThread::run()
{
    expandFolders();
    quint64 total = 0;
    for (const Job& job : std::as_const(m_jobs))
        total += job.size;
    emit sized(int(m_jobs.size()), total);
    for (const Job& job : std::as_const(m_jobs)) {
        if (job.kind == Job::ToDevice || job.kind == Job::ToPC)
            ++m_copies;
    }
    for (m_current = 0; m_current < m_jobs.size() && !m_cancel; ++m_current) {
        const Job& job = m_jobs.at(m_current);
        reportProgress(m_doneBefore, true);
        QString reason;
        const int result = perform(job, &reason);
        const QString name = QFileInfo(job.source).fileName();
        if (job.kind != Job::ToPC)
            m_changedDevice = m_changedDevice || result == 0;
        switch (job.kind) {
        case Job::ToDevice:
        case Job::ToPC:
        case Job::FolderToPC:
            if (result == 0) {
                ++m_copied;
                if (job.kind == Job::ToPC)
                    m_arrived.append(job.target);
            } else {
                fail(QStringLiteral("could not copy %1").arg(name), reason);
            }
            break;
        case Job::Install:
            if (result == 0)
                m_done.append(QStringLiteral("Installed %1").arg(name));
            else
                fail(QStringLiteral("could not install %1").arg(name), reason);
            break;
        case Job::Run:
            if (result == 0)
                m_done.append(QStringLiteral("Started %1").arg(job.source));
            else
                fail(QStringLiteral("could not start %1").arg(job.source), reason);
            break;
        case Job::Delete:
            if (result == 0)
                m_done.append(QStringLiteral("Deleted %1").arg(job.source));
            else
                fail(QStringLiteral("could not delete %1").arg(job.source), reason);
            break;
        }
        m_doneBefore += job.size;
    }
}

void FileTransferThread::fail(const QString& what, const QString& reason)
{
    m_failures.append(what + QStringLiteral(": ") + reason);
}

int FileTransferThread::perform(const Job& job, QString* reason)
{
    QString said;
    int result = PortlexError::InvalidArgument;
    switch (job.kind) {
    case Job::ToDevice:
        result = m_device->CopyFileToDevice(job.source, job.target, &FileTransferThread::onProgress, this, &said);
        break;
    case Job::Install:
        result = m_device->InstallPackage(job.source, m_volumeId, &said);
        break;
    case Job::ToPC:
        result = m_device->CopyFileToPC(job.source, job.target, &FileTransferThread::onProgress, this, &said);
        break;
    case Job::Run:
        result = m_device->RunApplication(job.source, &said);
        break;
    case Job::Delete:
        result = m_device->DeleteDeviceFile(job.source, &said);
        break;
    case Job::FolderToPC:
        break;
    }
    if (result != 0)
        *reason = said.isEmpty() ? QStringLiteral("error %1").arg(result) : QStringLiteral("%1 (error %2)").arg(said).arg(result);
    return result;
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
        ++m_copies;
        fail(QStringLiteral("could not copy %1").arg(devicePath),
             QStringLiteral("error %1").arg(result != 0 ? result : int(PortlexError::LocalFileError)));
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
