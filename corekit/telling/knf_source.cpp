// knf-source: tells what each key of a report is worth on this Linux host, for this user, and what would make it
// better.
#include "corekit/linuxhost/source.h"
#include "corekit/node_source.h"
#include "corekit/telling/keys.h"

#include <algorithm>
#include <cstdio>
#include <getopt.h>
#include <sys/utsname.h>
#include <unistd.h>

namespace {

constexpr char USAGE[] =
    "Usage: knf-source [--assume FEATURE=ANSWER]... [--page]\n"
    "Tells what this host offers to this user: features, the NICs and guests that can be seen now, and for each\n"
    "section and key of a report whether it is exact, close, zero by nature, not measured (shown as 0) or never there.\n"
    "Nothing on the host is changed.\n"
    "  --assume FEATURE=ANSWER  take \"yes\", \"no\", \"not allowed\" or \"can't tell\" for the kernel's answer: what another\n"
    "                           kernel or user would get\n"
    "  --page  print the tables of all keys as Markdown, for any host\n"
    "  -h      this message\n";

// Bytes that others chose, safe for a terminal.
std::string Quoted(const std::string &name) {
    std::string text;
    ParamAppendText(&text, ParamOf(name));
    return text;
}

// What the host told, and what the user wants taken for its answers.
struct Told {
    HostTold host{};
    bool assumed[FEATURES] = {};
    Answer assumption[FEATURES] = {};
};

Answer AnswerOf(const Told &told, u32 id) {
    return told.assumed[id] ? told.assumption[id] : told.host.answers[id];
}

void PrintHost(const Told &told) {
    utsname names = {};
    uname(&names);
    printf("Linux %s on %s, user %u\n", names.release, names.machine, geteuid());
    if (AnswerOf(told, FEATURE_PROCESSES) == ANSWER_NO) {
        printf("There is no /proc: nothing of CPUs, guests, threads and the IP stack can be told.\n");
    }
}

void PrintFeatures(const Told &told) {
    printf("\nWhat the host offers to this user\n");
    for (u32 i = 0; i < FEATURES; i++) {
        const Feature &feature = FeatureOf(static_cast<FeatureId>(i));
        Answer answer = AnswerOf(told, i);
        printf("  %-27s %s\n", feature.name, AnswerText(answer));
        if (answer != ANSWER_YES) {
            printf("    without: %s\n    needs: %s\n", feature.without, feature.cure);
        }
    }
}

void PrintNics(const std::vector<NicTold> &nics) {
    constexpr const char *SOURCES[] = {"the NIC's own", "the driver's", "of queue disciplines"};
    printf("\nNICs now\n%s", nics.empty() ? "  none\n" : "");
    for (const NicTold &nic : nics) {
        printf("  %s: ", Quoted(nic.name).c_str());
        if (nic.count.transmit != 0) {
            printf("transmit queues: %u, counters %s; ", nic.count.transmit, SOURCES[nic.source]);
        } else {
            printf("transmit queues: several that nobody counts, shown as 0; ");
        }
        printf("receive queues: %u%s\n", nic.count.receive, nic.counted ? "" : "; one of each taken for granted");
    }
}

void PrintGuest(const Guests &guests, size_t which) {
    const Guest &guest = guests.guests[which];
    printf("  %u %s: %zu vcpus, %zu vhost threads;", guest.pid,
           guest.name.empty() ? "without a name" : Quoted(guest.name).c_str(), guest.vcpus.size(), guest.vhost.size());
    for (const HeldTap &tap : guests.taps) {
        if (tap.guest == which) {
            printf(" %s", tap.index != 0 ? ("macvtap " + std::to_string(tap.index)).c_str() : Quoted(tap.name).c_str());
        }
    }
    printf("\n");
}

void PrintGuests(const Guests &guests) {
    printf("\nProcesses that hold a tap now\n");
    bool withoutVcpus = false;
    for (size_t i = 0; i < guests.guests.size(); i++) {
        PrintGuest(guests, i);
        withoutVcpus = withoutVcpus || guests.guests[i].vcpus.empty();
    }
    auto many = std::count_if(guests.taps.begin(), guests.taps.end(), [](auto &tap) { return tap.guest == NO_GUEST; });
    if (many != 0) {
        printf("  taps that several guests hold, named after none of them: %zd\n", many);
    }
    printf("  %zu of %u processes; not for this user: %u; holders of taps of other network namespaces: %u\n",
           guests.guests.size(), guests.processes, guests.refused, guests.foreign);
    if (guests.hidden) {
        printf("  Processes of other users are hidden from this one, and so are their guests (hidepid)\n");
    }
    if (withoutVcpus) {
        printf("  Vcpus are told by the names of their threads: start a guest with -name NAME,debug-threads=on\n");
    }
}

// Who may not look at others' processes still sees the guests of his own.
bool OwnAlone(const Told &told, const KeyRow &row) {
    return row.need == FEATURE_TAP_HOLDERS && AnswerOf(told, row.need) == ANSWER_NOT_ALLOWED;
}

bool Lacks(const Told &told, const KeyRow &row) {
    Answer answer = row.need != FEATURES ? AnswerOf(told, row.need) : ANSWER_YES;
    return (answer == ANSWER_NO || answer == ANSWER_NOT_ALLOWED) && !OwnAlone(told, row);
}

Worth WorthHere(const Told &told, const KeyRow &row) {
    return Lacks(told, row) ? row.without : row.worth;
}

// Behind a key: how it comes about; for one that is worth less here, what is missing.
std::string TextHere(const Told &told, const KeyRow &row) {
    if (row.need == FEATURES || AnswerOf(told, row.need) == ANSWER_YES) {
        return row.how;
    }
    const Feature &feature = FeatureOf(row.need);
    if (OwnAlone(told, row)) {
        return std::string(row.how) + " (guests of this user alone; those of others need " + feature.cure + ")";
    }
    std::string text = std::string(feature.name) + ": " + AnswerText(AnswerOf(told, row.need));
    return Lacks(told, row) ? text + "; needs " + feature.cure : std::string(row.how) + " (" + text + ")";
}

// A key of queues is worth something for each NIC.
bool OfNics(const Told &told, const KeyRow &row) {
    return FeatureOfNics(row.need) && !told.assumed[row.need] && !told.host.nics.empty();
}

Worth WorthOfNic(const NicTold &nic, const KeyRow &row) {
    constexpr Worth WORTHS[] = {UNMEASURED, CLOSE, EXACT};
    bool uncounted = std::string_view(row.path) == "ports.txqueue.count" && nic.count.transmit == 0;
    return uncounted ? UNMEASURED : WORTHS[NicServed(nic, row.need)];
}

// "exact: eth0, eth1; close: eth2", and the worth that all of them have, if they do.
std::string TextOfNics(const Told &told, const KeyRow &row, const char **all) {
    std::string text;
    bool lacks = false;
    for (Worth worth : {EXACT, CLOSE, UNMEASURED}) {
        std::string names;
        for (const NicTold &nic : told.host.nics) {
            names += WorthOfNic(nic, row) != worth ? "" : (names.empty() ? "" : ", ") + Quoted(nic.name);
        }
        if (!names.empty()) {
            *all = text.empty() ? WorthText(worth) : "by NIC";
            text += (text.empty() ? "" : "; ") + std::string(WorthText(worth)) + ": " + names;
            lacks = worth != EXACT;
        }
    }
    return text + (lacks ? std::string("; needs ") + FeatureOf(row.need).cure : "");
}

// One key that can't be read takes its section along.
const KeyRow *MissingKey(const Told &told, const std::string &section) {
    for (size_t i = 0; i < KEY_ROW_COUNT; i++) {
        if (KeySection(KEY_ROWS[i]) == section && WorthHere(told, KEY_ROWS[i]) == ABSENT) {
            return &KEY_ROWS[i];
        }
    }
    return nullptr;
}

// Why a section that this host can serve stands in no report now; null when it does. Sections stand where there is
// what they are about.
const char *NoneNow(const HostTold &host, const std::string &section) {
    auto isOne = [&](std::initializer_list<const char *> sections) {
        return std::find(sections.begin(), sections.end(), section) != sections.end();
    };
    if (isOne({"ports.physnic", "ports.txqueue", "ports.rxqueue"})) {
        return host.nics.empty() ? "no NIC" : nullptr;
    }
    if (isOne({"ports.ipv4", "ports.ipv6", "ports.tcptx", "ports.tcprx", "ports.udp"})) {
        return host.stacks == 0 ? "no bridge with an address whose counters of the IP stack can be read" : nullptr;
    }
    if (section == "ports.intr") {
        return host.vectors == 0 ? "no NIC with interrupt vectors of its own" : nullptr;
    }
    if (section == "ports.wdt") {
        return host.worldlets == 0 ? "no thread of a NIC, no vhost worker of a guest with vcpus" : nullptr;
    }
    if (isOne({"ports.vcpu", "ports.vcpu.histos"})) {
        bool any = std::any_of(host.guests.guests.begin(), host.guests.guests.end(),
                               [](const Guest &guest) { return !guest.vcpus.empty(); });
        return any ? nullptr : "no guest with vcpus that this user may look at";
    }
    return isOne({"ports", "ports.histos"}) && host.ports == 0 ? "no interface but the hidden one" : nullptr;
}

// The key without its section.
std::string KeyName(const KeyRow &row) {
    size_t start = KeySection(row).size();
    return std::string(row.path).substr(start == 0 ? 0 : start + 1);
}

// Calls `begin` with each section and `each` with its keys. Keys of a section stand together in the table.
template <typename Begin, typename Each>
void EachSection(Begin begin, Each each) {
    std::string section = "none yet";
    for (size_t i = 0; i < KEY_ROW_COUNT; i++) {
        if (std::string next = KeySection(KEY_ROWS[i]); next != section) {
            section = next;
            begin(section);
        }
        each(section, KEY_ROWS[i]);
    }
}

void PrintSection(const Told &told, const std::string &section, const KeyRow *missing) {
    const char *none = NoneNow(told.host, section);
    const char *state = missing != nullptr ? "not there: " : none != nullptr ? "none now: " : "there";
    std::string reason = missing != nullptr ? TextHere(told, *missing) : none != nullptr ? none : "";
    printf("%s: %s%s\n", section.empty() ? "the record" : section.c_str(), state, reason.c_str());
}

void PrintKey(const Told &told, const KeyRow &row) {
    const char *worth = WorthText(WorthHere(told, row));
    std::string nics = OfNics(told, row) ? TextOfNics(told, row, &worth) : "";
    std::string text = nics.empty() ? TextHere(told, row) : std::string(row.how) + " (" + nics + ")";
    printf("  %-14s %-12s  %s\n", KeyName(row).c_str(), worth, text.c_str());
}

void PrintKeys(const Told &told) {
    const KeyRow *missing = nullptr;
    printf("\nSections and keys of a report\n");
    EachSection(
        [&](const std::string &section) {
            missing = MissingKey(told, section);
            PrintSection(told, section, missing);
        },
        [&](const std::string &, const KeyRow &row) {
            if (missing == nullptr) {
                PrintKey(told, row);
            }
        });
}

void PrintPage() {
    EachSection(
        [&](const std::string &section) {
            printf("\n### %s\n\n| key | worth | how | otherwise |\n|---|---|---|---|\n",
                   section.empty() ? "the record" : section.c_str());
        },
        [&](const std::string &, const KeyRow &row) {
            std::string otherwise = row.need == FEATURES ? ""
                                                         : std::string(WorthText(row.without)) + " without \"" +
                                                               FeatureOf(row.need).name + "\"";
            std::string key = KeyName(row);
            printf("| %s | %s | %s | %s |\n", key == "*" ? "all" : ("`" + key + "`").c_str(), WorthText(row.worth),
                   row.how, otherwise.c_str());
        });
    printf(
        "\n### What the host offers\n\n| feature | from | served without it | what brings it |\n|---|---|---|---|\n");
    for (u32 i = 0; i < FEATURES; i++) {
        const Feature &feature = FeatureOf(static_cast<FeatureId>(i));
        printf("| %s | %s | %s | %s |\n", feature.name, feature.version, feature.without, feature.cure);
    }
}

// "FEATURE=ANSWER", both as they are printed. False when one of them is unknown.
bool Assume(const std::string &text, Told *told) {
    for (u32 id = 0; id < FEATURES; id++) {
        for (Answer answer : {ANSWER_NO, ANSWER_YES, ANSWER_NOT_ALLOWED, ANSWER_CANT_TELL}) {
            if (text == std::string(FeatureOf(static_cast<FeatureId>(id)).name) + "=" + AnswerText(answer)) {
                told->assumed[id] = true;
                told->assumption[id] = answer;
                return true;
            }
        }
    }
    fprintf(stderr, "knf-source: %s: expected FEATURE=ANSWER as knf-source prints them\n", Quoted(text).c_str());
    return false;
}

void PrintTold(Told *told) {
    LinuxHost *host = LinuxHostOpen();
    FeaturesAsk(host, &told->host);
    LinuxHostClose(host);
    PrintHost(*told);
    PrintFeatures(*told);
    PrintNics(told->host.nics);
    PrintGuests(told->host.guests);
    PrintKeys(*told);
}

}  // namespace

int main(int argc, char **argv) {
    const option names[] = {{"assume", required_argument, nullptr, 'a'},
                            {"page", no_argument, nullptr, 'p'},
                            {"help", no_argument, nullptr, 'h'},
                            {nullptr, 0, nullptr, 0}};
    bool page = false;
    Told told;
    for (int letter = 0; (letter = getopt_long(argc, argv, "h", names, nullptr)) != -1;) {
        if (letter == 'a' && !Assume(optarg, &told)) {
            return 1;
        }
        if (letter != 'a' && letter != 'p') {
            fputs(USAGE, letter == 'h' ? stdout : stderr);
            return letter == 'h' ? 0 : 1;
        }
        page = page || letter == 'p';
    }
    if (optind != argc) {
        fputs(USAGE, stderr);
        return 1;
    }
    if (page) {
        PrintPage();
    } else {
        PrintTold(&told);
    }
    return fflush(stdout) == 0 ? 0 : 1;
}
