// SPDX-License-Identifier: Apache-2.0

#include "kestlog/ReportPage.h"

#include <nlohmann/json.hpp>

namespace {

// The same object for a JSON reader, without a character that means something in HTML. Such
// characters stand in strings only.
std::string json_in_html(const Json& data) {
    std::string text;
    for (const char c : data.dump(-1, ' ', true)) {
        if (c == '<') {
            text += "\\u003c";
        } else if (c == '>') {
            text += "\\u003e";
        } else if (c == '&') {
            text += "\\u0026";
        } else {
            text += c;
        }
    }
    return text;
}

void replace(std::string* page, const std::string& mark, const std::string& text) {
    page->replace(page->find(mark), mark.size(), text);
}

}  // namespace

std::string report_page(const Json& data) {
    std::string page = PAGE_HTML;
    replace(&page, "{{script}}", PAGE_JS);
    replace(&page, "{{data}}", json_in_html(data));
    replace(&page, "{{style}}", PAGE_CSS);
    return page;
}
