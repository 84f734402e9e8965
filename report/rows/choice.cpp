#include "report/rows/choice.h"

#include "report/support/message.h"

#include <CLI/CLI.hpp>
#include <set>

namespace report {
namespace {

const char *const kGroup = "Choice of ports and time";

void AddNames(CLI::App &command, const char *flags, std::vector<std::string> *names, const char *type,
              const char *help) {
    // One name behind each flag: the words after it are files.
    command.add_option(flags, *names, help)->type_name(type)->allow_extra_args(false)->group(kGroup);
}

void AddMoment(CLI::App &command, const char *flag, Moment *moment, bool end, const char *help) {
    CLI::callback_t read = [moment, end](const CLI::results_t &words) { return MomentRead(words.back(), end, moment); };
    command.add_option(flag, read, help)
        ->type_name("TIME")
        ->take_last()
        ->group(kGroup)
        ->check([end](const std::string &word) {
            Moment any;
            return MomentRead(word, end, &any)
                       ? ""
                       : word + " is no time; times are 2026-11-23T02:10:00Z, 2026-11-23, 02:10 or seconds since 1970";
        });
}

}  // namespace

void ChoiceOptions(CLI::App &command, Choice *choice) {
    command.add_option("-p,--port", choice->ports, "A port, by its number")
        ->type_name("PORT")
        ->allow_extra_args(false)
        ->group(kGroup);
    AddNames(command, "-S,--switch", &choice->switches, "SWITCH", "All ports of a switch");
    AddNames(command, "-N,--pnic", &choice->nics, "NIC", "All ports of the switch that holds the physical NIC");
    AddNames(command, "-V,--vm", &choice->vms, "VM", "The ports of that name, and the uplinks of their switches");
    AddMoment(command, "--from", &choice->from, false,
              "Records from this time on: 2026-11-23T02:10:00Z, seconds since 1970, or 02:10 of each day, in UTC");
    AddMoment(command, "--to", &choice->to, true, "Records up to this time; 02:10 is the whole minute");
}

bool ChoiceHasTime(const Choice &choice, int64_t time) {
    return MomentWithin(time, choice.from, choice.to);
}

void ChoicePorts(Choice *choice, const Rows &rows, std::vector<char> *chosen) {
    size_t count = choice->ports.size() + choice->switches.size() + choice->nics.size() + choice->vms.size();
    chosen->assign(rows.ports.size(), count == 0 ? 1 : 0);
    if (count == 0) {
        return;
    }
    choice->seen.resize(count);
    std::set<std::string_view> whole, uplinks;  // switches: of the first all ports are chosen
    size_t number = 0;
    auto each = [&](auto matches, auto use) {
        for (size_t i = 0; i < rows.ports.size(); i++) {
            if (matches(rows.ports[i])) {
                use(i);
                choice->seen[number] = true;
            }
        }
        number++;
    };
    for (int64_t id : choice->ports) {
        std::string text = std::to_string(id);
        each([&](const PortIdentity &port) { return port.id == text; }, [&](size_t i) { (*chosen)[i] = 1; });
    }
    for (const std::string &name : choice->switches) {
        each([&](const PortIdentity &port) { return port.switchName == name; },
             [&](size_t i) { whole.insert(rows.ports[i].switchName); });
    }
    for (const std::string &name : choice->nics) {
        each([&](const PortIdentity &port) { return port.uplink && port.name == name; },
             [&](size_t i) { whole.insert(rows.ports[i].switchName); });
    }
    for (const std::string &name : choice->vms) {
        each([&](const PortIdentity &port) { return !port.uplink && port.name == name; },
             [&](size_t i) {
                 (*chosen)[i] = 1;
                 uplinks.insert(rows.ports[i].switchName);
             });
    }
    for (size_t i = 0; i < rows.ports.size(); i++) {
        const PortIdentity &port = rows.ports[i];
        if (whole.contains(port.switchName) || (port.uplink && uplinks.contains(port.switchName))) {
            (*chosen)[i] = 1;
        }
    }
}

void ChoiceTellUnseen(const Choice &choice) {
    size_t number = 0;
    auto tell = [&](const char *what, const std::string &name) {
        if (number >= choice.seen.size() || !choice.seen[number]) {
            Tell("no record has a %s %s", what, name.c_str());
        }
        number++;
    };
    for (int64_t id : choice.ports) {
        tell("port", std::to_string(id));
    }
    for (const std::string &name : choice.switches) {
        tell("switch", name);
    }
    for (const std::string &name : choice.nics) {
        tell("physical NIC", name);
    }
    for (const std::string &name : choice.vms) {
        tell("port named", name);
    }
}

}  // namespace report
