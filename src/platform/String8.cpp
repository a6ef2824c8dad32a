// SPDX-License-Identifier: Apache-2.0

#include <stdio.h>
#include <utils/String8.h>

namespace android {

String8 String8::format(const char* fmt, ...) {
    String8 result;
    va_list args;
    va_start(args, fmt);
    result.appendFormatV(fmt, args);
    va_end(args);
    return result;
}

int String8::appendFormat(const char* fmt, ...) {
    va_list args;
    va_start(args, fmt);
    const int result = appendFormatV(fmt, args);
    va_end(args);
    return result;
}

int String8::appendFormatV(const char* fmt, va_list args) {
    va_list measured;
    va_copy(measured, args);
    const int len = vsnprintf(nullptr, 0, fmt, measured);
    va_end(measured);
    if (len < 0) {
        return -1;
    }
    // Formatted aside: an argument may be this string's own text.
    std::string text(static_cast<size_t>(len) + 1, '\0');
    vsnprintf(&text[0], text.size(), fmt, args);
    m_text.append(text, 0, static_cast<size_t>(len));
    return 0;
}

}  // namespace android
