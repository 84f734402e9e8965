// Reports for lan-report: any bytes have to give lines of valid JSON, and made ones their own records, ports and names.
#include "report/input/layout.h"
#include "report/input/record_stream.h"
#include "report/input/text.h"
#include "report/support/message.h"
#include "tests/report/made_report.h"

#include <cstdlib>
#include <cstring>
#include <nlohmann/json.hpp>
#include <sys/mman.h>
#include <unistd.h>

using namespace report;

void report::Tell(const char * /*format*/, ...) {}

namespace {

void Require(bool right, const char *what) {
    if (!right) {
        fprintf(stderr, "%s\n", what);
        abort();
    }
}

std::vector<nlohmann::json> Read(std::string_view text, StreamState *state) {
    static int file = memfd_create("report", 0);
    Require(ftruncate(file, 0) == 0 && pwrite(file, text.data(), text.size(), 0) == static_cast<ssize_t>(text.size()),
            "file");
    RecordStream *stream = RecordStreamOpen({Joined({"/proc/self/fd/", std::to_string(file)})}, 64 << 20);
    std::vector<nlohmann::json> records;
    RecordText record;
    while ((*state = RecordStreamNext(stream, &record)) == StreamState::Record) {
        records.push_back(nlohmann::json::parse(record.json, nullptr, false));
        Require(!records.back().is_discarded() && records.back().is_object(), "a line is no JSON");
        Require(records.back()["host"] == record.host, "host");
        Require(record.json.find('\n') == std::string_view::npos, "more than a line");
    }
    RecordStreamClose(stream);
    return records;
}

// The bytes choose among pieces of the layout. None has a port's counters, and the heads of a document and of a record
// don't come together, nor is the first in a host's name, so that nothing can be imitated whole.
std::string Hostile(std::string_view *bytes, size_t bound, bool host = false) {
    static const std::string kPieces[] = {
        "\"",
        "\\",
        "\n",
        "a",
        "\xc3",
        "\xa9",
        "}",
        "{",
        "]",
        " ]",
        ",",
        std::string(1, '\0'),
        "\", \"switch\": \"",
        "\", \"id\": ",
        "5",
        ", \"mac\": \"02:0a:02:00:00:02\", \"rxmode\": 12, \"uplink\": \"false\"",
        ",\n\n{\"name\": \"",
        "{\"name\": \"",
        "\"}",
        "\", \"params\": \"",
        "\",\n    \"txpps\": ",
        ",\n  \"txpps\": ",
        RecordTail(),
        "\n] }\n",
        ",\n",
        RecordHead(1),
        DocumentHead("x"),
        ",\n  \"wdt\": [",
        "{\"host\":",
        "\"} ]}",
        ",\n\n{}",
        ",\n  \"coalesce\": { \"scheme\": \"",
    };
    std::string text;
    size_t count = bytes->empty() ? 0 : static_cast<unsigned char>((*bytes)[0]) % 8;
    const std::string &left = kPieces[!host && !bytes->empty() && ((*bytes)[0] & 0x80) != 0 ? 25 : 26];
    for (size_t i = 0; i < count && i + 1 < bytes->size(); i++) {
        const std::string &piece = kPieces[static_cast<unsigned char>((*bytes)[i + 1]) % std::size(kPieces)];
        text += &piece != &left && text.size() + piece.size() <= bound ? piece : "";
    }
    bytes->remove_prefix(std::min(bytes->size(), count + 1));
    return text;
}

std::string Mended(const std::string &raw) {
    std::string text;
    TextAppendUtf8(&text, raw);
    return text;
}

void TryNames(std::string_view bytes) {
    std::string host = Hostile(&bytes, 1027, true);
    std::vector<MadeRecord> made(3);
    for (int i = 0; i < 3; i++) {
        MadeRecord *record = &made[static_cast<size_t>(i)];
        record->iteration = i;
        record->ports = std::vector<MadePort>(3);
        for (long port = 0; port < 3; port++) {
            MadePort *at = &record->ports[static_cast<size_t>(port)];
            *at = {.name = Hostile(&bytes, 1047), .id = port, .gone = !bytes.empty() && bytes[0] == 'g'};
        }
    }
    StreamState state = StreamState::End;
    std::vector<nlohmann::json> records = Read(ReportOf(made, host), &state);
    Require(state == StreamState::End, "a good report is called broken");
    Require(records.size() == made.size(), "number of records");
    for (size_t i = 0; i < made.size(); i++) {
        Require(records[i]["host"] == Mended(host), "name of the host");

        const nlohmann::json &ports = records[i]["ports"];
        Require(ports.size() == 3, "number of ports");
        for (size_t port = 0; port < 3; port++) {
            const MadePort &truth = made[i].ports[port];
            Require(truth.gone == ports[port].empty(), "a port that is gone");
            Require(truth.gone || ports[port]["name"] == Mended(truth.name), "name of a port");
            Require(truth.gone || ports[port]["switch"] == truth.switchName, "name of a switch");
        }
    }
}

struct Outcome {
    Reading reading;
    uint32_t at;
    size_t texts;
    bool operator==(const Outcome &) const = default;
};

// The first unit, `step` bytes more at a time; each piece of text ends where the memory ends.
Outcome ReadUnit(std::string_view text, size_t step) {
    LayoutReader reader = {};
    LayoutBegin(&reader, true);
    for (size_t size = std::min(step, text.size());; size = std::min(size + step, text.size())) {
        std::vector<char> part(text.begin(), text.begin() + static_cast<long>(size));
        part.push_back('\0');
        bool last = size == text.size();
        Reading reading = LayoutGoOn(&reader, part.data(), static_cast<uint32_t>(size), last);
        if (last || (reading != Reading::More && reading != Reading::RecordSoFar)) {
            return {reading, reader.at, reader.texts.size()};
        }
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    std::string_view bytes(reinterpret_cast<const char *>(data), size);
    if (bytes.empty()) {
        return 0;
    }
    unsigned mode = static_cast<unsigned char>(bytes[0]) % 4;
    bytes.remove_prefix(1);
    StreamState state = StreamState::End;
    if (mode == 0) {
        TryNames(bytes);
    } else if (mode == 1) {
        // All places for texts, and damage.
        std::string text = Hostile(&bytes, 30);
        MadePort port = {.name = Hostile(&bytes, 1047), .switchName = Hostile(&bytes, 1023)};
        port.sections = CoalesceSection(text, text) + DeviceSection(Hostile(&bytes, 900)) +
                        WorldletSection({Hostile(&bytes, 900), text});
        std::string report = ReportOf({{0, {port, port}}, {1, {port, port}}}, text);
        if (bytes.size() > 3) {
            size_t at = (static_cast<size_t>(bytes[0]) << 8 | static_cast<unsigned char>(bytes[1])) % report.size();
            report.replace(at, static_cast<unsigned char>(bytes[2]) % 8, bytes.substr(3, 4));
        }
        Read(report, &state);
        Require(ReadUnit(report, report.size()) == ReadUnit(report, 1 + size % 97), "another reading in pieces");
    } else {
        Read(bytes, &state);
        if (bytes.starts_with(kDocumentHead)) {
            Require(ReadUnit(bytes, bytes.size()) == ReadUnit(bytes, 1 + size % 97), "another reading in pieces");
        }
    }
    return 0;
}
