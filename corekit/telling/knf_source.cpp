// knf-source: tells what each key of a report is worth on this Linux host, for this user, and what would make it
// better.
#include "corekit/linuxhost/guests/guests.h"
#include "corekit/node_source.h"
#include "corekit/telling/keys.h"

#include <cstdio>
#include <getopt.h>
#include <sys/utsname.h>
#include <unistd.h>

namespace {

constexpr char USAGE[] =
    "Usage: knf-source [--assume FEATURE=ANSWER]... [--page]\n"
    "Tells what this host offers to this user: the kernel's features, the guests that can be seen now, and for each\n"
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

void PrintHost(const ProcRoot &root) {
    utsname names = {};
    uname(&names);
    printf("Linux %s on %s, user %u\n", names.release, names.machine, geteuid());
    if (FeatureAsk(root, FEATURE_PROCESSES) == ANSWER_NO) {
        printf("There is no /proc: nothing of CPUs, guests, threads and the IP stack can be told.\n");
    }
}

void PrintFeatures(const ProcRoot &root) {
    printf("\nWhat the kernel offers to this user\n");
    for (u32 i = 0; i < FEATURES; i++) {
        const Feature &feature = FeatureOf(static_cast<FeatureId>(i));
        Answer answer = FeatureAsk(root, static_cast<FeatureId>(i));
        printf("  %-27s %s\n", feature.name, AnswerText(answer));
        if (answer != ANSWER_YES) {
            printf("    without: %s\n    needs: %s\n", feature.without, feature.cure);
        }
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

void PrintGuests(const ProcRoot &root) {
    Guests guests;
    printf("\nProcesses that hold a tap now\n");
    if (GuestsScan(root, &guests) != FINE) {
        printf("  no list of processes\n");
        return;
    }
    bool withoutVcpus = false;
    for (size_t i = 0; i < guests.guests.size(); i++) {
        PrintGuest(guests, i);
        withoutVcpus = withoutVcpus || guests.guests[i].vcpus.empty();
    }
    printf("  %zu of %u processes; not for this user: %u; holders in another network namespace: %u\n",
           guests.guests.size(), guests.processes, guests.refused, guests.foreign);
    if (withoutVcpus) {
        printf("  Vcpus are told by the names of their threads: start a guest with -name NAME,debug-threads=on\n");
    }
}

// Who may not look at others' processes still sees the guests of his own.
bool OwnAlone(const ProcRoot &root, const KeyRow &row) {
    return row.need == FEATURE_TAP_HOLDERS && FeatureAsk(root, row.need) == ANSWER_NOT_ALLOWED;
}

bool Lacks(const ProcRoot &root, const KeyRow &row) {
    Answer answer = row.need != FEATURES ? FeatureAsk(root, row.need) : ANSWER_YES;
    return (answer == ANSWER_NO || answer == ANSWER_NOT_ALLOWED) && !OwnAlone(root, row);
}

Worth WorthHere(const ProcRoot &root, const KeyRow &row) {
    return Lacks(root, row) ? row.without : row.worth;
}

// Behind a key: how it comes about; for one that is worth less here, what is missing.
std::string TextHere(const ProcRoot &root, const KeyRow &row) {
    if (row.need == FEATURES || FeatureAsk(root, row.need) == ANSWER_YES) {
        return row.how;
    }
    const Feature &feature = FeatureOf(row.need);
    if (OwnAlone(root, row)) {
        return std::string(row.how) + " (guests of this user alone; those of others need " + feature.cure + ")";
    }
    std::string text = std::string(feature.name) + ": " + AnswerText(FeatureAsk(root, row.need));
    return Lacks(root, row) ? text + "; needs " + feature.cure : std::string(row.how) + " (" + text + ")";
}

// One key that can't be read takes its section along.
const KeyRow *MissingKey(const ProcRoot &root, const std::string &section) {
    for (size_t i = 0; i < KEY_ROW_COUNT; i++) {
        if (KeySection(KEY_ROWS[i]) == section && WorthHere(root, KEY_ROWS[i]) == ABSENT) {
            return &KEY_ROWS[i];
        }
    }
    return nullptr;
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

void PrintKeys(const ProcRoot &root) {
    const KeyRow *missing = nullptr;
    printf("\nSections and keys of a report\n");
    EachSection(
        [&](const std::string &section) {
            missing = MissingKey(root, section);
            printf("%s: %s%s\n", section.empty() ? "the record" : section.c_str(),
                   missing != nullptr ? "not there: " : "there",
                   missing != nullptr ? TextHere(root, *missing).c_str() : "");
        },
        [&](const std::string &, const KeyRow &row) {
            if (missing == nullptr) {
                printf("  %-14s %-12s  %s\n", KeyName(row).c_str(), WorthText(WorthHere(root, row)),
                       TextHere(root, row).c_str());
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
        "\n### What the kernel offers\n\n| feature | from | served without it | what brings it |\n|---|---|---|---|\n");
    for (u32 i = 0; i < FEATURES; i++) {
        const Feature &feature = FeatureOf(static_cast<FeatureId>(i));
        printf("| %s | %s | %s | %s |\n", feature.name, feature.version, feature.without, feature.cure);
    }
}

// "FEATURE=ANSWER", both as they are printed. False when one of them is unknown.
bool Assume(const std::string &text) {
    for (u32 id = 0; id < FEATURES; id++) {
        for (Answer answer : {ANSWER_NO, ANSWER_YES, ANSWER_NOT_ALLOWED, ANSWER_CANT_TELL}) {
            auto feature = static_cast<FeatureId>(id);
            if (text == std::string(FeatureOf(feature).name) + "=" + AnswerText(answer)) {
                FeatureForce(feature, answer);
                return true;
            }
        }
    }
    fprintf(stderr, "knf-source: %s: expected FEATURE=ANSWER as knf-source prints them\n", Quoted(text).c_str());
    return false;
}

int Tell(bool page) {
    if (page) {
        PrintPage();
        return fflush(stdout) == 0 ? 0 : 1;
    }
    ProcRoot root;
    ProcRootOpen(&root);
    PrintHost(root);
    PrintFeatures(root);
    PrintGuests(root);
    PrintKeys(root);
    ProcRootClose(&root);
    return fflush(stdout) == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char **argv) {
    const option names[] = {{"assume", required_argument, nullptr, 'a'},
                            {"page", no_argument, nullptr, 'p'},
                            {"help", no_argument, nullptr, 'h'},
                            {nullptr, 0, nullptr, 0}};
    bool page = false;
    for (int letter = 0; (letter = getopt_long(argc, argv, "h", names, nullptr)) != -1;) {
        if (letter == 'a' && !Assume(optarg)) {
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
    return Tell(page);
}
