#pragma once

#include <QString>

// Result codes of the gateway. 0 is success everywhere. Codes below 1000 and any code a
// device chooses (such as 3 for a missing registry or 0xDEADBEEF) pass through unchanged.
namespace PortlexError {

// Raised by the client library.
enum Client : int
{
    NotConnected = 1001,     // ConnectDevice has not succeeded for this device (or, from a
                             // device, this connection has sent no accepted Connect)
    Timeout = 1002,          // no complete answer within the call timeout
    Unreachable = 1003,      // no simulator listens on the device's socket
    ProtocolError = 1004,    // malformed, unexpected or oversized frame
    VersionMismatch = 1005,  // the device speaks another protocol version
    NotImplemented = 1006,   // operation not available in this version of the library
    InvalidArgument = 1007,  // a null record was passed, or a request too large for a frame
    LocalFileError = 1008,   // the file on the PC could not be read or written
    Untrusted = 1009,        // the socket folder or the device's process is not the user's own
    Cancelled = 1010,        // the caller's progress callback asked to stop
};

// Answered by the device side.
enum Device : int
{
    BadRequest = 1100,       // the request payload could not be decoded
    PathRefused = 1101,      // the path leaves its volume, contains NUL or is too long
    NotFound = 1102,         // no such file, directory, module, setting or transfer
    NoSpace = 1103,          // the volume has not enough free space
    IoError = 1104,          // the device could not read or write its file
    UnknownOperation = 1105, // the device does not know the operation
    Refused = 1106,          // the device refuses the request (for instance a bad package)
    NotRunnable = 1107,      // RunApplication of something that is not a .mod file
    IsDirectory = 1108,      // a file transfer names a directory
    TransferIncomplete = 1109, // a transfer ended with fewer or more bytes than announced
};

// What a gateway code means, in words for a message ("the device did not answer in time");
// empty for a code a device chose, which has no name here. The window and the command line
// both word failures with it.
QString describe(int code);

} // namespace PortlexError
