// Interrupts of NICs: which vectors are theirs, and what came on them. A host whose interrupts nobody may count lists
// none: a caller does without in silence, and counts without their time would be half a truth.
#include "corekit/linuxhost/host.h"
#include "corekit/linuxhost/host_nodes.h"
#include "corekit/linuxhost/proc/vectors.h"

#include <algorithm>
#include <functional>

namespace {

// An interface that a device's vectors serve: the NIC, or a VLAN on it.
struct Owner {
    std::string name;
    std::string nic;
};
using Owners = std::map<u32, std::vector<Owner>>;  // by vector
using Names = std::vector<std::string>;

Owners FindOwners(LinuxHost *host, Names *nics) {
    Owners owners;
    for (const Link &link : host->links.rows) {
        const Link *nic = link.kind == KIND_VLAN ? LinksFind(host->links, link.lower) : &link;
        if (link.gone || nic == nullptr || nic->device[0] == 0) {
            continue;
        }
        nics->emplace_back(nic->name);
        for (u32 vector : VectorsOf(host->root, nic->bus, nic->device)) {
            owners[vector].push_back({link.name, nic->name});
        }
    }
    return owners;
}

// A name with a digit behind it is another one's.
bool AnyHas(const Names &actions, const std::string &name) {
    return std::any_of(actions.begin(), actions.end(), [&](const std::string &action) {
        size_t at = action.find(name);
        size_t end = at != std::string::npos ? at + name.size() : 0;
        return at != std::string::npos && (end == action.size() || action[end] < '0' || action[end] > '9');
    });
}

// Of several NICs of one device a vector serves the one that its handlers are named after; all when none is.
void LeaveOutOthers(std::vector<Owner> *owners, const Names &actions) {
    auto named = [&](const Owner &owner) { return AnyHas(actions, owner.nic); };
    if (std::any_of(owners->begin(), owners->end(), named)) {
        owners->erase(std::remove_if(owners->begin(), owners->end(), std::not_fn(named)), owners->end());
    }
}

// A reader looks for the name of a NIC with no digit behind it, in all names in a row. Blanks, which no interface has
// in its name, keep each apart. A handler that is named after a NIC is left out: it keeps the name that the NIC had
// when it was set up, which may be another one's by now.
Params NamesOf(std::vector<Owner> owners, const Names &actions, const Names &nics) {
    Params names;
    LeaveOutOthers(&owners, actions);
    std::sort(owners.begin(), owners.end(),
              [](const Owner &left, const Owner &right) { return left.name.size() < right.name.size(); });
    for (const Owner &owner : owners) {
        names.push_back(ParamOf(" " + owner.name + " "));
    }
    for (const std::string &action : actions) {
        if (std::none_of(nics.begin(), nics.end(), [&](const std::string &nic) { return AnyHas({action}, nic); })) {
            names.push_back(ParamOf(action));
        }
    }
    return names;
}

// Null unless it was listed.
Vector *VectorOf(LinuxHost *host, int64_t number) {
    auto &vectors = host->demand.vectors;
    auto found = number > 0 && number <= INT32_MAX ? vectors.find(static_cast<u32>(number)) : vectors.end();
    return found != vectors.end() ? &found->second : nullptr;
}

}  // namespace

std::map<u32, Params> HostVectors(LinuxHost *host) {
    Names nics;
    std::map<u32, Params> vectors;
    if (HostLinks(host) == FINE) {
        for (const auto &[vector, owners] : FindOwners(host, &nics)) {
            vectors[vector] = NamesOf(owners, VectorActions(host->root, vector), nics);
        }
    }
    return vectors;
}

KnfStatus VectorList(LinuxHost *host, const Params & /*keys*/, Params *entries) {
    OnDemand *demand = &host->demand;
    if (demand->vectorsRefused) {
        return STATUS_OK;
    }
    for (auto &[number, names] : HostVectors(host)) {
        const TrackingTable *table = HostTracking(host);
        Outcome outcome = table != nullptr ? table->vectorWatch(demand->tracking, number) : UNSUPPORTED;
        if (outcome == FINE) {
            demand->vectors[number].names = names;
            entries->push_back(ParamOf(int64_t{number}));
        }
        demand->vectorsRefused = outcome == UNSUPPORTED || outcome == REFUSED;
        if (demand->vectorsRefused) {
            break;
        }
    }
    return STATUS_OK;
}

KnfStatus VectorNames(LinuxHost *host, const Params &keys, Params *entries) {
    const Vector *vector = VectorOf(host, keys[0].number);
    if (vector != nullptr) {
        *entries = vector->names;
    }
    return vector != nullptr ? STATUS_OK : STATUS_NOT_FOUND;
}

KnfStatus VectorStatsGet(LinuxHost *host, const Params &keys, char *record) {
    OnDemand *demand = &host->demand;
    const CpuTopology *topology = HostTopology(host);
    Vector *vector = VectorOf(host, keys[0].number);
    if (vector == nullptr || topology == nullptr || keys[1].number < 0 || keys[1].number >= topology->cpus) {
        return STATUS_NOT_FOUND;
    }
    auto cpu = static_cast<size_t>(keys[1].number);
    vector->served.resize(topology->cpus);
    vector->samples.resize(topology->cpus);
    PassJoin(&demand->vectorPass, &vector->served[cpu], host->now());
    Outcome outcome = FINE;
    if (vector->generation != demand->vectorPass.generation) {
        outcome = demand->table->vectorRead(demand->tracking, static_cast<u32>(keys[0].number), topology->cpus,
                                            vector->samples.data());
        vector->generation = outcome == FINE ? demand->vectorPass.generation : 0;
    }
    Put(record, vector_stats::COUNT, vector->samples[cpu].count);
    Put(record, vector_stats::TIME, vector->samples[cpu].time / NANOSECONDS);
    return StatusOf(outcome);
}
