#include "report/commands.h"

#include "report/input/record_stream.h"
#include "report/rows/choice.h"
#include "report/summary/findings.h"
#include "report/summary/print.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <csignal>
#include <memory>
#include <sys/ioctl.h>
#include <unistd.h>

namespace report {
namespace {

constexpr size_t kAsUsual = ~size_t{0}, kUsualFindings = 20;

struct SummaryOptions {
    std::vector<std::string> files;
    std::string output;
    Choice choice;
    FindingsOptions findings;
    size_t most = kAsUsual;
    bool json = false, rules = false, exitCode = false;
};

volatile sig_atomic_t stopped = 0;

// False: an input was broken, or a record of another layout; what else there is was taken.
bool ReadAll(SummaryOptions *options, Findings *findings, StreamTally *tally) {
    RecordStream *stream = RecordStreamOpen(options->files);
    Rows rows;
    RowsInit(&rows);
    RecordText record;
    std::vector<char> chosen;
    bool whole = true;
    StreamState state = StreamState::End;
    while (stopped == 0 && (state = RecordStreamNext(stream, &record)) == StreamState::Record) {
        if (!RowsRead(&rows, record, kFindingsWanted)) {
            whole = false;
        } else if (ChoiceHasTime(options->choice, rows.time)) {
            ChoicePorts(&options->choice, rows, &chosen);
            FindingsAdd(findings, rows, record.number, &chosen);
        }
    }
    *tally = RecordStreamTally(stream);
    RowsCleanup(&rows);
    RecordStreamClose(stream);
    ChoiceTellUnseen(options->choice);
    return whole && state != StreamState::Broken;
}

bool HasSerious(const Findings &findings) {
    return std::any_of(findings.list.begin(), findings.list.end(),
                       [](const Finding &finding) { return finding.severity == Severity::Serious; });
}

// 0: no terminal.
size_t TerminalCells(const Output &output) {
    winsize size{};
    bool terminal = isatty(output.fd) == 1 && ioctl(output.fd, TIOCGWINSZ, &size) == 0;
    return terminal ? std::max<size_t>(size.ws_col, 40) : 0;
}

Status Summarise(SummaryOptions *options) {
    Output output;
    OutputOpen(&output, options->output);
    Status status = kDone;
    if (options->rules) {
        options->json ? PrintRulesJson(&output) : PrintRules(&output);
    } else {
        // So an endless run that is interrupted has its summary; the second signal kills.
        OutputFirstSignal([](int number) {
            stopped = 1;
            signal(number, OutputEnd);
        });
        Findings findings;
        FindingsInit(&findings, options->findings);
        StreamTally tally;
        status = ReadAll(options, &findings, &tally) ? kDone : kFailed;
        FindingsRank(&findings);
        if (options->json) {
            PrintFindingsJson(&output, findings, tally, options->most == kAsUsual ? 0 : options->most);
        } else {
            size_t most = options->most == kAsUsual ? kUsualFindings : options->most;
            PrintFindings(&output, findings, tally, most, TerminalCells(output));
        }
        if (status == kDone && options->exitCode && HasSerious(findings)) {
            status = kSerious;
        }
        FindingsCleanup(&findings);
    }
    return OutputClose(&output) == OutputState::Failed ? kFailed : status;
}

}  // namespace

void SummaryCommand(CLI::App &program, Status *status) {
    auto options = std::make_shared<SummaryOptions>();
    CLI::Validator positive(CLI::PositiveNumber);
    positive.description("");  // help has its own word for the argument
    CLI::App *command = program.add_subcommand("summary", "What is wrong, worst first: text to paste into a ticket");
    command->add_option("FILE", options->files, "Reports or records; - or none: standard input")->type_name("");
    command->add_option("-o,--output", options->output, "Write to this file")->type_name("FILE");
    ChoiceOptions(*command, &options->choice);
    command->add_option("-n", options->most, "So many findings at most, the worst; 0: all (20; with --json all)")
        ->type_name("N");
    command->add_option("--link-mbps", options->findings.linkMbps, "Speed of the uplinks' links, for rule F7")
        ->type_name("MBPS")
        ->check(positive);
    command->add_flag("--counts", options->findings.counts, "The reports were made with -a: counts, not rates");
    command->add_flag("--json", options->json, "One JSON object; ids are texts");
    command->add_flag("--rules", options->rules, "Print the rules with their thresholds, and read nothing");
    command->add_flag("--exit-code", options->exitCode, "End with 3 when there are serious findings");
    command->callback([options, status] { *status = Summarise(options.get()); });
}

}  // namespace report
