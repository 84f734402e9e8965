#include "report/commands.h"

#include "report/input/record_stream.h"
#include "report/page/page.h"
#include "report/rows/choice.h"
#include "report/support/output.h"

#include <CLI/CLI.hpp>
#include <csignal>
#include <memory>
#include <set>

namespace report {
namespace {

struct PageCommandOptions {
    std::vector<std::string> files;
    std::string output, host;
    Choice choice;
    FindingsOptions findings;
    PageOptions page;
    size_t megabytes = 15;
    bool plain = false;
};

volatile sig_atomic_t stopped = 0;

struct Series {
    Store store;
    Findings findings;
    std::set<std::string> hosts;
    uint64_t unreadable = 0;
    StreamTally tally = {};
    StreamState state = StreamState::End;
};

// A port that is not chosen is as if it had never been watched.
void LeaveOut(Rows *rows, const std::vector<char> &chosen) {
    for (size_t place = 0; place < rows->ports.size(); place++) {
        if (chosen[place] == 0) {
            rows->ports[place].id.clear();
        }
    }
}

void ReadAll(PageCommandOptions *options, Series *series) {
    RecordStream *stream = RecordStreamOpen(options->files);
    Rows rows;
    RowsInit(&rows);
    rows.histogramsOf = &series->store.histogramPlaces;
    RecordText record;
    std::vector<char> chosen;
    while (stopped == 0 && (series->state = RecordStreamNext(stream, &record)) == StreamState::Record) {
        if (!options->host.empty() && record.host != options->host) {
            continue;
        }
        if (!RowsRead(&rows, record, kStoreWanted | kFindingsWanted)) {
            series->unreadable++;
        } else if (ChoiceHasTime(options->choice, rows.time)) {
            series->hosts.insert(rows.host);
            if (series->hosts.size() > 1) {
                break;
            }
            ChoicePorts(&options->choice, rows, &chosen);
            FindingsAdd(&series->findings, rows, record.number, &chosen);
            LeaveOut(&rows, chosen);
            StoreAdd(&series->store, rows);
        }
    }
    series->tally = RecordStreamTally(stream);
    RowsCleanup(&rows);
    RecordStreamClose(stream);
    ChoiceTellUnseen(options->choice);
}

void Note(PageSource *source, uint64_t count, const char *one, const char *many) {
    if (count > 0) {
        source->notes.push_back(std::to_string(count) + " " + (count == 1 ? one : many));
    }
}

bool Make(PageCommandOptions *options, Series *series) {
    if (series->hosts.size() > 1) {
        Tell("records of several hosts, \"%s\" and \"%s\": choose one by --host", series->hosts.begin()->c_str(),
             series->hosts.rbegin()->c_str());
        return false;
    }
    if (series->store.records.empty()) {
        Tell("no record to show, so no page");
        return false;
    }
    FindingsRank(&series->findings);
    PageSource source{&series->store, &series->findings, *series->hosts.begin(), {}};
    if (options->findings.counts) {
        source.notes.push_back("What the report counts over an interval (-a) is shown by second.");
    }
    Note(&source, series->tally.mended, "name was no valid text and has been mended.",
         "names were no valid text and have been mended.");
    Note(&source, series->tally.cut, "record was cut and is left out.", "records were cut and are left out.");
    Note(&source, series->unreadable, "record could not be read and is left out.",
         "records could not be read and are left out.");
    Output output;
    OutputOpen(&output, options->output);
    bool made = PageWrite(&output, options->page, &source);
    if (!made) {
        Tell("%s: no page of %zu MB can hold this series", options->output.c_str(), options->megabytes);
    }
    return OutputClose(&output, made) != OutputState::Failed && made;
}

Status Page(PageCommandOptions *options) {
    // The first signal ends the input, so that an endless run has its page; the second one kills.
    OutputFirstSignal([](int number) {
        stopped = 1;
        signal(number, OutputEnd);
    });
    options->page.compress = !options->plain;
    options->page.limit = options->megabytes << 20;
    Series series;
    series.store.options.details = options->page.detail;
    series.store.options.counts = options->findings.counts;
    FindingsInit(&series.findings, options->findings);
    ReadAll(options, &series);
    bool made = Make(options, &series);
    FindingsCleanup(&series.findings);
    return made && series.unreadable == 0 && series.state != StreamState::Broken ? kDone : kFailed;
}

}  // namespace

void PageCommand(CLI::App &program, Status *status) {
    auto options = std::make_shared<PageCommandOptions>();
    CLI::App *command = program.add_subcommand("page", "One HTML file to look at: opens from disk, needs nothing else");
    command->add_option("FILE", options->files, "Reports or records; - or none: standard input");
    command->add_option("-o,--output", options->output, "Write to this file; standard output without")
        ->type_name("FILE");
    ChoiceOptions(*command, &options->choice);
    command->add_option("--host", options->host, "Records of this host alone");
    command
        ->add_option("--detail", options->page.detail,
                     "Ports with all their keys, at most: those with a finding, and the 50 worst")
        ->capture_default_str()
        ->check(CLI::Range(0, 10'000));
    command->add_option("--limit", options->megabytes, "Megabytes of the file, at most")
        ->capture_default_str()
        ->check(CLI::Range(1, 1000));
    command->add_option("--link-mbps", options->findings.linkMbps, "Speed of the uplinks' links, for rule F7")
        ->type_name("MBPS")
        ->check(CLI::PositiveNumber);
    command->add_flag("--counts", options->findings.counts, "The reports were made with -a: counts, not rates");
    command->add_flag("--no-compress", options->plain, "For Firefox before 113 and Safari before 16.4; the file grows");
    command->callback([options, status] { *status = Page(options.get()); });
}

}  // namespace report
