// SPDX-License-Identifier: Apache-2.0
// The platform's byte string, always NUL-terminated. A value type: copies are
// independent. Text up to 15 bytes, the empty string included, allocates nothing.
// A null pointer counts as "". Arguments may point into the string itself.
#ifndef PLATFORM_UTILS_STRING8_H_
#define PLATFORM_UTILS_STRING8_H_

#include <stdarg.h>
#include <stddef.h>

#include <string>

namespace android {

class String8 {
public:
    String8() = default;
    // Implicit on purpose: a literal may stand wherever a String8 is wanted.
    String8(const char* text) : m_text(text ? text : "") {}
    String8(const char* text, size_t len) { setTo(text, len); }

    // printf-like; a format error gives the empty string.
    static String8 format(const char* fmt, ...) __attribute__((format(printf, 1, 2)));

    const char* string() const { return m_text.c_str(); }
    const char* c_str() const { return m_text.c_str(); }
    size_t length() const { return m_text.length(); }
    size_t size() const { return m_text.length(); }
    size_t bytes() const { return m_text.length(); }
    bool isEmpty() const { return m_text.empty(); }
    bool empty() const { return m_text.empty(); }
    void clear() { m_text.clear(); }

    void setTo(const char* text) { m_text.assign(text ? text : ""); }
    void setTo(const char* text, size_t len) { m_text.assign(text ? text : "", text ? len : 0); }
    void setTo(const String8& other) { m_text = other.m_text; }

    String8& append(const char* text) {
        m_text.append(text ? text : "");
        return *this;
    }
    String8& append(const char* text, size_t len) {
        m_text.append(text ? text : "", text ? len : 0);
        return *this;
    }
    String8& append(const String8& other) {
        m_text.append(other.m_text);
        return *this;
    }
    // printf-like; returns 0, or -1 on a format error, which appends nothing.
    int appendFormat(const char* fmt, ...) __attribute__((format(printf, 2, 3)));
    int appendFormatV(const char* fmt, va_list args) __attribute__((format(printf, 2, 0)));

    String8& operator+=(const char* text) { return append(text); }
    String8& operator+=(const String8& other) { return append(other); }

    // Less than, equal to or greater than zero, by unsigned bytes.
    int compare(const String8& other) const { return m_text.compare(other.m_text); }
    int compare(const char* text) const { return m_text.compare(text ? text : ""); }

private:
    std::string m_text;
};

// The comparisons with plain text build no String8; null equals "".
inline bool operator==(const String8& left, const String8& right) {
    return left.compare(right) == 0;
}
inline bool operator!=(const String8& left, const String8& right) {
    return left.compare(right) != 0;
}
inline bool operator<(const String8& left, const String8& right) {
    return left.compare(right) < 0;
}
inline bool operator==(const String8& left, const char* right) {
    return left.compare(right) == 0;
}
inline bool operator!=(const String8& left, const char* right) {
    return left.compare(right) != 0;
}

inline String8 operator+(String8 left, const char* right) {
    left += right;
    return left;
}
inline String8 operator+(String8 left, const String8& right) {
    left += right;
    return left;
}

}  // namespace android

#endif  // PLATFORM_UTILS_STRING8_H_
