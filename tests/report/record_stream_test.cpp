#include "report/input/record_stream.h"

#include "tests/report/made_report.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <sys/mman.h>
#include <thread>
#include <unistd.h>
#include <zlib.h>

using namespace report;
using nlohmann::json;

namespace {

struct Read {
    std::vector<json> records;
    std::vector<std::string> lines, hosts;
    StreamState state = StreamState::End;
    StreamTally tally = {};
    std::string told;
};

Read ReadStream(RecordStream *stream) {
    Read read;
    RecordText record;
    testing::internal::CaptureStderr();
    while ((read.state = RecordStreamNext(stream, &record)) == StreamState::Record) {
        read.lines.emplace_back(record.json);
        read.hosts.emplace_back(record.host);
        read.records.push_back(json::parse(record.json));
    }
    read.tally = RecordStreamTally(stream);
    RecordStreamClose(stream);
    read.told = testing::internal::GetCapturedStderr();
    return read;
}

// A text as a file.
struct MemoryFile {
    int fd = memfd_create("report", 0);
    explicit MemoryFile(std::string_view text) {
        EXPECT_EQ(write(fd, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }
    ~MemoryFile() { close(fd); }
    std::string Path() const { return Joined({"/proc/self/fd/", std::to_string(fd)}); }
};

Read ReadText(std::string_view text, uint32_t bound = kRecordBound) {
    MemoryFile file(text);
    return ReadStream(RecordStreamOpen({file.Path()}, bound));
}

std::string Packed(std::string_view text) {
    z_stream stream = {};
    deflateInit2(&stream, 1, Z_DEFLATED, 16 + MAX_WBITS, 8, Z_DEFAULT_STRATEGY);
    std::string packed(deflateBound(&stream, text.size()), '\0');
    stream.next_in = reinterpret_cast<unsigned char *>(const_cast<char *>(text.data()));
    stream.avail_in = static_cast<unsigned>(text.size());
    stream.next_out = reinterpret_cast<unsigned char *>(packed.data());
    stream.avail_out = static_cast<unsigned>(packed.size());
    deflate(&stream, Z_FINISH);
    packed.resize(stream.total_out);
    deflateEnd(&stream);
    return packed;
}

std::vector<std::string> NamesOf(const json &record) {
    std::vector<std::string> names;
    for (const json &port : record["ports"]) {
        names.push_back(port.empty() ? "(gone)" : port["name"].get<std::string>());
    }
    return names;
}

MadePort Named(const std::string &name, long id = 50331650) {
    return {.name = name, .id = id};
}

MadePort Full(const std::string &text) {
    return {.name = text, .sections = CoalesceSection(text, text) + DeviceSection(text) + WorldletSection({text, "w"})};
}

std::string ThreeRecords(bool whole = true) {
    return ReportOf(
        {{0, {Full("a"), Named("b", 2)}}, {1, {Full("a"), {.gone = true}}}, {2, {Full("c"), {.gone = true}}}},
        "labhost", whole);
}

// Where each record's last byte stands.
std::vector<size_t> EndsOf(const std::string &report) {
    std::vector<size_t> ends;
    std::string tail = RecordTail();
    for (size_t at = report.find(tail); at != std::string::npos; at = report.find(tail, at + 1)) {
        ends.push_back(at + tail.size());
    }
    return ends;
}

}  // namespace

TEST(RecordStream, LineHasTheBytesOfTheRecordWithoutLineEndsAndIndentation) {
    Read read = ReadText(ReportOf({{7, {{.gone = true}, Named("w")}}}, "h"));
    ASSERT_EQ(read.lines.size(), 1U);
    EXPECT_EQ(read.lines[0],
              "{\"host\": \"h\", \"time\": 1795416707, \"interval\": 1, \"iteration\": 7,\"cpu\": { \"topology\": "
              "{ \"core\": 2, \"llc\": 2, \"package\": 4},\"used\": [ 64.00,  -1.00,  213.00],\"wdt\": [ 22.00,   0.50,"
              "   53.00] },\"ports\":[{},{\"name\": \"w\", \"switch\": \"vSwitch0\", \"id\": 50331650, \"mac\": "
              "\"02:0a:02:00:00:02\", \"rxmode\": 12, \"uplink\": \"false\",\"txpps\": 47999, \"txmbps\": 314.9, "
              "\"txsize\": 820, \"txeps\": 2.00, \"rxpps\": -3, \"rxmbps\": 0.0, \"rxsize\": 819, \"rxeps\": 4.00}],"
              "\"overhead\": {\"used\": 0.07 } }");
    EXPECT_EQ(read.state, StreamState::End);
    EXPECT_EQ(read.told, "");
    EXPECT_EQ(ReadText(read.lines[0]).lines, read.lines) << "what was read once is read again";
}

// Whatever a text holds: each place for one gives it back, and the ports around it are all there.
TEST(RecordStream, HostileTextsComeOutAsTheyWere) {
    const MadePort other = Named("B", 2);
    std::string port = PortHead(other) + PortRest(other);
    std::string record = RecordHead(1) + port + RecordTail();
    const std::string texts[] = {
        "",
        "\"",
        "\\",
        "\\\"",
        "\n",
        "\t\x01\x7f",
        std::string("\0", 1),
        "</script>\"\\",
        "\u00e9\U0001f600",
        "}",
        "{}",
        "]",
        "\", \"switch\": \"",
        "x\", \"id\": 1",

        "\"}",
        "\"} ]}",
        "\",\n    \"txpps\": ",
        std::string(20, '"'),
    };
    for (const std::string &text : texts) {
        Read read =
            ReadText(ReportOf({{0, {Named("A", 1), Full(text), other}}, {1, {Named("A", 1), Full(text), other}}}));
        ASSERT_EQ(read.records.size(), 2U) << text << read.told;
        for (const json &made : read.records) {
            ASSERT_EQ(NamesOf(made), (std::vector<std::string>{"A", text, "B"}));
            const json &full = made["ports"][1];
            EXPECT_EQ(full["coalesce"]["scheme"], text);
            EXPECT_EQ(full["coalesce"]["params"], text);
            EXPECT_EQ(full["physnic"]["devname"], text);
            EXPECT_EQ(full["wdt"][0]["name"], text);
        }
    }
    std::string head = PortHead(Named("x", 1));
    const std::string names[] = {
        head.substr(10),                              // a switch and a number
        head.substr(10) + PortRest(other),            // the rest of a port
        head.substr(10) + PortRest(other) + ",\n\n",  // and what divides it from the next
        head.substr(10) + PortRest(other) + ",\n\n{\"name",
        head.substr(10) + PortRest(other) + RecordTail(),  // the rest of a record
        head.substr(10) + PortRest(other) + RecordTail() + "\n] }\n",
        head.substr(10) + PortRest(other) + RecordTail() + ",\n" + RecordHead(5) + "{\"name\": \"",  // wrong iteration
        port,
        record,
        DocumentHead("h") + record,
        "web1\" },\n\"stats\": [\n",
        head.substr(10) + ", \"mac\": \"02:0a:02:00:00:02\", \"rxmode\": 12, \"uplink\": \"false",
        std::string(1047, '"'),
    };
    for (const std::string &name : names) {
        ASSERT_LE(name.size(), 1047U);
        Read read = ReadText(
            ReportOf({{0, {Named("A", 1), Named(name), other}}, {1, {Named(name, 1), {.gone = true}, other}}}));
        ASSERT_EQ(read.records.size(), 2U) << name << read.told;
        EXPECT_EQ(NamesOf(read.records[0]), (std::vector<std::string>{"A", name, "B"}));
        EXPECT_EQ(NamesOf(read.records[1]), (std::vector<std::string>{name, "(gone)", "B"}));
        EXPECT_EQ(read.records[1]["ports"][0]["switch"], "vSwitch0");
        EXPECT_GT(read.tally.mended, 0U);
    }
    std::string half = "x\", \"switch\": ";  // and the quote that closes it
    EXPECT_EQ(ReadText(ReportOf({{0, {{.switchName = half}}}})).records.at(0)["ports"][0]["switch"], half);
}

// What no reader can tell from two ports, when it is there from the start; later the ports are known.
TEST(RecordStream, ImitatedPortIsSeenThroughWhereThePortsAreKnown) {
    std::string name = Joined({"A", PortHead(Named("", 7)).substr(10), PortRest({}), ",\n\n{\"name\": \"B"});
    Read read = ReadText(ReportOf({{0, {Named("A")}}, {1, {Named(name)}}}));
    ASSERT_EQ(read.records.size(), 2U) << read.told;
    EXPECT_EQ(NamesOf(read.records[1]), std::vector<std::string>{name});
    read = ReadText(ReportOf({{0, {Named(name)}}, {1, {Named("A")}}}));
    ASSERT_EQ(read.records.size(), 2U) << read.told;
    EXPECT_EQ(NamesOf(read.records[0]), (std::vector<std::string>{"A", "B"}));
    EXPECT_EQ(NamesOf(read.records[1]), std::vector<std::string>{"A"});
}

TEST(RecordStream, HostIsATextToo) {
    for (std::string host : {"", "a\"b", "\" },\n\"stats\": [\n", "x\" },\n\"stats\": [\n{ \"time\": 1, \"interval\"",
                             "\" },\n\"stats\": [\n\n] }\n\t"}) {
        Read read = ReadText(ReportOf({{0}, {1}}, host));
        ASSERT_EQ(read.records.size(), 2U) << host << read.told;
        EXPECT_EQ(read.hosts, std::vector<std::string>(2, host));
        EXPECT_EQ(read.records[1]["host"], host);
        EXPECT_EQ(ReadText(read.lines[1]).hosts, std::vector<std::string>{host});
    }
}

TEST(RecordStream, BytesThatAreNoUtf8BecomeCharactersOfTheSameNumber) {
    const std::pair<const char *, const char *> texts[] = {
        {"caf\xe9", "caf\u00e9"},
        {"\xc3", "\u00c3"},
        {"\xc0\x80", "\u00c0\u0080"},
        {"\xed\xa0\x80", "\u00ed\u00a0\u0080"},
        {"\xf4\x90\x80\x80", "\u00f4\u0090\u0080\u0080"},
        {"\xe2\x82", "\u00e2\u0082"},
        {"\xe2\x82\xac", "\u20ac"},
    };
    for (auto [raw, text] : texts) {
        Read read = ReadText(ReportOf({{0, {Named(raw)}}}, raw));
        ASSERT_EQ(read.records.size(), 1U) << read.told;
        EXPECT_EQ(NamesOf(read.records[0]), std::vector<std::string>{text});
        EXPECT_EQ(read.hosts[0], text);
    }
}

TEST(RecordStream, CutReportGivesTheRecordsWhoseLastByteCame) {
    std::string report = ThreeRecords();
    std::vector<size_t> ends = EndsOf(report);
    MemoryFile file(report);
    for (size_t size = report.size(); size > 0; size--) {
        ASSERT_EQ(ftruncate(file.fd, static_cast<off_t>(size)), 0);
        Read read = ReadStream(RecordStreamOpen({file.Path()}));
        auto whole =
            static_cast<size_t>(std::count_if(ends.begin(), ends.end(), [=](size_t end) { return end <= size; }));
        ASSERT_EQ(read.records.size(), whole) << size << read.told;
        ASSERT_EQ(read.state, StreamState::End) << size << read.told;
        bool between = whole > 0 && size <= ends[whole - 1] + 2;
        ASSERT_EQ(read.tally.cut, whole == 3 || between ? 0U : 1U) << size << read.told;
    }
}

// Each byte alone, and each record awaited before the next byte is there.
TEST(RecordStream, RecordComesWithItsLastByte) {
    std::string report = ThreeRecords(false);
    std::vector<size_t> ends = EndsOf(report);
    int pipe[2];
    ASSERT_EQ(::pipe(pipe), 0);
    RecordStream *stream = RecordStreamOpen({Joined({"/proc/self/fd/", std::to_string(pipe[0])})});
    size_t sent = 0;
    for (size_t end : ends) {
        std::thread writer([&] {
            for (; sent < end; sent++) {
                EXPECT_EQ(write(pipe[1], &report[sent], 1), 1);
            }
        });
        RecordText record;
        EXPECT_EQ(RecordStreamNext(stream, &record), StreamState::Record);
        writer.join();
    }
    close(pipe[1]);
    EXPECT_EQ(ReadStream(stream).state, StreamState::End);
    close(pipe[0]);
}

TEST(RecordStream, GzipInMembersAndCut) {
    std::string report = ThreeRecords();
    std::string packed = Packed(report.substr(0, 1000)) + Packed(report.substr(1000));
    Read plain = ReadText(report);
    EXPECT_EQ(ReadText(packed + std::string(512, '\0')).lines, plain.lines);
    Read cut = ReadText(packed.substr(0, packed.size() - 9));
    EXPECT_EQ(cut.state, StreamState::End);
    EXPECT_NE(cut.told.find("cut"), std::string::npos);
    EXPECT_LE(cut.records.size(), 3U);
    std::string stored = ThreeRecords(false);
    EXPECT_EQ(ReadText(Packed(stored).substr(0, Packed(stored).size() - 8)).records.size(), 3U);
    Read damaged = ReadText(packed + "x");
    EXPECT_EQ(damaged.state, StreamState::Broken);
    EXPECT_EQ(damaged.lines, plain.lines);
}

TEST(RecordStream, WhatIsBehindADocument) {
    std::string report = ThreeRecords();
    std::string unended = ThreeRecords(false);
    std::string other = ReportOf({{0}}, "other");
    std::string line = ReadText(other).lines.at(0);
    struct {
        std::string text;
        size_t records, cut;
        StreamState state;
    } cases[] = {
        {report + other, 4, 0, StreamState::End},
        {unended + other, 4, 0, StreamState::End},
        {unended + "\n" + other, 4, 0, StreamState::End},
        {unended.substr(0, unended.size() - 30) + other, 3, 1, StreamState::End},
        {unended.substr(0, EndsOf(unended)[1] + 200) + other, 3, 1, StreamState::End},
        {DocumentHead("h") + other, 1, 1, StreamState::End},
        {ReportOf({}) + other, 1, 0, StreamState::End},
        {report + line + "\n" + line, 5, 0, StreamState::End},
        {line + "\n" + line.substr(0, 300), 1, 1, StreamState::End},
        {line.substr(0, 300) + line + "\n" + line, 2, 1, StreamState::End},
        {line + "\n" + line + "}\n" + line, 1, 0, StreamState::Broken},
        {report + "x", 3, 0, StreamState::Broken},
        {unended + "x", 3, 0, StreamState::Broken},
        {"", 0, 0, StreamState::End},
        {"{\n  \"sysinfo\": {\n", 0, 0, StreamState::Broken},
    };
    for (const auto &test : cases) {
        Read read = ReadText(test.text);
        EXPECT_EQ(read.records.size(), test.records) << test.text << read.told;
        EXPECT_EQ(read.tally.cut, test.cut) << test.text << read.told;
        EXPECT_EQ(read.state, test.state) << test.text << read.told;
    }
}

TEST(RecordStream, DamageIsToldWithFileByteAndWhatWasExpected) {
    std::string report = ThreeRecords();
    size_t at = report.rfind("\"txsize\": 820");
    report[at + 10] = 'x';
    MemoryFile bad(report), good(ReportOf({{0}}));
    Read read = ReadStream(RecordStreamOpen({bad.Path(), "/nowhere", good.Path()}));
    EXPECT_EQ(read.state, StreamState::Broken);
    EXPECT_EQ(read.records.size(), 3U) << "two ahead of the damage, one of the last file";
    EXPECT_EQ(read.told,
              Joined({"lan-report: ", bad.Path(), ": byte ", std::to_string(at + 10),
                      ": expected a number\nlan-report: /nowhere: can't open: No such file or directory\n"}));
}

TEST(RecordStream, RecordBeyondTheBoundIsRefused) {
    MadeRecord large = {0, std::vector<MadePort>(3000)};
    std::string report = ReportOf({{0}}) + ReportOf({large});
    EXPECT_EQ(ReadText(report).records.size(), 2U);
    Read read = ReadText(report, 300 << 10);
    EXPECT_EQ(read.records.size(), 1U);
    EXPECT_EQ(read.state, StreamState::Broken);
    EXPECT_NE(read.told.find("expected a record of 307200 bytes at most"), std::string::npos) << read.told;
}

TEST(RecordStream, LinesMustBeJson) {
    const char *lines[] = {
        R"({"host":"h","a":1,})",
        R"({"host":"h","a":01})",
        R"({"host":"h","a":1.})",
        R"({"host":"h","a":[1,]})",
        R"({"host":"h","a":"\x"})",
        R"({"host":"h","a":"\ud800"})",
        R"({"host":"h","a":"\udc00\ud800"})",
        "{\"host\":\"h\",\"a\":\"\x01\"}",
        "{\"host\":\"h\",\"a\":\"\xff\"}",
        R"({"host":1})",
        R"({"host":"h"}})",
        R"({"host":"h","a":tru})",
        R"({"host":"h" "a":1})",
        R"({"host":"h","a"})",
        R"({"host":"h","a":-})",
    };
    for (std::string line : lines) {
        Read read = ReadText(line + "\n");
        EXPECT_EQ(read.state, StreamState::Broken) << line;
        EXPECT_EQ(read.records.size(), 0U) << line;
    }
    std::string good = R"({"host": "\ud83d\ude00\n\/","a":[{},[],-0.5e+3,true,null,{"b":"\u0001"}]})";
    EXPECT_EQ(ReadText(good + " \r\n").hosts, std::vector<std::string>{"\U0001f600\n/"});
}
