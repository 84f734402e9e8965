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
    const std::pair<const char *, u32> calls[] = {{"get", 1U << CALL_GET},
                                                  {"list", 1U << CALL_LIST},
                                                  {"set", 1U << CALL_SET},
                                                  {"create", 1U << CALL_CREATE},
                                                  {"add", 1U << CALL_ADD},
                                                  {"text", 1U << CALL_TEXT},
                                                  {"signature", 1U << CALL_SIGNATURE},
                                                  {"cache", 1U << CALL_CACHE},
                                                  {"any", (1U << CALL_KINDS) - 1}};
    constexpr char expected[] = "get, list, set, create, add, text, signature, cache or any";
    std::string name = TakePlain(line, expected).text;
    for (const auto &[known, bits] : calls) {
        if (name == known) {
            return bits;
        }
    }
    Fail(line, "call " + Quoted(name) + ": expected " + expected);
    return 0;
}

// How many calls fail, and how.
void TakeOutcome(Line *line, FaultRule *rule) {
    rule->nth = static_cast<u64>(TakeNumber(line, "nth", 0, 1, MAX_I64));
    auto from = static_cast<u64>(TakeNumber(line, "from", 0, 1, MAX_I64));
    auto status = static_cast<KnfStatus>(TakeNumber(line, "status", 0, 1, MAX_ID));
    rule->delay = static_cast<u32>(TakeNumber(line, "delay", 0, 1, 60000));
    rule->signal = static_cast<int>(TakeNumber(line, "signal", 0, 1, 64));
    if (rule->nth != 0 && from != 0) {
        Fail(line, "nth= and from=: expected one of them");
    }
    if (rule->signal != 0 && status != 0) {
        Fail(line, "signal= and status=: expected one of them, as a call that a signal meets succeeds");
    }
    if (rule->signal != 0 && rule->delay != 0) {
        Fail(line, "signal= and delay=: expected one of them");
    }
    rule->from = from != 0 ? from : 1;
    rule->status = status != 0 ? status : STATUS_SIMULATED;
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
        if ((rule.calls & (1U << CALL_GET | 1U << CALL_LIST | 1U << CALL_SET)) == 0) {
            Fail(line, "node too many: expected one for get, list, set and any alone");
        }
    }
    if (std::optional<Word> added = Take(line, "key")) {
        rule.added.push_back(ToParam(line, *added, "key="));
        rule.calls &= 1U << CALL_ADD;
        if (rule.calls == 0) {
            Fail(line, "key= too many: expected it for add alone");
        }
    }
    TakeOutcome(line, &rule);
    if (Complete(line)) {
        rules->push_back(std::move(rule));
    }
}
