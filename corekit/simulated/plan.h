// What the lines of a description leave to the whole: the traffic of a switch and the time of the pcpus follow from all
// lines together. Lines note here what they stated; once all are read, the rest is worked out, and the plan is empty.
//
// On a switch, what its ports send is what others receive, what goes out by an uplink, and what is dropped: an uplink
// that states no tx or no rx takes what is left, and without such an uplink the ports that state none. Of the host's
// time nobody gets more than there is: vcpus and worldlets that ask for more get shares of it, and wait for the rest.
// What else is stated stays, even where it breaks these laws.
#pragma once

#include "interface/types.h"

#include <string>
#include <vector>

struct Entity;
struct Host;

constexpr i64 UNSTATED = -1;

struct PlannedPort {
    Entity *entity;
    const std::string *switchName;  // of the host's texts, so that equal ones are one
    i64 type;
    bool txStated, rxStated, sizeStated;
};

// `entity` has the time that is asked for each of `count` vcpus, or for a worldlet.
struct PlannedRun {
    Entity *entity;
    i64 count;
    i64 pcpu;  // the only one that it runs on; UNSTATED for any
    bool isWorldlet, waitStated;
};

struct PlannedFilter {
    Entity *entity;
    i64 uplink;  // number of the NIC's port
    const std::string *switchName;
};

struct Plan {
    std::vector<PlannedPort> ports;
    std::vector<PlannedRun> runs;
    std::vector<PlannedFilter> filters;
    bool stackTxStated = false, stackRxStated = false;
};

void TrafficSettle(Host *host);
void ScheduleSettle(Host *host);
