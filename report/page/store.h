// A series of records as columns in memory, while they stream by: eight figures of every port, the load of the pcpus,
// and for each port all its other figures as one string of small differences, which comes apart again at the end for
// the few ports that the page shows closely. Bounded: details of the least remarkable ports go first, then time is
// kept in buckets with maximum and mean. Owned by the caller; plain memory.
//
// A port is who has its id, whatever its place in the list. Records may come in any order of time.
#pragma once

#include "report/page/series_log.h"
#include "report/rows/rows.h"

#include <string>
#include <unordered_map>
#include <vector>

namespace report {

// The columns of all ports, in the order of the page.
enum PortColumn : size_t { kRxpps, kTxpps, kRxmbps, kTxmbps, kRxeps, kTxeps, kReady, kCstp, kPortColumns };
struct PortColumnText {
    const char *key, *unit;
    int32_t scale;
};
extern const PortColumnText kPortColumnTexts[kPortColumns];
enum PcpuColumn : size_t { kPcpuUsed, kPcpuWdt, kPcpuColumns };

// A further figure of a port: a column of a section, and which element of its list. Ordered as in the report.
struct DetailKey {
    Section section;
    uint8_t column;
    uint16_t element;
    auto operator<=>(const DetailKey &) const = default;
};
std::string DetailName(DetailKey key);  // "vnic.r1full", "vcpu.0.ready"
int32_t DetailScale(DetailKey key);     // 1 or 100

struct HistogramKind {
    std::string name;  // "pktsizein", "vcpu.0.ready"
    int32_t scale;     // of its buckets: shares have decimals, counts have none
    std::vector<std::string> limits;
    bool operator==(const HistogramKind &) const = default;
};

struct StoredPort {
    std::string id, name, switchName, mac;
    bool uplink = false;
    std::string texts;  // key, NUL, value, NUL ...: model, device, ids of vcpus, names of worldlets
    // Of all records so far: what makes a port remarkable.
    double lost = 0, packets = 0;
    int32_t ready = 0;

    bool detailed = true;    // its further figures are being kept
    bool shortened = false;  // they were given up at times
    std::vector<DetailKey> keys;
    SeriesLog details;  // a series a key
    std::vector<HistogramKind> kinds;
    SeriesLog histograms;  // a kind: count, mean, and a series a bucket
};

// A record, or a bucket of them. Cells of a port that was unknown then are not there.
struct StoredRecord {
    int64_t time = 0;
    std::vector<int32_t> ports;  // kPortColumns a port
    std::vector<int32_t> pcpus;  // kPcpuColumns a pcpu
    // Buckets: `ports` and `pcpus` are the largest values, these the means.
    std::vector<int32_t> portMeans, pcpuMeans;
};

// Exact sums of the bucket that is being filled: means of means would lose a little with each record.
struct CellSums {
    std::vector<int64_t> sums;
    std::vector<uint32_t> counts;
};

struct StoreOptions {
    size_t details = 200;            // ports that the page shows closely, at most
    size_t detailBytes = 28u << 20;  // for all logs of ports
    size_t cells = 10'000'000;       // values of `ports`, before time is kept in buckets
    bool counts = false;             // what the report counted over an interval is kept by second
};

struct Store {
    StoreOptions options;
    std::vector<StoredPort> ports;  // in order of appearance
    std::unordered_map<std::string, uint32_t> places;
    std::vector<StoredRecord> records;
    size_t every = 1;     // records of the report in a stored one
    size_t inBucket = 0;  // of the last stored one
    CellSums portSums, pcpuSums;
    uint64_t added = 0;      // records of the report
    uint64_t tooLarge = 0;   // values that no column can hold
    uint64_t backward = 0;   // records with a time before that of the one ahead of them
    int64_t interval = 0;    // of the last record
    int64_t lastTime = 0;    // of the last record
    double seconds = 1;      // that counts are divided by; 1: they are rates
    size_t detailBytes = 0;  // held
    bool detailsLost = false;

    std::vector<uint32_t> portOfPlace;  // of the last record; kNoPlace: a port that no record told yet
    std::vector<bool> histogramPlaces;  // whose histograms the next record shall tell: for Rows::histogramsOf
};

constexpr uint32_t kStoreWanted = Wanted(Section::Ports) | Wanted(Section::Vnic) | Wanted(Section::Physnic) |
                                  Wanted(Section::Txqueue) | Wanted(Section::Rxqueue) | Wanted(Section::Intr) |
                                  Wanted(Section::Vcpu) | Wanted(Section::Wdt) | Wanted(Section::Pcpu) |
                                  Wanted(Section::Histograms) | Wanted(Section::Hoststack);

void StoreAdd(Store *store, const Rows &rows);
// Ports by what makes them remarkable: packets lost, then the worst ready, then packets.
std::vector<uint32_t> StoreRanked(const Store &store);
// Joins stored records by twos or more, each with maximum and mean.
void StoreFold(Store *store, size_t count);
// Sorts records by time; true when they were not in order. Details go by the order of coming: order[n] is the place
// of the nth record that came.
bool StoreSort(Store *store, std::vector<uint32_t> *order);

// Series of a log, one behind the other, each over all stored records in the order of StoreSort.
std::vector<int32_t> StoreSeries(const Store &store, const SeriesLog &log, const std::vector<uint32_t> &order);

}  // namespace report
