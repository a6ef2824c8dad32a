// SPDX-License-Identifier: Apache-2.0
// The kinds of files that the service keeps in a CP directory.
#ifndef STORAGE_LOGTYPE_H_
#define STORAGE_LOGTYPE_H_

enum LogType : int {
    LT_UNKNOWN = 0,    // anything not recognised by its name
    LT_LOG = 1,        // rotating log file
    LT_IPC_INFO = 2,   // record of the inter-processor communication driver
    LT_DUMP = 3,       // memory dump
    LT_MINI_DUMP = 4,  // mini dump
    LT_VERSION = 5,    // CP version record
    LT_RINGBUF = 6,    // ring buffer; becomes LT_UNKNOWN when scanned
    LT_SLEEP_LOG = 7,  // sleep log; becomes LT_UNKNOWN when scanned
    LT_WCDMA_IQ = 8    // WCDMA I/Q capture; becomes LT_UNKNOWN when scanned
};

// What trimming leaves alone.
enum class Spare {
    NOTHING,
    PROTECTED,    // of a directory in use: first and current log, version records, I/Q captures
    ALL_BUT_LOGS  // first and current log, and all that is no log
};

#endif  // STORAGE_LOGTYPE_H_
