#include "MifBatchReader.h"

#include "MifReader.h"

#include <QFileInfo>

#include <algorithm>

MifBatchReader::MifBatchReader(const QStringList& paths, int threadCount)
    : m_paths(paths)
    , m_results(size_t(paths.size()))
{
    const int workers = std::min(threadCount - 1, int(paths.size()) - 1);
    for (int i = 0; i < workers; ++i)
        m_workers.emplace_back([this] {
            while (readNext()) { }
        });
}

MifBatchReader::~MifBatchReader()
{
    cancel();
    for (std::thread& worker : m_workers)
        worker.join();
}

void MifBatchReader::cancel()
{
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        m_cancelled = true;
    }
    m_ready.notify_all();
}

bool MifBatchReader::take(int index, MifEntry& entry)
{
    Result& result = m_results.at(size_t(index));
    std::unique_lock<std::mutex> lock(m_mutex);
    while (!result.done && !m_cancelled) {
        lock.unlock();
        const bool helped = readNext();
        lock.lock();
        if (!helped)
            m_ready.wait(lock, [this, &result] { return result.done || m_cancelled; });
    }
    if (!result.done)
        return false;
    entry = std::move(result.entry);
    return result.ok;
}

bool MifBatchReader::readNext()
{
    if (m_cancelled)
        return false;
    const int index = m_next++;
    if (index >= m_paths.size())
        return false;
    MifEntry entry;
    const bool ok = readModule(m_paths.at(index), entry);
    {
        std::lock_guard<std::mutex> lock(m_mutex);
        Result& result = m_results[size_t(index)];
        result.ok = ok;
        result.entry = std::move(entry);
        result.done = true;
    }
    m_ready.notify_all();
    return true;
}

bool MifBatchReader::readModule(const QString& path, MifEntry& entry)
{
    MifReader reader;
    if (!reader.readFile(path) || !reader.decodeModule(entry))
        return false;
    entry.fileName = QFileInfo(path).fileName();
    entry.filePath = path;
    return true;
}
