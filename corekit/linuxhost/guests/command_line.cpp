#include "corekit/linuxhost/guests/command_line.h"

#include <algorithm>
#include <charconv>

namespace {

struct Option {
    std::string key;  // empty for a value alone, as the first of a list may be
    std::string value;
};
using Options = std::vector<Option>;

std::string_view TakeArgument(std::string_view *command) {
    size_t end = std::min(command->find('\0'), command->size());
    std::string_view argument = command->substr(0, end);
    command->remove_prefix(std::min(end + 1, command->size()));
    return argument;
}

// Up to a comma; two commas stand for one.
std::string TakePiece(std::string_view *list) {
    std::string piece;
    size_t at = 0;
    while (at < list->size()) {
        bool comma = (*list)[at] == ',';
        bool twice = comma && at + 1 < list->size() && (*list)[at + 1] == ',';
        if (comma && !twice) {
            break;
        }
        piece += (*list)[at];
        at += twice ? 2 : 1;
    }
    list->remove_prefix(std::min(at + 1, list->size()));
    return piece;
}

Options OfList(std::string_view list) {
    Options options;
    while (!list.empty()) {
        std::string piece = TakePiece(&list);
        size_t equals = piece.find('=');
        options.push_back(equals == std::string::npos ? Option{"", piece}
                                                      : Option{piece.substr(0, equals), piece.substr(equals + 1)});
    }
    return options;
}

// A text behind its quotation mark, with \" and \\ taken for what they stand for.
std::string TakeQuoted(std::string_view *text) {
    std::string value;
    size_t at = 0;
    for (; at < text->size() && (*text)[at] != '"'; at++) {
        at += (*text)[at] == '\\' && at + 1 < text->size() ? 1U : 0U;
        value += (*text)[at];
    }
    text->remove_prefix(std::min(at + 1, text->size()));
    return value;
}

// The texts among the members of the outermost object: all that is asked for here is text.
Options OfObject(std::string_view text) {
    Options options;
    std::string key;
    bool isValue = false;
    int depth = 0;
    while (!text.empty()) {
        char c = text.front();
        text.remove_prefix(1);
        depth += c == '{' || c == '[' ? 1 : 0;
        depth -= c == '}' || c == ']' ? 1 : 0;
        if (c == '"') {
            std::string word = TakeQuoted(&text);
            if (depth == 1 && isValue) {
                options.push_back({key, word});
            } else if (depth == 1) {
                key = word;
            }
        } else if (depth == 1 && (c == ':' || c == ',')) {
            isValue = c == ':';
        }
    }
    return options;
}

Options OptionsOf(std::string_view argument) {
    return !argument.empty() && argument.front() == '{' ? OfObject(argument) : OfList(argument);
}

// The value of a key, or the value alone at the front where `implied` says that it stands for that key.
std::string ValueOf(const Options &options, const char *key, bool implied = false) {
    for (const Option &option : options) {
        if (option.key == key || (implied && option.key.empty() && &option == options.data())) {
            return option.value;
        }
    }
    return "";
}

// Calls `each` with the value of every argument of this name, with one dash or two.
template <typename Each>
void EachArgument(std::string_view command, std::string_view name, Each each) {
    TakeArgument(&command);  // the program
    while (!command.empty()) {
        std::string_view argument = TakeArgument(&command);
        argument.remove_prefix(argument.substr(0, 2) == "--" ? 1 : 0);
        if (argument == name) {
            each(OptionsOf(TakeArgument(&command)));
        }
    }
}

bool ParseMac(std::string_view text, u8 (&mac)[6]) {
    for (size_t i = 0; i < 6; i++) {
        const char *end = text.data() + text.size();
        auto [next, error] = std::from_chars(text.data(), end, mac[i], 16);
        bool last = i == 5;
        if (error != std::errc() || (last ? next != end : next == end || *next != ':')) {
            return false;
        }
        text.remove_prefix(static_cast<size_t>(next - text.data()) + (last ? 0 : 1));
    }
    return true;
}

// Numbers between colons. What is no number ends the list.
std::vector<u32> ParseDescriptors(const std::string &text) {
    std::vector<u32> descriptors;
    const char *at = text.data();
    const char *end = at + text.size();
    while (at < end) {
        u32 number = 0;
        auto [next, error] = std::from_chars(at, end, number);
        if (error != std::errc() || (next < end && *next != ':')) {
            break;
        }
        descriptors.push_back(number);
        at = next + 1;
    }
    return descriptors;
}

struct Backend {
    std::string id;
    CommandNic nic;
};

Backend BackendOf(const Options &options) {
    CommandNic nic = {ValueOf(options, "ifname"), ParseDescriptors(ValueOf(options, "fds")), {}};
    for (u32 descriptor : ParseDescriptors(ValueOf(options, "fd"))) {
        nic.descriptors.push_back(descriptor);
    }
    return {ValueOf(options, "id"), nic};
}

bool IsTap(const Options &options) {
    std::string type = ValueOf(options, "type", true);
    return type == "tap" || type == "bridge";
}

}  // namespace

std::string CommandGuestName(std::string_view command) {
    std::string name;
    EachArgument(command, "-name", [&](const Options &options) {
        std::string guest = ValueOf(options, "guest", true);
        name = guest.empty() ? name : guest;
    });
    return name;
}

std::vector<CommandNic> CommandNics(std::string_view command) {
    std::vector<Backend> backends;
    std::vector<CommandNic> nics;
    EachArgument(command, "-netdev", [&](const Options &options) {
        if (IsTap(options) && backends.size() < MAX_COMMAND_NICS) {
            backends.push_back(BackendOf(options));
        }
    });
    EachArgument(command, "-device", [&](const Options &options) {
        std::string id = ValueOf(options, "netdev");
        for (Backend &backend : backends) {
            if (!id.empty() && backend.id == id && ParseMac(ValueOf(options, "mac"), backend.nic.mac)) {
                nics.push_back(backend.nic);
                backend.id.clear();  // one card each, so that a long command line costs no more
                break;
            }
        }
    });
    EachArgument(command, "-nic", [&](const Options &options) {
        Backend backend = BackendOf(options);
        if (IsTap(options) && nics.size() < 2 * MAX_COMMAND_NICS &&
            ParseMac(ValueOf(options, "mac"), backend.nic.mac)) {
            nics.push_back(backend.nic);
        }
    });
    return nics;
}
