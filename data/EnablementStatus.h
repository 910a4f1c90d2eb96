#pragma once

// State of a developer-enablement mode (test signature or enablement service). 0 means
// enabled; a failed query returns its error code (PortlexErrors.h) as the status, which
// callers treat as "not enabled".
enum EnablementStatus : int
{
    EnablementEnabled = 0,
    EnablementDisabled = 1,
    EnablementExpired = 2,
};
