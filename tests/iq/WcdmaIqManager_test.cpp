// SPDX-License-Identifier: Apache-2.0

#include "iq/WcdmaIqManager.h"

#include <errno.h>
#include <pthread.h>

#include "iq/IqStorRespHandler.h"
#include "storage/CpStorage.h"
#include "storage/MediaStorage.h"
#include "storage/StorageManager.h"
#include "support/ServiceFixture.h"
#include "support/fake_devices.h"

namespace {

constexpr uint32_t MB = 1u << 20;
const pthread_t s_main = pthread_self();

// Read by the saving thread between a command and its response. Steps of a save: 0 the
// driver is asked, 2n-1 the middle and 2n the end of the nth write.
struct Script {
    std::vector<size_t> writes;  // what the saving thread wrote to files, call by call
    size_t half_at = 0;          // that call (from 1) transfers 1000 bytes only
    size_t fail_at = 0;          // that call and all later ones fail with fail_error
    int fail_error = ENOSPC;
    bool dead_card = false;
    int refused_cmd = -1;  // this command to the thread is not taken
    bool no_threads = false;
    bool impatient = false;     // no poll of the loop's thread waits for longer than 1 ms
    int pair[2] = {-1, -1};     // the connection to the thread: the loop's end, the thread's
    size_t gate_at = SIZE_MAX;  // at this step the thread waits at the gate
    // Without a lock, which would put the threads in order.
    std::atomic<bool> shut{false}, reached{false};
    std::atomic<int> saved_sent{0};
    std::atomic<bool> no_polls[2]{{false}, {false}};  // of the thread, of the loop
    std::atomic<bool> no_reads[2]{{false}, {false}};  // likewise, from the other one
    std::atomic<int> failures{0};                     // of these
    std::atomic<int> rests{0};                        // of the thread
    std::atomic<time_t> time{1456823700};             // 2016-03-01 09:15:00
    std::atomic<int> tick{1};                         // every call of time() is so much later

    void pass(size_t step) {
        for (; step == gate_at && shut.load(std::memory_order_relaxed); usleep(200)) {
            reached.store(true, std::memory_order_relaxed);
        }
    }
};

ssize_t thread_write(Script& script, int fd, const char* data, size_t len) {
    script.writes.push_back(len);
    const size_t call = script.writes.size();
    if (script.fail_at != 0 && call >= script.fail_at) {
        errno = script.fail_error;
        return -1;
    }
    ssize_t n = real::write(fd, data, std::min<size_t>(len, 1000));
    script.pass(2 * call - 1);
    if (call != script.half_at) {
        n += real::write(fd, data + n, len - static_cast<size_t>(n));
    }
    script.pass(2 * call);
    return n;
}

// Interposed are writes of the saving thread and commands to it, its polls, the clock of the
// names and the making of the connection to it.
ssize_t scripted_write(Script& script, int fd, const void* data, size_t len) {
    struct stat st;
    if (fd <= STDERR_FILENO || fstat(fd, &st) != 0) {
        return real::write(fd, data, len);
    }
    const bool in_main = pthread_equal(pthread_self(), s_main) != 0;
    if (S_ISREG(st.st_mode) && !in_main) {
        return thread_write(script, fd, static_cast<const char*>(data), len);
    }
    if (S_ISREG(st.st_mode) && script.dead_card) {  // the file that shows whether it works
        errno = EIO;
        return -1;
    }
    const int message = S_ISSOCK(st.st_mode) ? *static_cast<const uint8_t*>(data) : -1;
    if (in_main && message >= 0 && message == script.refused_cmd) {
        errno = EAGAIN;
        return -1;
    }
    const ssize_t n = real::write(fd, data, len);
    if (in_main && (message == IQST_STOP || message == IQST_QUIT)) {  // which opens the gate
        script.shut.store(false, std::memory_order_relaxed);
    }
    script.saved_sent.fetch_add(message == IQST_SAVED, std::memory_order_relaxed);
    return n;
}

int scripted_poll(Script& script, struct pollfd* fds, nfds_t num, int timeout) {
    const bool in_main = pthread_equal(pthread_self(), s_main) != 0;
    if (script.no_polls[in_main]) {
        ++script.failures;
        errno = ENOMEM;
        return -1;
    }
    return real::poll(fds, num, in_main && script.impatient ? std::min(timeout, 1) : timeout);
}

void follow(Script& script) {
    faults::instead.write = [&script](int fd, const void* data, size_t len) {
        return scripted_write(script, fd, data, len);
    };
    faults::instead.poll = [&script](struct pollfd* fds, nfds_t num, int timeout) {
        return scripted_poll(script, fds, num, timeout);
    };
    faults::instead.read = [&script](int fd, void* data, size_t len) {
        const bool in_main = fd == script.pair[0];
        if ((!in_main && fd != script.pair[1]) || !script.no_reads[in_main]) {
            return real::read(fd, data, len);
        }
        ++script.failures;
        errno = EAGAIN;
        return ssize_t{-1};
    };
    faults::instead.usleep = [&script](useconds_t us) {
        script.rests += us >= 100000;
        return real::usleep(us);
    };
    faults::instead.time = [&script](time_t* result) {
        const time_t now = script.time += script.tick;
        return result ? *result = now : now;
    };
    faults::instead.socketpair = [&script](int domain, int type, int protocol, int* pair) {
        const int result = real::socketpair(domain, type, protocol, pair);
        std::copy(pair, pair + 2, script.pair);
        return result;
    };
    faults::instead.pthread_create = [&script](auto... arguments) {
        return script.no_threads ? EAGAIN : real::pthread_create(arguments...);
    };
}

std::string samples(uint32_t len) {
    static const std::string bytes = pattern_bytes(25 * MB, 8);
    return bytes.substr(0, len);
}

class WcdmaIqManagerTest : public ChannelFixture {
protected:
    WcdmaIqManagerTest() {
        set_zone("UTC0");
        follow(script);
        device.on_buf_info = [this] { script.pass(0); };
        EXPECT_EQ(boot("stream cp_gnss on 5 3\nstream cp_wcn on 5 3\n"), 0);
        iq = std::make_unique<WcdmaIqManager>(ctrl->get_cp(CT_GNSS));
    }
    ~WcdmaIqManagerTest() override {
        iq.reset();
        ctrl.reset();
        faults::instead = {};
    }

