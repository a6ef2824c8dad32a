// SPDX-License-Identifier: Apache-2.0
// Measures the log path: the same bytes go through a FIFO to the service, to cat and to
// split -b 5M in turn, and the CPU time of each, start and end included, is compared.
//
// The three are treated alike: the same writer, files on the same file system, and the
// same amount of data kept. The service deletes its old files itself and pays for that;
// for cat (which writes one file) and split the benchmark deletes what is old from its
// own process and shows what that cost. So there are two ratios: to the CPU time of cat,
// which the aim is about, and to cat with its deletions, which is work for work. The
// GNSS channel is used, whose files begin with no time record.
//
// Writer and reader share one CPU: on two, what the reader's copies cost depends on which
// caches the data is in, and the ratio is different in every round (--spread shows it).
//
// --strace counts the service's system calls in the steady state instead.
//
// Exit status: 0 within the limits, 1 not, 2 could not measure.
#include <errno.h>
#include <fcntl.h>
#include <linux/magic.h>
#include <poll.h>
#include <sched.h>
#include <signal.h>
#include <stddef.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace fs = std::filesystem;

namespace {

constexpr uint64_t MIB = 1 << 20;
constexpr double TARGET = 1.15;  // CPU of the service relative to cat
constexpr uint64_t FILE_MIB = 5;
constexpr int START_TIMEOUT_MS = 5000;

// scripts/bench --help prints the same file.
const char USAGE[] =
#include "usage.txt"
    ;

struct Options {
    uint64_t mib = 1024;
    uint64_t kept_mib = 50;  // 0: everything
    size_t block = 65536;    // bytes a write to the FIFO
    int rounds = 3;
    bool spread = false;  // over all CPUs
    bool count_calls = false;
    std::string dir;
    std::string service;
};

volatile sig_atomic_t g_interrupted = 0;

void on_signal(int /*signo*/) {
    g_interrupted = 1;
}

double seconds(const struct timeval& t) {
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_usec) / 1e6;
}

double read_clock(clockid_t clock) {
    struct timespec t;
    clock_gettime(clock, &t);
    return static_cast<double>(t.tv_sec) + static_cast<double>(t.tv_nsec) / 1e9;
}

void sleep_ms(int ms) {
    poll(nullptr, 0, ms);
}

bool fail(const char* what, const std::string& name) {
    fprintf(stderr, "bench_log_path: %s %s: %s\n", what, name.c_str(), strerror(errno));
    return false;
}

std::string read_text(const std::string& path) {
    std::string text;
    if (FILE* file = fopen(path.c_str(), "re")) {
        char buf[4096];
        for (size_t n; (n = fread(buf, 1, sizeof(buf), file)) > 0;) {
            text.append(buf, n);
        }
        fclose(file);
    }
    return text;
}

bool write_text(const std::string& path, const std::string& text) {
    FILE* file = fopen(path.c_str(), "we");
    if (!file) {
        return fail("create", path);
    }
    const bool written = fwrite(text.data(), 1, text.size(), file) == text.size();
    return (fclose(file) == 0 && written) || fail("write", path);
}

// A directory that goes with everything in it.
class TempDir {
public:
    explicit TempDir(const std::string& parent) : m_path(parent + "/kestbench.XXXXXX") {
        if (!mkdtemp(m_path.data())) {
            fail("create", m_path);
            m_path.clear();
        }
    }
    ~TempDir() {
        std::error_code ignored;
        if (!m_path.empty()) {
            fs::remove_all(m_path, ignored);
        }
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    const std::string& path() const { return m_path; }

private:
    std::string m_path;
};

// A listening socket of the handset that a service of this root connects to. Nothing is
// ever said on it: without it the service would try again every few seconds.
class SilentServer {
public:
    SilentServer(const char* name, const std::string& root) {
        struct sockaddr_un address;
        memset(&address, 0, sizeof(address));
        address.sun_family = AF_UNIX;
        const std::string full = std::string(name) + "@" + root;
        const size_t len = std::min(full.size(), sizeof(address.sun_path) - 1);
        memcpy(address.sun_path + 1, full.data(), len);
        m_fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
        if (bind(m_fd, reinterpret_cast<struct sockaddr*>(&address),
                 static_cast<socklen_t>(offsetof(struct sockaddr_un, sun_path) + 1 + len)) < 0 ||
            listen(m_fd, 4) < 0) {
            fail("listen on", full);
        }
    }
    ~SilentServer() { close(m_fd); }
    SilentServer(const SilentServer&) = delete;
    SilentServer& operator=(const SilentServer&) = delete;

private:
    int m_fd;
};

struct Result {
    bool ok = false;
    double user = 0;
    double sys = 0;
    double wall = 0;
    double deleting = 0;  // CPU time of the benchmark for the deletion of old data
    uint64_t reads = 0;   // read calls, those of start-up included
    uint64_t writes = 0;  // write and writev calls
    double cpu() const { return user + sys; }
    double with_deleting() const { return user + sys + deleting; }
};

// A child process that reads a FIFO.
class Reader {
public:
    ~Reader() {
        if (m_pid > 0) {
            kill(m_pid, SIGKILL);
            waitpid(m_pid, nullptr, 0);
        }
    }

