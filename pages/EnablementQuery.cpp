#include "EnablementQuery.h"

#include "_ZantDevice.h"

namespace {

// A status past the three modes is the failed call's result code.
bool isFailure(EnablementStatus status)
{
    return status != EnablementEnabled && status != EnablementDisabled && status != EnablementExpired;
}

} // namespace

EnablementQuery EnablementQuery::ask(_ZantDevice& device, bool withPrivileges)
{
    EnablementQuery answer;
    QString mode, owner, signatureExpiry, serviceExpiry;
    QString reason;
    const EnablementStatus signature = device.GlobalTestSigStatus(mode, owner, signatureExpiry, &reason);
    const EnablementStatus service
        = isFailure(signature) ? signature : device.TepStatus(mode, owner, serviceExpiry, &reason);
    for (const EnablementStatus status : {signature, service}) {
        if (isFailure(status)) {
            answer.code = int(status);
            answer.reason = reason;
            return answer;
        }
    }
    answer.signatureEnabled = signature == EnablementEnabled;
    answer.serviceEnabled = service == EnablementEnabled;
    if (answer.signatureEnabled) {
        answer.mode = Signature;
        answer.expiry = signatureExpiry;
    } else if (answer.serviceEnabled) {
        answer.mode = Service;
        answer.expiry = serviceExpiry;
        // The panel lists what it gets: a failed list leaves it empty, as it always did.
        if (withPrivileges)
            device.GetTepSigPrivs(answer.privileges);
    }
    return answer;
}
