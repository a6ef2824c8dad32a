// SPDX-License-Identifier: Apache-2.0
// kestlog frames.
#include <stdio.h>

#include <algorithm>

#include "common/text.h"
#include "kestlog/Commands.h"
#include "kestlog/ExitStatus.h"
#include "kestlog/LineBuffer.h"
#include "kestlog/NumberColumn.h"
#include "kestlog/Progress.h"
#include "kestlog/Report.h"
#include "kestlog/TreeInput.h"
#include "kestlog/option_numbers.h"

namespace {

// Which frames are wanted, and how.
struct Wanted {
    int type = -1;  // -1: any
    int sub_type = -1;
    uint64_t limit = UINT64_MAX;  // how many are still to be printed
    bool hex = false;
    bool json = false;
    bool several = false;  // files

    bool takes(const Piece& piece) const {
        return (type < 0 || (type == piece.type && !piece.headless)) &&
               (sub_type < 0 || (sub_type == piece.sub_type && !piece.headless));
    }
};

class FramePrinter {
public:
    FramePrinter(const Wanted& wanted, const std::string& path) : m_wanted(wanted) {
        if (!wanted.several) {
            return;
        }
        if (wanted.json) {
            m_file = "\"file\":" + json_string(path) + ",";
        } else {
            m_out.add(std::string_view(escape_text(path)));
            m_out.add(":");
            m_out.end_line();
        }
    }

    // False once the output cannot be written.
    bool print(const Piece& piece) {
        m_wanted.json ? print_json(piece) : print_text(piece);
        return m_out.end_line();
    }

private:
    void print_text(const Piece& piece) {
        print_facts(piece);
        if (piece.kind) {
            m_out.add("  ");
            m_out.add(std::string_view(piece.kind));
        }
        if (!piece.intact) {
            m_out.add("  wrong length");
        }
        for (size_t row = 0; m_wanted.hex && row < piece.data_len; row += ROW) {
            m_out.end_line();
            print_row(piece, row);
        }
    }

    // What each line begins with.
    void print_facts(const Piece& piece) {
        LineBuffer::Short line(m_out);
        line.add(m_offset, piece.offset);
        if (piece.headless) {
            line.add("  no header                      ");
            line.add(m_data_len, piece.data_len);
            line.add(" bytes");
            return;
        }
        line.add("  seq ");
        line.add(m_seq, piece.seq_num);
        line.add(" type 0x");
        line.add_hex(piece.type);
        line.add(" 0x");
        line.add_hex(piece.sub_type);
        line.add("  ");
        line.add(m_data_len, piece.data_len);
        line.add(" bytes");
    }

    void print_row(const Piece& piece, size_t row) {
        const size_t end = std::min(row + ROW, piece.data_len);
        m_out.add("    ");
        for (const int shift : {16, 8, 0}) {
            m_out.add_hex(static_cast<uint8_t>(row >> shift));
        }
        m_out.add(" ");
        for (size_t i = row; i < row + ROW; ++i) {
            m_out.add(" ");
            if (i < end) {
                m_out.add_hex(piece.data[i]);
            } else {
                m_out.add("  ");
            }
        }
        m_out.add("  ");
        for (size_t i = row; i < end; ++i) {
            const char c = static_cast<char>(piece.data[i]);
            m_out.add(std::string_view(c >= 0x20 && c < 0x7f ? &c : ".", 1));
        }
    }

    // By hand, as there may be millions. No text in it needs to be escaped but the file's.
    void print_json(const Piece& piece) {
        m_out.add("{");
        m_out.add(std::string_view(m_file));
        m_out.add("\"offset\":");
        m_out.add(piece.offset);
        if (!piece.headless) {
            m_out.add(",\"seq\":");
            m_out.add(piece.seq_num);
            m_out.add(",\"type\":");
            m_out.add(piece.type);
            m_out.add(",\"sub_type\":");
            m_out.add(piece.sub_type);
            m_out.add(",\"len\":");
            m_out.add(piece.len_field);
        }
        m_out.add(",\"payload\":");
        m_out.add(piece.data_len);
        m_out.add(std::string_view(piece.intact ? ",\"intact\":true" : ",\"intact\":false"));
        if (piece.kind) {
            m_out.add(",\"kind\":\"");
            m_out.add(std::string_view(piece.kind));
            m_out.add("\"");
        }
        if (m_wanted.hex) {
            m_out.add(",\"data\":\"");
            for (size_t i = 0; i < piece.data_len; ++i) {
                m_out.add_hex(piece.data[i]);
            }
            m_out.add("\"");
        }
        m_out.add("}");
    }

    static constexpr size_t ROW = 16;

    const Wanted& m_wanted;
    std::string m_file;
    LineBuffer m_out;
    NumberColumn m_offset{NumberColumn::RIGHT, 10};
    NumberColumn m_seq{NumberColumn::LEFT, 10};
    NumberColumn m_data_len{NumberColumn::RIGHT, 5};
};

int frames(const std::string& path, Wanted* wanted) {
    LogReader in;
    if (const int status = open_input(in, path)) {
        return status;
    }
    FileReport report;
    {
        FramePrinter printer(*wanted, path);
        const PieceVisitor print = [&](const Piece& piece) {
            bool more = true;
            if (wanted->takes(piece)) {
                more = printer.print(piece) && --wanted->limit > 0;
            }
            return more;
        };
        scan_file(in, FileName(file_part(path)), print, wanted->hex ? FP_DATA : FP_LENGTH, &report);
    }
    tell_damage(path, report);
    return scan_status(in, path, report);
}

}  // namespace

int run_frames(const CommandLine& line) {
    Wanted wanted;
    Args files;
    int status = ES_OK;
    wanted.hex = line.has("hex");
    wanted.json = line.has("json");
    if (!read_type(line, "type", &wanted.type, &status) ||
        !read_type(line, "sub-type", &wanted.sub_type, &status) ||
        !read_whole(line, "limit", 0, UINT64_MAX, &wanted.limit, &status) ||
        !select_files(line, &files, &status)) {
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
