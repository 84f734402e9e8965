#include "report/commands.h"
#include "report/input/json_walk.h"
#include "report/input/record_stream.h"
#include "report/input/text.h"
#include "report/records/split.h"
#include "report/rows/choice.h"
#include "report/support/output.h"

#include <CLI/CLI.hpp>
#include <charconv>
#include <csignal>
#include <memory>

namespace report {
namespace {

struct Options {
    std::vector<std::string> files;
    std::string path;
    std::string split;
    bool ports = false;
    Choice choice;
};

struct Work {
    Options *options;
    Output output;
    Split split;
    Rows rows;  // who the ports are, for --ports
    std::vector<char> chosen;
    std::string lines;
    bool failed = false;  // a record had not the form of one
};

int64_t TimeOf(const RecordText &record) {
    std::string_view text = JsonMember(record.json, "time");
    int64_t time = 0;
    std::from_chars(text.data(), text.data() + text.size(), time);
    return time;
}

bool IsKey(const JsonPart &part, std::string_view key) {
    return part.key.size() == key.size() + 2 && part.key.substr(1, key.size()) == key;
}

// What a reader of single lines has to know first, then the rest of the port's object as it stands.
void AppendPort(Work *work, const RecordText &record, const PortIdentity &port, std::string_view object) {
    std::string *lines = &work->lines;
    auto text = [lines](const char *key, std::string_view value) {
        *lines += key;
        TextAppendJson(lines, value);
        *lines += '"';
    };
    *lines += "{\"time\": " + std::to_string(work->rows.time);
    text(", \"host\": \"", record.host);
    *lines += ", \"iteration\": " + std::to_string(work->rows.iteration);
    text(", \"switch\": \"", port.switchName);
    text(", \"name\": \"", port.name);
    lines->append(", \"id\": ").append(JsonMember(object, "id"));
    JsonPart part;
    for (size_t at = 0; JsonNext(object, &at, &part);) {
        if (!IsKey(part, "switch") && !IsKey(part, "name") && !IsKey(part, "id")) {
            lines->append(", ").append(part.key).append(": ").append(part.value);
        }
    }
    *lines += "}\n";
}

void AppendPorts(Work *work, const RecordText &record) {
    if (!RowsRead(&work->rows, record, 0)) {
        work->failed = true;
        return;
    }
    ChoicePorts(&work->options->choice, work->rows, &work->chosen);
    std::string_view ports = JsonMember(record.json, "ports");
    JsonPart part;
    size_t at = 0;
    for (size_t i = 0; i < work->rows.ports.size() && JsonNext(ports, &at, &part); i++) {
        const PortIdentity &port = work->rows.ports[i];
        if (work->chosen[i] != 0 && port.present && !port.id.empty()) {
            AppendPort(work, record, port, part.value);
        }
    }
}

OutputState Write(Work *work, const RecordText &record) {
    const Options &options = *work->options;
    int64_t time = TimeOf(record);
    if (!ChoiceHasTime(options.choice, time)) {
        return OutputState::Fine;
    }
    work->lines.clear();
    std::string_view lines = work->lines;
    if (options.ports) {
        AppendPorts(work, record);
        lines = work->lines;
    } else if (!options.split.empty()) {
        work->lines.append(record.json).append("\n");
        lines = work->lines;
    } else {
        OutputWrite(&work->output, record.json);
        lines = "\n";
    }
    if (!options.split.empty()) {
        return lines.empty() ? OutputState::Fine : SplitWrite(&work->split, time, lines);
    }
    OutputWrite(&work->output, lines);
    return OutputFlush(&work->output);
}

Status Run(Options *options) {
    // The first signal ends what feeds the input, and with it the input.
    OutputFirstSignal([](int number) { signal(number, OutputEnd); });
    Work work = {};
    work.options = options;
    work.split.directory = options->path;
    if (options->split.empty()) {
        OutputOpen(&work.output, options->path);
    }
    RowsInit(&work.rows);
    RecordStream *stream = RecordStreamOpen(options->files);
    RecordText record;
    StreamState read = StreamState::End;
    OutputState wrote = work.output.state;
    while (wrote == OutputState::Fine && (read = RecordStreamNext(stream, &record)) == StreamState::Record) {
        wrote = Write(&work, record);
    }
    RecordStreamClose(stream);
    RowsCleanup(&work.rows);
    if (options->ports && wrote == OutputState::Fine) {
        ChoiceTellUnseen(options->choice);
    }
    OutputState closed = options->split.empty() ? OutputClose(&work.output) : SplitClose(&work.split);
    bool failed = wrote == OutputState::Failed || closed == OutputState::Failed || read == StreamState::Broken ||
                  work.failed || work.split.lost;
    return failed ? kFailed : kDone;
}

}  // namespace

void RecordsCommand(CLI::App &program, Status *status) {
    auto options = std::make_shared<Options>();
    CLI::App *command = program.add_subcommand("records", "One record a line, each with its host (NDJSON)");
    command->add_option("FILE", options->files, "Reports, or lines of \"records\"; - or none: standard input")
        ->type_name("");
    CLI::Option *ports = command->add_flag("--ports", options->ports, "One line a port and record");
    CLI::Option *path = command
                            ->add_option("-o,--output", options->path,
                                         "Write this file, which is put into its place when it is whole; with "
                                         "--split a directory")
                            ->type_name("FILE");
    command->add_option("--split", options->split, "A file for each \"hour\" of the records' time, in UTC")
        ->type_name("hour")
        ->check(CLI::IsMember({"hour"}))
        ->needs(path);
    ChoiceOptions(*command, &options->choice);
    for (const char *name : {"--port", "--switch", "--pnic", "--vm"}) {
        command->get_option(name)->needs(ports);
    }
    command->callback([options, status] { *status = Run(options.get()); });
}

}  // namespace report
