#include "corekit/linuxhost/netlink/socket.h"

#include <algorithm>
#include <cstring>
#include <linux/netlink.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <unistd.h>

namespace {

constexpr int NOTICE_SPACE = 1 << 20;  // bytes the kernel may keep for us; it grants what it allows
constexpr timeval PATIENCE = {2, 0};   // a kernel that does not answer must not hang a run
constexpr int TRIES = 100000;          // messages of an answer, against one without end

ssize_t KernelSend(void *context, const void *message, size_t size) {
    return send(static_cast<NetlinkSocket *>(context)->fd, message, size, 0);
}

// Only what the kernel itself sends counts; a message of another process has a port.
ssize_t KernelReceive(void *context, void *buffer, size_t size) {
    sockaddr_nl from = {};
    iovec vector = {buffer, size};
    msghdr message = {};
    message.msg_name = &from;
    message.msg_namelen = sizeof from;
    message.msg_iov = &vector;
    message.msg_iovlen = 1;
    ssize_t length = recvmsg(static_cast<NetlinkSocket *>(context)->fd, &message, MSG_TRUNC);
    return length > 0 && from.nl_pid != 0 ? 0 : length;
}

ssize_t Receive(NetlinkSocket *socket) {
    ssize_t length = 0;
    do {
        length = socket->io.receive(socket->io.context, socket->buffer.get(), NETLINK_BUFFER);
    } while (length < 0 && errno == EINTR);
    return length;
}

struct Progress {
    bool done = false;
    bool interrupted = false;
    Outcome outcome = FINE;
};

// The end of a dump, or of a request that is acknowledged. Both bear an errno, which is 0 when all went well.
int ErrorOf(const nlmsghdr *message) {
    int error = 0;
    std::string_view rest;
    return MessageSplit(message, &error, sizeof error, &rest) ? -error : 0;
}

void Take(const nlmsghdr *message, u32 sequence, bool dump, const NetlinkReader &reader, Progress *progress) {
    if (message->nlmsg_seq != sequence) {
        return;
    }
    progress->interrupted |= (message->nlmsg_flags & NLM_F_DUMP_INTR) != 0;
    if (message->nlmsg_type == NLMSG_DONE || message->nlmsg_type == NLMSG_ERROR) {
        progress->outcome = ErrnoOutcome(ErrorOf(message));
        progress->done = true;
    } else if (message->nlmsg_type >= NLMSG_MIN_TYPE) {
        reader.row(reader.context, message);
        progress->done |= !dump;
    }
}

// The next of the messages in `*rest`, or null at their end, and at a length that does not fit.
const nlmsghdr *NextMessage(std::string_view *rest) {
    auto message = reinterpret_cast<const nlmsghdr *>(rest->data());
    if (rest->size() < sizeof *message || message->nlmsg_len < sizeof *message || message->nlmsg_len > rest->size()) {
        return nullptr;
    }
    rest->remove_prefix(std::min<size_t>(NLMSG_ALIGN(message->nlmsg_len), rest->size()));
    return message;
}

void TakeAll(const NetlinkSocket &socket, size_t length, u32 sequence, bool dump, const NetlinkReader &reader,
             Progress *progress) {
    std::string_view rest(socket.buffer.get(), length);
    while (const nlmsghdr *message = progress->done ? nullptr : NextMessage(&rest)) {
        Take(message, sequence, dump, reader, progress);
    }
}

Outcome ReadAnswer(NetlinkSocket *socket, u32 sequence, bool dump, const NetlinkReader &reader) {
    Progress progress;
    bool cut = false;
    for (int i = 0; i < TRIES && !progress.done; i++) {
        ssize_t length = Receive(socket);
        if (length < 0 && errno != ENOBUFS) {
            return BROKEN;
        }
        progress.interrupted |= length < 0;
        length = std::max<ssize_t>(length, 0);
        cut |= static_cast<size_t>(length) > NETLINK_BUFFER;
        size_t whole = std::min<size_t>(static_cast<size_t>(length), NETLINK_BUFFER);
        TakeAll(*socket, whole, sequence, dump, reader, &progress);
    }
    if (!progress.done || cut) {
        return BROKEN;
    }
    return progress.outcome == FINE && progress.interrupted ? INTERRUPTED : progress.outcome;
}

}  // namespace

NetlinkSocket::~NetlinkSocket() {
    if (fd >= 0) {
        close(fd);
    }
}

