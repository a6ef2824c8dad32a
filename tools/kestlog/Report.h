// What kestlog prints: lines for people and objects for --json. Names and contents come
// from a medium that anyone may have written to: they are escaped in both.
#ifndef KESTLOG_REPORT_H_
#define KESTLOG_REPORT_H_

#include <string>

#include "kestlog/FileScan.h"
#include "kestlog/LogReader.h"

// One JSON object, built in order.
class Json {
public:
    Json& add(const char* key, const std::string& text);
    Json& add(const char* key, const char* text) { return add(key, std::string(text)); }
    Json& add(const char* key, uint64_t number);
    Json& add(const char* key, bool value);
    Json& raw(const char* key, const std::string& json);
    std::string str() const { return m_text + "}"; }
    void print() const;

private:
    std::string m_text = "{";
};

// An array of objects or numbers that are JSON already.
std::string json_array(const std::vector<std::string>& elements);

Json finding_json(const Finding& finding);

// "damage: words (at byte 12)".
std::string finding_text(const Finding& finding);

// Says on standard error what failed; returns the status.
int failure(int status, const std::string& words);

// Opens the file that a command is about. 0 or the exit status, having said why.
int open_input(LogReader& in, const std::string& path);

// Says on standard error what damage there is.
void tell_damage(const std::string& path, const FileReport& report);

// The exit status after the scan, having said whether the file could not be read.
int scan_status(const LogReader& in, const std::string& path, const FileReport& report);

std::string file_part(const std::string& path);  // what follows the last "/"

#endif  // KESTLOG_REPORT_H_
