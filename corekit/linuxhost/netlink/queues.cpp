#include "corekit/linuxhost/netlink/queues.h"

#include "corekit/linuxhost/netlink/attributes.h"
#include "corekit/linuxhost/netlink/uapi.h"

#include <algorithm>
#include <cstring>
#include <linux/ethtool_netlink.h>
#include <linux/gen_stats.h>
#include <linux/genetlink.h>
#include <linux/pkt_sched.h>
#include <linux/rtnetlink.h>

namespace {

struct FamilyMessage {
    u16 id = 0;
};
constexpr AttrField FAMILY_FIELDS[] = {{CTRL_ATTR_FAMILY_ID, ATTR_UINT, ATTR_AT(FamilyMessage, id)}};

bool SplitGeneric(const nlmsghdr *message, std::string_view *attributes) {
    genlmsghdr header;
    return MessageSplit(message, &header, sizeof header, attributes);
}

void TakeFamily(void *context, const nlmsghdr *message) {
    FamilyMessage told;
    std::string_view attributes;
    if (SplitGeneric(message, &attributes) && AttrFill(FAMILY_FIELDS, attributes, &told) != 0) {
        *static_cast<u16 *>(context) = told.id;
    }
}

NetlinkRequest GenericRequest(u16 family, u16 flags, u8 command) {
    genlmsghdr header = {command, 1, 0};
    return RequestOf(family, flags, &header, sizeof header);
}

u16 FamilyOf(NetlinkSocket *generic, const char *name) {
    u16 id = 0;
    NetlinkRequest request = GenericRequest(GENL_ID_CTRL, 0, CTRL_CMD_GETFAMILY);
    RequestAdd(&request, CTRL_ATTR_FAMILY_NAME, name, strlen(name) + 1);
    return NetlinkTalk(generic, &request, {TakeFamily, &id}) == FINE ? id : u16{0};
}

struct QueueMessage {
    u32 index = 0;
    u32 queue = QUEUES_MAX;
    u32 type = 0;
    QueueCounters counters{};
};
constexpr AttrField QUEUE_FIELDS[] = {{NETDEV_QUEUE_INDEX, ATTR_UINT, ATTR_AT(QueueMessage, queue)},
                                      {NETDEV_QUEUE_IFINDEX, ATTR_UINT, ATTR_AT(QueueMessage, index)},
                                      {NETDEV_QUEUE_TYPE, ATTR_UINT, ATTR_AT(QueueMessage, type)}};

struct CountContext {
    u32 index;
    QueueCount *count;
    bool told;
};

void TakeQueue(void *context, const nlmsghdr *message) {
    auto *wanted = static_cast<CountContext *>(context);
    QueueMessage told;
    std::string_view attributes;
    if (!SplitGeneric(message, &attributes)) {
        return;
    }
    AttrFill(QUEUE_FIELDS, attributes, &told);
    if (told.index == wanted->index && told.queue < QUEUES_MAX) {
        u32 &count = told.type == NETDEV_TX_QUEUE ? wanted->count->transmit : wanted->count->receive;
        count = std::max(count, told.queue + 1);
        wanted->told = true;
    }
}

struct ChannelMessage {
    u32 receive = 0;
    u32 transmit = 0;
    u32 combined = 0;
};
constexpr AttrField CHANNEL_FIELDS[] = {
    {ETHTOOL_A_CHANNELS_RX_COUNT, ATTR_UINT, ATTR_AT(ChannelMessage, receive)},
    {ETHTOOL_A_CHANNELS_TX_COUNT, ATTR_UINT, ATTR_AT(ChannelMessage, transmit)},
    {ETHTOOL_A_CHANNELS_COMBINED_COUNT, ATTR_UINT, ATTR_AT(ChannelMessage, combined)}};

void TakeChannels(void *context, const nlmsghdr *message) {
    auto *wanted = static_cast<CountContext *>(context);
    ChannelMessage told;
    std::string_view attributes;
    if (SplitGeneric(message, &attributes) && AttrFill(CHANNEL_FIELDS, attributes, &told) != 0) {
        wanted->count->receive = std::min(told.receive, QUEUES_MAX) + std::min(told.combined, QUEUES_MAX);
        wanted->count->transmit = std::min(told.transmit, QUEUES_MAX) + std::min(told.combined, QUEUES_MAX);
        wanted->told = true;
    }
}

Outcome AskQueues(NetlinkSocket *generic, u16 family, CountContext *wanted) {
    NetlinkRequest request = GenericRequest(family, NLM_F_DUMP, NETDEV_QUEUE_GET);
    RequestAddU32(&request, NETDEV_QUEUE_IFINDEX, wanted->index);
    return NetlinkTalk(generic, &request, {TakeQueue, wanted});
}

Outcome AskChannels(NetlinkSocket *generic, u16 family, CountContext *wanted) {
    struct {
        nlattr header;
        u32 index;
    } device = {{8, ETHTOOL_A_HEADER_DEV_INDEX}, wanted->index};
    NetlinkRequest request = GenericRequest(family, 0, ETHTOOL_MSG_CHANNELS_GET);
    RequestAdd(&request, ETHTOOL_A_CHANNELS_HEADER | NLA_F_NESTED, &device, sizeof device);
    return NetlinkTalk(generic, &request, {TakeChannels, wanted});
}

struct Counters {
    u32 index;
    std::vector<QueueCounters> *queues;
    u32 root;  // handle of "mq", whose children are the queues
    bool rooted;
};

void Keep(const Counters &wanted, u32 queue, const QueueCounters &counters) {
    if (queue < QUEUES_MAX) {
        wanted.queues->resize(std::max<size_t>(wanted.queues->size(), queue + 1));
        (*wanted.queues)[queue] = counters;
    }
}

constexpr AttrField QSTATS_FIELDS[] = {{NETDEV_QSTATS_TX_PACKETS, ATTR_UINT, ATTR_AT(QueueMessage, counters.packets)},
                                       {NETDEV_QSTATS_TX_BYTES, ATTR_UINT, ATTR_AT(QueueMessage, counters.bytes)},
                                       {NETDEV_QSTATS_TX_DROPS, ATTR_UINT, ATTR_AT(QueueMessage, counters.errors)},
                                       {NETDEV_QSTATS_TX_STOP, ATTR_UINT, ATTR_AT(QueueMessage, counters.stops)},
                                       {NETDEV_QSTATS_IFINDEX, ATTR_UINT, ATTR_AT(QueueMessage, index)},
                                       {NETDEV_QSTATS_QUEUE_TYPE, ATTR_UINT, ATTR_AT(QueueMessage, type)},
                                       {NETDEV_QSTATS_QUEUE_INDEX, ATTR_UINT, ATTR_AT(QueueMessage, queue)}};
static_assert(QUEUE_PACKETS == 1U << 0 && QUEUE_BYTES == 1U << 1 && QUEUE_ERRORS == 1U << 2 && QUEUE_STOPS == 1U << 3);

void TakeQueueCounters(void *context, const nlmsghdr *message) {
    auto *wanted = static_cast<Counters *>(context);
    QueueMessage told;
    std::string_view attributes;
    if (!SplitGeneric(message, &attributes)) {
        return;
    }
    u32 known = AttrFill(QSTATS_FIELDS, attributes, &told);
    if (told.index == wanted->index && told.type == NETDEV_TX_QUEUE && (known & QUEUE_PACKETS) != 0) {
        told.counters.known = known & (QUEUE_PACKETS | QUEUE_BYTES | QUEUE_ERRORS | QUEUE_STOPS);
        Keep(*wanted, told.queue, told.counters);
    }
}

struct DisciplineMessage {
    char kind[NAME_SIZE] = {};
    gnet_stats_basic basic{};
    u64 packets = 0;  // told where it does not fit the 32 bits of `basic`
    gnet_stats_queue queue{};
};
// clang-format off
constexpr AttrField DISCIPLINE_STATS[] = {
    {TCA_STATS_BASIC, ATTR_STRUCT, ATTR_AT(DisciplineMessage, basic)},
    {TCA_STATS_PKT64, ATTR_UINT, ATTR_AT(DisciplineMessage, packets)},
    {TCA_STATS_QUEUE, ATTR_STRUCT, ATTR_AT(DisciplineMessage, queue)}};
constexpr AttrField DISCIPLINE_FIELDS[] = {
    {TCA_KIND, ATTR_TEXT, ATTR_AT(DisciplineMessage, kind)},
    {TCA_STATS2, ATTR_NEST, 0, 0, DISCIPLINE_STATS, 3}};
// clang-format on

void TakeDiscipline(void *context, const nlmsghdr *message) {
    auto *wanted = static_cast<Counters *>(context);
    tcmsg header;
    DisciplineMessage told;
    std::string_view attributes;
    if (message->nlmsg_type != RTM_NEWQDISC || !MessageSplit(message, &header, sizeof header, &attributes) ||
        static_cast<u32>(header.tcm_ifindex) != wanted->index) {
        return;
    }
    AttrFill(DISCIPLINE_FIELDS, attributes, &told);
    if (header.tcm_parent == TC_H_ROOT) {
        wanted->rooted = strcmp(told.kind, "mq") == 0;
        wanted->root = header.tcm_handle;
    } else if (wanted->rooted && TC_H_MAJ(header.tcm_parent) == wanted->root && TC_H_MIN(header.tcm_parent) != 0) {
        u64 packets = std::max<u64>(told.basic.packets, told.packets);
        Keep(*wanted, TC_H_MIN(header.tcm_parent) - 1,
             {packets, told.basic.bytes, told.queue.drops, 0, QUEUE_PACKETS | QUEUE_BYTES | QUEUE_ERRORS});
    }
}

Outcome ReadNetdev(NetlinkSocket *generic, u16 family, Counters *wanted) {
    NetlinkRequest request = GenericRequest(family, NLM_F_DUMP, NETDEV_QSTATS_GET);
    RequestAddU32(&request, NETDEV_QSTATS_IFINDEX, wanted->index);
    RequestAdd(&request, NETDEV_QSTATS_SCOPE, &NETDEV_SCOPE_QUEUE, sizeof NETDEV_SCOPE_QUEUE);
    return NetlinkTalk(generic, &request, {TakeQueueCounters, wanted});
}

Outcome ReadDisciplines(NetlinkSocket *route, Counters *wanted) {
    tcmsg header = {};
    header.tcm_ifindex = static_cast<int>(wanted->index);
    NetlinkRequest request = RequestOf(RTM_GETQDISC, NLM_F_DUMP, &header, sizeof header);
    return NetlinkTalk(route, &request, {TakeDiscipline, wanted});
}

bool AllTold(const std::vector<QueueCounters> &queues, u32 count) {
    return queues.size() >= count && std::all_of(queues.begin(), queues.begin() + count,
                                                 [](const QueueCounters &queue) { return queue.known != 0; });
}

}  // namespace

