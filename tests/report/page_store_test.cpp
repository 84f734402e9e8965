#include "report/page/store.h"

#include <gtest/gtest.h>
#include <random>

using namespace report;

namespace {

std::string PortJson(int id, int rxpps, int rxeps, const std::string &more = "") {
    std::string number = std::to_string(id);
    return R"({"name": "n)" + number + R"(", "switch": "s", "id": )" + number + R"(, "uplink": "false", "rxpps": )" +
           std::to_string(rxpps) + R"(, "rxeps": )" + std::to_string(rxeps) + more + "}";
}

struct StoreFixture : testing::Test {
    Store store;
    Rows rows;
    int records = 0;
    std::vector<uint32_t> order;
    void SetUp() override {
        RowsInit(&rows);
        rows.histogramsOf = &store.histogramPlaces;
    }
    void TearDown() override { RowsCleanup(&rows); }

    void Add(const std::string &ports, int time = -1) {
        std::string json = R"({"host": "h", "time": )" + std::to_string(time < 0 ? 1000 + 10 * records : time) +
                           R"(, "interval": 10, "iteration": )" + std::to_string(records) + R"(, "ports": [)" + ports +
                           "]}";
        ASSERT_TRUE(
            RowsRead(&rows, RecordText{json, "h", static_cast<uint64_t>(records++), "test", false}, kStoreWanted));
        StoreAdd(&store, rows);
    }
    std::vector<int32_t> Series(int port, const std::string &key) {
        if (order.empty()) {
            StoreSort(&store, &order);
        }
        const StoredPort &stored = store.ports[store.places.at(std::to_string(port))];
        std::vector<int32_t> all = StoreSeries(store, stored.details, order);
        for (size_t i = 0; i < stored.keys.size(); i++) {
            if (DetailName(stored.keys[i]) == key) {
                auto from = all.begin() + static_cast<ptrdiff_t>(i * store.records.size());
                return {from, from + static_cast<ptrdiff_t>(store.records.size())};
            }
        }
        return {};
    }
};

constexpr int32_t NONE = kMissing;

}  // namespace

TEST(PageEncode, FixedPointKeepsDecimalsAndRefusesWhatItCanNotHold) {
    struct {
        const char *cell;
        int32_t scale, fixed;
        uint64_t tooLarge;
    } cases[] = {
        {"12", 1, 12, 0},        {"12", 100, 1200, 0},
        {"-0.5", 100, -50, 0},   {"3.25", 100, 325, 0},
        {"3.255", 100, 326, 0},  {"7.6", 1, 8, 0},
        {"1e3", 100, 100000, 0}, {"10737418.23", 100, kMostFixed, 0},
        {"", 1, NONE, 0},        {"10737418.24", 100, NONE, 1},
        {"x", 1, NONE, 0},       {"18446744073709551615", 1, NONE, 1},
        {"1e999", 1, NONE, 1},   {"-1073741824", 1, NONE, 1},
        {"1.", 100, 100, 0},     {"-", 100, NONE, 0},
    };
    for (const auto &each : cases) {
        uint64_t tooLarge = 0;
        EXPECT_EQ(FixedOf(each.cell, each.scale, &tooLarge), each.fixed) << each.cell;
        EXPECT_EQ(tooLarge, each.tooLarge) << each.cell;
    }
    EXPECT_EQ(CommonFactor(std::vector<int32_t>{100, NONE, 250}, 100), 10);
}

TEST(PageEncode, TextsCanNotEndTheirPlace) {
    EXPECT_EQ(JsonString("</script>\"\\\n"), R"("\u003c/script>\"\\\u000a")");
    EXPECT_EQ(HtmlText("<a href=\"x\">&\x01\u202e"), "&lt;a href=&quot;x&quot;&gt;&amp;\\x01\\u{202e}");
    EXPECT_EQ(Base64("ab"), "YWI=");
    EXPECT_EQ(PolicyHash("00ff10"), "sha256-AP8Q");
}

TEST(PageSeriesLog, GivesBackWhatWentIn) {
    std::mt19937 dice(1);
    SeriesLog log;
    std::vector<std::pair<size_t, std::vector<int32_t>>> records;
    std::vector<int32_t> values;
    for (size_t record = 0; record < 400; record += 1 + dice() % 3) {
        values.resize(values.size() + dice() % 2, NONE);
        for (int32_t &value : values) {
            uint32_t choice = dice() % 8;
            value = choice == 0   ? NONE
                    : choice == 1 ? static_cast<int32_t>(dice() % (2u * kMostFixed)) - kMostFixed
                    : choice == 2 ? kMostFixed
                    : choice == 3 ? -kMostFixed
                                  : value;
        }
        SeriesLogAdd(&log, record, values);
        records.emplace_back(record, values);
    }
    SeriesLogReader reader{&log.bytes, 0, 0, {}, 0};
    for (const auto &[record, wanted] : records) {
        ASSERT_TRUE(SeriesLogNext(&reader));
        EXPECT_EQ(reader.record, record);
        EXPECT_EQ(reader.values, wanted);
    }
    EXPECT_FALSE(SeriesLogNext(&reader));
}

