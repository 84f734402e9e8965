#include "report/rows/rows.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

using namespace report;

namespace {

struct RowsFixture : testing::Test {
    Rows rows;
    void SetUp() override { RowsInit(&rows); }
    void TearDown() override { RowsCleanup(&rows); }

    bool Read(std::string json, std::string_view host = "h", uint32_t wanted = ~0u) {
        json.shrink_to_fit();  // a sanitizer sees a read behind its end
        return RowsRead(&rows, RecordText{json, host, 0, "test", false}, wanted);
    }
    std::string_view Cell(Section section, size_t row, const char *key) {
        return rows.of(section).at(row, static_cast<size_t>(ColumnFind(section, key)));
    }
};

std::string Record(int iteration, const std::string &ports, const std::string &more = "") {
    return R"({"host": "h", "time": 1795416700, "interval": 10, "iteration": )" + std::to_string(iteration) + more +
           R"(, "ports": [)" + ports + "]}";
}

const char *const kWeb = R"({"name": "web\"1", "switch": "s", "id": 50331650, "uplink": "false", "rxeps": 1.50})";
const char *const kNic = R"({"name": "nic0", "switch": "s", "id": 7, "uplink": "true", "rxeps": 0.00})";

}  // namespace

TEST_F(RowsFixture, EmptyPortKeepsTheIdentityOfItsPlaceWithinARunOfItsHost) {
    ASSERT_TRUE(Read(Record(3, std::string(kWeb) + "," + kNic)));
    EXPECT_EQ(Cell(Section::Ports, 0, "rxeps"), "1.50");
    ASSERT_TRUE(Read(Record(3, std::string(kNic) + "," + kNic), "other"));
    ASSERT_TRUE(Read(Record(4, std::string("{},") + kNic)));
    EXPECT_EQ(rows.ports[0].name, "web\"1");
    EXPECT_EQ(rows.ports[0].id, "50331650");
    EXPECT_FALSE(rows.ports[0].present);
    EXPECT_EQ(Cell(Section::Ports, 0, "rxeps").data(), nullptr);
    EXPECT_EQ(Cell(Section::Ports, 1, "rxeps"), "0.00");
    ASSERT_TRUE(Read(Record(5, "{},{}"), "other"));
    EXPECT_EQ(rows.ports[0].name, "nic0");
    EXPECT_TRUE(rows.ports[0].uplink);
    ASSERT_TRUE(Read(Record(5, "{},{},{}")));  // another list of ports
    EXPECT_EQ(rows.ports[0].name, "");
    ASSERT_TRUE(Read(Record(0, "{},{}"), "other"));  // another run
    EXPECT_EQ(rows.ports[0].id, "");
}

TEST_F(RowsFixture, AKeyMayStandAnywhereInItsObject) {
    ASSERT_TRUE(Read(Record(0, R"({"vcpu": [{"histos": {"buckets": [2, 5], "values": [{"values": [7, -8], "mean": 3,
        "name": "run", "count": 9}]}, "ready": 4.5, "id": 18446744073709551615}], "id": 9, "rxqueue": {"ports": 3,
        "details": [[33554435, 2], []], "count": 2}, "coalesce": {"rx": {"depth": 4}, "scheme": "x"},
        "vnic": {"r1full": 2.0, "type": "parlan3"}, "name": "n"})")));
    EXPECT_EQ(rows.of(Section::Vnic).size(), 1u);
    EXPECT_EQ(Cell(Section::Vnic, 0, "coalesce.rx.depth"), "4");
    EXPECT_EQ(Cell(Section::Vnic, 0, "vnic.type"), "parlan3");
    EXPECT_EQ(Cell(Section::Vcpu, 0, "vcpu.id"), "18446744073709551615");
    EXPECT_EQ(Cell(Section::Rxqueue, 0, "rxqueue.details"), "33554435 2");
    EXPECT_NE(Cell(Section::Rxqueue, 1, "rxqueue.details").data(), nullptr);
    EXPECT_EQ(Cell(Section::Rxqueue, 1, "rxqueue.ports"), "3");
    ASSERT_EQ(rows.of(Section::Histograms).size(), 2u);
    EXPECT_EQ(Cell(Section::Histograms, 1, "vcpu.id"), "18446744073709551615");
    EXPECT_EQ(Cell(Section::Histograms, 1, "histos.limit"), "5");
    EXPECT_EQ(Cell(Section::Histograms, 1, "histos.value"), "-8");
    EXPECT_EQ(Cell(Section::Histograms, 1, "histos.name"), "run");
}

