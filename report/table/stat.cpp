#include "report/table/stat.h"

#include "report/rows/rows.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

namespace report {
namespace {

// Digits behind the point, so that a computed figure can be shown as fine as the values are.
uint32_t DecimalsOf(std::string_view number) {
    size_t point = number.find('.');
    if (point == std::string_view::npos) {
        return 0;
    }
    size_t end = std::min(number.find_first_of("eE"), number.size());
    return static_cast<uint32_t>(std::min<size_t>(end - point - 1, 15));
}

void Take(StatKind kind, std::string_view cell, StatValue *value) {
    double number;
    if (!CellNumber(cell, &number)) {
        return;
    }
    value->decimals = std::max(value->decimals, DecimalsOf(cell));
    value->count++;
    switch (kind) {
    case StatKind::Max:
        if (!value->present || number > value->number) {
            value->number = number;
            value->text.assign(cell);
        }
        break;
    case StatKind::Mean:
        value->number += number;
        break;
    case StatKind::P95:
        value->values.push_back(number);
        break;
    case StatKind::Last:
        value->text.assign(cell);
        break;
    }
    value->present = true;
}

std::string_view Written(double number, uint32_t decimals, std::string *scratch) {
    char text[400];  // the largest double has 309 digits ahead of the point
    int length = snprintf(text, sizeof text, "%.*f", static_cast<int>(decimals), number);
    scratch->assign(text, static_cast<size_t>(length));
    return *scratch;
}

}  // namespace

bool StatFind(std::string_view word, StatKind *kind) {
    constexpr std::string_view kWords[] = {"max", "mean", "p95", "last"};  // in the order of StatKind
    const std::string_view *found = std::find(std::begin(kWords), std::end(kWords), word);
    *kind = static_cast<StatKind>(found - kWords);
    return found != std::end(kWords);
}

std::vector<const char *> StatKeys(Section section) {
    switch (section) {
    case Section::Txqueue:
        return {"txqueue.queue"};
    case Section::Rxqueue:
        return {"rxqueue.queue"};
    case Section::Vcpu:
        return {"vcpu.id"};
    case Section::Wdt:
        return {"wdt.name"};
    case Section::Pcpu:
        return {"cpu.pcpu"};
    case Section::Histograms:
        return {"vcpu.id", "histos.name", "histos.limit"};
    default:
        return {};
    }
}

bool StatIsFigure(Section section, const Column &column) {
    static constexpr std::string_view kNames[] = {"rxmode", "wdt.affval"};  // numbers of which there is no mean
    std::vector<const char *> keys = StatKeys(section);
    return column.kind == Kind::Number && std::find(keys.begin(), keys.end(), column.key) == keys.end() &&
           std::find(std::begin(kNames), std::end(kNames), column.key) == std::end(kNames);
}

void StatRow(Stat *stat, std::string *key, uint64_t record, bool hasValue, const std::string_view *cells) {
    size_t columns = stat->isFigure.size();
    auto find = [&] {
        auto [found, isNew] = stat->places.try_emplace(*key, stat->elements.size());
        if (isNew) {
            stat->elements.emplace_back().values.resize(columns);
        }
        return &stat->elements[found->second];
    };
    StatElement *element = find();
    if (element->lastRecord == record) {
        key->append("\n").append(std::to_string(++element->alike));
        element = find();
    }
    element->alike = 0;
    element->lastRecord = record;
    element->records += hasValue ? 1 : 0;
    for (size_t i = 0; i < columns; i++) {
        if (stat->isFigure[i]) {
            Take(stat->kind, cells[i], &element->values[i]);
        } else if (cells[i].data() != nullptr) {
            element->values[i].text.assign(cells[i]);
            element->values[i].present = true;
        }
    }
}

std::string_view StatFigure(Stat *stat, StatElement *element, size_t column, std::string *scratch) {
    StatValue *value = &element->values[column];
    if (!value->present) {
        return {};
    }
    if (!stat->isFigure[column] || stat->kind == StatKind::Max || stat->kind == StatKind::Last) {
        return value->text;
    }
    if (stat->kind == StatKind::Mean) {
        return Written(value->number / static_cast<double>(value->count), value->decimals + 2, scratch);
    }
    // The smallest value that 95 % of all values don't exceed.
    auto rank = static_cast<ptrdiff_t>((value->values.size() * 95 + 99) / 100 - 1);
    std::nth_element(value->values.begin(), value->values.begin() + rank, value->values.end());
    return Written(value->values[static_cast<size_t>(rank)], value->decimals, scratch);
}

}  // namespace report