    bool start(const std::vector<std::string>& args, const std::string& out,
               const std::string& err) {
        std::vector<char*> argv;
        for (const std::string& arg : args) {
            argv.push_back(const_cast<char*>(arg.c_str()));
        }
        argv.push_back(nullptr);
        m_pid = fork();
        if (m_pid == 0) {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            signal(SIGPIPE, SIG_DFL);
            const int flags = O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC;
            const int out_fd = open(out.c_str(), flags, 0644);
            const int err_fd = open(err.c_str(), flags, 0644);
            dup2(out_fd, STDOUT_FILENO);
            dup2(err_fd, STDERR_FILENO);
            execvp(argv[0], argv.data());
            _exit(127);
        }
        return m_pid > 0 || fail("start", args[0]);
    }

    // The writing end of the FIFO, once the child has opened the reading end; or -1.
    int connect(const std::string& fifo) {
        for (int waited = 0; waited < START_TIMEOUT_MS && running(); ++waited) {
            const int fd = open(fifo.c_str(), O_WRONLY | O_NONBLOCK | O_CLOEXEC);
            if (fd >= 0) {
                fcntl(fd, F_SETFL, 0);
                return fd;
            }
            sleep_ms(1);
        }
        fail("no reader of", fifo);
        return -1;
    }

    bool running() const {
        siginfo_t info;
        info.si_pid = 0;
        waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOHANG | WNOWAIT);
        return info.si_pid == 0;
    }

    // Nanoseconds on a CPU and the like, as the kernel shows them: equal texts mean that
    // the child did not run.
    std::string run_state() const { return read_text(proc("schedstat")); }

    void end(int signo) { kill(m_pid, signo); }

    // Waits for the child's end and takes what it cost.
    bool collect(int expected_signal, Result& result) {
        siginfo_t info;
        while (waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOWAIT) < 0) {
            if (errno != EINTR || g_interrupted) {
                return false;
            }
        }
        unsigned long long reads = 0;
        unsigned long long writes = 0;
        sscanf(read_text(proc("io")).c_str(), "rchar: %*u wchar: %*u syscr: %llu syscw: %llu",
               &reads, &writes);
        int status;
        struct rusage usage;
        wait4(m_pid, &status, 0, &usage);
        m_pid = -1;
        result.user = seconds(usage.ru_utime);
        result.sys = seconds(usage.ru_stime);
        result.reads = reads;
        result.writes = writes;
        return expected_signal ? WIFSIGNALED(status) && WTERMSIG(status) == expected_signal
                               : WIFEXITED(status) && WEXITSTATUS(status) == 0;
    }

private:
    std::string proc(const char* file) const {
        return "/proc/" + std::to_string(m_pid) + "/" + file;
    }

    pid_t m_pid = -1;
};

bool write_all(int fd, const uint8_t* data, size_t len) {
    while (len > 0) {
        const ssize_t n = write(fd, data, len);
        if (n < 0 && (errno != EINTR || g_interrupted)) {
            return fail("write to", "the FIFO");
        }
        if (n > 0) {
            data += n;
            len -= static_cast<size_t>(n);
        }
    }
    return true;
}

