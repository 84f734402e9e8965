// A netlink socket and a conversation over it. Every message of the room goes through the send and receive of
// NetlinkIo, so that a test can play the kernel. Owns one descriptor and, once used, a buffer of 64 KiB.
#pragma once

#include "corekit/linuxhost/rows.h"

#include <memory>
#include <string_view>
#include <sys/types.h>

struct nlmsghdr;

struct NetlinkIo {
    // Both as the system calls: a length, or -1 and errno. receive tells the whole length of a message that it had to
    // cut, and waits unless the socket is of notices.
    ssize_t (*send)(void *context, const void *message, size_t size);
    ssize_t (*receive)(void *context, void *buffer, size_t size);
    void *context;
};

struct NetlinkSocket {
    int fd = -1;
    u32 sequence = 0;
    NetlinkIo io{};                  // of the kernel unless it was set before NetlinkOpen
    std::unique_ptr<char[]> buffer;  // NETLINK_BUFFER bytes
    NetlinkSocket() = default;
    NetlinkSocket(const NetlinkSocket &) = delete;
    NetlinkSocket &operator=(const NetlinkSocket &) = delete;
    ~NetlinkSocket();
};

constexpr size_t NETLINK_BUFFER = 65536;

// For requests (groups 0) or for notices of these groups, a bit each. Nothing happens to a socket that is open.
Outcome NetlinkOpen(NetlinkSocket *socket, int protocol, u32 groups = 0);

// A request under construction. What does not fit makes it invalid, and NetlinkTalk refuses it.
struct NetlinkRequest {
    alignas(8) char bytes[512];
    u32 size;
};
// With a header behind that of the message, as struct ifinfomsg.
NetlinkRequest RequestOf(u16 type, u16 flags, const void *header, size_t size);
void RequestAdd(NetlinkRequest *request, u16 type, const void *payload, size_t size);
void RequestAddU32(NetlinkRequest *request, u16 type, u32 value);

// What is behind the message's header, when it holds at least `size` bytes; these are copied to `*header`, the
// attributes behind them returned. False for a message that is too short.
bool MessageSplit(const nlmsghdr *message, void *header, size_t size, std::string_view *attributes);

// Gets each message of an answer. A function without captures and its context.
struct NetlinkReader {
    void (*row)(void *context, const nlmsghdr *message);
    void *context;
};

// Sends the request and reads all of its answer, whatever comes, so that the next one finds a clean socket. A dump that
// the kernel refuses in its last message is refused. INTERRUPTED: the list changed under way, all rows were given.
Outcome NetlinkTalk(NetlinkSocket *socket, NetlinkRequest *request, const NetlinkReader &reader);

// What waits on a socket of notices, never waiting itself. INTERRUPTED: some were lost; all that waited is read.
Outcome NetlinkNotices(NetlinkSocket *socket, const NetlinkReader &reader);
