#include "PortlexErrors.h"

QString PortlexError::describe(int code)
{
    switch (code) {
    case NotConnected: return QStringLiteral("the device is not connected");
    case Timeout: return QStringLiteral("the device did not answer in time");
    case Unreachable: return QStringLiteral("the device is not reachable");
    case ProtocolError: return QStringLiteral("the device's answer was malformed");
    case VersionMismatch: return QStringLiteral("the device speaks another protocol version");
    case NotImplemented: return QStringLiteral("not available in this version");
    case InvalidArgument: return QStringLiteral("invalid argument");
    case LocalFileError: return QStringLiteral("the file on this computer could not be read or written");
    case Untrusted: return QStringLiteral("the device's socket is not the user's own");
    case Cancelled: return QStringLiteral("cancelled");
    case BadRequest: return QStringLiteral("the device could not read the request");
    case PathRefused: return QStringLiteral("the path is refused");
    case NotFound: return QStringLiteral("not found");
    case NoSpace: return QStringLiteral("not enough free space on the volume");
    case IoError: return QStringLiteral("the device could not read or write its file");
    case UnknownOperation: return QStringLiteral("the device does not know the operation");
    case Refused: return QStringLiteral("the device refuses the request");
    case NotRunnable: return QStringLiteral("not a .mod file");
    case IsDirectory: return QStringLiteral("the path is a directory");
    case TransferIncomplete: return QStringLiteral("the transfer ended incomplete");
    default: return QString();
    }
}
