#include "report/rows/parser.h"

#include "report/input/json_line.h"
#include "report/support/message.h"

#include <charconv>

namespace report::parsing {
namespace {

// The columns below "prefix" among those of "whole"; first == last when there are none.
Span SpanBelow(const Span &whole, std::string_view prefix) {
    std::span<const Column> columns = SectionColumns(whole.section);
    Span span{whole.section, whole.first, whole.first, whole.prefix};
    auto begins = [&](size_t column) {
        std::string_view key = std::string_view(columns[column].key).substr(whole.prefix);
        return key.size() > prefix.size() && key.starts_with(prefix) && key[prefix.size()] == '.';
    };
    while (span.first < whole.last && !begins(span.first)) {
        span.first++;
    }
    span.last = span.first;
    while (span.last < whole.last && begins(span.last)) {
        span.last++;
    }
    span.prefix += prefix.size() + 1;
    return span;
}

bool CellOf(Parser *parser, const Column &column, ondemand::value &value, std::string_view *cell) {
    return column.kind == Kind::Text ? TextOf(parser, column.key, value, cell)
                                     : NumberOf(parser, column.key, value, cell);
}

}  // namespace

Span SpanOf(Section section, std::string_view prefix) {
    Span whole{section, 0, SectionColumns(section).size(), 0};
    return prefix.empty() ? whole : SpanBelow(whole, prefix);
}

size_t ColumnOf(Section section, const char *key) {
    return static_cast<size_t>(ColumnFind(section, key));
}

std::string_view KeyOf(ondemand::field &field) {
    const char *raw = field.key().raw();
    size_t length = 0;
    while (raw[length] != '"') {  // the first pass over the record saw that each text ends
        length += raw[length] == '\\' ? 2 : 1;
    }
    return {raw, length};
}

bool Put(std::string_view *cell, std::string_view value) {
    if (cell->data() != nullptr) {
        return false;
    }
    *cell = value;
    return true;
}

bool Refuse(Parser *parser, std::string_view key, const char *what) {
    if (parser->wrong.empty()) {
        parser->wrong.assign(key.substr(0, 64)).append(what);
    }
    return false;
}

bool Stranger(Parser *parser, std::string_view key) {
    if (!parser->strangerTold) {
        parser->strangerTold = true;
        Tell("%s: record %llu: no report has a key \"%.*s\"; such keys are left out", parser->record->file,
             static_cast<unsigned long long>(parser->record->number),
             static_cast<int>(std::min<size_t>(key.size(), 64)), key.data());
    }
    return true;
}

bool NumberOf(Parser *parser, std::string_view key, ondemand::value &value, std::string_view *cell) {
    std::string_view token = value.raw_json_token();  // with the blanks behind it
    while (!token.empty() &&
           (token.back() == ' ' || token.back() == '\n' || token.back() == '\t' || token.back() == '\r')) {
        token.remove_suffix(1);
    }
    if (!JsonIsNumber(token)) {
        return Refuse(parser, key, " is no number");
    }
    return Put(cell, token) || Refuse(parser, key, " stands there twice");
}

bool TextOf(Parser *parser, std::string_view key, ondemand::value &value, std::string_view *cell) {
    std::string_view text;
    if (value.get_string().get(text) != simdjson::SUCCESS) {
        return Refuse(parser, key, " is no text");
    }
    return Put(cell, text) || Refuse(parser, key, " stands there twice");
}

bool IntegerOf(Parser *parser, std::string_view key, ondemand::value &value, int64_t *number, bool *seen) {
    std::string_view cell;
    if (!NumberOf(parser, key, value, &cell)) {
        return false;
    }
    auto [end, error] = std::from_chars(cell.data(), cell.data() + cell.size(), *number);
    if (error != std::errc() || end != cell.data() + cell.size()) {
        return Refuse(parser, key, " is no whole number");
    }
    if (*seen) {
        return Refuse(parser, key, " stands there twice");
    }
    *seen = true;
    return true;
}

bool Once(Parser *parser, std::string_view key, bool *seen) {
    if (*seen) {
        return Refuse(parser, key, " stands there twice");
    }
    *seen = true;
    return true;
}

bool NumbersOf(Parser *parser, std::string_view what, ondemand::value value, std::vector<std::string_view> *numbers) {
    return EachElement(parser, what, value, [&](ondemand::value element) {
        return NumberOf(parser, what, element, &numbers->emplace_back());
    });
}

RowsOfSection *Of(Parser *parser, Section section) {
    return &parser->rows->sections[static_cast<size_t>(section)];
}

bool IsWanted(const Parser *parser, Section section) {
    const std::vector<bool> *chosen = section == Section::Histograms ? parser->rows->histogramsOf : nullptr;
    return (parser->wanted & Wanted(section)) != 0 &&
           (chosen == nullptr || (parser->place < chosen->size() && (*chosen)[parser->place]));
}

std::string_view *NewRow(Parser *parser, Section section) {
    RowsOfSection *table = Of(parser, section);
    table->places.push_back(parser->place);
    table->cells.resize(table->cells.size() + table->columns);
    return table->cells.data() + (table->cells.size() - table->columns);
}

std::string_view *RowOfPort(Parser *parser, Section section) {
    RowsOfSection *table = Of(parser, section);
    if (table->places.empty() || table->places.back() != parser->place) {
        return NewRow(parser, section);
    }
    return table->cells.data() + (table->cells.size() - table->columns);
}

std::string_view NumberText(Parser *parser, size_t number) {
    while (parser->numbers.size() <= number) {
        parser->numbers.push_back(std::to_string(parser->numbers.size()));
    }
    return parser->numbers[number];
}

std::string *NewText(Parser *parser) {
    if (parser->textsUsed == parser->texts.size()) {
        parser->texts.emplace_back();
    }
    std::string *text = &parser->texts[parser->textsUsed++];
    text->clear();
    return text;
}

bool ReadObject(Parser *parser, std::string_view what, const Span &span, std::string_view *cells,
                ondemand::value value) {
    size_t next = span.first;
    return EachField(parser, what, value, [&](std::string_view key, ondemand::value field) {
        return ReadCell(parser, span, cells, &next, key, field);
    });
}

bool ReadCell(Parser *parser, const Span &span, std::string_view *cells, size_t *next, std::string_view key,
              ondemand::value &value) {
    const Column *columns = SectionColumns(span.section).data();
    size_t column = *next;
    for (size_t tried = span.first; tried < span.last; tried++) {
        column = column < span.last ? column : span.first;
        if (key == columns[column].key + span.prefix) {
            *next = column + 1;
            return CellOf(parser, columns[column], value, &cells[column]);
        }
        column++;
    }
    Span below = SpanBelow(span, key);  // as deep as the catalogue's keys, whatever the record holds
    if (below.first == below.last) {
        return Stranger(parser, key);
    }
    return ReadObject(parser, key, below, cells, value);
}

}  // namespace report::parsing
