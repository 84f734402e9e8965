// What this kernel offers to this user, by asking it, never by its version: distributions carry features back. One
// table serves the source, the telling command and the manual. A question costs up to 100 us, is asked once a process
// and changes nothing on the host.
#pragma once

#include "corekit/linuxhost/file.h"

enum Answer : u8 { ANSWER_NO, ANSWER_YES, ANSWER_NOT_ALLOWED, ANSWER_CANT_TELL };

enum FeatureId : u32 {
    FEATURE_PROCESSES,       // other users' processes show in /proc
    FEATURE_TAP_HOLDERS,     // descriptors of other users' processes can be looked at
    FEATURE_SCHEDSTAT,       // threads tell their times
    FEATURE_MIGRATIONS,      // migrations of threads are told, in text or by an event
    FEATURE_PERF,            // a perf event counts migrations of others' threads
    FEATURE_REMOTE_WAKEUPS,  // kernel.sched_schedstats is on
    FEATURE_ONE_CACHE,       // all CPUs share one last-level cache
    FEATURE_LINK_COUNTERS,   // RTM_GETSTATS
    FEATURE_QUEUES,          // netdev family: queues of a NIC
    FEATURE_QUEUE_COUNTERS,  // netdev family: counters of a queue
    FEATURE_TCP_SOCKETS,     // sock_diag of TCP, with notices of destroyed sockets
    FEATURE_IPV6,            // counters of IPv6
    FEATURES
};

struct Feature {
    const char *name;
    const char *version;  // the mainline kernel that first has it, for people; empty for what has long been there or is
                          // no matter of version
    Answer (*ask)(const ProcRoot &root);
    const char *without;  // what is served without it
    const char *cure;     // what would bring it
};

const Feature &FeatureOf(FeatureId id);
Answer FeatureAsk(const ProcRoot &root, FeatureId id);
// From now on this is the answer, whatever the kernel says.
void FeatureForce(FeatureId id, Answer answer);
const char *AnswerText(Answer answer);  // "yes", "no", "not allowed", "can't tell"
