#include "report/commands.h"

#include "report/rows/choice.h"
#include "report/table/keep.h"
#include "report/table/stat.h"

#include <CLI/CLI.hpp>
#include <memory>

namespace report {
namespace {

// A field that --stat alone has: in how many records the element had a value.
constexpr Column kRecords = {"records", "", "with --stat: records in which there was a value", Kind::Number};

struct Options {
    std::vector<std::string> files, fields, sort;
    std::string section = "ports", stat, out;
    bool aligned = false, csv = false, tsv = false, json = false, local = false, columns = false;
    size_t limit = 0;
    Choice choice;
};

// Lead columns that no row of the report has.
enum : size_t { kLeadRecords = kLeads, kLeadSeconds };

// Where a cell of a row comes from.
struct Field {
    const Column *column;
    bool isLead;
    size_t at;  // among the lead columns or those of the section
};

struct Table {
    Options *options;
    Section section = Section::Ports;
    std::vector<Field> fields;  // what is written, then what is only sorted by
    size_t written = 0;
    std::vector<std::string_view> cells;             // of the row at hand
    std::string time, seconds, interval, iteration;  // of the record at hand
    Rows rows;
    std::vector<char> chosen;
    Output output;
    Sink sink;
    Keep keep;
    Stat stat;
    std::string key;
    uint64_t records = 0, rowsTaken = 0;
};

bool HasStat(const Table *table) {
    return !table->options->stat.empty();
}

bool FindField(const Table *table, std::string_view key, Field *field) {
    std::span<const Column> leads = LeadColumns(table->section), columns = SectionColumns(table->section);
    for (size_t i = 0; i < leads.size(); i++) {
        if (key == leads[i].key) {
            *field = {&leads[i], true, i};
            return true;
        }
    }
    if (key == kRecords.key && HasStat(table)) {
        *field = {&kRecords, true, kLeadRecords};
        return true;
    }
    int at = ColumnGuess(table->section, key);
    if (at >= 0) {
        *field = {&columns[static_cast<size_t>(at)], false, static_cast<size_t>(at)};
    }
    return at >= 0;
}

void TellUnknownKey(const Table *table, const std::string &key) {
    std::string known, elsewhere;
    for (const Column &column : SectionColumns(table->section)) {
        known.append(known.empty() ? "" : " ").append(column.key);
    }
    for (size_t i = 0; i < kSections; i++) {
        if (ColumnGuess(static_cast<Section>(i), key) >= 0) {
            elsewhere.append(elsewhere.empty() ? "; a column of section " : ", ")
                .append(SectionName(static_cast<Section>(i)));
        }
    }
    Tell("%s is no column of section %s, or of several; known: %s%s", key.c_str(), table->options->section.c_str(),
         known.c_str(), elsewhere.c_str());
}

// The columns that are written without -f: all, but for what a figure of a span of time does not have, and what only
// widens lines for the eye.
void DefaultFields(Table *table) {
    for (const Column &column : LeadColumns(table->section)) {
        std::string_view key = column.key;
        bool ofRecord = key == "interval" || key == "iteration";
        if (key == "switch" && HasStat(table)) {
            table->options->fields.push_back(kRecords.key);
        }
        if (!ofRecord || (!HasStat(table) && table->sink.format != Format::Aligned)) {
            table->options->fields.push_back(column.key);
        }
    }
    if (!SectionHasPorts(table->section) && HasStat(table)) {
        table->options->fields.push_back(kRecords.key);
    }
    for (const Column &column : SectionColumns(table->section)) {
        table->options->fields.push_back(column.key);
    }
}

bool AddField(Table *table, const std::string &key) {
    Field field;
    if (!FindField(table, key, &field)) {
        TellUnknownKey(table, key);
        return false;
    }
    for (const Field &other : table->fields) {
        if (other.column == field.column && table->sink.format == Format::Json) {
            Tell("%s stands twice in -f, and a JSON row has each key once", key.c_str());
            return false;
        }
    }
    table->fields.push_back(field);
    return true;
}

bool PlanFields(Table *table) {
    if (table->options->fields.empty()) {
        DefaultFields(table);
    }
    for (const std::string &key : table->options->fields) {
        if (!AddField(table, key)) {
            return false;
        }
    }
    table->written = table->fields.size();
    for (const Field &field : table->fields) {
        std::string_view key = field.column->key, unit = field.column->unit;
        bool isText = field.column->kind == Kind::Text;
        table->sink.columns.push_back({field.column->key, field.column->kind, unit == "errors/s",
                                       isText && key != "time" && key != "mac", field.isLead && key == "id"});
    }
    return true;
}

bool PlanSort(Table *table) {
    if (table->options->sort.size() > kMostSortKeys) {
        Tell("--sort takes %zu columns at most", kMostSortKeys);
        return false;
    }
    for (std::string key : table->options->sort) {
        bool descending = key.starts_with('-');
        key.erase(0, descending || key.starts_with('+') ? 1 : 0);
        Field field;
        if (!FindField(table, key, &field)) {
            TellUnknownKey(table, key);
            return false;
        }
        bool isTime = field.isLead && field.at == static_cast<size_t>(Lead::Time);
        field.at = isTime ? kLeadSeconds : field.at;  // local times have an order of their own
        table->keep.keys.push_back({table->fields.size(), isTime ? Kind::Number : field.column->kind, descending});
        table->fields.push_back(field);
    }
    table->keep.limit = table->options->limit;
    return true;
}

void PlanStat(Table *table) {
    StatFind(table->options->stat, &table->stat.kind);
    for (const Field &field : table->fields) {
        table->stat.isFigure.push_back(!field.isLead && StatIsFigure(table->section, *field.column));
    }
}

std::string_view PortCell(const PortIdentity &port, Lead lead) {
    const std::string &text = lead == Lead::Switch ? port.switchName : lead == Lead::Name ? port.name : port.id;
    return text.empty() && (port.id.empty() || lead == Lead::Id) ? std::string_view() : std::string_view(text);
}

std::string_view LeadCell(const Table *table, size_t row, size_t lead) {
    if (lead >= kLeads) {
        return lead == kLeadSeconds ? std::string_view(table->seconds) : std::string_view();
    }
    switch (static_cast<Lead>(lead)) {
    case Lead::Time:
        return table->time;
    case Lead::Host:
        return table->rows.host;
    case Lead::Interval:
        return table->interval;
    case Lead::Iteration:
        return table->iteration;
    default: {
        uint32_t place = table->rows.of(table->section).places[row];
        return place == kNoPlace ? std::string_view() : PortCell(table->rows.ports[place], static_cast<Lead>(lead));
    }
    }
}

// What tells the element of a row from all others over the whole input.
void ElementKey(Table *table, size_t row) {
    static const PortIdentity nobody;
    const RowsOfSection &rows = table->rows.of(table->section);
    uint32_t place = rows.places[row];
    const PortIdentity &port = place == kNoPlace ? nobody : table->rows.ports[place];
    table->key.clear();
    auto add = [table](std::string_view part) {
        table->key.append(std::to_string(part.size())).append(":").append(part);
    };
    add(table->rows.host);
    add(port.id.empty() ? std::to_string(place) : port.id);
    for (const char *key : StatKeys(table->section)) {
        add(rows.at(row, static_cast<size_t>(ColumnFind(table->section, key))));
    }
}

void TakeRow(Table *table, size_t row) {
    const RowsOfSection &rows = table->rows.of(table->section);
    for (size_t i = 0; i < table->fields.size(); i++) {
        const Field &field = table->fields[i];
        table->cells[i] = field.isLead ? LeadCell(table, row, field.at) : rows.at(row, field.at);
    }
    if (HasStat(table)) {
        uint32_t place = rows.places[row];
        ElementKey(table, row);
        StatRow(&table->stat, &table->key, table->records, place == kNoPlace || table->rows.ports[place].present,
                table->cells.data());
    } else if (!table->keep.keys.empty()) {
        KeepRow(&table->keep, table->cells.data(), table->cells.size());
    } else {
        SinkRow(&table->sink, table->cells.data());
        table->rowsTaken++;
    }
}

bool IsFull(const Table *table) {
    return table->options->limit != 0 && table->rowsTaken >= table->options->limit;
}

void TakeRecord(Table *table) {
    const Rows &rows = table->rows;
    if (!ChoiceHasTime(table->options->choice, rows.time)) {
        return;
    }
    table->records++;
    table->time = MomentText(rows.time, table->options->local);
    table->seconds = std::to_string(rows.time);
    table->interval = std::to_string(rows.interval);
    table->iteration = std::to_string(rows.iteration);
    ChoicePorts(&table->options->choice, rows, &table->chosen);
    const RowsOfSection &section = rows.of(table->section);
    for (size_t row = 0; row < section.size() && !IsFull(table); row++) {
        uint32_t place = section.places[row];
        if (place == kNoPlace || table->chosen[place] != 0) {
            TakeRow(table, row);
        }
    }
}

// One row an element, when the input is at its end.
void WriteStat(Table *table) {
    std::vector<std::string> scratch(table->fields.size());
    for (StatElement &element : table->stat.elements) {
        for (size_t i = 0; i < table->fields.size(); i++) {
            if (table->fields[i].column == &kRecords) {
                scratch[i] = std::to_string(element.records);
                table->cells[i] = scratch[i];
            } else {
                table->cells[i] = StatFigure(&table->stat, &element, i, &scratch[i]);
            }
        }
        if (!table->keep.keys.empty()) {
            KeepRow(&table->keep, table->cells.data(), table->cells.size());
        } else if (!IsFull(table)) {
            SinkRow(&table->sink, table->cells.data());
            table->rowsTaken++;
        }
    }
}

Status ReadAll(Table *table) {
    Status status = kDone;
    RecordStream *stream = RecordStreamOpen(table->options->files);
    RecordText record;
    StreamState state = StreamState::Record;
    while (table->output.state == OutputState::Fine && !IsFull(table) &&
           (state = RecordStreamNext(stream, &record)) == StreamState::Record) {
        if (!RowsRead(&table->rows, record, Wanted(table->section))) {
            status = kFailed;
            continue;
        }
        TakeRecord(table);
        SinkEndBlock(&table->sink);
    }
    RecordStreamClose(stream);
    return state == StreamState::Broken ? kFailed : status;
}

// All columns of one section or of all, as a table of its own.
void WriteColumns(Table *table, bool all) {
    for (const char *key : {"section", "column", "unit", "meaning"}) {
        table->sink.columns.push_back({key, Kind::Text});
    }
    SinkBegin(&table->sink);
    auto write = [table](Section section, std::span<const Column> columns) {
        for (const Column &column : columns) {
            std::string_view cells[] = {SectionName(section), column.key, column.unit, column.meaning};
            SinkRow(&table->sink, cells);
        }
    };
    for (size_t i = 0; i < kSections; i++) {
        auto section = static_cast<Section>(i);
        if (all || section == table->section) {
            write(section, LeadColumns(section));
            write(section, SectionColumns(section));
        }
    }
}

bool Plan(Table *table, bool toTerminal) {
    const Options *options = table->options;
    if (!SectionFind(options->section, &table->section)) {
        std::string known;
        for (size_t i = 0; i < kSections; i++) {
            known.append(" ").append(SectionName(static_cast<Section>(i)));
        }
        Tell("no section is called %s; known:%s", options->section.c_str(), known.c_str());
        return false;
    }
    bool aligned = options->aligned || (toTerminal && !options->csv && !options->tsv && !options->json);
    table->sink.format = aligned         ? Format::Aligned
                         : options->tsv  ? Format::Tsv
                         : options->json ? Format::Json
                                         : Format::Csv;
    if (options->columns) {
        return true;
    }
    bool planned = PlanFields(table) && PlanSort(table);
    PlanStat(table);
    return planned;
}

Status Run(Options *options, bool sectionGiven) {
    Table table{};
    table.options = options;
    Output probe;
    probe.fd = STDOUT_FILENO;
    bool toFile = !options->out.empty() && options->out != "-";
    table.sink.output = &probe;
    if (!toFile) {
        SinkLookAt(&table.sink);
    }
    if (!Plan(&table, table.sink.terminal)) {
        return kUsage;
    }
    OutputOpen(&table.output, options->out);
    table.sink.output = &table.output;
    Status status = kDone;
    if (options->columns) {
        WriteColumns(&table, !sectionGiven);
    } else {
        table.cells.resize(table.fields.size());
        RowsInit(&table.rows);
        SinkBegin(&table.sink);
        status = ReadAll(&table);
        WriteStat(&table);
        KeepWrite(&table.keep, table.written, &table.sink);
        RowsCleanup(&table.rows);
        ChoiceTellUnseen(options->choice);
    }
    SinkEndBlock(&table.sink);
    return OutputClose(&table.output) == OutputState::Failed ? kFailed : status;
}

void AddFormats(CLI::App *command, Options *options) {
    const std::pair<const char *, bool *> formats[] = {{"--aligned", &options->aligned},
                                                       {"--csv", &options->csv},
                                                       {"--tsv", &options->tsv},
                                                       {"--json", &options->json}};
    const char *const helps[] = {
        "Columns side by side for the eye; the usual form on a terminal",
        "Commas between; the usual form into a pipe or file",
        "Tabs between; \\t \\n \\r \\\\ stand for what would break a line",
        "An object a line; absent values are left out",
    };
    std::vector<CLI::Option *> added;
    for (size_t i = 0; i < std::size(formats); i++) {
        CLI::Option *option = command->add_flag(formats[i].first, *formats[i].second, helps[i])->group("Form");
        for (CLI::Option *other : added) {
            option->excludes(other);
        }
        added.push_back(option);
    }
    command->add_flag("--local", options->local, "Local times with their distance from UTC, instead of UTC")
        ->group("Form");
    command->add_option("-o,--output", options->out, "Write a file: beside its place first, then renamed")
        ->type_name("FILE")
        ->group("Form");
}

}  // namespace

void TableCommand(CLI::App &program, Status *status) {
    auto options = std::make_shared<Options>();
    CLI::App *command = program.add_subcommand("table", "Rows of one section: what a spreadsheet or a script takes");
    command->add_option("FILE", options->files, "Reports or records; - or none: standard input")->type_name("");
    CLI::Option *section =
        command
            ->add_option("-s,--section", options->section,
                         "What a row is about: ports (without this option), vnic, physnic, txqueue, rxqueue, "
                         "intr, vcpu, wdt, pcpu, histograms, hoststack or overhead")
            ->type_name("SECTION")
            ->capture_default_str();
    command->add_option("-f,--fields", options->fields, "Columns, in this order; \"ready\" will do for vcpu.ready")
        ->type_name("KEY,...")
        ->delimiter(',')
        ->allow_extra_args(false);
    command
        ->add_option("--sort", options->sort,
                     "Order of all rows, by up to 3 columns; -KEY: largest first. Absent values come last. "
                     "Keeps all rows in memory, or with -n as many as it shows")
        ->type_name("[-]KEY,...")
        ->delimiter(',')
        ->allow_extra_args(false);
    command->add_option("-n,--rows", options->limit, "Write so many rows at most")
        ->type_name("N")
        ->check([](const std::string &word) { return word == "0" ? "no rows are wanted: 1 or more" : ""; });
    command
        ->add_option("--stat", options->stat,
                     "One row for all records: max, mean, p95 (95 % of the values are not above it) or last")
        ->type_name("max|mean|p95|last")
        ->check([](const std::string &word) {
            StatKind kind;
            return StatFind(word, &kind) ? "" : word + " is none of max, mean, p95 and last";
        });
    command->add_flag("--columns", options->columns, "Show the columns with unit and meaning, and read nothing");
    AddFormats(command, options.get());
    ChoiceOptions(*command, &options->choice);
    command->footer("Examples:\n"
                    "  lan-report table report.json\n"
                    "  lan-report table --sort=-rxeps -n 20 report.json\n"
                    "  lan-report table -s vcpu -V web1 --stat max -f name,vcpu.id,ready,cstp report.json\n"
                    "  lan-meter -A -t vqiW -i 10 -n 0 | lan-report table -s physnic --csv > uplinks.csv");
    command->callback([options, section, status] { *status = Run(options.get(), section->count() != 0); });
}

}  // namespace report