TEST_F(StoreFixture, DetailsFollowTheirPortThroughPlacesGapsAndNewKeys) {
    Add(PortJson(1, 5, 0, R"(, "vcpu": [{"id": 77, "ready": 1.5}, {"id": 78, "ready": 4.25}])") + "," +
        PortJson(2, 6, 0));
    Add(PortJson(2, 7, 0, R"(, "vnic": {"r1full": 9.5})") + "," + PortJson(1, 8, 0));
    Add("{},{}");
    Add(PortJson(2, 7, 0, R"(, "vnic": {"r1full": 3.0})"), 1005);  // late, by its time the second
    EXPECT_EQ(Series(1, "vcpu.1.ready"), (std::vector<int32_t>{425, NONE, NONE, NONE}));
    EXPECT_EQ(Series(2, "vnic.r1full"), (std::vector<int32_t>{NONE, 300, 950, NONE}));
    EXPECT_EQ(store.records[0].ports[kReady], 425);
}

TEST_F(StoreFixture, FewBytesKeepTheDetailsOfTheWorstPorts) {
    store.options.detailBytes = 5'000;
    store.options.details = 4;
    for (int record = 0; record < 60; record++) {
        std::string ports;
        for (int id = 0; id < 100; id++) {
            int loss = id == 50 ? 5 : id == 51 && record >= 40 ? 1000 : 0;
            ports.append(id == 0 ? "" : ",");
            ports += PortJson(id, 10, loss, R"(, "vnic": {"r1full": )" + std::to_string(record * record % 977) + "}");
        }
        Add(ports);
        ASSERT_LE(store.detailBytes, store.options.detailBytes);
    }
    for (int record = 0; record < 60; record++) {
        EXPECT_EQ(Series(50, "vnic.r1full")[static_cast<size_t>(record)], record * record % 977 * 100);
    }
    std::vector<int32_t> late = Series(51, "vnic.r1full");
    ASSERT_EQ(late.size(), 60u);
    EXPECT_EQ(late[59], 59 * 59 % 977 * 100);
    EXPECT_EQ(Series(99, "vnic.r1full"), std::vector<int32_t>());
    EXPECT_FALSE(store.ports[50].shortened);
}

TEST_F(StoreFixture, LongSeriesFoldIntoBucketsWithMaximumAndMean) {
    store.options.cells = 8 * 20;
    for (int record = 0; record < 150; record++) {
        Add(record % 50 == 49 ? "{}" : PortJson(1, record + 1, record == 70 ? 3 : 0));
    }
    EXPECT_GT(store.every, 1u);
    EXPECT_LE(store.records.size() * store.ports.size() * kPortColumns * 2, store.options.cells);
    EXPECT_EQ(store.added, 150u);
    int32_t worst = NONE;
    for (size_t i = 0; i < store.records.size(); i++) {
        const StoredRecord &bucket = store.records[i];
        int first = static_cast<int>(i * store.every), end = std::min(150, first + static_cast<int>(store.every));
        int64_t sum = 0, count = 0, most = 0;
        for (int record = first; record < end; record++) {
            if (record % 50 != 49) {
                sum += record + 1, count++, most = record + 1;
            }
        }
        EXPECT_EQ(bucket.time, 1000 + 10 * (end - 1));
        EXPECT_EQ(bucket.ports[kRxpps], most);
        EXPECT_NEAR(bucket.portMeans[kRxpps], static_cast<double>(sum) / static_cast<double>(count), 2);
        worst = std::max(worst, bucket.ports[kRxeps]);
    }
    EXPECT_EQ(worst, 300);
}

TEST_F(StoreFixture, HistogramsOfOtherLimitsBeginAnew) {
    auto histogram = [](const char *values) {
        return R"(, "histos": [{"name": "pktsizein", "min": 1, "max": 9, "mean": 4, "count": 12, "values": [)" +
               std::string(values) + "]}]";
    };
    store.histogramPlaces = {true};
    Add(PortJson(1, 1, 0, histogram("[64, 40.5], [65, 59.5]")));
    Add(PortJson(1, 1, 0, histogram("[64, 100.0], [65, 0.0]")));
    order = {0, 1};
    EXPECT_EQ(StoreSeries(store, store.ports[0].histograms, order),
              (std::vector<int32_t>{12, 12, 4, 4, 4050, 10000, 5950, 0}));
    Add(PortJson(1, 1, 0, histogram("[32, 1.0]")));
    order.push_back(2);
    EXPECT_EQ(store.ports[0].kinds[0].limits, std::vector<std::string>{"32"});
    EXPECT_EQ(StoreSeries(store, store.ports[0].histograms, order),
              (std::vector<int32_t>{NONE, NONE, 12, NONE, NONE, 4, NONE, NONE, 100}));
}
