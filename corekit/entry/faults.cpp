#include "corekit/entry/faults.h"

#include "corekit/simulated/line.h"

#include <algorithm>
#include <csignal>
#include <ctime>
#include <sys/timerfd.h>
#include <unistd.h>
#include <utility>

namespace {

// Waits in a read, which the kernel restarts behind a signal whose handler asks for that. False when it was cut short.
bool Delay(uint32_t milliseconds) {
    int fd = timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC);
    const itimerspec times = {{0, 0}, {milliseconds / 1000, milliseconds % 1000 * 1000000L}};
    uint64_t expired = 0;
    bool whole = timerfd_settime(fd, 0, &times, nullptr) == 0 && read(fd, &expired, sizeof expired) == sizeof expired;
    close(fd);
    return whole;
}

bool Matches(const FaultRule &rule, const FaultCall &call) {
    if ((rule.calls & 1U << call.kind) == 0) {
        return false;
    }
    if (!rule.added.empty() && (call.added == nullptr || !ParamEqual(rule.added[0], *call.added))) {
        return false;
    }
    if (!rule.hasNode) {
        return true;
    }
    const Params &keys = ParamListParams(call.keys);
    return call.kind <= CALL_SET && call.node == rule.node && rule.keys.size() <= keys.size() &&
           std::equal(rule.keys.begin(), rule.keys.end(), keys.begin(), ParamEqual);
}

u32 TakeCalls(Line *line) {
    const std::pair<const char *, u32> calls[] = {{"get", 1U << CALL_GET}, {"list", 1U << CALL_LIST},
                                                  {"set", 1U << CALL_SET}, {"create", 1U << CALL_CREATE},
                                                  {"add", 1U << CALL_ADD}, {"any", (1U << CALL_KINDS) - 1}};
    std::string name = TakePlain(line, "get, list, set, create, add or any").text;
    for (const auto &[known, bits] : calls) {
        if (name == known) {
            return bits;
        }
    }
    Fail(line, "call " + Quoted(name) + ": expected get, list, set, create, add or any");
    return 0;
}

}  // namespace

KnfStatus FaultsCheck(std::vector<FaultRule> *rules, const FaultCall &call) {
    KnfStatus status = 0;
    for (FaultRule &rule : *rules) {
        if (!Matches(rule, call)) {
            continue;
        }
        rule.seen++;
        bool fails = rule.nth != 0 ? rule.seen == rule.nth : rule.seen >= rule.from;
        if (fails && rule.signal != 0) {
            std::raise(rule.signal);
        } else if (fails && rule.delay != 0) {
            status = Delay(rule.delay) ? status : rule.status;
        } else if (fails && status == 0) {
            status = rule.status;
        }
    }
    return status;
}

void FaultsTake(Line *line, std::vector<FaultRule> *rules) {
    FaultRule rule;
    rule.calls = TakeCalls(line);
    if (AtPlain(*line)) {
        rule.hasNode = true;
        rule.node = TakeNode(line);
        rule.keys = TakeKeys(line);
        if (rule.calls == 1U << CALL_CREATE || rule.calls == 1U << CALL_ADD) {
            Fail(line, "node too many: expected none for create and add");
        }
    }
    if (std::optional<Word> added = Take(line, "key")) {
        rule.added.push_back(ToParam(line, *added, "key="));
        rule.calls &= 1U << CALL_ADD;
        if (rule.calls == 0) {
            Fail(line, "key= too many: expected it for add alone");
        }
    }
    rule.nth = static_cast<u64>(TakeNumber(line, "nth", 0, 1, MAX_I64));
    rule.from = static_cast<u64>(TakeNumber(line, "from", 1, 1, MAX_I64));
    rule.status = static_cast<KnfStatus>(TakeNumber(line, "status", STATUS_SIMULATED, 1, MAX_ID));
    rule.delay = static_cast<u32>(TakeNumber(line, "delay", 0, 1, 60000));
    rule.signal = static_cast<int>(TakeNumber(line, "signal", 0, 1, 64));
    if (Complete(line)) {
        rules->push_back(std::move(rule));
    }
}
