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
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

#include "sim/LogCollector.h"
#include "sim/ServiceProcess.h"
#include "sim/SimHandset.h"
#include "sim/SimSupervisor.h"
#include "sim/files.h"

namespace fs = std::filesystem;

namespace {

constexpr uint64_t MIB = 1 << 20;
constexpr double TARGET = 1.15;  // CPU of the service relative to cat
constexpr unsigned FILE_MIB = 5;
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

struct Result {
    bool ok = false;
    ChildProcess::Cost cost;
    double wall = 0;
    double deleting = 0;  // CPU time of the benchmark for the deletion of old data
    double cpu() const { return cost.user_s + cost.system_s; }
    double with_deleting() const { return cpu() + deleting; }
};

// The writing end of the FIFO, once the reader has opened its end; or -1.
int open_writer(const std::string& fifo, ChildProcess& reader) {
    for (int waited = 0; waited < START_TIMEOUT_MS && reader.alive(); ++waited) {
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

// Waits until the program has not been on a CPU for so long.
void wait_idle(const ChildProcess& program, int ms) {
    for (std::string state; state != program.run_state();) {
        state = program.run_state();
        sleep_ms(ms);
    }
}

// Kills the program: true when that is what it ended by.
bool end(ChildProcess& program) {
    program.signal(SIGKILL);
    return program.wait() && WIFSIGNALED(program.status()) && WTERMSIG(program.status()) == SIGKILL;
}

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
bool wait_empty(int fd, ChildProcess& reader) {
    for (int unread = 1; unread > 0;) {
        if (ioctl(fd, FIONREAD, &unread) < 0 || g_interrupted || !reader.alive()) {
            return false;
        }
        if (unread > 0) {
            sched_yield();
        }
    }
    return true;
}

// The handset that the service is started for: a GNSS receiver, and supervisors to connect
// to, without which the service would try again every few seconds.
class BenchHandset {
public:
    BenchHandset(const std::string& dir, uint64_t kept_mib) : m_kept_mib(kept_mib) {
        const SimSizes sizes = {FILE_MIB, static_cast<unsigned>(kept_mib), 250, true};
        SimCp* gnss = m_sim.create(dir + "/h", sizes) ? m_sim.add_cp("cp_gnss") : nullptr;
        if (!gnss) {
            fprintf(stderr, "bench_log_path: %s\n", m_sim.error().c_str());
            return;
        }
        gnss->log.leave_to_writer();
        m_fifo = gnss->log.path();
        m_ok = (m_modemd.start("modemd", m_sim.root()) &&
                m_wcnd.start("external_wcn_kest", m_sim.root())) ||
               fail("listen in", m_sim.root());
    }
    ~BenchHandset() { m_sim.remove_root(); }
    BenchHandset(const BenchHandset&) = delete;
    BenchHandset& operator=(const BenchHandset&) = delete;

    bool ok() const { return m_ok; }
    const SimHandset& sim() const { return m_sim; }
    const std::string& fifo() const { return m_fifo; }

    // True when the log files hold what they must after size bytes: all but what may
    // still be staged in the service, or what the quota allows.
    bool check_logs(uint64_t size) const {
        constexpr uint64_t STAGED = 65536;
        LogCollector logs(m_sim);
        logs.scan();
        const uint64_t found = logs.media()[0].bytes;
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
    SimHandset m_sim;
    SimSupervisor m_modemd;
    SimSupervisor m_wcnd;
    std::string m_fifo;
    const uint64_t m_kept_mib;
    bool m_ok = false;
};

// Starts the service, or a wrapper of it, for the handset; the writing end of the GNSS
// receiver's log device, or -1.
int start_service(const std::vector<std::string>& args, const BenchHandset& handset,
                  ServiceProcess& service) {
    if (!handset.ok()) {
        return -1;
    }
    if (!service.start(args[0], handset.sim(), {args.begin() + 1, args.end()})) {
        fail("start", args[0]);
        return -1;
    }
    const int fd = open_writer(handset.fifo(), service);
    if (fd < 0) {
        fputs(service.log_text().c_str(), stderr);
    }
    return fd;
}

// ---- CPU time

Result run_service(const Options& options, const std::string& dir) {
    Result result;
    const BenchHandset handset(dir, options.kept_mib);
    ServiceProcess service;
    const int fd = start_service({options.service}, handset, service);
    if (fd < 0) {
        return result;
    }
    const uint64_t size = options.mib * MIB;
    const double start = read_clock(CLOCK_MONOTONIC);
    if (feed(fd, size, options.block, [](uint64_t) {}) && wait_empty(fd, service)) {
        result.wall = read_clock(CLOCK_MONOTONIC) - start;
        // The last block is read but may not be stored yet.
        wait_idle(service, 20);
        result.ok = end(service) && handset.check_logs(size);
        result.cost = service.cost();
    }
    close(fd);
    return result;
}

// cat and split end with the FIFO's end.
template <typename Trim>
Result run_tool(const Options& options, const std::string& dir,
                const std::vector<std::string>& args, const std::string& out, Trim trim) {
    Result result;
    ChildProcess reader;
    if (!reader.start({args, out, dir + "/err", false, {}, -1})) {
        fail("start", args[0]);
        return result;
    }
    const int fd = open_writer(dir + "/fifo", reader);
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
    result.ok = reader.wait() && reader.status() == 0 && fed;
    result.cost = reader.cost();
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
                   round ? std::to_string(round).c_str() : "warm", readers[i].name, r.cost.user_s,
                   r.cost.system_s, r.cpu(), r.deleting, to_cat, to_work, size / 1e6 / r.wall,
                   static_cast<unsigned long long>(r.cost.reads),
                   static_cast<unsigned long long>(r.cost.writes),
                   size / 1024 / static_cast<double>(std::max<uint64_t>(r.cost.reads, 1)));
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
    const BenchHandset handset(dir, options.kept_mib);
    const std::string table = dir + "/calls";
    unlink(table.c_str());
    // A property file that has just been changed is read again and again for a while.
    sleep_ms(200);
    // -D: the service stays the child, and strace ends with it.
    ServiceProcess service;
    const int fd =
        start_service({"strace", "-D", "-f", "-c", "-o", table, options.service}, handset, service);
    if (fd < 0) {
        return false;
    }
    const std::vector<uint8_t> data(block, 0x5a);
    bool fed = true;
    for (int i = 0; i < blocks && fed; ++i) {
        fed = write_all(fd, data.data(), block) && wait_empty(fd, service);
    }
    wait_idle(service, 50);
    fed = end(service) && fed;
    close(fd);
    for (int waited = 0; waited < START_TIMEOUT_MS; waited += 10) {
        const std::string text = read_text_file(table);
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
    return temp_dir();
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

    const TempDir dir(options.dir, "kestbench");
    if (dir.path().empty()) {
        fail("make a directory in", options.dir);
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
