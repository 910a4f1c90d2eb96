#pragma once

// The wire protocol between the gateway client (portlex) and a device (zantro-sim).
//
// Transport: a Unix local socket, one request at a time per connection; a client may
// hold several connections to one device (one per calling thread). The socket lives in a
// folder of the user's own that nobody else may write to, and a client talks only to a
// device process of its own user id.
//
// Frame: a fixed 20-byte header, big-endian, then the payload.
//     quint32 magic       FrameMagic
//     quint32 size        payload bytes that follow the header, at most MaxPayloadSize
//                         (MaxRequestSize for requests)
//     quint16 version     ProtocolVersion of the sender
//     quint16 flags       RequestFlags on requests, AnswerFlags on answers
//     quint32 requestId   chosen by the client, echoed by the answer
//     quint32 operation   an Operation; the answer repeats it
// The payload is a QDataStream (version StreamVersion, little-endian: the byte order of
// every host we run on, so texts need no swapping). Lists are a quint32 count followed by
// the elements (QDataStream's container form); records use the operators of
// RecordStreams.h. A frame with a wrong magic or an oversized size closes
// the connection; nothing else is affected.
//
// Every answer payload starts with `qint32 result` (0 = success, else a code from
// PortlexErrors.h or one the device chooses); the fields listed under "answer" follow the
// result and are present when the result is 0 unless stated otherwise. A failure may
// instead carry a QString saying why (a refused path, a read-only folder); the client hands
// it to the caller as that call's reason. An answer too large for a frame is Refused with
// such a text.
//
// Still working: while a request takes long, the device may send any number of frames
// with the StillWorking flag, the request's id and operation and an empty payload before
// the answer. Each one restarts the client's timeout for that request, up to
// StillWorkingLimit call timeouts in all; then the call times out.
//
// Back-pressure: a device reads no further requests from a connection while answers it
// has not yet handed to the kernel exceed a few chunks; a client that does not read its
// answers stalls itself, not the device.
//
// Handshake: the first frame on every connection is Hello. A device that does not speak
// the client's version answers VersionMismatch with a message and closes the connection.
// Any other frame before a successful Hello, or a later frame with another version,
// closes the connection.

#include <QDataStream>
#include <QFlags>
#include <QString>

enum class Operation : quint32
{
    // --- discovery and identity ---------------------------------------------------------
    // request: quint16 version, QString clientName
    // answer:  QString displayName, QString deviceId
    //          on VersionMismatch: QString message (then the device closes the connection)
    Hello = 1,
    // request: QString user, QString password (both empty from ConnectDevice)
    // answer:  QString statusText, present whatever the result (a refusal says why)
    // A device serves a connection only after it accepted a Connect on it (NotConnected
    // before), so a client repeats the Connect on every connection it opens.
    Connect = 2,
    // request: empty          answer: DeviceCache
    GetCache = 3,

    // --- queries -------------------------------------------------------------------------
    // request: empty          answer: list of ModuleInfo
    GetModules = 10,
    // request: QString modulePath (ModuleInfo::path)      answer: MifEntry
    GetModuleMif = 11,
    // request: empty          answer: list of LoadedModuleInfo, processes and modules by ascending id
    GetLoadedModules = 12,
    // request: empty          answer: list of ProcessInfo, processes and threads by ascending id
    GetProcesses = 13,
    // request: empty          answer: list of VolumeInfo
    GetVolumes = 14,
    // request: empty          answer: list of RegistryInfo
    GetRegistry = 15,
    // request: QString path ("/" is the root)
    // answer:  _SettingsInfo: the node's name, path and values, and its direct children
    //          (name and path only)
    GetChildSettings = 16,
    // request: QString path (a volume's mount point is its root)
    // answer:  _DirectoryInfo: the directory's name and path, its files and its direct
    //          sub-directories (without contents)
    GetFileSystemLevel = 17,
    // request: empty          answer: list of PriviledgeRecord of the enablement service
    GetTepSigPrivs = 18,
    // request: empty
    // answer:  qint32 status (EnablementStatus), QString mode, QString owner, QString expiry
    //          (expiry in the ctime layout, e.g. "Sun Sep 19 20:00:00 2027")
    TepStatus = 19,
    // request and answer as TepStatus, for the global test signature
    GlobalTestSigStatus = 20,

