#include "corekit/faults.h"

#include <algorithm>
#include <csignal>

namespace {

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
        } else if (fails && status == 0) {
            status = rule.status;
        }
    }
    return status;
}
