// SPDX-License-Identifier: Apache-2.0
// kestlog frames.
#include <ctype.h>
#include <stdio.h>
#include <stdlib.h>

#include <algorithm>
#include <nlohmann/json.hpp>
#include <utility>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"

namespace {

// Which frames are wanted, and how.
struct Wanted {
    int type = -1;  // -1: any
    int sub_type = -1;
    uint64_t limit = UINT64_MAX;  // how many are still to be printed
    bool hex = false;
    bool json = false;
    bool several = false;  // files
};

bool parse_number(const CommandLine& line, const char* option, uint64_t largest, uint64_t* value) {
    const std::string text = line.value(option, "");
    char* end;
    *value = strtoull(text.c_str(), &end, 0);
    return !text.empty() && isdigit(static_cast<unsigned char>(text[0])) && !*end &&
           *value <= largest;
}

// False, with the name of the option in wrong, when a number cannot be read.
bool read_options(const CommandLine& line, Wanted* wanted, std::string* wrong) {
    uint64_t value;
    wanted->hex = line.has("hex");
    wanted->json = line.has("json");
    for (auto [option, target] :
         {std::pair<const char*, int*>{"type", &wanted->type}, {"sub-type", &wanted->sub_type}}) {
        if (line.has(option)) {
            *wrong = option;
            if (!parse_number(line, option, UINT8_MAX, &value)) {
                return false;
            }
            *target = static_cast<int>(value);
        }
    }
    *wrong = "limit";
    return !line.has("limit") || parse_number(line, "limit", UINT64_MAX, &wanted->limit);
}

void print_hex(const Piece& piece) {
    constexpr size_t ROW = 16;
    for (size_t row = 0; row < piece.data_len; row += ROW) {
        std::string text;
        printf("    %06zx ", row);
        for (size_t i = row; i < row + ROW; ++i) {
            if (i < piece.data_len) {
                printf(" %02x", piece.data[i]);
                const char c = static_cast<char>(piece.data[i]);
                text += c >= 0x20 && c < 0x7f ? c : '.';
            } else {
                printf("   ");
            }
        }
        printf("  %s\n", text.c_str());
    }
}

std::string hex_text(const Piece& piece) {
    static const char DIGITS[] = "0123456789abcdef";
    std::string text;
    for (size_t i = 0; i < piece.data_len; ++i) {
        text += DIGITS[piece.data[i] >> 4];
        text += DIGITS[piece.data[i] & 15];
    }
    return text;
}

void print_piece(const Wanted& wanted, const std::string& path, const Piece& piece) {
    if (!wanted.json) {
        printf("%10llu  seq %-10u type 0x%02x 0x%02x  %5zu bytes%s%s%s\n",
               static_cast<unsigned long long>(piece.offset), piece.seq_num, piece.type,
               piece.sub_type, piece.data_len, piece.kind ? "  " : "", piece.kind ? piece.kind : "",
               piece.intact ? "" : "  wrong length");
        if (wanted.hex) {
            print_hex(piece);
        }
        return;
    }
    Json object;
    if (wanted.several) {
        object["file"] = json_text(path);
    }
    object["offset"] = piece.offset;
    object["seq"] = piece.seq_num;
    object["type"] = piece.type;
    object["sub_type"] = piece.sub_type;
    object["len"] = piece.len_field;
    object["payload"] = piece.data_len;
    object["intact"] = piece.intact;
    if (piece.kind) {
        object["kind"] = piece.kind;
    }
    if (wanted.hex) {
        object["data"] = hex_text(piece);
    }
    print_json(object);
}

int frames(const std::string& path, Wanted* wanted) {
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    if (wanted->several && !wanted->json) {
        printf("%s:\n", escape_text(path).c_str());
    }
    FileReport report;
    const PieceVisitor print = [&](const Piece& piece) {
        if ((wanted->type < 0 || wanted->type == piece.type) &&
            (wanted->sub_type < 0 || wanted->sub_type == piece.sub_type)) {
            print_piece(*wanted, path, piece);
            --wanted->limit;
        }
        return wanted->limit > 0 && ferror(stdout) == 0;
    };
    scan_file(in, FileName(file_part(path)), print, &report);
    tell_damage(path, report);
    return scan_status(in, path, report);
}

}  // namespace

int run_frames(const CommandLine& line) {
    Wanted wanted;
    std::string wrong;
    if (!read_options(line, &wanted, &wrong)) {
        return line.usage_error("--" + wrong + ": '" + line.value(wrong, "") +
                                "' is not a number that it can be");
    }
    Args files;
    int status = ES_OK;
    if (!select_files(line, &files, &status)) {
        return status;
    }
    wanted.several = line.params().size() > 1;
    const Progress progress(total_size(files), true);
    for (const std::string& path : files) {
        if (wanted.limit > 0) {
            status = std::max(status, frames(path, &wanted));
        }
    }
    return status;
}
