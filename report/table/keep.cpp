#include "report/table/keep.h"

#include "report/rows/rows.h"

#include <algorithm>
#include <cstring>

namespace report {
namespace {

// The byte ahead of a cell: its length, or one of these.
constexpr uint8_t kAbsent = 255, kLong = 254;  // kLong: the length follows in four bytes

void AppendCell(std::string *cells, std::string_view cell) {
    bool isLong = cell.size() >= kLong;
    cells->push_back(static_cast<char>(cell.data() == nullptr ? kAbsent : isLong ? kLong : cell.size()));
    if (isLong) {
        auto length = static_cast<uint32_t>(cell.size());
        cells->append(reinterpret_cast<const char *>(&length), sizeof length);
    }
    cells->append(cell);
}

std::string_view TakeCell(std::string_view *cells) {
    auto head = static_cast<uint8_t>(cells->front());
    cells->remove_prefix(1);
    if (head == kAbsent) {
        return {};
    }
    uint32_t length = head;
    if (head == kLong) {
        memcpy(&length, cells->data(), sizeof length);
        cells->remove_prefix(sizeof length);
    }
    std::string_view cell = cells->substr(0, length);
    cells->remove_prefix(length);
    return cell;
}

int Compare(const SortKey &key, const KeptRow &a, const KeptRow &b, size_t i) {
    if (key.kind == Kind::Number) {
        return a.keys[i].number < b.keys[i].number ? -1 : a.keys[i].number > b.keys[i].number ? 1 : 0;
    }
    std::string_view left(a.cells.data() + a.keys[i].start, a.keys[i].length);
    std::string_view right(b.cells.data() + b.keys[i].start, b.keys[i].length);
    if (key.kind == Kind::Id && left.size() != right.size()) {  // of more than a double's digits
        return left.size() < right.size() ? -1 : 1;
    }
    return left.compare(right);
}

bool Before(const Keep *keep, const KeptRow &a, const KeptRow &b) {
    for (size_t i = 0; i < keep->keys.size(); i++) {
        if (a.keys[i].absent != b.keys[i].absent) {
            return b.keys[i].absent;
        }
        int order = a.keys[i].absent ? 0 : Compare(keep->keys[i], a, b, i);
        if (order != 0) {
            return keep->keys[i].descending ? order > 0 : order < 0;
        }
    }
    return a.number < b.number;
}

KeptRow MakeRow(Keep *keep, const std::string_view *cells, size_t count) {
    KeptRow row{};
    size_t bytes = 0;
    for (size_t i = 0; i < count; i++) {
        bytes += cells[i].size() + 1;
    }
    row.cells.reserve(bytes);
    row.number = keep->number++;
    for (size_t i = 0; i < count; i++) {
        AppendCell(&row.cells, cells[i]);
    }
    for (size_t i = 0; i < keep->keys.size(); i++) {
        std::string_view cell = cells[keep->keys[i].cell];
        row.keys[i].absent = cell.data() == nullptr;
        if (keep->keys[i].kind == Kind::Number) {
            row.keys[i].absent = !CellNumber(cell, &row.keys[i].number);
        }
        row.keys[i].start = static_cast<uint32_t>(row.cells.size());
        row.keys[i].length = static_cast<uint32_t>(cell.size());
        if (keep->keys[i].kind != Kind::Number) {
            row.cells.append(cell);  // a second time, behind the cells, so that it is found at once
        }
    }
    return row;
}

}  // namespace

void KeepRow(Keep *keep, const std::string_view *cells, size_t count) {
    auto before = [keep](const KeptRow &a, const KeptRow &b) { return Before(keep, a, b); };
    keep->rows.push_back(MakeRow(keep, cells, count));
    if (keep->limit == 0) {
        return;
    }
    std::push_heap(keep->rows.begin(), keep->rows.end(), before);
    if (keep->rows.size() > keep->limit) {
        std::pop_heap(keep->rows.begin(), keep->rows.end(), before);
        keep->rows.pop_back();
    }
}

void KeepWrite(Keep *keep, size_t count, Sink *sink) {
    std::sort(keep->rows.begin(), keep->rows.end(),
              [keep](const KeptRow &a, const KeptRow &b) { return Before(keep, a, b); });
    std::vector<std::string_view> cells(count);
    for (const KeptRow &row : keep->rows) {
        std::string_view rest = row.cells;
        for (std::string_view &cell : cells) {
            cell = TakeCell(&rest);
        }
        SinkRow(sink, cells.data());
    }
}

}  // namespace report
