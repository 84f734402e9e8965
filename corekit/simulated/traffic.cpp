#include "corekit/simulated/host_nodes.h"
#include "corekit/simulated/line.h"

#include <algorithm>

namespace {

constexpr i64 LOCAL_SHARE = 4;  // one packet in so many stays on its switch

// Packets a second under one load.
struct Flow {
    LoadCurve *load;
    i64 sent = 0;   // by the ports, and in by uplinks that state it
    i64 taken = 0;  // received or dropped by the ports, and out by uplinks that state it
};

using Ports = std::vector<const PlannedPort *>;
struct SwitchPlan {
    std::vector<Flow> flows;
    Ports clients, uplinks;
    Ports outlets, inlets;     // uplinks that state no tx, no rx
    Ports senders, receivers;  // clients that do not
};
using Switches = std::unordered_map<const std::string *, SwitchPlan>;

Flow *FlowOf(SwitchPlan *plan, LoadCurve *load) {
    auto found = std::find_if(plan->flows.begin(), plan->flows.end(), [&](const Flow &f) { return f.load == load; });
    return found != plan->flows.end() ? &*found : &plan->flows.emplace_back(Flow{load});
}

void AddTo(i64 *sum, i64 more) {
    *sum = std::clamp(*sum + more, -MAX_RATE, MAX_RATE);
}

void AddClient(SwitchPlan *plan, const PlannedPort &port) {
    Flow *flow = FlowOf(plan, port.entity->load);
    AddTo(&flow->sent, port.entity->value[TX]);
    AddTo(&flow->taken, port.entity->value[RX] + port.entity->value[RX_ERRORS]);
    plan->clients.push_back(&port);
    if (!port.txStated) {
        plan->senders.push_back(&port);
    }
    if (!port.rxStated) {
        plan->receivers.push_back(&port);
    }
}

// What an uplink loses on the way in never came to the switch.
void AddUplink(SwitchPlan *plan, const PlannedPort &port) {
    Flow *flow = FlowOf(plan, port.entity->load);
    AddTo(&flow->sent, port.entity->value[RX]);
    AddTo(&flow->taken, port.txStated ? port.entity->value[TX] + port.entity->value[TX_ERRORS] : 0);
    plan->uplinks.push_back(&port);
    if (!port.txStated) {
        plan->outlets.push_back(&port);
    }
    if (!port.rxStated) {
        plan->inlets.push_back(&port);
    }
}

// An even share for each, what does not divide to the first.
void Give(Host *host, const Ports &ports, LoadCurve *load, Slot slot, i64 rate) {
    auto count = static_cast<i64>(ports.size());
    for (i64 i = 0; i < count; i++) {
        NodesAddRate(host, ports[static_cast<size_t>(i)]->entity, load, slot,
                     rate / count + (i < rate % count ? 1 : 0));
    }
}

void SettleFlow(Host *host, const SwitchPlan &plan, const Flow &flow) {
    i64 excess = flow.sent - flow.taken;
    if (!plan.outlets.empty() && !plan.inlets.empty()) {
        i64 local = std::max<i64>(std::min(flow.sent, flow.taken), 0) / LOCAL_SHARE;
        Give(host, plan.outlets, flow.load, TX, flow.sent - local);
        Give(host, plan.inlets, flow.load, RX, flow.taken - local);
    } else if (excess > 0) {
        plan.outlets.empty() ? Give(host, plan.receivers, flow.load, RX, excess)
                             : Give(host, plan.outlets, flow.load, TX, excess);
    } else {
        plan.inlets.empty() ? Give(host, plan.senders, flow.load, TX, -excess)
                            : Give(host, plan.inlets, flow.load, RX, -excess);
    }
}

// What an uplink drops on the way out did not go out: it is taken off the largest flow, whose load the drops follow.
void SettleUplinks(Host *host, SwitchPlan *plan) {
    auto less = [](const Flow &one, const Flow &other) { return one.sent < other.sent; };
    auto most = std::max_element(plan->flows.begin(), plan->flows.end(), less);
    for (const PlannedPort *port : plan->outlets) {
        port->entity->load = port->rxStated ? port->entity->load : most->load;
        port->entity->value[TX] = -port->entity->value[TX_ERRORS];
    }
    for (const Flow &flow : plan->flows) {
        SettleFlow(host, *plan, flow);
    }
    for (const PlannedPort *port : plan->outlets) {
        port->entity->value[TX] = std::max<i64>(port->entity->value[TX], 0);
    }
}

// The mean of what the clients send, for uplinks that state none.
void SettleSizes(const SwitchPlan &plan) {
    __int128 bytes = 0;
    i64 packets = 0;
    for (const PlannedPort *port : plan.clients) {
        i64 sent = std::clamp<i64>(port->entity->value[TX], 0, MAX_RATE - packets);
        bytes += static_cast<__int128>(sent) * port->entity->value[SIZE];
        packets += sent;
    }
    for (const PlannedPort *port : plan.uplinks) {
        if (!port->sizeStated && packets > 0) {
            NodesSetSize(port->entity, static_cast<i64>(bytes / packets));
        }
    }
}

// The filters of a NIC serve the clients of its switch in turn, or its own port where there are none.
void SettleFilters(const Host &host, const Switches &switches) {
    i64 uplink = 0;
    size_t next = 0;
    for (const PlannedFilter &filter : host.plan.filters) {
        const Ports &clients = switches.at(filter.switchName).clients;
        next = filter.uplink == uplink ? next : 0;
        uplink = filter.uplink;
        filter.entity->value[PORT] = clients.empty() ? uplink : clients[next % clients.size()]->entity->value[PORT];
        next++;
    }
}

// The host's stack sends and receives what its ports do: four fifths by IPv4, a fifth by IPv6.
void SettleStack(Host *host) {
    const Plan &plan = host->plan;
    for (const PlannedPort &port : plan.ports) {
        for (Entity *part = port.type == PORT_HOST_STACK ? port.entity : nullptr; part != nullptr; part = part->more) {
            NodesAddRate(host, host->stack, part->load, TX, plan.stackTxStated ? 0 : part->value[TX] * 4 / 5);
            NodesAddRate(host, host->stack, part->load, RX, plan.stackRxStated ? 0 : part->value[RX] * 4 / 5);
        }
    }
}

}  // namespace

void TrafficSettle(Host *host) {
    Switches switches;
    for (const PlannedPort &port : host->plan.ports) {
        SwitchPlan *plan = &switches[port.switchName];
        port.type == PORT_UPLINK ? AddUplink(plan, port) : AddClient(plan, port);
    }
    for (auto &[name, plan] : switches) {
        SettleUplinks(host, &plan);
        SettleSizes(plan);
    }
    SettleFilters(*host, switches);
    SettleStack(host);
}
