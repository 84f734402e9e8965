#include "report/table/sink.h"

#include "report/support/cells.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <sys/ioctl.h>
#include <unistd.h>

namespace report {
namespace {

constexpr size_t kNarrowestName = 8;

// On a terminal a name's control characters are escaped; into a file it goes as it is.
void AppendField(const Sink *sink, std::string_view text, std::string *out) {
    if (sink->terminal) {
        AppendClean(out, text);
    } else {
        out->append(text);
    }
}

// An absent value is nothing, an empty text is "".
void AppendCsv(const Sink *sink, std::string_view cell, std::string *out) {
    if (cell.data() == nullptr) {
        return;
    }
    std::string clean;
    if (sink->terminal) {
        AppendClean(&clean, cell);
        cell = clean;
    }
    if (!cell.empty() && cell.find_first_of(",\"\r\n") == std::string::npos) {
        out->append(cell);
        return;
    }
    out->push_back('"');
    for (char c : cell) {
        out->append(c == '"' ? 2 : 1, c);
    }
    out->push_back('"');
}

void AppendTsv(const Sink *sink, std::string_view cell, std::string *out) {
    static constexpr std::string_view kRaw = "\t\n\r\\", kLetters = "tnr\\";
    while (!cell.empty()) {
        size_t raw = cell.find_first_of(kRaw);
        AppendField(sink, cell.substr(0, raw), out);
        if (raw == std::string_view::npos) {
            return;
        }
        out->append({'\\', kLetters[kRaw.find(cell[raw])]});
        cell.remove_prefix(raw + 1);
    }
}

void AppendUnicode(uint32_t character, std::string *out) {
    char escaped[16];
    snprintf(escaped, sizeof escaped, "\\u%04x", character);
    out->append(escaped);
}

void AppendJsonText(std::string_view text, std::string *out) {
    out->push_back('"');
    while (!text.empty()) {
        size_t length;
        bool valid;
        uint32_t character = NextCharacter(text, &length, &valid);
        if (!valid || IsControl(character)) {
            AppendUnicode(valid ? character : 0xfffd, out);
        } else {
            if (character == '"' || character == '\\') {
                out->push_back('\\');
            }
            out->append(text.substr(0, length));
        }
        text.remove_prefix(length);
    }
    out->push_back('"');
}

// A whole number that a reader with doubles would round.
bool IsRounded(std::string_view number) {
    constexpr std::string_view kMost = "9007199254740992";
    number.remove_prefix(number.starts_with('-') ? 1 : 0);
    return number.size() > kMost.size() || (number.size() == kMost.size() && number > kMost);
}

void AppendJson(const Sink *sink, const std::string_view *cells, std::string *out) {
    char before = '{';
    for (size_t i = 0; i < sink->columns.size(); i++) {
        const SinkColumn &column = sink->columns[i];
        if (cells[i].data() == nullptr) {
            continue;
        }
        out->push_back(before);
        before = ',';
        out->append("\"").append(column.key).append("\":");
        if (column.kind == Kind::Number && !(column.isPort && IsRounded(cells[i]))) {
            out->append(cells[i]);
        } else {
            AppendJsonText(cells[i], out);
        }
    }
    out->append(before == '{' ? "{}" : "}");
}

void AppendSeparated(const Sink *sink, const std::string_view *cells, std::string *out) {
    for (size_t i = 0; i < sink->columns.size(); i++) {
        if (sink->format == Format::Csv) {
            out->append(i == 0 ? "" : ",");
            AppendCsv(sink, cells[i], out);
        } else {
            out->append(i == 0 ? "" : "\t");
            AppendTsv(sink, cells[i], out);
        }
    }
}

void KeepAligned(Sink *sink, const std::string_view *cells) {
    for (size_t i = 0; i < sink->columns.size(); i++) {
        size_t start = sink->block.size();
        AppendClean(&sink->block, cells[i]);
        sink->ends.push_back(sink->block.size());
        sink->widths[i] = std::max(sink->widths[i], CellsOf(std::string_view(sink->block).substr(start)));
        sink->used[i] = sink->used[i] || cells[i].data() != nullptr;
    }
}

// Widths of the columns, 0 for one that is not shown. Texts that may be cut give way, the widest first, until the line
// fits the terminal or each is as narrow as a name may be.
std::vector<size_t> FittingWidths(const Sink *sink) {
    std::vector<size_t> widths(sink->columns.size());
    size_t line = 0;
    for (size_t i = 0; i < widths.size(); i++) {
        if (sink->used[i]) {
            widths[i] = std::max(sink->widths[i], sink->columns[i].key.size());
            line += widths[i] + (line == 0 ? 0 : 2);
        }
    }
    while (sink->width != 0 && line > sink->width) {
        size_t widest = widths.size();
        for (size_t i = 0; i < widths.size(); i++) {
            if (sink->columns[i].maySplit && widths[i] > std::max(kNarrowestName, sink->columns[i].key.size()) &&
                (widest == widths.size() || widths[i] > widths[widest])) {
                widest = i;
            }
        }
        if (widest == widths.size()) {
            break;
        }
        widths[widest]--;
        line--;
    }
    return widths;
}

// One cell, filled up to its width: numbers stand at its right, texts at its left.
void AppendPadded(std::string_view text, size_t width, bool right, const char *colour, std::string *out) {
    size_t cells = CellsOf(text);
    bool cut = cells > width;
    if (cut) {
        text = CutToCells(text, width - 1);
        cells = CellsOf(text) + 1;
    }
    out->append(right ? width - cells : 0, ' ').append(colour).append(text).append(cut ? "…" : "");
    out->append(*colour != '\0' ? "\033[0m" : "").append(right ? 0 : width - cells, ' ');
}

void WriteAlignedLine(Sink *sink, const std::vector<size_t> &widths, bool header, auto cellOf) {
    std::string *line = &sink->line;
    line->clear();
    for (size_t i = 0; i < widths.size(); i++) {
        if (widths[i] == 0) {
            continue;
        }
        const SinkColumn &column = sink->columns[i];
        std::string_view cell = cellOf(i);
        const char *colour = "";
        if (sink->colour && header) {
            colour = "\033[1m";
        } else if (sink->colour && column.loss && cell.find_first_of("123456789") != std::string_view::npos) {
            colour = "\033[1;31m";
        }
        line->append(line->empty() ? 0 : 2, ' ');
        AppendPadded(cell, widths[i], column.kind != Kind::Text, colour, line);
    }
    line->erase(line->find_last_not_of(' ') + 1);
    line->push_back('\n');
    OutputWrite(sink->output, *line);
}

void WriteBlock(Sink *sink) {
    size_t columns = sink->columns.size();
    std::vector<size_t> widths = FittingWidths(sink);
    if (widths != sink->headed) {
        WriteAlignedLine(sink, widths, true, [&](size_t i) { return std::string_view(sink->columns[i].key); });
        sink->headed = widths;
    }
    for (size_t row = 0; row < sink->ends.size(); row += columns) {
        WriteAlignedLine(sink, widths, false, [&](size_t i) {
            size_t start = row + i == 0 ? 0 : sink->ends[row + i - 1];
            return std::string_view(sink->block).substr(start, sink->ends[row + i] - start);
        });
    }
    sink->block.clear();
    sink->ends.clear();
}

}  // namespace

void SinkLookAt(Sink *sink) {
    sink->terminal = isatty(sink->output->fd) == 1;
    const char *noColour = getenv("NO_COLOR"), *kind = getenv("TERM");
    sink->colour = sink->terminal && (noColour == nullptr || *noColour == '\0') && kind != nullptr &&
                   std::string_view(kind) != "dumb";
    winsize size{};
    if (sink->terminal && ioctl(sink->output->fd, TIOCGWINSZ, &size) == 0) {
        sink->width = size.ws_col;
    }
}

void SinkBegin(Sink *sink) {
    sink->widths.assign(sink->columns.size(), 0);
    sink->used.assign(sink->columns.size(), false);
    if (sink->format == Format::Csv || sink->format == Format::Tsv) {
        std::vector<std::string_view> keys;
        for (const SinkColumn &column : sink->columns) {
            keys.push_back(column.key);
        }
        SinkRow(sink, keys.data());
    }
}

void SinkRow(Sink *sink, const std::string_view *cells) {
    if (sink->format == Format::Aligned) {
        KeepAligned(sink, cells);
        return;
    }
    sink->line.clear();
    if (sink->format == Format::Json) {
        AppendJson(sink, cells, &sink->line);
    } else {
        AppendSeparated(sink, cells, &sink->line);
    }
    sink->line.push_back('\n');
    OutputWrite(sink->output, sink->line);
}

OutputState SinkEndBlock(Sink *sink) {
    if (!sink->ends.empty()) {
        WriteBlock(sink);
    }
    return OutputFlush(sink->output);
}

}  // namespace report
