#pragma once

#include "ProgressCallback.h"

#include <QtGlobal>

// Reports a file transfer to a PortlexProgressCallback in KiB, so that an int holds the
// size of any file: the range once, then the bytes done.
class TransferProgress
{
public:
    TransferProgress(PortlexProgressCallback callback, void* context, quint64 size);

    // Reports done bytes; true when the caller asks to stop.
    bool cancelled(quint64 done) const;

private:
    static int kibibytes(quint64 bytes) { return int((bytes + 1023) / 1024); }

    PortlexProgressCallback m_callback;
    void* m_context;
    int m_total;
};
