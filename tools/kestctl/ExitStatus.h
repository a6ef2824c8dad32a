// SPDX-License-Identifier: Apache-2.0
// The exit statuses of kestctl, for scripts. They are documented in the man page and never
// change their meaning.
#ifndef KESTCTL_EXITSTATUS_H_
#define KESTCTL_EXITSTATUS_H_

enum ExitStatus : int {
    ES_OK = 0,
    ES_USAGE = 1,          // nothing was sent
    ES_NO_CONNECTION = 2,  // the service does not listen
    ES_TIMEOUT = 3,        // no reply in time
    ES_BAD_REPLY = 4,      // an unexpected reply, or the service closed the connection
    ES_OUTPUT = 5,         // standard output could not be written
    ES_STILL_OFF = 6,      // enable-log: a CP is still not logged
    // Error code N of the service gives ES_SERVICE_ERROR + N.
    ES_SERVICE_ERROR = 10
};

// The error codes of the service that have a meaning here are 1 to MAX_ERROR_CODE.
constexpr int MAX_ERROR_CODE = 9;

// The meaning of an error code; "unknown error code" for any other.
const char* error_meaning(int code);

#endif  // KESTCTL_EXITSTATUS_H_
