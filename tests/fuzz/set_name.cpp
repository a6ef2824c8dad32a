// SPDX-License-Identifier: Apache-2.0
// kestlog's names are exactly those that the service gives: a set's is a time of the calendar
// and nothing else, and a log file's is put together again from what was found in it.
#include <regex>

#include "fuzz/fuzz.h"
#include "kestlog/FileName.h"

namespace {

bool is_set_name(const std::string& name) {
    static const std::regex FORM(
        "\\d{4}-(0[1-9]|1[0-2])-(0[1-9]|[12]\\d|3[01])-([01]\\d|2[0-3])-[0-5]\\d-([0-5]\\d|60)");
    return std::regex_match(name, FORM);
}

void check_file_name(const std::string& name) {
    const FileName file(name);
    FUZZ_CHECK(file.text == name && (file.exact || (!file.aside && !has_time(file.time))));
    if (!file.exact || !file.is_log()) {
        return;
    }
    const std::string own =
        std::to_string(file.number) + "-" + file.cp + "-" + file.time.file_stamp().string();
    FUZZ_CHECK(file.cp == cp_type_to_name(file.cp_type) && name.compare(0, own.size(), own) == 0);
    FUZZ_CHECK(std::regex_match(name.substr(own.size()),
                                std::regex(file.aside ? "-[1-9]\\d*\\.log" : "\\.log")));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string name = fuzz_text(data, size);
    LogTime time;
    const bool set = parse_set_name(name, &time);
    FUZZ_CHECK(set == is_set_name(name));
    FUZZ_CHECK(!set || time.set_stamp() == name.c_str());
    FUZZ_CHECK(!set || time_text(time).substr(0, 10) == name.substr(0, 10));
    check_file_name(name);
    return 0;
}
