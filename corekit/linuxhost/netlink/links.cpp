#include "corekit/linuxhost/netlink/links.h"

#include "corekit/linuxhost/netlink/link_dump.h"

#include <algorithm>
#include <cstring>
#include <linux/rtnetlink.h>

const u32 LINK_NOTICES = 1U << (RTNLGRP_LINK - 1);

namespace {

constexpr u32 GONE_SHARE = 3;  // rows are dropped when one in so many is gone

std::vector<Link>::iterator Place(std::vector<Link> *rows, u32 index) {
    if (rows->empty() || rows->back().index < index) {
        return rows->end();
    }
    return std::lower_bound(rows->begin(), rows->end(), index,
                            [](const Link &link, u32 wanted) { return link.index < wanted; });
}

bool SameButFlags(const Link &left, const Link &right) {
    return left.master == right.master && left.lower == right.lower && left.kind == right.kind &&
           left.gone == right.gone && memcmp(left.mac, right.mac, sizeof left.mac) == 0 &&
           strcmp(left.name, right.name) == 0 && strcmp(left.device, right.device) == 0;
}

// Another interface of the same index: its deletion was seen, or it has changed what an interface never changes. Name,
// address, switch and type of hardware all may, even at once.
bool Another(const Link &old, const Link &link) {
    return old.gone || old.kind != link.kind;
}

// What the messages of an interface do not tell, or not by every kernel.
void KeepUntold(const Link &old, Link *link) {
    link->birth = old.birth;
    link->mark = old.mark;
    if (link->device[0] == 0) {
        memcpy(link->device, old.device, sizeof link->device);
        memcpy(link->bus, old.bus, sizeof link->bus);
    }
}

// Drops what is gone, when that pays. A later link of such an index is new in any case: no two births are the same.
void Compact(LinkTable *table) {
    if (size_t{table->gone} * GONE_SHARE > table->rows.size()) {
        std::erase_if(table->rows, [](const Link &link) { return link.gone; });
        table->gone = 0;
    }
}

void Put(LinkTable *table, Link link) {
    Compact(table);
    auto at = Place(&table->rows, link.index);
    bool there = at != table->rows.end() && at->index == link.index;
    if (!there && table->rows.size() - table->gone >= LINKS_MAX) {
        table->overflown = true;
        return;
    }
    if (there && !Another(*at, link)) {
        KeepUntold(*at, &link);
        table->change += SameButFlags(*at, link) ? 0 : 1;
        *at = link;
        return;
    }
    link.birth = ++table->change;
    if (there) {
        table->gone -= at->gone ? 1 : 0;
        *at = link;
    } else {
        table->rows.insert(at, link);
    }
}

// The first rows of a table.
void Adopt(LinkTable *table, std::vector<Link> *found) {
    table->overflown |= found->size() > LINKS_MAX;
    found->resize(std::min<size_t>(found->size(), LINKS_MAX));
    for (Link &link : *found) {
        link.birth = ++table->change;
    }
    table->rows.swap(*found);
}

void Remove(LinkTable *table, u32 index) {
    if (Link *link = LinksFind(table, index)) {
        link->gone = true;
        table->gone++;
        table->change++;
    }
}

void TakeNotice(void *context, const nlmsghdr *message) {
    Link link;
    if (!LinkParse(message, &link)) {
        return;
    }
    auto *table = static_cast<LinkTable *>(context);
    if (message->nlmsg_type == RTM_NEWLINK) {
        Put(table, link);
    } else if (message->nlmsg_type == RTM_DELLINK) {
        Remove(table, link.index);
    }
}

}  // namespace

Outcome LinksLoad(NetlinkSocket *socket, LinkTable *table) {
    std::vector<Link> found;
    Outcome outcome = LinksDump(socket, &found);
    if (outcome != FINE && outcome != INTERRUPTED) {
        return outcome;
    }
    if (table->rows.empty()) {
        Adopt(table, &found);
        return FINE;
    }
    std::vector<Link> alone;
    auto at = found.begin();
    for (const Link &old : std::vector<Link>(table->rows)) {
        at = std::find_if(at, found.end(), [&old](const Link &link) { return link.index >= old.index; });
        bool missing = at == found.end() || at->index != old.index;
        if (missing && !old.gone && (outcome == FINE || LinkAsk(socket, old.index, &alone) == GONE)) {
            Remove(table, old.index);
        }
    }
    found.insert(found.end(), alone.begin(), alone.end());
    for (const Link &link : found) {
        Put(table, link);
    }
    return FINE;
}

Link *LinksFind(LinkTable *table, u32 index) {
    auto at = Place(&table->rows, index);
    return at != table->rows.end() && at->index == index && !at->gone ? &*at : nullptr;
}

const Link *LinksFind(const LinkTable &table, u32 index) {
    return LinksFind(const_cast<LinkTable *>(&table), index);
}

void LinksRenew(LinkTable *table, Link *link) {
    link->birth = ++table->change;
    link->mark = 0;
}

const Link *LinksFind(const LinkTable &table, u32 index, u32 *row) {
    if (*row >= table.rows.size() || table.rows[*row].index != index) {
        const Link *link = LinksFind(table, index);
        *row = link != nullptr ? static_cast<u32>(link - table.rows.data()) : 0;
        return link;
    }
    return table.rows[*row].gone ? nullptr : &table.rows[*row];
}

Outcome LinksNotices(NetlinkSocket *notices, LinkTable *table) {
    return NetlinkNotices(notices, {TakeNotice, table});
}
