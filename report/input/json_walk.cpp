#include "report/input/json_walk.h"

#include <algorithm>

namespace report {
namespace {

size_t SkipBlank(std::string_view json, size_t at) {
    return std::min(json.find_first_not_of(" \t\r\n", at), json.size());
}

// From a quote to behind the next one.
size_t SkipString(std::string_view json, size_t at) {
    for (at++; at < json.size() && json[at] != '"'; at++) {
        at += json[at] == '\\' ? 1 : 0;
    }
    return std::min(at + 1, json.size());
}

size_t SkipValue(std::string_view json, size_t at) {
    int depth = 0;
    while (at < json.size()) {
        switch (json[at]) {
        case '"':
            at = SkipString(json, at);
            break;
        case '{':
        case '[':
            depth++;
            at++;
            continue;
        case '}':
        case ']':
            if (depth == 0) {
                return at;
            }
            depth--;
            at++;
            break;
        case ',':
            if (depth == 0) {
                return at;
            }
            at++;
            continue;
        default:
            at++;
            continue;
        }
        if (depth == 0) {
            return at;
        }
    }
    return at;
}

std::string_view Trimmed(std::string_view text) {
    size_t end = text.find_last_not_of(" \t\r\n");
    return text.substr(0, end == std::string_view::npos ? 0 : end + 1);
}

}  // namespace

bool JsonNext(std::string_view container, size_t *at, JsonPart *part) {
    bool object = container.starts_with('{');
    size_t begin = SkipBlank(container, *at == 0 ? 1 : *at);
    if (*at != 0 && begin < container.size() && container[begin] == ',') {
        begin = SkipBlank(container, begin + 1);
    }
    if (begin >= container.size() || container[begin] == '}' || container[begin] == ']') {
        return false;
    }
    part->key = {};
    if (object) {
        size_t end = SkipString(container, begin);
        part->key = container.substr(begin, end - begin);
        begin = SkipBlank(container, std::min(container.find(':', end), container.size() - 1) + 1);
    }
    *at = SkipValue(container, begin);
    part->value = Trimmed(container.substr(begin, *at - begin));
    return true;
}

std::string_view JsonMember(std::string_view object, std::string_view key) {
    JsonPart part;
    for (size_t at = 0; JsonNext(object, &at, &part);) {
        if (part.key.size() == key.size() + 2 && part.key.substr(1, key.size()) == key) {
            return part.value;
        }
    }
    return {};
}

}  // namespace report
