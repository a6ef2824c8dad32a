// SPDX-License-Identifier: Apache-2.0

#include "kestlog/Problems.h"

#include <errno.h>
#include <string.h>

#include <nlohmann/json.hpp>

#include "kestlog/ExitStatus.h"

void Problems::add(const std::string& path, const std::vector<Finding>& findings) {
    for (const Finding& finding : findings) {
        ++(finding.damage ? m_damages : m_notes);
        if (m_json) {
            Json object = finding_json(finding);
            object["path"] = json_text(path);
            print(object);
        } else {
            failure(ES_DAMAGE, path + ": " + finding_text(finding));
        }
    }
}

void Problems::add(const std::string& path, const FileReport& report, int error) {
    add(path, report.all_findings());
    if (error) {
        unreadable(path, error);
    }
}

void Problems::unreadable(const std::string& path, int error) {
    // The service may rename and trim files while they are read.
    unreadable(
        path + ": " +
        (error == ENOENT ? "gone or renamed since the directory was read" : strerror(error)));
}

void Problems::unreadable(const std::string& words) {
    ++m_unreadable;
    failure(ES_UNREADABLE, words);
}

void Problems::print(const Json& object) const {
    fprintf(m_stream, "%s\n", object.dump(-1, ' ', true).c_str());
}

int Problems::status() const {
    return m_damages ? ES_DAMAGE : m_unreadable ? ES_UNREADABLE : ES_OK;
}