// Feeds size bytes. After every file size of data, trim(bytes fed so far) is called.
template <typename Trim>
bool feed(int fd, uint64_t size, size_t block, Trim trim) {
    std::vector<uint8_t> data(block);
    for (size_t i = 0; i < block; ++i) {
        data[i] = static_cast<uint8_t>(i * 167 >> 3);
    }
    uint64_t next_trim = FILE_MIB * MIB;
    for (uint64_t fed = 0; fed < size;) {
        const size_t len = static_cast<size_t>(std::min<uint64_t>(block, size - fed));
        if (!write_all(fd, data.data(), len)) {
            return false;
        }
        fed += len;
        if (fed >= next_trim) {
            trim(fed);
            next_trim += FILE_MIB * MIB;
        }
    }
    return true;
}

// Waits until the reader has emptied the FIFO.
bool wait_empty(int fd, const Reader& reader) {
    for (int unread = 1; unread > 0;) {
        if (ioctl(fd, FIONREAD, &unread) < 0 || g_interrupted || !reader.running()) {
            return false;
        }
        if (unread > 0) {
            sched_yield();
        }
    }
    return true;
}

// The handset in a directory that the service is started for.
class Handset {
public:
    Handset(const std::string& dir, uint64_t kept_mib)
        : m_root(dir + "/h"),
          m_modemd("modemd", m_root),
          m_wcnd("external_wcn_kest", m_root),
          m_kept_mib(kept_mib) {
        std::error_code error;
        fs::create_directories(m_root + "/data/local/tmp/kestmodem", error);
        fs::create_directories(m_root + "/dev", error);
        m_ok = (mkfifo(fifo().c_str(), 0600) == 0 || fail("create", fifo())) &&
               write_text(m_root + "/default.prop", "ro.modem.gnss.diag=" + fifo() + "\n") &&
               write_text(m_root + "/data/local/tmp/kestmodem/kest_modem.conf",
                          "minidump disable\texternal\nlog_file_size " + std::to_string(FILE_MIB) +
                              "\ndata_log_size " + std::to_string(kept_mib) +
                              "\nsd_log_size 250\nlog_overwrite enable\n"
                              "stream\tcp_gnss\ton\t0\t0\n") &&
               setenv("KESTMODEM_ROOT", m_root.c_str(), 1) == 0;
    }
    ~Handset() {
        std::error_code ignored;
        fs::remove_all(m_root, ignored);
    }
    Handset(const Handset&) = delete;
    Handset& operator=(const Handset&) = delete;

    bool ok() const { return m_ok; }
    std::string fifo() const { return m_root + "/dev/gnss"; }

    // True when the log files hold what they must after size bytes: all but what may
    // still be staged in the service, or what the quota allows.
    bool check_logs(uint64_t size) const {
        constexpr uint64_t STAGED = 65536;
        uint64_t found = 0;
        std::error_code error;
        for (fs::recursive_directory_iterator it(m_root + "/data/modem_log", error), end;
             !error && it != end; it.increment(error)) {
            if (it->is_regular_file(error)) {
                found += it->file_size(error);
            }
        }
        const uint64_t quota = m_kept_mib ? m_kept_mib * MIB : size;
        const uint64_t most = std::min(quota, size);
        const uint64_t tolerance = size > quota ? (FILE_MIB + 1) * MIB : 0;
        if (found > most || found + STAGED + tolerance < most) {
            fprintf(stderr, "bench_log_path: the log files hold %llu bytes, not about %llu\n",
                    static_cast<unsigned long long>(found), static_cast<unsigned long long>(most));
            return false;
        }
        return true;
    }

private:
    std::string m_root;
    SilentServer m_modemd;
    SilentServer m_wcnd;
    uint64_t m_kept_mib;
    bool m_ok = false;
};

// ---- CPU time

Result run_service(const Options& options, const std::string& dir) {
    Result result;
    const Handset handset(dir, options.kept_mib);
    Reader reader;
    if (!handset.ok() || !reader.start({options.service}, dir + "/out", dir + "/err")) {
        return result;
    }
    const int fd = reader.connect(handset.fifo());
    if (fd < 0) {
        fputs(read_text(dir + "/err").c_str(), stderr);
        return result;
    }
    const uint64_t size = options.mib * MIB;
    const double start = read_clock(CLOCK_MONOTONIC);
    if (feed(fd, size, options.block, [](uint64_t) {}) && wait_empty(fd, reader)) {
        result.wall = read_clock(CLOCK_MONOTONIC) - start;
        // The last block is read but may not be stored yet.
        for (std::string state; state != reader.run_state();) {
            state = reader.run_state();
            sleep_ms(20);
        }
        reader.end(SIGKILL);
        result.ok = reader.collect(SIGKILL, result) && handset.check_logs(size);
    }
    close(fd);
    return result;
}

