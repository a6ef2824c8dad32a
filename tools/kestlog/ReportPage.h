// SPDX-License-Identifier: Apache-2.0
// The page of a report: one file that needs no other. Its parts lie in tools/kestlog/report and
// are compiled in.
#ifndef KESTLOG_REPORTPAGE_H_
#define KESTLOG_REPORTPAGE_H_

#include <string>

#include "kestlog/Report.h"

extern const char PAGE_HTML[];
extern const char PAGE_CSS[];
extern const char PAGE_JS[];

// The whole page. The data stands in it as a script that is not run; nothing in it can end that
// script or become markup.
std::string report_page(const Json& data);

#endif  // KESTLOG_REPORTPAGE_H_
