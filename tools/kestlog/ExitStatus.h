// How kestlog ends, for scripts to tell the cases apart. The numbers are documented in
// the man page and never change their meaning. Of several the largest wins.
#ifndef KESTLOG_EXITSTATUS_H_
#define KESTLOG_EXITSTATUS_H_

enum ExitStatus : int {
    ES_OK = 0,
    ES_USAGE = 1,
    ES_UNREADABLE = 2,  // a file or directory could not be read, or it is none of ours
    ES_DAMAGE = 3,      // damage found
    ES_OUTPUT = 4       // the output could not be written, or it exists already
};

#endif  // KESTLOG_EXITSTATUS_H_