// cat and split end with the FIFO's end.
template <typename Trim>
Result run_tool(const Options& options, const std::string& dir,
                const std::vector<std::string>& args, const std::string& out, Trim trim) {
    Result result;
    const std::string fifo = dir + "/fifo";
    Reader reader;
    if (!reader.start(args, out, dir + "/err")) {
        return result;
    }
    const int fd = reader.connect(fifo);
    if (fd < 0) {
        return result;
    }
    const double start = read_clock(CLOCK_MONOTONIC);
    const bool fed = feed(fd, options.mib * MIB, options.block, [&](uint64_t size) {
        const double before = read_clock(CLOCK_THREAD_CPUTIME_ID);
        trim(size);
        result.deleting += read_clock(CLOCK_THREAD_CPUTIME_ID) - before;
    });
    close(fd);
    result.ok = reader.collect(0, result) && fed;
    result.wall = read_clock(CLOCK_MONOTONIC) - start;
    return result;
}

Result run_cat(const Options& options, const std::string& dir) {
    const std::string out = dir + "/cat.out";
    const int file = open(out.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    Result result = run_tool(options, dir, {"cat", dir + "/fifo"}, out, [&](uint64_t fed) {
        if (options.kept_mib && fed > options.kept_mib * MIB) {
            fallocate(file, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0,
                      static_cast<off_t>(fed - options.kept_mib * MIB));
        }
    });
    struct stat st;
    if (fstat(file, &st) < 0 || static_cast<uint64_t>(st.st_size) != options.mib * MIB) {
        result.ok = false;
    }
    close(file);
    unlink(out.c_str());
    return result;
}

Result run_split(const Options& options, const std::string& dir) {
    const std::string prefix = dir + "/x";
    uint64_t oldest = 0;
    auto remove_oldest = [&] {
        char name[16];
        snprintf(name, sizeof(name), "%05llu", static_cast<unsigned long long>(oldest));
        ++oldest;
        return unlink((prefix + name).c_str()) == 0;
    };
    const std::vector<std::string> args = {
        "split", "-b", std::to_string(FILE_MIB) + "M", "-d", "-a", "5", dir + "/fifo", prefix};
    const Result result = run_tool(options, dir, args, dir + "/out", [&](uint64_t fed) {
        if (options.kept_mib && fed / (FILE_MIB * MIB) > oldest + options.kept_mib / FILE_MIB) {
            remove_oldest();
        }
    });
    while (remove_oldest()) {
    }
    return result;
}

double median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t half = values.size() / 2;
    return values.size() % 2 ? values[half] : (values[half - 1] + values[half]) / 2;
}