    int start() { return iq->start(ctrl->get_cp(CT_GNSS)->storage()); }
    bool waits() const { return iq->state() == WcdmaIqManager::IQS_WAITING; }
    size_t released() { return device.count(CMD_RELEASE_IQ_BUF); }
    bool saved(size_t num) {
        return pump([&] { return released() >= num; }) && waits();
    }
    void fill(const std::string& content, uint32_t offset = 64) {
        device.fill(offset, static_cast<uint32_t>(content.size()), content);
    }
    bool save(const std::string& content) {
        const size_t before = released();
        fill(content);
        return saved(before + 1);
    }
    void arm(size_t gate_at) {
        script.writes.clear();
        script.gate_at = gate_at;
        script.shut = true;
        script.reached = false;
    }
    bool begin_save(const std::string& content, size_t gate_at = SIZE_MAX) {
        arm(gate_at);
        fill(content);
        return pump([&] { return !waits(); }) &&
               (gate_at == SIZE_MAX ||
                wait_until([&] { return script.reached.load(std::memory_order_relaxed); }));
    }
    // The thread's connection breaks off.
    void disconnect() { ASSERT_EQ(shutdown(script.pair[0], SHUT_WR), 0); }
    void log_data(CpType cp) {
        ASSERT_TRUE((cp == CT_GNSS ? gnss_dev : wcn_dev).put("log"));
        ctrl->get_cp(cp)->process(POLLIN);
    }
    // The I/Q files on both media, oldest first.
    std::vector<std::string> iq_files() const { return root.find("_wiq_"); }
    std::string newest() const { return root.read_file(iq_files().back()); }
    // That the total of the medium in use is what its files hold.
    void expect_accounted() {
        ctrl->flush();
        MediaStorage* media = ctrl->stor_mgr().get_media_stor();
        const std::string dir = media->log_root().string() + root.root().size();
        size_t sum = 0;
        for (const std::string& file : root.tree(dir)) {
            sum += root.read_file(dir + "/" + file).size();
        }
        EXPECT_EQ(media->size(), sum);
    }

