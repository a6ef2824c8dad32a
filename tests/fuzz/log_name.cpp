// SPDX-License-Identifier: Apache-2.0
// Names of files found on a medium: kind, time and number agree with the text, and
// nothing is read behind its end.
#include "storage/log_name.h"

#include <algorithm>
#include <vector>

#include "fuzz/fuzz.h"

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

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string name = fuzz_text(data, size);
    check_number(name);

    LogTime time;
    LogTime again;
    const LogType type = parse(name, time);
    if (type == LT_UNKNOWN || type == LT_VERSION) {
        FUZZ_CHECK(same(time, UNSET));
        return 0;
    }
    // The name that the service would give comes back as it was.
    const std::string own = std::string("0-cp-") + time.file_stamp().string() + ".log";
    FUZZ_CHECK(parse(own, again) == LT_LOG && same(time, again));
    return 0;
}
