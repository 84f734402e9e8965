// Which ports and which span of time a command shall look at: the options -p, -S, -N, -V as lan-meter has them, --from
// and --to. Several of them add up. Names are looked up in each record, by the identity that Rows keeps.
#pragma once

#include "report/rows/moment.h"
#include "report/rows/rows.h"

#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace report {

struct Choice {
    std::vector<int64_t> ports;
    std::vector<std::string> switches, nics, vms;
    Moment from, to;

    std::vector<bool> seen;  // which of them stood in a record, in the order of the fields above
};

// Adds the options to a command's line; *choice must live as long as the command.
void ChoiceOptions(CLI::App &command, Choice *choice);
// Whether the record's time is in the span.
bool ChoiceHasTime(const Choice &choice, int64_t time);
// One byte a port of the record, by its place: 1 when it is chosen. Without any choice all are.
void ChoicePorts(Choice *choice, const Rows &rows, std::vector<char> *chosen);
// Tells what was chosen and stood in no record, for the end of a run.
void ChoiceTellUnseen(const Choice &choice);

}  // namespace report