    Script script;
    FakeDevice device{root.path("dev/iq_mem")};
    const Fifo gnss_dev{root.path("gnss")}, wcn_dev{root.path("wcn")};
    std::unique_ptr<WcdmaIqManager> iq;
};

TEST_F(WcdmaIqManagerTest, AFailedStartUndoesEverything) {
    const size_t descriptors = open_descriptors();
    const size_t slots = Filler::free_slots(mux());
    const std::string path = root.path("dev/iq_mem"), away = path + "_";
    const struct {
        std::function<void()> break_it, mend_it;
        const char* message;
    } cases[] = {
        {[&] { rename(path.c_str(), away.c_str()); }, [&] { rename(away.c_str(), path.c_str()); },
         "prepare_iq_mem_map(): can not open /dev/iq_mem [2("},
        {[&] { device.fail_ioctl(CMD_SET_IQ_CH_TYPE, EBUSY); },
         [&] { device.fail_ioctl(CMD_SET_IQ_CH_TYPE, 0); },
         "prepare_iq_mem_map(): ioctl CMD_SET_IQ_CH_TYPE error [16("},
        {[&] { device.fail_mmap(ENOMEM); }, [&] { device.fail_mmap(0); },
         "prepare_iq_mem_map(): mmap error [12("},
        {[&] { script.no_threads = true; }, [&] { script.no_threads = false; }, "mapped to 0x"},
    };
    for (const auto& c : cases) {
        SCOPED_TRACE(c.message);
        c.break_it();
        EXPECT_EQ(start(), -1);
        c.mend_it();
        EXPECT_TRUE(log.has(c.message)) << log.text();
        EXPECT_EQ(iq->state(), WcdmaIqManager::IQS_IDLE);
        EXPECT_EQ(device.maps(), 0u);
        EXPECT_EQ(open_descriptors(), descriptors);
        EXPECT_EQ(Filler::free_slots(mux()), slots);
    }
    // Refused, switched on by the two after it, and off again by the one whose thread failed.
    EXPECT_EQ(device.ioctls(CMD_SET_IQ_CH_TYPE), (std::vector<long>{1, 1, 1, 0}));
    EXPECT_EQ(start(), 0);
    EXPECT_EQ(start(), -1) << "runs already";
    EXPECT_EQ(iq->stop(), 0);
    EXPECT_EQ(device.ioctls(CMD_SET_IQ_CH_TYPE), (std::vector<long>{1, 1, 1, 0, 1, 0}));
    EXPECT_EQ(Filler::free_slots(mux()), slots);
}

TEST_F(WcdmaIqManagerTest, SavesWhatIsWithinTheMappingAndFitsTheMedium) {
    const uint32_t end = IQ_MEM_SIZE;
    const char *const outside = "is outside the mapping", *const full = "save WCDMA I/Q error";
    const struct {
        const char* what;
        uint32_t offset, len, kept;
        size_t half_at, fail_at;  // as in the script
        const char* message;
    } cases[] = {
        {"three chunks", 7, 25 * MB, 25 * MB, 0, 0, ""},
        {"the last byte", end - 1, 1, 1, 0, 0, ""},
        {"nothing, at the end", end, 0, 0, 0, 0, ""},
        {"nothing, behind the end", end + 1, 0, 0, 0, 0, outside},
        {"one byte too many", 1, end, 0, 0, 0, outside},
        {"offset of 32 bits", UINT32_MAX, 1, 0, 0, 0, outside},
        {"length of 32 bits", 1, UINT32_MAX, 0, 0, 0, outside},
        {"full", 0, 25 * MB, 0, 0, 1, full},
        {"full in a chunk", 0, 25 * MB, 10 * MB + 1000, 2, 3, full},
        {"taken in parts", 0, 25 * MB, 25 * MB, 3, 0, ""},
    };
    ASSERT_EQ(start(), 0);
    script.tick = 0;
    size_t num = 0;
    for (const auto& c : cases) {
        SCOPED_TRACE(c.what);
        script.half_at = c.half_at;
        script.fail_at = c.fail_at;
        script.writes.clear();
        log.clear();
        device.fill(c.offset, c.len, c.message == outside ? "" : samples(c.len));
        ASSERT_TRUE(saved(++num));
        EXPECT_EQ(log.has(outside), c.message == outside);
        EXPECT_EQ(log.has(full), c.message == full);
        EXPECT_EQ(log.count("process_stor_response(int): WCDMA I/Q saved\n"), 1u);
        ASSERT_EQ(iq_files().size(), num);
        EXPECT_TRUE(newest() == samples(c.kept));
        expect_accounted();
        script.tick = 1;
    }
    EXPECT_EQ(iq_files()[0],
              "data/modem_log/2016-03-01-09-15-00/cp_gnss/cp_gnss_wiq_2016-03-01_09-15-00.bin");
    device.fail_ioctl(CMD_GET_IQ_BUF_INFO, EIO);
    ASSERT_TRUE(save("never told"));
    EXPECT_TRUE(log.has("process_save(): ioctl CMD_GET_IQ_BUF_INFO error [5("));
    EXPECT_EQ(newest(), "");
}

TEST_F(WcdmaIqManagerTest, KeepsSixtyFilesAcrossStopAndStart) {
    for (size_t i = 0; i < 63; ++i) {
        if (i == 0 || i == 59) {
            iq->stop();
            ASSERT_EQ(start(), 0);
        }
        ASSERT_TRUE(save(std::string(i, 'x')));
    }
    EXPECT_EQ(iq->num_files(), 60u);
    ASSERT_EQ(iq_files().size(), 60u);
    EXPECT_EQ(root.read_file(iq_files()[0]).size(), 3u);
    EXPECT_EQ(newest().size(), 62u);
    expect_accounted();
    // An entry never outlives its file: here they all go with their set.
    remove_tree("data/modem_log/" + root.list("data/modem_log")[0]);
    log_data(CT_WCN);
    EXPECT_EQ(iq->num_files(), 0u);
    // Creating the file is what finds the card there, and gone.
    for (const bool card : {true, false, true, false, true}) {
        set_card(card);
        ASSERT_TRUE(save("data"));
    }
    EXPECT_EQ(iq_files().size(), 5u);
    EXPECT_EQ(iq->num_files(), 3u) << "the first and the third went with the card";
    set_card(false);
    log_data(CT_WCN);
    EXPECT_EQ(iq->num_files(), 2u);
    EXPECT_TRUE(waits());
}

TEST_F(WcdmaIqManagerTest, AMediumThatTakesNothingIsLeftOrMadeRoomOn) {
    const std::string sets = "data/modem_log/2016-02-0", file = "-00-00-00/cp_gnss/old";
    root.write_file(sets + "1" + file, std::string(MB, 'x'));
    root.write_file(sets + "2" + file, std::string(MB, 'x'));
    MediaStorage* const internal = ctrl->stor_mgr().get_media(MT_INTERNAL);
    internal->clear();
    ASSERT_EQ(internal->stat(), 0);
    ASSERT_EQ(ctrl->set_log_file_size(1), 0);
    ASSERT_EQ(start(), 0);
    script.fail_at = 1;  // full
    ASSERT_TRUE(save("lost"));
    EXPECT_FALSE(root.exists(sets + "1" + file));
    EXPECT_TRUE(root.exists(sets + "2" + file));
    script.fail_at = 0;
    // With the logs off nothing else kept the quota. What is saved with the captures stays.
    ASSERT_EQ(ctrl->set_data_part_size(1), 0);
    bool new_dir;
    internal->create_file(android::String8("cp_gnss"), LT_DUMP, new_dir, android::String8("dump"))
        ->close();
    ASSERT_TRUE(save(std::string(MB + 1, 'x')) && save("second"));
    EXPECT_FALSE(root.exists(sets + "2" + file));
    EXPECT_EQ(root.find("dump").size(), 1u);
    set_card(true);
    ASSERT_TRUE(save("on the card"));
    EXPECT_EQ(iq_files().back().compare(0, 2, "sd"), 0) << iq_files().back();
    script.fail_at = 1;
    script.fail_error = EIO;
    script.dead_card = true;
    ASSERT_TRUE(save("lost"));
    script.fail_at = 0;
    ASSERT_TRUE(save("inside"));
    EXPECT_EQ(ctrl->stor_mgr().media_type(), MT_INTERNAL);
    EXPECT_EQ(root.find("_wiq_").size(), 6u);
    EXPECT_EQ(root.read_file(root.find("data/modem_log/2016-03-01").back()), "inside");
}

// A device that hung up left an empty file every time, which pushed the captures out.
TEST_F(WcdmaIqManagerTest, EmptyFilesPushNoCaptureOut) {
    ASSERT_EQ(start(), 0);
    for (size_t i = 0; i < 59; ++i) {
        ASSERT_TRUE(save("x"));
    }
    device.fail_ioctl(CMD_GET_IQ_BUF_INFO, EIO);
    for (size_t i = 0; i < 8; ++i) {
        fill("lost");
        ASSERT_TRUE(pump([&] { return released() == 60 + i; }));
    }
    ASSERT_EQ(iq_files().size(), 60u);
    EXPECT_EQ(root.read_file(iq_files()[58]), "x");
}

TEST_F(WcdmaIqManagerTest, AThreadThatDoesNotAnswerIsReported) {
    ASSERT_EQ(start(), 0);
    // The driver holds the thread until the service has said that it waits.
    const char* message = "wait_response(): I/Q saving thread does not answer, waiting on\n";
    script.impatient = true;
    device.on_buf_info = [&] { EXPECT_TRUE(wait_until([&] { return log.count(message) > 1; })); };
    ASSERT_TRUE(begin_save(samples(MB)));
    EXPECT_EQ(iq->pause(), 0);
    EXPECT_EQ(iq->state(), WcdmaIqManager::IQS_PAUSED);
    EXPECT_EQ(iq->resume(), 0);
    message = "end_thread(): I/Q saving thread does not end, waiting on\n";
    device.on_buf_info = [&] { EXPECT_TRUE(wait_until([&] { return log.has(message); })); };
    ASSERT_TRUE(begin_save(samples(MB)));
    EXPECT_EQ(iq->stop(), 0);
}

TEST_F(WcdmaIqManagerTest, AThreadThatIsLostIsReplaced) {
    ASSERT_EQ(start(), 0);
    disconnect();
    EXPECT_TRUE(pump([&] { return log.has("process_thread_lost(): I/Q saving thread is gone"); }));
    ASSERT_TRUE(save("by the second"));
    EXPECT_EQ(newest(), "by the second");
    // In the middle of a save: found out by the loop, and by who waits for the answer.
    ASSERT_TRUE(begin_save(samples(25 * MB), 1));
    disconnect();
    script.shut = false;
    ASSERT_TRUE(saved(2));
    EXPECT_TRUE(newest() == samples(10 * MB));
    ASSERT_TRUE(begin_save(samples(25 * MB), 1));
    script.no_polls[1] = true;
    EXPECT_EQ(iq->pause(), 0);
    script.no_polls[1] = false;
    EXPECT_TRUE(newest() == samples(10 * MB));
    // A thread that cannot read its commands any more ends; without one buffers are dropped.
    EXPECT_EQ(iq->resume(), 0);
    ASSERT_TRUE(save("by the third"));
    script.no_threads = true;
    const int unreadable = open("/dev/null", O_WRONLY | O_CLOEXEC);
    dup3(unreadable, script.pair[1], O_CLOEXEC);
    close(unreadable);
    ASSERT_TRUE(save("lost"));
    ASSERT_TRUE(save("lost"));
    EXPECT_TRUE(log.has("process(int): no thread to save WCDMA I/Q ["));
    script.no_threads = false;
    ASSERT_TRUE(save("by the last"));
    EXPECT_EQ(newest(), "by the last");
    expect_accounted();
}

TEST_F(WcdmaIqManagerTest, AThreadThatCannotPollNeitherSpinsNorIsStuck) {
    ASSERT_EQ(start(), 0);
    script.no_polls[0] = true;
    ASSERT_TRUE(save("one"));
    ASSERT_TRUE(save("two"));
    EXPECT_TRUE(wait_until([&] { return script.failures >= 9; }));
    EXPECT_GE(script.rests, 5);
    EXPECT_EQ(iq->stop(), 0);
    EXPECT_EQ(newest(), "two");
}

// Both ends of a connection that is ready and gives nothing.
TEST_F(WcdmaIqManagerTest, AConnectionThatGivesNothingIsLeftAlone) {
    boot_clock::freeze();
    ASSERT_EQ(start(), 0);
    script.no_reads[0] = true;
    ASSERT_TRUE(begin_save("one"));
    EXPECT_TRUE(wait_until([&] { return script.failures >= 6; }));
    EXPECT_GE(script.rests, 5);
    script.no_reads[1] = true;
    script.no_reads[0] = false;
    ASSERT_TRUE(wait_until([&] { return script.saved_sent == 1; }));
    script.failures = 0;
    pass(15);
    EXPECT_EQ(script.failures, 10);
    script.no_reads[1] = false;
    boot_clock::advance(3000);
    EXPECT_TRUE(saved(1));
    EXPECT_EQ(newest(), "one");
}

TEST_F(WcdmaIqManagerTest, BuffersWaitForTheResumeOnly) {
    script.tick = 0;
    EXPECT_EQ(iq->pause() + iq->resume(), -2) << "not started";
    ASSERT_EQ(start(), 0);
    iq->process_stor_response(IQST_SAVED);
    EXPECT_TRUE(log.has("process_stor_response(int): IQST_SAVED received in state 1 ["));
    EXPECT_EQ(iq->pause() + iq->pause(), 0);
    uint32_t offset = 0;
    for (const char* content : {"dropped", "first", "second", "third", "fourth"}) {
        fill(content, offset += 64);
    }
    pump_once(mux());
    EXPECT_EQ(iq_files().size(), 0u) << "nothing is taken while paused";
    EXPECT_EQ(iq->resume(), 0);
    ASSERT_TRUE(saved(5)) << "the resume releases a buffer";
    // All within one second.
    std::vector<std::string> contents;
    for (const std::string& file : iq_files()) {
        contents.push_back(root.read_file(file));
    }
    EXPECT_EQ(contents, (std::vector<std::string>{"first", "second", "third", "fourth"}));
    EXPECT_EQ(iq->num_files(), 4u);
}

TEST_F(WcdmaIqManagerTest, WithoutAFileOrACommandTheBufferIsDropped) {
    ASSERT_EQ(start(), 0);
    remove_tree("data/modem_log");
    root.write_file("data/modem_log", "");
    ASSERT_TRUE(save("lost"));
    EXPECT_EQ(log.count("process(int): create WCDMA I/Q file error [20("), 1u);
    remove_tree("data/modem_log");
    script.refused_cmd = IQST_SAVE;
    ASSERT_TRUE(save("lost too"));
    EXPECT_EQ(iq_files().size() + iq->num_files(), 0u);
    // A stop that cannot be sent lets the save end by itself.
    script.refused_cmd = IQST_STOP;
    ASSERT_TRUE(begin_save(samples(25 * MB)));
    EXPECT_EQ(iq->pause(), 0);
    EXPECT_TRUE(log.has("can not stop saving WCDMA I/Q"));
    EXPECT_TRUE(newest() == samples(25 * MB));
    // And one that cannot be told to end ends with the connection.
    script.refused_cmd = IQST_QUIT;
    EXPECT_EQ(iq->stop(), 0);
    expect_accounted();
    // The reason that is told is not that of the release, which fails as well.
    ASSERT_EQ(start(), 0);
    device.fail_ioctl(CMD_RELEASE_IQ_BUF, EBADMSG);
    script.no_threads = true;
    disconnect();
    fill("lost");
    EXPECT_TRUE(pump([&] { return log.has("process(int): no thread to save WCDMA I/Q [11("); }));
}

// ---- Every moment of a save, every way to disturb it

// In steps of the script, for a save of two chunks.
enum Moment : size_t {
    BEFORE = 0,
    IN_FIRST_CHUNK = 1,
    BETWEEN_CHUNKS = 2,
    AT_THE_END = 4,
    ANSWERED = SIZE_MAX
};

class SaveMomentTest : public WcdmaIqManagerTest, public testing::WithParamInterface<Moment> {
protected:
    // One save is done, another one is at that moment.
    void begin() {
        ASSERT_EQ(start(), 0);
        ASSERT_TRUE(save("earlier"));
        ASSERT_TRUE(begin_save(samples(11 * MB), GetParam()));
        ASSERT_TRUE(GetParam() != ANSWERED || wait_until([&] {
                        return script.saved_sent.load(std::memory_order_relaxed) == 2;
                    }));
        ASSERT_EQ(iq_files().size(), 2u);
    }
    // The thread has noticed after the chunk it was at.
    void expect_written(size_t files) {
        const bool whole = GetParam() >= AT_THE_END;
        EXPECT_EQ(script.writes.size(), whole ? 2u : 1u);
        ASSERT_EQ(iq_files().size(), files);
        EXPECT_TRUE(files == 0 || newest() == samples((whole ? 11 : 10) * MB));
    }
    void expect_goes_on() {
        ASSERT_TRUE(saved(2)) << "or again, when it was stopped";
        ASSERT_TRUE(save("later"));
        EXPECT_FALSE(log.has("received in state"));
    }