    // --- actions -------------------------------------------------------------------------
    // Transfers are bound to their connection: a connection that closes aborts its open
    // transfers, and the device removes their temporary files.
    //
    // Bulk data: a file's bytes move as Data frames (the Data flag on an answer or a
    // request) of one stream request: the frame's request id and operation are the stream
    // request's, its payload is raw file bytes (no QDataStream), at most TransferChunkSize.
    // A stream costs one round trip however long the file; each Data frame restarts the
    // receiver's timeout as a StillWorking notice does. Data frames of a stream that has
    // been answered already are dropped by the device, so a client may finish the frame it
    // is sending after an early refusal and stay in step.
    //
    // Copy from the device: the device opens the file.
    // request: QString devicePath             answer: quint32 transferId, quint64 size
    CopyToPCBegin = 30,
    // request: quint32 transferId
    // The device sends the rest of the file as Data answer frames, then the answer; a
    // failure answer may follow any number of Data frames.
    // answer:  nothing more
    CopyToPCStream = 31,
    // request: quint32 transferId             answer: nothing more
    CopyToPCEnd = 32,
    // Copy to the device: the device writes a temporary file beside the target and renames
    // it on commit, so a cut transfer leaves nothing. A size above the free space is refused.
    // request: QString devicePath, quint64 size     answer: quint32 transferId
    CopyToDeviceBegin = 33,
    // request: quint32 transferId, quint64 size (the bytes the transfer still expects)
    // The client sends size bytes as Data request frames right after the request, without
    // waiting. The device answers once it has them all, or at once on a refusal or failure
    // (which ends the transfer). An empty Data frame is the client's stop: the device ends
    // the transfer, removing its temporary file, and answers Cancelled.
    // answer:  nothing more
    UploadStream = 34,
    // request: quint32 transferId             answer: nothing more (the file is in place)
    CopyToDeviceCommit = 35,
    // Package installation: the package is uploaded with UploadStream, then extracted into
    // the volume's module folder on commit.
    // request: quint16 volumeId, QString packageName, quint64 size
    // answer:  quint32 transferId (on success only), then QString statusText whatever the result
    InstallPackageBegin = 37,
    // request: quint32 transferId             answer: QString statusText whatever the result
    InstallPackageCommit = 38,
    // request: QString devicePath of a .mod   answer: nothing more
    RunApplication = 39,
    // request: QString devicePath (a file, or a directory with its contents)
    // answer:  nothing more
    DeleteDeviceFile = 40,
};

namespace Protocol {

constexpr quint32 FrameMagic = 0x5A4E5452;  // "ZNTR"
constexpr quint16 ProtocolVersion = 2;
constexpr QDataStream::Version StreamVersion = QDataStream::Qt_6_4;
constexpr int HeaderSize = 20;
constexpr quint32 MaxPayloadSize = 16 * 1024 * 1024;
constexpr quint32 TransferChunkSize = 1024 * 1024;
// A request carries at most one chunk of file data and a few texts.
constexpr quint32 MaxRequestSize = TransferChunkSize + 64 * 1024;

// Every gateway call completes or fails after this long without a frame from the device.
constexpr int CallTimeoutMs = 5000;
// StillWorking notices renew a call's timeout, but not for ever: a device that keeps
// saying so for this many call timeouts in a row (without answering, or without data in a
// stream) has the call fail with Timeout. 60 x 5 s: five minutes, beyond any install.
constexpr int StillWorkingLimit = 60;
// Discovery asks every socket for its identity within this time, all at once.
constexpr int DiscoveryTimeoutMs = 500;
// A device drops a connection that stays without a handshake, or with a frame only
// partly received, for this long.
constexpr int HalfOpenTimeoutMs = 5000;

// Lock requests carried with a request (the header's flags): the device disables the
// named mode before it answers.
enum RequestFlag : quint16
{
    NoFlags = 0,
    ServiceLockRequest = 0x1,
    SignatureLockRequest = 0x2,
};
using RequestFlags = QFlags<RequestFlag>;

enum AnswerFlag : quint16
{
    StillWorking = 0x1,  // not the answer yet: the device is busy with the request
};

// On a request or an answer: raw file bytes of the stream request named by the id.
constexpr quint16 DataFlag = 0x8000;

bool isKnownOperation(quint32 value);
// The operation's name as written in this header ("GetRegistry"); empty when unknown.
QString operationName(Operation operation);

// The folder that holds the devices' sockets: ZANTRO_SIM_DIR, else the per-user runtime
// location + "/zantro-sim".
QString socketDirectory();
// Refuses a socket folder that is a link or not a folder, belongs to another user, or
// that others may write to; error names the folder. A safe folder is left as it is.
bool checkSocketDirectory(const QString& directory, QString* error);
// Creates a missing folder with mode 0700, then checks it as above.
bool ensureSocketDirectory(const QString& directory, QString* error);
// Lets a connected socket hold a few transfer chunks in the kernel, so that a chunk does
// not need many wake-ups of both sides to pass.
void widenSocketBuffers(qintptr descriptor);

} // namespace Protocol

Q_DECLARE_OPERATORS_FOR_FLAGS(Protocol::RequestFlags)
