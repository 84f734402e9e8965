// The data of a page: the manifest in JSON, and blocks of numbers that stand in elements of their own. Texts are as
// large as the page and live until it is written.
#pragma once

#include "report/page/store.h"
#include "report/summary/findings.h"

namespace report {

// What a page is made of.
struct PageSource {
    Store *store;
    const Findings *findings;  // ranked
    std::string host;
    std::vector<std::string> notes;  // what was mended or left out, for the head
};

// What of it goes into the page.
struct PagePlan {
    std::vector<uint32_t> order;   // of StoreSort
    std::vector<double> times;     // ascending, those of one second spread in it
    double step = 0;               // median distance
    std::vector<uint32_t> ports;   // of the store, ascending
    std::vector<uint32_t> detail;  // of the store, the most remarkable first
    std::vector<size_t> columns;   // of PortColumn
    bool compress = true;
    size_t limit = 0;  // bytes of manifest and blocks
};

struct Block {
    std::string id, text;
};

struct Manifest {
    std::string json;
    std::vector<Block> blocks;
    size_t bytes = 0;     // of both
    size_t detailed = 0;  // ports that have their details
};

// The span that a record speaks for.
double PlanSeconds(const PagePlan &plan, size_t record);
void PlanTimes(const Store &store, PagePlan *plan);

// Without details when there is no room for them, with those of as many ports as there is room for.
void ManifestMake(const PageSource &source, const PagePlan &plan, Manifest *manifest);

}  // namespace report