Outcome QueuesCount(NetlinkSocket *generic, Families *families, u32 index, QueueCount *count) {
    if (!families->asked) {
        *families = {true, FamilyOf(generic, NETDEV_FAMILY), FamilyOf(generic, ETHTOOL_GENL_NAME)};
    }
    *count = {};
    CountContext wanted = {index, count, false};
    Outcome outcome = UNSUPPORTED;
    if (families->netdev != 0) {
        outcome = AskQueues(generic, families->netdev, &wanted);
    }
    if (!wanted.told && families->ethtool != 0) {
        outcome = AskChannels(generic, families->ethtool, &wanted);
    }
    return wanted.told ? FINE : outcome == FINE ? UNSUPPORTED : outcome;
}

QueueSource QueuesChoose(NetlinkSocket *generic, NetlinkSocket *route, Families *families, u32 index, u32 transmit) {
    for (QueueSource source : {QUEUES_NETDEV, QUEUES_DISCIPLINES}) {
        std::vector<QueueCounters> queues;
        NetlinkSocket *socket = source == QUEUES_NETDEV ? generic : route;
        if (QueuesRead(socket, *families, source, index, &queues) == FINE && AllTold(queues, transmit)) {
            return source;
        }
    }
    return QUEUES_UNTOLD;
}

Outcome QueuesRead(NetlinkSocket *socket, const Families &families, QueueSource source, u32 index,
                   std::vector<QueueCounters> *queues) {
    std::fill(queues->begin(), queues->end(), QueueCounters{});
    Counters wanted = {index, queues, 0, false};
    if (source == QUEUES_NETDEV && families.netdev != 0) {
        return ReadNetdev(socket, families.netdev, &wanted);
    }
    return source == QUEUES_DISCIPLINES ? ReadDisciplines(socket, &wanted) : UNSUPPORTED;
}
