#pragma once

#include "MifEntry.h"

#include <QStringList>

#include <atomic>
#include <condition_variable>
#include <mutex>
#include <thread>
#include <vector>

// Reads MIF files on worker threads, ahead of a caller that takes the results in file
// order. A caller waiting for a file reads the next unclaimed one itself, so it seldom
// sleeps. Cancelling or destroying it stops the workers before their next file; the
// destructor waits only for the files being read at that moment.
class MifBatchReader
{
public:
    // threadCount counts the caller's thread too.
    MifBatchReader(const QStringList& paths, int threadCount);
    ~MifBatchReader();
    MifBatchReader(const MifBatchReader&) = delete;
    MifBatchReader& operator=(const MifBatchReader&) = delete;

    // Returns once file index has been read. False when it is not a readable module or the
    // reader was cancelled first; each index may be taken once.
    bool take(int index, MifEntry& entry);
    void cancel();

    // One file as the module information view loads it: false for a file that cannot be
    // read or holds no module header.
    static bool readModule(const QString& path, MifEntry& entry);

private:
    struct Result
    {
        bool done = false;
        bool ok = false;
        MifEntry entry;
    };

    // Reads the next unclaimed file; false when none is left or the reader was cancelled.
    bool readNext();

    const QStringList m_paths;
    std::vector<Result> m_results;
    std::atomic<int> m_next { 0 };
    std::atomic<bool> m_cancelled { false };
    std::mutex m_mutex;
    std::condition_variable m_ready;
    std::vector<std::thread> m_workers;
};
