// SPDX-License-Identifier: Apache-2.0
// Every command of kestlog over a card with a few files of any content: it ends with a status that
// it may have, leaves the card as it is, and what it writes holds to its promises.
#include <algorithm>
#include <filesystem>
#include <iterator>
#include <map>
#include <sstream>
#include <string>
#include <vector>

#include "fuzz/fuzz.h"
#include "kestlog/program.h"
#include "sim/files.h"
#include "support/TestRoot.h"

namespace {

namespace fs = std::filesystem;

// In the order of a CP's log, oldest first: all are in one directory.
const char* const NAMES[] = {
    "2-agdsp-2016-03-01_09-05-00.log",         "1-agdsp-2016-03-01_09-10-00.log",
    "0-agdsp-2016-03-01_09-15-00.log",         "2-cp_wcdma-2016-03-01_09-05-00.log",
    "1-cp_wcdma-2016-03-01_09-10-00.log",      "0-cp_wcdma-2016-03-01_09-15-00.log",
    "cp_wcdma_memory_2016-03-01_09-12-00.dmp", "cp_wcdma_ringbuf_2016-03-01_09-12-00.log",
    "mini_dump_2016-03-01_09-12-00.bin",       "cp_wcdma.version",
    "cp_wcdma_wiq_2016-03-01_09-12-00.bin",    "anything",
};
constexpr size_t NAME_NUM = std::size(NAMES);

// ROOT, FILES and OUT stand for the card, all of its files and an output.
const char* const COMMANDS[] = {
    "verify --json ROOT",
    "ls --json --tree ROOT",
    "info FILES",
    "frames --hex FILES",
    "frames --json --type 0x9d --limit 9 FILES",
    "join --records --cp CP -o OUT ROOT",
    "join --kind pcm --cp CP -o OUT ROOT",
    "extract -o OUT ROOT",
    "extract --type 1 --sub-type 2 -o OUT ROOT",
    "split -o OUT FILES",
    "export -o OUT ROOT",
    "export --json --broken -o OUT ROOT",
    "report --iq-rate 1000 --iq-format ci16_le --pcm-rate 8000 --pcm-format s16le -o OUT ROOT",
    "report --since -10m -o OUT ROOT",
    "bundle --crash 09:12 -o OUT ROOT",
    "wav --rate 8000 --channels 2 --format s16le --fill-gaps -o OUT ROOT",
};

struct Card {
    Card() {
        top = make_temp_dir(fs::is_directory("/dev/shm") ? "/dev/shm" : "/tmp", "kest_fuzz");
        FUZZ_CHECK(!top.empty() && freopen("/dev/null", "w", stdout));
    }
    ~Card() { fs::remove_all(top); }

    // One CP's directory in a set; the output is beside it.
    void fill(const std::map<std::string, std::string>& files, const std::string& cp) {
        fs::remove_all(top / "card");
        fs::remove_all(out());
        dir = top / "card/modem_log/2016-03-01-09-05-00" / cp;
        fs::create_directories(dir);
        for (const auto& [name, content] : files) {
            std::ofstream(dir / name, std::ios::binary) << content;
        }
    }
    fs::path out() const { return top / "out"; }

    fs::path top, dir;
};

int run(const Card& card, const std::string& command, const std::string& cp) {
    std::vector<std::string> args = {"kestlog"};
    std::istringstream words(command);
    for (std::string word; words >> word;) {
        if (word == "FILES") {
            for (const auto& entry : fs::directory_iterator(card.dir)) {
                args.push_back(entry.path());
            }
        } else {
            args.push_back(word == "ROOT"  ? (card.top / "card").string()
                           : word == "OUT" ? card.out().string()
                           : word == "CP"  ? cp
                                           : word);
        }
    }
    return run_program(static_cast<int>(args.size()), argv_of(args).data());
}

}  // namespace

// The first byte tells the command. Then, for each file, a byte tells the name, and two how many
// of the bytes behind them are its content. The first file's CP is that of the directory.
extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static Card card;
    if (size < 4) {
        return 0;
    }
    const std::string command = COMMANDS[data[0] % std::size(COMMANDS)];
    const std::string cp = data[1] % NAME_NUM < 3 ? "agdsp" : "cp_wcdma";
    std::map<std::string, std::string> files;
    for (size_t at = 1; at + 3 <= size;) {
        const std::string name = NAMES[data[at] % NAME_NUM];
        const size_t wanted = data[at + 1] | static_cast<size_t>(data[at + 2]) << 8;
        const size_t len = std::min(wanted, size - at - 3);
        files[name] = fuzz_text(data + at + 3, len);
        at += 3 + len;
    }
    card.fill(files, cp);
    const int status = run(card, command, cp);
    // Wrong usage: a build without wav, or no file with the CP's name.
    FUZZ_CHECK(status >= 0 && status <= 4);
    size_t found = 0;
    for (const auto& entry : fs::directory_iterator(card.dir)) {
        const auto file = files.find(entry.path().filename());
        FUZZ_CHECK(file != files.end() && read_text_file(entry.path()) == file->second);
        ++found;
    }
    FUZZ_CHECK(found == files.size());
    if (command.find("join --records") == 0 && (status == 0 || status == 3)) {
        std::string stream;
        for (const char* name : NAMES) {
            const bool is_log = std::string(name).find("-" + cp + "-") != std::string::npos;
            stream += is_log && files.count(name) ? files[name] : "";
        }
        FUZZ_CHECK(read_text_file(card.out()) == stream);
    }
    if (command.find("report") == 0 && (status == 0 || status == 3)) {
        const std::string page = read_text_file(card.out());
        FUZZ_CHECK(page.find("</html>") != std::string::npos);
        FUZZ_CHECK(page.find("<mark of a fuzzer>") == std::string::npos);
    }
    return 0;
}
