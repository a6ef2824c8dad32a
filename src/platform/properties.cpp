// SPDX-License-Identifier: Apache-2.0

#include <cutils/properties.h>
#include <errno.h>
#include <fcntl.h>
#include <stdint.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/PropertyTable.h"
#include "platform/env_root.h"

namespace {

const char FILE_NAME[] = "/default.prop";
const off_t MAX_FILE_SIZE = 1 << 20;

// File systems stamp changes with a clock that advances in ticks of up to 10 ms, so a
// file changed twice in one tick has the same stamp after both. A stamp proves the
// content only when it was this old at the time the content was read.
const int64_t SETTLE_NS = 50 * 1000 * 1000;
// Where stamps are whole seconds, or only even ones.
const int64_t SECOND_NS = 1000 * 1000 * 1000;
const int64_t COARSE_SETTLE_NS = 2 * SECOND_NS + SETTLE_NS;

int64_t nanoseconds(const struct timespec& t) {
    return static_cast<int64_t>(t.tv_sec) * 1000000000 + t.tv_nsec;
}

// Nothing when the clock cannot be read.
std::optional<int64_t> now(clockid_t clock) {
    struct timespec t;
    if (clock_gettime(clock, &t) < 0) {
        return std::nullopt;
    }
    return nanoseconds(t);
}

// Whether then lies back so far. Not when a time is unknown.
bool is_settled(std::optional<int64_t> now, std::optional<int64_t> then, int64_t settle_ns) {
    return now && then && *now - *then >= settle_ns;
}

// What tells one state of a file from another.
struct Stamp {
    dev_t dev;
    ino_t ino;
    off_t size;
    int64_t mtime;
    int64_t ctime;

    explicit Stamp(const struct stat& st)
        : dev(st.st_dev),
          ino(st.st_ino),
          size(st.st_size),
          mtime(nanoseconds(st.st_mtim)),
          ctime(nanoseconds(st.st_ctim)) {}
    Stamp() : dev(0), ino(0), size(-1), mtime(0), ctime(0) {}

    bool operator==(const Stamp& o) const {
        return dev == o.dev && ino == o.ino && size == o.size && mtime == o.mtime &&
               ctime == o.ctime;
    }
};

bool acceptable(const struct stat& st) {
    return S_ISREG(st.st_mode) && st.st_size <= MAX_FILE_SIZE;
}

// The parsed file of one root.
class PropertyFile {
public:
    // The value of a property, or false. The view is valid until the next call.
    bool find(const char* root, const char* key, std::string_view& value);

private:
    bool refresh();
    bool load();
    static bool read_content(int fd, std::string& content);

    std::string m_root;
    std::string m_path;
    Stamp m_stamp;
    bool m_known = false;                 // the table is that of a file of this root
    bool m_settled = false;               // m_stamp was old enough when the content was read
    std::optional<int64_t> m_first_seen;  // monotonic time of the first load with m_stamp
    PropertyTable m_table;
};

bool PropertyFile::find(const char* root, const char* key, std::string_view& value) {
    if (m_path.empty() || m_root != root) {
        m_root = root;
        m_path = m_root + FILE_NAME;
        m_known = false;
        m_settled = false;
    }
    return refresh() && m_table.find(key, value);
}

// Makes the table that of the file as it is now; false when there is no usable file. One that
// is there and cannot be looked at or read, for want of a descriptor, say, leaves the table as it
// was.
bool PropertyFile::refresh() {
    struct stat st;
    const bool there = stat(m_path.c_str(), &st) == 0;
    if (!there && errno != ENOENT && errno != ENOTDIR) {
        return m_known;
    }
    if (!there || !acceptable(st)) {
        m_known = false;
        return false;
    }
    m_known = (m_settled && Stamp(st) == m_stamp) || load() || m_known;
    return m_known;
}

bool PropertyFile::load() {
    m_settled = false;
    // Non-blocking: a FIFO may have taken the file's place since the stat.
    const int fd = open(m_path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY);
    if (fd < 0) {
        return false;
    }
    // The times and the stamp come before the content: a change while it is being read
    // gives a later stamp.
    const std::optional<int64_t> monotonic = now(CLOCK_MONOTONIC);
    const std::optional<int64_t> realtime = now(CLOCK_REALTIME);
    struct stat st;
    std::string content;
    const bool usable = fstat(fd, &st) == 0 && acceptable(st) && read_content(fd, content);
    close(fd);
    if (!usable) {
        m_stamp = Stamp();
        return false;
    }
    m_table.parse(std::move(content));
    const Stamp stamp(st);
    if (!(stamp == m_stamp)) {
        m_stamp = stamp;
        m_first_seen = monotonic;
    }
    // Either the change lies back far enough by the wall clock or, when that was set
    // back, the stamp has been known for long enough.
    const bool coarse = stamp.mtime % SECOND_NS == 0 && stamp.ctime % SECOND_NS == 0;
    const int64_t settle_ns = coarse ? COARSE_SETTLE_NS : SETTLE_NS;
    m_settled = is_settled(realtime, stamp.ctime, settle_ns) ||
                is_settled(monotonic, m_first_seen, settle_ns);
    return true;
}

bool PropertyFile::read_content(int fd, std::string& content) {
    char buf[4096];
    for (;;) {
        const ssize_t n = read(fd, buf, sizeof(buf));
        if (n == 0) {
            return true;
        }
        if (n < 0) {
            if (errno == EINTR) {
                continue;
            }
            return false;
        }
        content.append(buf, static_cast<size_t>(n));
        if (content.size() > static_cast<size_t>(MAX_FILE_SIZE)) {
            return false;
        }
    }
}

// Stores text, which must fit, as the NUL-terminated result.
int give(char* value, std::string_view text) {
    memmove(value, text.data(), text.size());  // the default may be the buffer itself
    value[text.size()] = '\0';
    return static_cast<int>(text.size());
}

}  // namespace

int property_get(const char* key, char* value, const char* default_value) {
    static std::mutex lock;
    // Never destroyed: threads may still read properties while the process exits.
    static PropertyFile* const file = new PropertyFile;

    const int saved_errno = errno;
    const char* root = getenv(ENV_ROOT);
    int len = -1;
    {
        const std::lock_guard<std::mutex> guard(lock);
        std::string_view found;
        if (key && file->find(root ? root : "", key, found) && found.size() < PROPERTY_VALUE_MAX) {
            len = give(value, found);
        }
    }
    if (len < 0) {
        const std::string_view fallback(default_value ? default_value : "");
        len = give(value, fallback.substr(0, PROPERTY_VALUE_MAX - 1));
    }
    errno = saved_errno;
    return len;
}
