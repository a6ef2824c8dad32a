// SPDX-License-Identifier: Apache-2.0
// Bytes as text that people write, read and compare: quoted pieces such as "~\x01ab\n", each
// with a count behind it when it is there several times: "\x55"*70000. The pieces of a text
// stand one after the other, with blanks between them.
#ifndef SIM_BYTE_TEXT_H_
#define SIM_BYTE_TEXT_H_

#include <string>
#include <vector>

// The bytes of a text. The escapes are \xNN, \n, \r, \t, \" and \\. False with a reason when
// the text is malformed or stands for more than 16 MiB.
bool parse_bytes(const std::string& text, std::string* bytes, std::string* reason);

// The text of bytes, a piece for each line. A piece ends behind a line feed, between the two
// flags of diag frames that follow each other, in front of three flags and more, and when a line
// is full, so that a byte too many or too few changes few lines. A long run of one byte and
// lines that repeat become a single piece with a count.
std::vector<std::string> show_bytes(const std::string& bytes);

// The same as a single line.
std::string show_bytes_line(const std::string& bytes);

// A name or path for a line of text: bytes as they are, or as their escapes where they are no
// printable ASCII.
std::string show_name(const std::string& name);

#endif  // SIM_BYTE_TEXT_H_
