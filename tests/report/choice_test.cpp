#include "report/rows/choice.h"
#include "report/support/cells.h"

#include <gtest/gtest.h>

using namespace report;

TEST(Moment, IsReadInAllItsForms) {
    const struct {
        const char *text;
        int64_t from, to;  // as the begin and as the end of a span
        Moment::Kind kind;
    } cases[] = {
        {"1795416700", 1795416700, 1795416700, Moment::Kind::Once},
        {"@-5", -5, -5, Moment::Kind::Once},
        {"2026-11-23T06:51:40Z", 1795416700, 1795416700, Moment::Kind::Once},
        {"2026-11-23 06:51:40.25", 1795416700, 1795416700, Moment::Kind::Once},
        {"2026-11-23T06:51", 1795416660, 1795416719, Moment::Kind::Once},
        {"2026-11-23", 1795392000, 1795478399, Moment::Kind::Once},
        {"2026-11-23T06:51:40+01:30", 1795411300, 1795411300, Moment::Kind::Once},
        {"2026-11-23T06:51:40-01", 1795420300, 1795420300, Moment::Kind::Once},
        {"0001-01-01", -62135596800, -62135510401, Moment::Kind::Once},
        {"02:10", 7800, 7859, Moment::Kind::Daily},
        {"02:10:05Z", 7805, 7805, Moment::Kind::Daily},
        {"00:30+01:00", 84600, 84659, Moment::Kind::Daily},
    };
    for (const auto &c : cases) {
        Moment from, to;
        ASSERT_TRUE(MomentRead(c.text, false, &from) && MomentRead(c.text, true, &to)) << c.text;
        EXPECT_EQ(from.seconds, c.from) << c.text;
        EXPECT_EQ(to.seconds, c.to) << c.text;
        EXPECT_EQ(from.kind, c.kind) << c.text;
    }
    for (const char *text : {"", "@", "x", "2026-1-23x", "2026-02-29", "2026-13-01", "2026-11-23T", "2026-11-23T25:00",
                             "2026-11-23T06", "2026-11-23T06:51:40X", "2026-11-23T06:51+", "6:51",
                             "99999999999999999999", "02:10:0", "24:01", "02:10:00Z "}) {
        Moment moment;
        EXPECT_FALSE(MomentRead(text, false, &moment)) << text;
    }
}

TEST(Moment, SpanOfTimesOfDayCrossesMidnight) {
    Moment from, to, none;
    ASSERT_TRUE(MomentRead("23:00", false, &from) && MomentRead("01:00", true, &to));
    for (int64_t day : {-2, 0, 20000}) {
        int64_t midnight = day * 86400;
        EXPECT_TRUE(MomentWithin(midnight + 23 * 3600, from, to));
        EXPECT_TRUE(MomentWithin(midnight + 3659, from, to));
        EXPECT_FALSE(MomentWithin(midnight + 3660, from, to));
        EXPECT_FALSE(MomentWithin(midnight + 23 * 3600 - 1, from, to));
        EXPECT_FALSE(MomentWithin(midnight, from, none));
        EXPECT_TRUE(MomentWithin(midnight + 3659, to, from));  // by day it crosses nothing
    }
    EXPECT_EQ(MomentText(1795416700, false), "2026-11-23T06:51:40Z");
    EXPECT_EQ(MomentText(-1, false), "1969-12-31T23:59:59Z");
    EXPECT_EQ(MomentText(INT64_MIN, false), "-9223372036854775808");
}

TEST(Choice, AddsUpAndFindsUplinks) {
    Rows rows;
    rows.ports = {{"nic0", "a", "1", true, true},  {"web", "a", "2", false, true},  {"nic1", "b", "3", true, true},
                  {"web", "b", "4", false, false}, {"nic0", "b", "5", false, true}, {"db", "c", "-6", false, true}};
    const struct {
        std::vector<int64_t> ports;
        std::vector<std::string> switches, nics, vms;
        const char *chosen;
    } cases[] = {
        {{}, {}, {}, {}, "111111"},       {{-6, 77}, {}, {}, {}, "000001"}, {{}, {"b"}, {}, {}, "001110"},
        {{}, {}, {"nic0"}, {}, "110000"}, {{}, {}, {"web"}, {}, "000000"},  {{}, {}, {}, {"web"}, "111100"},
        {{}, {}, {}, {"nic0"}, "001010"}, {{2}, {"c"}, {}, {}, "010001"},
    };
    for (const auto &c : cases) {
        Choice choice{};
        choice.ports = c.ports;
        choice.switches = c.switches;
        choice.nics = c.nics;
        choice.vms = c.vms;
        std::vector<char> chosen;
        ChoicePorts(&choice, rows, &chosen);
        std::string text;
        for (char one : chosen) {
            text.push_back(one != 0 ? '1' : '0');
        }
        EXPECT_EQ(text, c.chosen);
    }
}

TEST(Cells, AreThoseOfATerminal) {
    const struct {
        std::string_view text;
        size_t cells;
        std::string_view clean;
    } cases[] = {
        {"web1", 4, "web1"},
        {"漢字", 4, "漢字"},
        {"e\u0301", 1, "e\u0301"},
        {"\U0001f600", 2, "\U0001f600"},
        {"한", 2, "한"},
        {std::string_view("\0\x1b\x7f", 3), 12, "\\x00\\x1b\\x7f"},
        {"\xff\xc3", 8, "\\xff\\xc3"},
        {"\xed\xa0\x80", 12, "\\xed\\xa0\\x80"},  // half of a pair
        {"\xc0\xaf", 8, "\\xc0\\xaf"},            // longer than need be
        {"\u009b", 8, "\\u{009b}"},
        {"\u202e", 8, "\\u{202e}"},
    };
    for (const auto &c : cases) {
        std::string clean;
        AppendClean(&clean, c.text);
        EXPECT_EQ(clean, c.clean);
        EXPECT_EQ(CellsOf(clean), c.cells) << c.clean;
    }
    EXPECT_EQ(CutToCells("漢字", 3), "漢");
    EXPECT_EQ(CutToCells("e\u0301x", 1), "e\u0301");
}