int measure(const Options& options, const std::string& dir) {
    const struct {
        const char* name;
        Result (*run)(const Options&, const std::string&);
    } readers[] = {{"cat", run_cat}, {"split", run_split}, {"kestmodem", run_service}};
    constexpr size_t READERS = 3;

    if (mkfifo((dir + "/fifo").c_str(), 0600) < 0) {
        fail("create", dir + "/fifo");
        return 2;
    }
    printf("%-6s%-10s%8s%8s%8s%10s%8s%11s%8s%8s%8s%10s\n", "round", "reader", "user s", "sys s",
           "cpu s", "delete s", "x cat", "x cat+del", "MB/s", "reads", "writes", "KiB/read");
    std::vector<double> cpu[READERS];
    std::vector<double> ratio[READERS];
    std::vector<double> work_ratio[READERS];
    // Round 0 warms up memory and caches and does not count.
    for (int round = 0; round <= options.rounds; ++round) {
        Result cat;
        for (size_t i = 0; i < READERS; ++i) {
            const Result r = readers[i].run(options, dir);
            if (!r.ok) {
                fprintf(stderr, "bench_log_path: %s failed\n", readers[i].name);
                return 2;
            }
            if (i == 0) {
                cat = r;
            }
            const double to_cat = r.cpu() / cat.cpu();
            const double to_work = r.with_deleting() / cat.with_deleting();
            const double size = static_cast<double>(options.mib * MIB);
            printf("%-6s%-10s%8.3f%8.3f%8.3f%10.3f%8.3f%11.3f%8.0f%8llu%8llu%10.1f\n",
                   round ? std::to_string(round).c_str() : "warm", readers[i].name, r.user, r.sys,
                   r.cpu(), r.deleting, to_cat, to_work, size / 1e6 / r.wall,
                   static_cast<unsigned long long>(r.reads),
                   static_cast<unsigned long long>(r.writes),
                   size / 1024 / static_cast<double>(std::max<uint64_t>(r.reads, 1)));
            fflush(stdout);
            if (round > 0) {
                cpu[i].push_back(r.cpu());
                ratio[i].push_back(to_cat);
                work_ratio[i].push_back(to_work);
            }
        }
    }
    for (size_t i = 0; i < READERS; ++i) {
        printf("median %-10s %.3f s of CPU, %.3f x cat, %.3f x cat with its deletions\n",
               readers[i].name, median(cpu[i]), median(ratio[i]), median(work_ratio[i]));
    }
    const bool within = median(ratio[READERS - 1]) <= TARGET;
    printf("%s: the aim is %.2f x cat\n", within ? "within the aim" : "MISSED", TARGET);
    return within ? 0 : 1;
}

// ---- System calls

typedef std::map<std::string, long> Calls;

// The table that strace -c writes: five or six columns, the calls in the fourth and the
// name in the last.
Calls parse_calls(const std::string& text) {
    Calls calls;
    for (size_t pos = 0; pos < text.size();) {
        const size_t end = std::min(text.find('\n', pos), text.size());
        const std::string line = text.substr(pos, end - pos);
        pos = end + 1;
        char last[64] = "";
        char extra[64] = "";
        long count = 0;
        const int fields = sscanf(line.c_str(), "%*f %*f %*d %ld %63s %63s", &count, last, extra);
        if (fields >= 2) {
            calls[fields == 3 ? extra : last] += count;
        }
    }
    return calls;
}

// The calls of a whole run in which the service got this many blocks, one by one.
bool count_run(const Options& options, const std::string& dir, size_t block, int blocks,
               Calls& calls) {
    const Handset handset(dir, options.kept_mib);
    const std::string table = dir + "/calls";
    unlink(table.c_str());
    Reader reader;
    // A property file that has just been changed is read again and again for a while.
    sleep_ms(200);
    // -D: the service stays the child, and strace ends with it.
    if (!handset.ok() || !reader.start({"strace", "-D", "-f", "-c", "-o", table, options.service},
                                       dir + "/out", dir + "/err")) {
        return false;
    }
    const int fd = reader.connect(handset.fifo());
    if (fd < 0) {
        fputs(read_text(dir + "/err").c_str(), stderr);
        return false;
    }
    const std::vector<uint8_t> data(block, 0x5a);
    bool fed = true;
    for (int i = 0; i < blocks && fed; ++i) {
        fed = write_all(fd, data.data(), block) && wait_empty(fd, reader);
    }
    for (std::string state; state != reader.run_state();) {
        state = reader.run_state();
        sleep_ms(50);
    }
    Result ignored;
    reader.end(SIGKILL);
    fed = reader.collect(SIGKILL, ignored) && fed;
    close(fd);
    for (int waited = 0; waited < START_TIMEOUT_MS; waited += 10) {
        const std::string text = read_text(table);
        if (text.find(" total\n") != std::string::npos) {
            calls = parse_calls(text);
            calls.erase("total");
            return fed;
        }
        sleep_ms(10);
    }
    return fail("no counts in", table);
}

