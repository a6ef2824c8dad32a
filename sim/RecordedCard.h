// SPDX-License-Identifier: Apache-2.0
// The log files in a log tree that the service wrote, on a card that somebody sent or in the
// root of a handset: for each CP its files in the order in which they were written. A tree is
// not trusted: no link is followed, nothing but regular files is opened, and what cannot be
// used is told in a line each, while the rest is used.
#ifndef SIM_RECORDEDCARD_H_
#define SIM_RECORDEDCARD_H_

#include <stddef.h>
#include <stdint.h>

#include <string>
#include <vector>

struct RecordedFile {
    std::string path;
    size_t set = 0;     // in the order of the sets
    uint64_t size = 0;  // without the time record
    uint64_t head = 0;  // of the time record in front of it, 0 if there is none
    int64_t time = 0;   // when it was started, by its name: seconds of local time
    uint32_t number = 0;
    uint32_t aside = UINT32_MAX;  // the "-N" of a file that made way for a namesake
};

struct RecordedCp {
    std::string name;
    bool audio_dsp() const { return name == "agdsp"; }
    uint64_t size() const;  // without time records

    std::vector<RecordedFile> files;  // the oldest first
};

class RecordedCard {
public:
    // Reads the tree: a log root, or a directory that has log roots where a card, an internal
    // medium or a handset has them. Once for each object. False when there is no log file.
    // With clean the tree is of a service that has seen no crash: then only the files of modems
    // begin with a time record, and what looks like one elsewhere is data.
    bool read(const std::string& root, bool clean = false);

    const std::vector<RecordedCp>& cps() const { return m_cps; }  // by name
    size_t sets() const { return m_sets; }
    // Dumps, version files and the like beside the log files.
    unsigned other_files() const { return m_other_files; }
    // A line for people for everything that was left out.
    const std::vector<std::string>& problems() const { return m_problems; }

private:
    struct Set {
        std::string name;
        std::string path;
    };

    void find_sets(const std::string& log_root, std::vector<Set>* sets);
    void read_set(const Set& set);
    void read_cp(const std::string& dir, RecordedCp* cp);
    bool read_file(const std::string& cp, RecordedFile* file);
    std::vector<std::string> names_in(const std::string& dir);
    bool is_directory(const std::string& path);
    bool fail(const std::string& path, const std::string& what);

    bool m_clean = false;
    std::vector<RecordedCp> m_cps;
    size_t m_sets = 0;
    unsigned m_other_files = 0;
    std::vector<std::string> m_problems;
};

#endif  // SIM_RECORDEDCARD_H_
