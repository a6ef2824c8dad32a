// SPDX-License-Identifier: Apache-2.0
// Names found on a medium. The service's reader: kind, time and number agree with the text,
// and nothing is read behind its end. kestlog's: exactly the names that the service gives; a
// set's is a time of the calendar and nothing else, and a log file's is put together again
// from what was found in it.
#include <algorithm>
#include <regex>
#include <vector>

#include "fuzz/fuzz.h"
#include "kestlog/FileName.h"
#include "storage/log_name.h"

namespace {

const LogTime UNSET{-1, -1, -1, -1, -1, -1};

bool same(const LogTime& a, const LogTime& b) {
    return !(a < b) && !(b < a);
}

LogType parse(const std::string& name, LogTime& time) {
    const std::vector<char> exact(name.begin(), name.end());
    time = UNSET;
    return parse_log_name(exact.data(), exact.size(), time);
}

void check_number(const std::string& name) {
    const size_t run = std::min(name.find_first_not_of("0123456789"), name.size());
    uint32_t number;
    size_t digits;
    const android::String8 text(name.data(), name.size());
    const bool valid = parse_log_number(text, number, digits) == 0;
    FUZZ_CHECK(!valid || (run > 0 && digits == run && name[run] == '-'));
    if (run > 0 && run < 10 && name[run] == '-') {
        FUZZ_CHECK(valid && number == strtoul(name.c_str(), nullptr, 10));
    }
}

void check_kind_and_time(const std::string& name) {
    LogTime time;
    LogTime again;
    const LogType type = parse(name, time);
    if (type == LT_UNKNOWN || type == LT_VERSION) {
        FUZZ_CHECK(same(time, UNSET));
        return;
    }
    // The name that the service would give comes back as it was.
    const std::string own = std::string("0-cp-") + time.file_stamp().string() + ".log";
    FUZZ_CHECK(parse(own, again) == LT_LOG && same(time, again));
}

bool is_set_name(const std::string& name) {
    static const std::regex FORM(
        "\\d{4}-(0[1-9]|1[0-2])-(0[1-9]|[12]\\d|3[01])-([01]\\d|2[0-3])-[0-5]\\d-([0-5]\\d|60)");
    return std::regex_match(name, FORM);
}

void check_set_name(const std::string& name) {
    LogTime time;
    const bool set = parse_set_name(name, &time);
    FUZZ_CHECK(set == is_set_name(name));
    FUZZ_CHECK(!set || time.set_stamp() == name.c_str());
    FUZZ_CHECK(!set || time_text(time).substr(0, 10) == name.substr(0, 10));
}

void check_file_name(const std::string& name) {
    const FileName file(name);
    FUZZ_CHECK(file.text() == name && (file.exact || (!file.aside() && !has_time(file.time()))));
    if (!file.exact || !file.is_log()) {
        return;
    }
    const std::string own =
        std::to_string(file.number) + "-" + file.cp() + "-" + file.time().file_stamp().string();
    FUZZ_CHECK(file.cp() == cp_type_to_name(file.cp_type) && name.compare(0, own.size(), own) == 0);
    FUZZ_CHECK(std::regex_match(name.substr(own.size()),
                                std::regex(file.aside() ? "-[1-9]\\d*\\.log" : "\\.log")));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string name = fuzz_text(data, size);
    check_number(name);
    check_kind_and_time(name);
    check_set_name(name);
    check_file_name(name);
    return 0;
}
