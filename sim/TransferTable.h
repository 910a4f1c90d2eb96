#pragma once

#include <QFile>
#include <QString>

#include <memory>
#include <unordered_map>

// The device's open transfers. Each belongs to the client connection that began it and
// dies with it. An upload writes to a hidden temporary file beside its target (a package
// to one in the install folder), which goes away unless the transfer is committed.
class TransferTable
{
public:
    enum class Kind
    {
        Download,
        Upload,
        Package,
    };

    struct Transfer
    {
        quint64 connectionId = 0;
        Kind kind = Kind::Download;
        std::unique_ptr<QFile> file;  // open: the source, or the temporary file written
        QString targetPath;           // local path an upload is renamed to; a package's install folder
        QString name;                 // a package's file name
        int volume = -1;
        quint64 size = 0;             // bytes announced
        quint64 done = 0;             // bytes moved so far
        qint64 lastActive = 0;        // when its client last moved it (ms of the actions' clock)
    };

    // Names of the temporary files and folders; nothing else starts with these.
    static const QString PartialPrefix;
    static const QString StagingPrefix;
    // True when a part of the slash-separated path starts with one of those prefixes: the
    // device refuses to create such a name, as the next start would sweep it away.
    static bool hasReservedName(const QString& path);

    // A client may keep this many transfers open at once, so it cannot use up the files
    // the device can hold open.
    static constexpr int MaxOpenPerConnection = 8;

    ~TransferTable();

    bool full(quint64 connectionId) const;

    quint32 add(Transfer transfer);
    // The transfer, if it exists and belongs to connectionId; else null.
    Transfer* find(quint32 id, quint64 connectionId, Kind kind);
    // Removes the transfer from the table and hands it over.
    Transfer take(quint32 id);
    // Ends the transfer; an upload's temporary file is deleted.
    void discard(quint32 id);
    void discardConnection(quint64 connectionId);
    // Ends every transfer last active before cutoff, so that a client gone quiet gives back
    // the room it reserved and the files it held open.
    void discardIdle(qint64 cutoff);

    // Bytes promised to the volume's unfinished uploads.
    quint64 reservedBytes(int volume) const;

    // A new temporary file, open for writing, in folder; null if none can be made.
    static std::unique_ptr<QFile> createPartial(const QString& folder);
    // Deletes what cut transfers and installs left below root (after a crash), without
    // following links. Returns how many entries went.
    static int sweep(const QString& root);

private:
    std::unordered_map<quint32, Transfer> m_transfers;
    quint32 m_nextId = 1;
};
