// SPDX-License-Identifier: Apache-2.0
// The exit statuses of kestlog, for scripts. They are documented in the man page and never
// change their meaning. When several apply, the largest is used.
#ifndef KESTLOG_EXITSTATUS_H_
#define KESTLOG_EXITSTATUS_H_

enum ExitStatus : int {
    ES_OK = 0,
    ES_USAGE = 1,
    ES_UNREADABLE = 2,  // a file or directory could not be read, or is not one of the service
    ES_DAMAGE = 3,      // damage found
    ES_OUTPUT = 4       // the output could not be written, or it exists already
};

#endif  // KESTLOG_EXITSTATUS_H_