// The difference of a long and a short run within one log file is the steady state.
int count_calls(const Options& options, const std::string& dir) {
    constexpr int SHORT_RUN = 16;
    const std::map<std::string, double> allowed = {
        {"poll", 1}, {"read", 1}, {"access", 1}, {"write", 0}, {"writev", 1}};
    bool within = true;
    for (const size_t block :
         {static_cast<size_t>(1024), static_cast<size_t>(4096), static_cast<size_t>(32768)}) {
        const int blocks = static_cast<int>(4 * MIB / block);
        Calls few;
        Calls many;
        if (!count_run(options, dir, block, SHORT_RUN, few) ||
            !count_run(options, dir, block, SHORT_RUN + blocks, many)) {
            return 2;
        }
        printf("system calls a block, %d blocks of %zu bytes:\n", blocks, block);
        double lookups = 0;
        for (const auto& [name, count] : many) {
            const double rate = static_cast<double>(count - few[name]) / blocks;
            const auto limit = allowed.find(name);
            const bool lookup = name.find("stat") != std::string::npos;
            lookups += lookup ? rate : 0;
            const bool good = lookup ? lookups <= 1.0 + 0.01
                                     : rate <= (limit == allowed.end() ? 0 : limit->second + 0.01);
            within = within && good;
            if (count != few[name]) {
                printf("  %-14s %7.3f%s\n", name.c_str(), rate, good ? "" : "  too many");
            }
        }
    }
    printf("%s\n", within ? "nothing but what each block must cost" : "MISSED");
    return within ? 0 : 1;
}

// ---- Set-up

// A tmpfs with room for what is kept and some more, or the usual place.
std::string default_dir(const Options& options) {
    const uint64_t needed =
        (options.kept_mib ? 2 * options.kept_mib + 64 : options.mib + 256) * MIB;
    struct statfs info;
    if (statfs("/dev/shm", &info) == 0 && info.f_type == TMPFS_MAGIC &&
        info.f_bavail * static_cast<uint64_t>(info.f_bsize) >= needed &&
        access("/dev/shm", W_OK) == 0) {
        return "/dev/shm";
    }
    const char* tmp = getenv("TMPDIR");
    return tmp && *tmp ? tmp : "/tmp";
}

bool parse_options(int argc, char** argv, Options& options) {
    for (int i = 1; i < argc; ++i) {
        const std::string arg = argv[i];
        if (arg == "--strace") {
            options.count_calls = true;
            continue;
        }
        if (arg == "--spread") {
            options.spread = true;
            continue;
        }
        if (++i >= argc) {
            return false;
        }
        const char* value = argv[i];
        char* end;
        const unsigned long number = strtoul(value, &end, 10);
        const bool is_number = *value && !*end;
        if (arg == "--dir") {
            options.dir = value;
        } else if (arg == "--service") {
            options.service = value;
        } else if (arg == "--mib" && is_number && number > 0) {
            options.mib = number;
        } else if (arg == "--kept" && is_number) {
            options.kept_mib = number;
        } else if (arg == "--block" && is_number && number > 0) {
            options.block = number;
        } else if (arg == "--rounds" && is_number && number > 0 && number < 1000) {
            options.rounds = static_cast<int>(number);
        } else {
            return false;
        }
    }
    return true;
}

}  // namespace

int main(int argc, char** argv) {
    Options options;
    if (!parse_options(argc, argv, options)) {
        fputs(USAGE, stderr);
        return 2;
    }
    if (options.service.empty()) {
        std::error_code error;
        options.service = fs::read_symlink("/proc/self/exe", error).parent_path() / "kestmodem";
    }
    if (options.dir.empty()) {
        options.dir = default_dir(options);
    }
    struct sigaction action;
    memset(&action, 0, sizeof(action));
    action.sa_handler = on_signal;  // without SA_RESTART: a waiting write ends
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
    action.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &action, nullptr);

    const TempDir dir(options.dir);
    if (dir.path().empty()) {
        return 2;
    }
    if (options.count_calls) {
        return count_calls(options, dir.path());
    }
    if (!options.spread) {
        cpu_set_t one;
        CPU_ZERO(&one);
        CPU_SET(sched_getcpu(), &one);
        sched_setaffinity(0, sizeof(one), &one);
    }
    printf("%llu MiB through a FIFO in writes of %zu bytes, files of %llu MiB in %s, ",
           static_cast<unsigned long long>(options.mib), options.block,
           static_cast<unsigned long long>(FILE_MIB), options.dir.c_str());
    if (options.kept_mib) {
        printf("%llu MiB kept\n", static_cast<unsigned long long>(options.kept_mib));
    } else {
        printf("everything kept\n");
    }
    return measure(options, dir.path());
}
