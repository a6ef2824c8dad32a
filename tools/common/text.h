// SPDX-License-Identifier: Apache-2.0
// Escapes text from an untrusted source (the service, a medium that anyone may have written
// to) for a terminal or a JSON reader.
#ifndef COMMON_TEXT_H_
#define COMMON_TEXT_H_

#include <string>

// For a terminal: every byte that is not printable ASCII as \xNN, and \\ for the backslash.
std::string escape_text(const std::string& text);

// A JSON string with its quotes. A byte that is not printable ASCII becomes the code point
// of that number, \u00NN.
std::string json_string(const std::string& text);

// Removes the ending from the text; false when it has another one.
bool cut_ending(std::string* text, const std::string& ending);

#endif  // COMMON_TEXT_H_
