#include "Portlex.h"

#include "MifBatchReader.h"
#include "MifFileFinder.h"

#include <QFileInfo>
#include <QThread>

int Portlex::GetPlatformClassIds(const QString& directory, std::vector<MifEntry>& entries,
                                 PortlexProgressCallback callback, void* context)
{
    entries.clear();
    const QStringList paths = MifFileFinder::find(directory);
    const int count = int(paths.size());
    const auto stopRequested = [&](int value, const QString& text) {
        return callback && callback(context, value, count, text);
    };
    if (stopRequested(-1, QString()))
        return 0;

    // The callback drives the GUI, so it runs here between waits while workers read ahead.
    MifBatchReader reader(paths, QThread::idealThreadCount());
    std::vector<MifEntry> found;
    found.reserve(size_t(count));
    for (int i = 0; i < count; ++i) {
        if (stopRequested(i, QFileInfo(paths.at(i)).fileName()))
            return 0; // the reader's destructor stops the workers
        MifEntry entry;
        if (reader.take(i, entry))
            found.push_back(std::move(entry));
    }
    entries = std::move(found);
    return int(entries.size());
}
