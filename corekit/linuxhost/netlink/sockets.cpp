#include "corekit/linuxhost/netlink/sockets.h"

#include "corekit/linuxhost/netlink/attributes.h"

#include <algorithm>
#include <cstring>
#include <linux/inet_diag.h>
#include <linux/netlink.h>
#include <linux/sock_diag.h>
#include <linux/tcp.h>
#include <netinet/in.h>

namespace {

constexpr u32 END_NOTICES = 1U << (SKNLGRP_INET_TCP_DESTROY - 1) | 1U << (SKNLGRP_INET6_TCP_DESTROY - 1);
// States of sockets that have figures: all but those that wait, listen or are about to be made. The numbers are the
// kernel's own (TCP_TIME_WAIT 6, TCP_SYN_RECV 3, TCP_LISTEN 10, TCP_NEW_SYN_RECV 12).
constexpr u32 STATES = 0xfff & ~(1U << 6 | 1U << 3 | 1U << 10);
constexpr int TRIES = 5;

struct InfoMessage {
    tcp_info info;
};
constexpr AttrField INFO_FIELDS[] = {{INET_DIAG_INFO, ATTR_STRUCT, ATTR_AT(InfoMessage, info)}};

void TakeSocket(void *context, const nlmsghdr *message) {
    auto *found = static_cast<std::vector<TcpSocket> *>(context);
    inet_diag_msg header;
    std::string_view attributes;
    InfoMessage told;
    if (found->size() <= SOCKETS_MAX && MessageSplit(message, &header, sizeof header, &attributes) &&
        AttrFill(INFO_FIELDS, attributes, &told) != 0) {
        u64 cookie = u64{header.id.idiag_cookie[1]} << 32 | header.id.idiag_cookie[0];
        found->push_back(
            {cookie, {told.info.tcpi_bytes_sent, told.info.tcpi_bytes_received, told.info.tcpi_data_segs_in}});
    }
}

Outcome Dump(NetlinkSocket *socket, u8 family, std::vector<TcpSocket> *found) {
    inet_diag_req_v2 header = {};
    header.sdiag_family = family;
    header.sdiag_protocol = IPPROTO_TCP;
    header.idiag_ext = 1U << (INET_DIAG_INFO - 1);
    header.idiag_states = STATES;
    size_t before = found->size();
    Outcome outcome = INTERRUPTED;
    for (int i = 0; i < TRIES && outcome == INTERRUPTED; i++) {
        found->resize(before);
        NetlinkRequest request = RequestOf(SOCK_DIAG_BY_FAMILY, NLM_F_DUMP, &header, sizeof header);
        outcome = NetlinkTalk(socket, &request, {TakeSocket, found});
    }
    return outcome == INTERRUPTED ? FINE : outcome;
}

bool ByCookie(const TcpSocket &left, const TcpSocket &right) {
    return left.cookie < right.cookie;
}

void Sort(std::vector<TcpSocket> *sockets) {
    std::sort(sockets->begin(), sockets->end(), ByCookie);
    auto same = [](const TcpSocket &left, const TcpSocket &right) { return left.cookie == right.cookie; };
    sockets->erase(std::unique(sockets->begin(), sockets->end(), same), sockets->end());
}

void Add(TcpTotals *totals, const TcpTotals &more) {
    totals->bytesSent += more.bytesSent;
    totals->bytesReceived += more.bytesReceived;
    totals->segmentsReceived += more.segmentsReceived;
}

// What a socket told before and no longer does: one that is reset begins at 0 again, and so does its last word.
void KeepReset(TcpSockets *sockets, const std::vector<TcpSocket> &later) {
    for (const TcpSocket &now : later) {
        auto [begin, end] = std::equal_range(sockets->living.begin(), sockets->living.end(), now, ByCookie);
        if (begin != end && (now.totals.bytesSent < begin->totals.bytesSent ||
                             now.totals.bytesReceived < begin->totals.bytesReceived)) {
            Add(&sockets->past, begin->totals);
            begin->totals = {};
        }
    }
}

// The sockets of the dump, those that it no longer shows, without those whose end is told.
void Join(TcpSockets *sockets, const std::vector<TcpSocket> &found, bool lost) {
    std::vector<TcpSocket> all(found);
    if (lost) {  // whatever is no longer shown has ended, and nobody will say so
        for (const TcpSocket &old : sockets->living) {
            bool told = std::binary_search(sockets->ended.begin(), sockets->ended.end(), old, ByCookie);
            if (!told && !std::binary_search(found.begin(), found.end(), old, ByCookie)) {
                Add(&sockets->past, old.totals);
            }
        }
    } else {
        std::vector<TcpSocket> shown;
        std::set_union(found.begin(), found.end(), sockets->living.begin(), sockets->living.end(),
                       std::back_inserter(shown), ByCookie);
        all.swap(shown);
    }
    sockets->living.clear();
    std::set_difference(all.begin(), all.end(), sockets->ended.begin(), sockets->ended.end(),
                        std::back_inserter(sockets->living), ByCookie);
}

}  // namespace

Outcome TcpSocketsRead(TcpSockets *sockets, TcpTotals *totals) {
    Outcome outcome = NetlinkOpen(&sockets->notices, NETLINK_SOCK_DIAG, END_NOTICES);
    outcome = outcome == FINE ? NetlinkOpen(&sockets->requests, NETLINK_SOCK_DIAG) : outcome;
    if (outcome != FINE) {
        return outcome;
    }
    std::vector<TcpSocket> found;
    found.reserve(sockets->living.size());
    outcome = Dump(&sockets->requests, AF_INET, &found);
    if (outcome == FINE && Dump(&sockets->requests, AF_INET6, &found) == BROKEN) {
        outcome = BROKEN;
    }
    if (outcome != FINE || found.size() > SOCKETS_MAX) {
        return outcome == FINE ? BROKEN : outcome;
    }
    // Behind the dump: an end that is told now may still be in it, and leaves it again.
    sockets->ended.clear();
    bool lost = NetlinkNotices(&sockets->notices, {TakeSocket, &sockets->ended}) == INTERRUPTED;
    Sort(&found);
    Sort(&sockets->ended);
    KeepReset(sockets, found);
    KeepReset(sockets, sockets->ended);
    for (const TcpSocket &end : sockets->ended) {
        Add(&sockets->past, end.totals);
    }
    Join(sockets, found, lost);
    if (sockets->living.size() > SOCKETS_MAX) {
        return BROKEN;
    }
    *totals = sockets->past;
    for (const TcpSocket &socket : sockets->living) {
        Add(totals, socket.totals);
    }
    return FINE;
}
