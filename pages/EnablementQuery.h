#pragma once

#include "PriviledgeRecord.h"

#include <QString>
#include <QVector>

class _ZantDevice;

// What the enablement indicator and panel show: the device's developer modes, asked in one
// go on a worker thread, or why they could not be. The mode shown is the signature's when
// it is enabled, else the service's; "Lock" ends the service first.
struct EnablementQuery
{
    enum Mode
    {
        None,
        Signature,
        Service
    };

    int code = 0;          // 0, or the failed call's result code
    QString reason;        // the device's word on a failure, when it gave one
    Mode mode = None;        // the one shown
    QString expiry;          // of the mode shown
    bool serviceEnabled = false;
    bool signatureEnabled = false;
    QVector<PriviledgeRecord> privileges;  // of the service, when asked for

    bool failed() const { return code != 0; }

    // Blocking: call it off the GUI thread.
    static EnablementQuery ask(_ZantDevice& device, bool withPrivileges);
};
