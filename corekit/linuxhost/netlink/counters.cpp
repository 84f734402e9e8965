#include "corekit/linuxhost/netlink/counters.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <linux/if_link.h>
#include <linux/rtnetlink.h>

namespace {

struct StatsMessage {
    rtnl_link_stats64 stats;
};

constexpr AttrField STATS_FIELDS[] = {{IFLA_STATS_LINK_64, ATTR_STRUCT, ATTR_AT(StatsMessage, stats)}};

bool Parse(const nlmsghdr *message, u32 *index, LinkCounters *counters) {
    if_stats_msg header;
    std::string_view attributes;
    StatsMessage told;
    if (message->nlmsg_type != RTM_NEWSTATS || !MessageSplit(message, &header, sizeof header, &attributes) ||
        AttrFill(STATS_FIELDS, attributes, &told) == 0) {
        return false;
    }
    const rtnl_link_stats64 &stats = told.stats;
    *index = header.ifindex;
    *counters = {stats.rx_packets, stats.tx_packets, stats.rx_bytes,   stats.tx_bytes,        stats.rx_errors,
                 stats.tx_errors,  stats.rx_dropped, stats.tx_dropped, stats.rx_missed_errors};
    return true;
}

void TakeEach(void *context, const nlmsghdr *message) {
    u32 index = 0;
    LinkCounters counters;
    if (Parse(message, &index, &counters)) {
        const CounterReader &reader = *static_cast<const CounterReader *>(context);
        reader.row(reader.context, index, counters);
    }
}

struct Wanted {
    u32 index;
    LinkCounters *counters;
    bool found;
};

// The answer's own index is looked at, whatever the kernel made of ours.
void TakeWanted(void *context, const nlmsghdr *message) {
    auto *wanted = static_cast<Wanted *>(context);
    u32 index = 0;
    LinkCounters counters;
    if (Parse(message, &index, &counters) && index == wanted->index) {
        *wanted->counters = counters;
        wanted->found = true;
    }
}

NetlinkRequest StatsRequest(u16 flags, u32 index) {
    if_stats_msg header = {};
    header.ifindex = index;
    header.filter_mask = IFLA_STATS_FILTER_BIT(IFLA_STATS_LINK_64);
    return RequestOf(RTM_GETSTATS, flags, &header, sizeof header);
}

}  // namespace

Outcome CountersDump(NetlinkSocket *socket, const CounterReader &reader) {
    NetlinkRequest request = StatsRequest(NLM_F_DUMP, 0);
    CounterReader copy = reader;
    return NetlinkTalk(socket, &request, {TakeEach, &copy});
}

Outcome CountersRead(NetlinkSocket *socket, u32 index, LinkCounters *counters) {
    NetlinkRequest request = StatsRequest(0, index);
    Wanted wanted = {index, counters, false};
    Outcome outcome = NetlinkTalk(socket, &request, {TakeWanted, &wanted});
    return outcome == FINE && !wanted.found ? BROKEN : outcome;
}
