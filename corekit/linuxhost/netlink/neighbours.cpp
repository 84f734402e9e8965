#include "corekit/linuxhost/netlink/neighbours.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <linux/if_addr.h>
#include <linux/if_ether.h>
#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <sys/socket.h>

namespace {

constexpr AttrField NEIGHBOUR_FIELDS[] = {{NDA_LLADDR, ATTR_STRUCT, ATTR_AT(Learned, mac)}};

void TakeAddress(void *context, const nlmsghdr *message) {
    auto *indices = static_cast<std::vector<u32> *>(context);
    ifaddrmsg header;
    std::string_view attributes;
    if (message->nlmsg_type == RTM_NEWADDR && MessageSplit(message, &header, sizeof header, &attributes) &&
        header.ifa_scope < RT_SCOPE_LINK && indices->size() < NEIGHBOURS_MAX) {
        indices->push_back(header.ifa_index);
    }
}

void TakeNeighbour(void *context, const nlmsghdr *message) {
    auto *learned = static_cast<std::vector<Learned> *>(context);
    ndmsg header;
    std::string_view attributes;
    Learned entry = {};
    if (message->nlmsg_type == RTM_NEWNEIGH && MessageSplit(message, &header, sizeof header, &attributes) &&
        header.ndm_family == AF_BRIDGE && (header.ndm_flags & NTF_SELF) == 0 &&
        (header.ndm_state & (NUD_PERMANENT | NUD_NOARP)) == 0 && learned->size() < NEIGHBOURS_MAX &&
        AttrFill(NEIGHBOUR_FIELDS, attributes, &entry) != 0) {
        entry.index = static_cast<u32>(header.ndm_ifindex);
        learned->push_back(entry);
    }
}

bool ByIndex(const Learned &left, const Learned &right) {
    return left.index < right.index;
}

}  // namespace

Outcome AddressesLoad(NetlinkSocket *socket, u32 index, std::vector<u32> *indices) {
    ifaddrmsg header = {};
    header.ifa_index = index;
    NetlinkRequest request = RequestOf(RTM_GETADDR, NLM_F_DUMP, &header, sizeof header);
    return NetlinkTalk(socket, &request, {TakeAddress, indices});
}

Outcome LearnedLoad(NetlinkSocket *socket, std::vector<Learned> *learned) {
    ndmsg header = {};
    header.ndm_family = AF_BRIDGE;
    NetlinkRequest request = RequestOf(RTM_GETNEIGH, NLM_F_DUMP, &header, sizeof header);
    Outcome outcome = NetlinkTalk(socket, &request, {TakeNeighbour, learned});
    std::stable_sort(learned->begin(), learned->end(), ByIndex);
    return outcome;
}

const Learned *LearnedFind(const std::vector<Learned> &learned, u32 index) {
    auto [begin, end] = std::equal_range(learned.begin(), learned.end(), Learned{index, {}}, ByIndex);
    return end - begin == 1 ? &*begin : nullptr;
}