Outcome NetlinkOpen(NetlinkSocket *netlink, int protocol, u32 groups) {
    if (netlink->buffer == nullptr) {
        netlink->buffer.reset(new char[NETLINK_BUFFER]);
    }
    if (netlink->fd >= 0 || netlink->io.send != nullptr) {
        return FINE;
    }
    int fd = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC | (groups != 0 ? SOCK_NONBLOCK : 0), protocol);
    if (fd < 0) {
        return ErrnoOutcome(errno);
    }
    int on = 1;
    setsockopt(fd, SOL_NETLINK, NETLINK_EXT_ACK, &on, sizeof on);
    setsockopt(fd, SOL_NETLINK, NETLINK_GET_STRICT_CHK, &on, sizeof on);
    setsockopt(fd, SOL_SOCKET, SO_RCVTIMEO, &PATIENCE, sizeof PATIENCE);
    if (groups != 0) {
        setsockopt(fd, SOL_SOCKET, SO_RCVBUF, &NOTICE_SPACE, sizeof NOTICE_SPACE);
    }
    sockaddr_nl address = {};
    address.nl_family = AF_NETLINK;
    address.nl_groups = groups;
    if (bind(fd, reinterpret_cast<const sockaddr *>(&address), sizeof address) != 0) {
        Outcome outcome = ErrnoOutcome(errno);
        close(fd);
        return outcome;
    }
    netlink->fd = fd;
    netlink->io = {KernelSend, KernelReceive, netlink};
    return FINE;
}

NetlinkRequest RequestOf(u16 type, u16 flags, const void *header, size_t size) {
    NetlinkRequest request;
    memset(&request, 0, sizeof request);
    auto *message = reinterpret_cast<nlmsghdr *>(request.bytes);
    message->nlmsg_type = type;
    message->nlmsg_flags = static_cast<u16>(flags | NLM_F_REQUEST);
    memcpy(request.bytes + NLMSG_HDRLEN, header, size);
    request.size = static_cast<u32>(NLMSG_HDRLEN + NLMSG_ALIGN(size));
    return request;
}

void RequestAdd(NetlinkRequest *request, u16 type, const void *payload, size_t size) {
    size_t whole = NLA_HDRLEN + size;
    if (request->size == 0 || request->size + NLA_ALIGN(whole) > sizeof request->bytes) {
        request->size = 0;
        return;
    }
    nlattr header = {static_cast<u16>(whole), type};
    memcpy(request->bytes + request->size, &header, sizeof header);
    memcpy(request->bytes + request->size + NLA_HDRLEN, payload, size);
    request->size += static_cast<u32>(NLA_ALIGN(whole));
}

void RequestAddU32(NetlinkRequest *request, u16 type, u32 value) {
    RequestAdd(request, type, &value, sizeof value);
}

bool MessageSplit(const nlmsghdr *message, void *header, size_t size, std::string_view *attributes) {
    if (message->nlmsg_len < NLMSG_HDRLEN + size) {
        return false;
    }
    const char *payload = reinterpret_cast<const char *>(message) + NLMSG_HDRLEN;
    memcpy(header, payload, size);
    size_t begin = std::min<size_t>(NLMSG_ALIGN(size), message->nlmsg_len - NLMSG_HDRLEN);
    *attributes = std::string_view(payload + begin, message->nlmsg_len - NLMSG_HDRLEN - begin);
    return true;
}

Outcome NetlinkTalk(NetlinkSocket *socket, NetlinkRequest *request, const NetlinkReader &reader) {
    auto *message = reinterpret_cast<nlmsghdr *>(request->bytes);
    if (request->size == 0 || socket->io.send == nullptr) {
        return BROKEN;
    }
    message->nlmsg_len = request->size;
    message->nlmsg_seq = ++socket->sequence;
    if (socket->io.send(socket->io.context, request->bytes, request->size) < 0) {
        return ErrnoOutcome(errno) == INTERRUPTED ? BROKEN : ErrnoOutcome(errno);
    }
    return ReadAnswer(socket, message->nlmsg_seq, (message->nlmsg_flags & NLM_F_DUMP) == NLM_F_DUMP, reader);
}

Outcome NetlinkNotices(NetlinkSocket *socket, const NetlinkReader &reader) {
    bool lost = false;
    for (int i = 0; i < TRIES; i++) {
        ssize_t length = Receive(socket);
        if (length < 0 && errno != ENOBUFS) {
            break;
        }
        lost |= length < 0 || static_cast<size_t>(length) > NETLINK_BUFFER;
        if (length <= 0 || static_cast<size_t>(length) > NETLINK_BUFFER) {
            continue;
        }
        std::string_view rest(socket->buffer.get(), static_cast<size_t>(length));
        while (const nlmsghdr *message = NextMessage(&rest)) {
            reader.row(reader.context, message);
        }
    }
    return lost ? INTERRUPTED : FINE;
}