TEST_F(RowsFixture, WhatIsNoRecordIsRefused) {
    const std::string head = R"({"host": "h", "time": 1, "interval": 1, "iteration": 0)";
    std::string deep(100'000, '[');
    const std::string port = R"(, "ports": [)", cpu = R"(, "cpu": )";
    const std::string bad[] = {
        "",
        "7",
        "[]",
        "\"x\"",
        "null",
        "{}",
        "{",
        head,
        head + "}}",
        head + "} {}",
        head + ",}",
        R"({"time": 1, "interval": 1})",
        R"({"time": 1.5, "interval": 1, "iteration": 0})",
        R"({"time": 99999999999999999999, "interval": 1, "iteration": 0})",
        R"({"time": 1, "time": 1, "interval": 1, "iteration": 0})",
        head + R"(, "ports": {}})",
        head + R"(, "ports": [], "ports": []})",
        head + port + "7]}",
        head + port + R"({"name": 7}]})",
        head + port + R"({"name": "a", "name": "b"}]})",
        head + port + R"({"id": "7"}]})",
        head + port + R"({"rxpps": 1, "rxpps": 2}]})",
        head + port + R"({"rxpps": 012}]})",
        head + port + R"({"rxpps": +1}]})",
        head + port + R"({"rxpps": 1.}]})",
        head + port + R"({"rxpps": nan}]})",
        head + port + R"({"rxpps": 1e}]})",
        head + port + R"({"rxpps": null}]})",
        head + port + R"({"rxpps": 1 2}]})",
        head + port + R"({"rxpps" 1}]})",
        head + port + R"({"mac": "\ud800"}]})",
        head + port + R"({"vnic": []}]})",
        head + port + R"({"vnic": {"type": 3}}]})",
        head + port + R"({"coalesce": {"tx": 3}}]})",
        head + port + R"({"wdt": [[]]}]})",
        head + port + R"({"wdt": [], "wdt": []}]})",
        head + port + R"({"txqueue": {"details": [{"pps": 1, "count": 2}], "count": 1}}]})",
        head + port + R"({"rxqueue": {"details": [7]}}]})",
        head + port + R"({"histos": [{"values": [[1]]}]}]})",
        head + port + R"({"histos": [{"values": [[1, 2, 3]]}]}]})",
        head + port + R"({"vcpu": [{"histos": {"values": [], "buckets": []}}]}]})",
        head + cpu + R"({"used": 7}})",
        head + cpu + R"({"used": ["7"]}})",
        head + R"(, "overhead": {"used": {}}})",
        head + R"(, "ports": )" + deep,
        head + R"(, "cpu": {"used": )" + deep + std::string(100'000, ']') + "}}",
        head + R"(, "unknown": )" + deep,
    };
    for (const std::string &json : bad) {
        EXPECT_FALSE(Read(json)) << json.substr(0, 200);
        EXPECT_EQ(rows.of(Section::Ports).size(), 0u);
    }
    EXPECT_TRUE(Read(head + R"(, "new": [[{"a": {}}]], "ports": [{"newer": {"x": 1}, "rxpps": 1}]})"));
    EXPECT_EQ(Cell(Section::Ports, 0, "rxpps"), "1");
    EXPECT_TRUE(Read(head + port + R"({"vnic": 7}]})", "h", Wanted(Section::Wdt)));  // not wanted, not looked at
}

TEST_F(RowsFixture, ACutRecordIsRefusedAtEachLength) {
    const std::string whole = Record(0, std::string(kWeb) + R"(, {}, {"id": 2, "vcpu": [{"id": 3, "used": -1.5e3}],
        "txqueue": {"count": 1, "details": [{"pps": 1}]}})",
                                     R"(, "cpu": {"used": [1, 2], "wdt": [3]})");
    for (size_t length = 0; length < whole.size(); length++) {
        ASSERT_FALSE(Read(whole.substr(0, length))) << length;
    }
    ASSERT_TRUE(Read(whole));
    EXPECT_EQ(Cell(Section::Pcpu, 1, "cpu.pcpu"), "sum");
    EXPECT_EQ(Cell(Section::Pcpu, 1, "cpu.wdt").data(), nullptr);
    EXPECT_EQ(Cell(Section::Vcpu, 0, "vcpu.used"), "-1.5e3");
}