    const char* const file_gone = "WCDMA I/Q file is gone, its save ends";
};

TEST_P(SaveMomentTest, Pause) {
    ASSERT_NO_FATAL_FAILURE(begin());
    EXPECT_EQ(iq->pause(), 0);
    EXPECT_EQ(released(), 1u);
    ASSERT_NO_FATAL_FAILURE(expect_written(2));
    EXPECT_EQ(iq->num_files(), 2u);
    EXPECT_EQ(iq->resume(), 0);
    ASSERT_NO_FATAL_FAILURE(expect_goes_on());
    EXPECT_EQ(newest(), "later");
    expect_accounted();
}

TEST_P(SaveMomentTest, Stop) {
    const size_t descriptors = open_descriptors();
    ASSERT_NO_FATAL_FAILURE(begin());
    EXPECT_EQ(iq->stop(), 0);
    EXPECT_EQ(open_descriptors(), descriptors);
    EXPECT_EQ(device.maps(), 0u);
    ASSERT_NO_FATAL_FAILURE(expect_written(2));
    EXPECT_EQ(iq->resume(), -1);
    ASSERT_EQ(start(), 0);
    ASSERT_NO_FATAL_FAILURE(expect_goes_on());
    expect_accounted();
}

TEST_P(SaveMomentTest, TheCardGoes) {
    set_card(true);
    ASSERT_NO_FATAL_FAILURE(begin());
    set_card(false);
    log_data(CT_WCN);
    EXPECT_FALSE(log.has(file_gone)) << "let go of before";
    EXPECT_EQ(iq->num_files(), 0u);
    ASSERT_NO_FATAL_FAILURE(expect_written(2));
    ASSERT_NO_FATAL_FAILURE(expect_goes_on());
    EXPECT_EQ(root.read_file(iq_files()[0]), "later") << "on the internal medium";
}

TEST_P(SaveMomentTest, TheSetGoes) {
    ASSERT_NO_FATAL_FAILURE(begin());
    remove_tree("data/modem_log/" + root.list("data/modem_log")[0]);
    log_data(CT_WCN);
    EXPECT_EQ(iq->num_files(), 0u);
    EXPECT_TRUE(log.has(file_gone));
    ASSERT_NO_FATAL_FAILURE(expect_written(0));
    ASSERT_NO_FATAL_FAILURE(expect_goes_on());
    EXPECT_EQ(newest(), "later");
    expect_accounted();
}

INSTANTIATE_TEST_SUITE_P(All, SaveMomentTest,
                         testing::Values(BEFORE, IN_FIRST_CHUNK, BETWEEN_CHUNKS, AT_THE_END,
                                         ANSWERED));

// ---- Driven by the channel

TEST_F(WcdmaIqManagerTest, TheChannelDrivesItsCapture) {
    iq.reset();
    ASSERT_EQ(boot("iq cp_gnss WCDMA\nstream cp_gnss on 5 3\nstream cp_wcn on 5 3\n"), 0);
    const auto captured = [&](const std::string& content) {
        const size_t num = released();
        fill(content);
        return pump([&] { return released() > num; }) && newest() == content;
    };
    ASSERT_TRUE(captured("one"));
    // Cleared in the middle of a save.
    arm(4);
    fill(samples(20 * MB));
    ASSERT_TRUE(pump([&] { return script.reached.load(); }));
    EXPECT_EQ(ctrl->clear_log(), 0);
    EXPECT_EQ(iq_files().size(), 0u);
    ASSERT_TRUE(captured("two"));
    EXPECT_EQ(iq_files().size(), 1u);
    EXPECT_EQ(ctrl->disable_wcdma_iq(CT_GNSS), 0);
    EXPECT_EQ(ctrl->enable_wcdma_iq(CT_GNSS), 0);
    EXPECT_EQ(device.maps(), 0u) << "not before the next start";
    LogPipeHandler* gnss = ctrl->get_cp(CT_GNSS);
    gnss->stop();
    EXPECT_EQ(gnss->start(), 0);
    ASSERT_TRUE(captured("three"));
    gnss->stop();
    device.fail_mmap(ENOMEM);
    EXPECT_EQ(gnss->start(), 0);
    EXPECT_TRUE(log.has("start_logging(): start saving WCDMA I/Q error ["));
}

}  // namespace
