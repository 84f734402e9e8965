// The sections of a record as tables: which columns each has, in the order of the report, and where their values stand
// in it. One table for all commands: a flat row, a finding and a plot name a figure by the same key.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace report {

enum class Section : uint8_t {
    Ports,       // one row a port: client counters; a port that is {} has a row without values
    Vnic,        // one row a virtual NIC: coalesce.*, txwdt.*, vnic.*
    Physnic,     // one row an uplink: physnic.*
    Txqueue,     // one row a transmit queue; one without a queue when the NIC has none
    Rxqueue,     // one row a receive queue, likewise
    Intr,        // one row an uplink: intr.*
    Vcpu,        // one row a vcpu and port
    Wdt,         // one row a worldlet and port
    Pcpu,        // one row a physical CPU, and one for the sum
    Histograms,  // one row a bucket, of ports and of vcpus
    Hoststack,   // one row a port that has them, the first of its kind: ipv4.* ipv6.* tcptx.* tcprx.* udp.*
    Overhead,    // one row a record
};
constexpr size_t kSections = 12;

enum class Kind : uint8_t {
    Number,  // as the report wrote it, never rounded
    Id,      // up to 64 bits: a text where JSON readers round
    Text,
};

struct Column {
    const char *key;   // "rxpps", "vnic.r1full", "vcpu.ready": its path in the record or port; unique in its section
    const char *unit;  // "packets/s", "%", ...; empty where there is none
    const char *meaning;
    Kind kind;
};

// What stands ahead of the columns of each section: time, host, interval, iteration; with a port also switch, name, id.
enum class Lead : uint8_t { Time, Host, Interval, Iteration, Switch, Name, Id };
constexpr size_t kLeads = 7;
constexpr size_t kMostColumns = 64;  // no section has more

std::string_view SectionName(Section section);  // "ports", "vnic", ...
// The section of a name; false when there is none of that name.
bool SectionFind(std::string_view name, Section *section);
// Whether its rows belong to ports.
bool SectionHasPorts(Section section);
std::span<const Column> LeadColumns(Section section);
std::span<const Column> SectionColumns(Section section);
// Place of a key among the columns of its section; -1 when there is none.
int ColumnFind(Section section, std::string_view key);
// As ColumnFind, and the part behind the last point will do where only one column of the section ends with it:
// "ready" of vcpu is "vcpu.ready".
int ColumnGuess(Section section, std::string_view key);

}  // namespace report
