#include "corekit/simulated/host.h"

#include <algorithm>
#include <array>
#include <cstring>
#include <sys/time.h>
#include <utility>

namespace {

constexpr i64 SECOND = 1000000;
constexpr size_t NOISE_SPAN = 4096;

const std::array<char, 2 * NOISE_SPAN> &Noise() {
    static const auto noise = [] {
        std::array<char, 2 * NOISE_SPAN> bytes;
        for (size_t i = 0; i < bytes.size(); i++) {
            bytes[i] = static_cast<char>(Hashed(i) % 255 + 1);
        }
        return bytes;
    }();
    return noise;
}

void AppendKey(std::string *key, i64 number) {
    *key += 'i';
    key->append(reinterpret_cast<const char *>(&number), sizeof number);
}

void AppendKey(std::string *key, const std::string &text) {
    *key += 's';
    key->append(text.c_str(), text.size() + 1);
}

void StartKey(std::string *key, u32 node) {
    key->assign(reinterpret_cast<const char *>(&node), sizeof node);
}

void AppendKeys(std::string *key, const Params &keys) {
    for (const KnfParamRec &param : keys) {
        param.isText ? AppendKey(key, param.text) : AppendKey(key, static_cast<i64>(param.number));
    }
}

// The key of a look-up, in a buffer that is used again each time. Never destroyed: reads may still come while the
// process ends.
std::string_view LookUpKey(u32 node, const Params &keys) {
    static auto *key = new std::string;
    StartKey(key, node);
    AppendKeys(key, keys);
    return *key;
}

u32 SeedOf(std::string_view key) {
    u64 seed = key.size();
    for (u64 word = 0; !key.empty(); key.remove_prefix(std::min(key.size(), sizeof word)), word = 0) {
        memcpy(&word, key.data(), std::min(key.size(), sizeof word));
        seed = Hashed(seed ^ word);
    }
    return static_cast<u32>(seed);
}

// rate x elapsed, exact, cut towards zero.
u64 Moved(i64 rate, i64 elapsed) {
    return static_cast<u64>(static_cast<__int128>(rate) * elapsed / SECOND);
}

void Store(char *record, u32 offset, u32 width, u64 value) {
    memcpy(record + offset, &value, width);
}

struct Moment {
    i64 clock;    // of the host's time of day
    i64 elapsed;  // since the host was loaded
    i64 started;  // the clock when the host was started
    Work life;    // since then
};

Moment Now(const Host &host) {
    i64 clock = HostClock();
    i64 started = host.loadedAt - host.age;
    return {clock, clock - host.loadedAt, started, WorkOf(clock - started)};
}

i64 Micros(const Work &work) {
    return work.seconds * SECOND + work.micros;
}

// rate x work of all parts of the entity, whole, from a fraction of a count on.
u64 Count(const Entity &entity, Slot slot, const Moment &now) {
    u64 count = 0;
    u32 phase = (entity.phase + slot) * 2654435761U;
    i64 rest = static_cast<i64>(u64{phase} * SECOND >> 32);
    for (const Entity *part = &entity; part != nullptr; part = part->more) {
        i64 rate = part->value[slot];
        const Work &work = part->load == nullptr ? now.life : LoadWork(part->load, now.started, now.clock);
        i64 micros = rate * work.micros + rest;
        count += static_cast<u64>(rate) * static_cast<u64>(work.seconds) + static_cast<u64>(micros / SECOND);
        rest = micros % SECOND;
    }
    return rest < 0 ? count - 1 : count;
}

i64 Collected(const Tracker &tracker, i64 now) {
    u64 since = tracker.running ? static_cast<u64>(now) - static_cast<u64>(tracker.since) : 0;
    return static_cast<i64>(static_cast<u64>(tracker.collected) + since);
}

u64 Counted(const Instance &instance, Slot slot, const Moment &now) {
    const Tracker *tracker = instance.tracker;
    if (tracker == nullptr) {
        return Count(*instance.entity, slot, now);
    }
    if (tracker->ofPort) {
        u64 count = tracker->running ? Count(*instance.entity, slot, now) : 0;
        return static_cast<u64>(Collected(*tracker, static_cast<i64>(count)));
    }
    // Of vcpus, periods at full load.
    Work work = WorkOf(Collected(*tracker, Micros(now.life)));
    i64 rate = instance.entity->value[slot];
    return static_cast<u64>(rate * work.seconds + rate * work.micros / SECOND) / instance.kind->grain;
}

u64 Share(u64 count, i64 factor, i64 divisor, i64 from) {
    if (divisor == 1) {
        return count * static_cast<u64>(factor);
    }
    auto of = static_cast<u64>(divisor);
    auto begun = static_cast<i64>(count % of) - from;
    return count / of * static_cast<u64>(factor) + static_cast<u64>(std::clamp<i64>(begun, 0, factor));
}

void FillFields(const Instance &instance, const Moment &now, char *record) {
    const Entity &entity = *instance.entity;
    Slot counted = SLOTS;
    u64 count = 0;
    u64 total = 0;
    for (const Field &field : instance.kind->fields) {
        i64 slot = entity.value[field.slot];
        u64 value = 0;
        if (field.motion <= QUEUED && field.slot != counted) {
            counted = field.slot;
            count = Counted(instance, counted, now);
        }
        switch (field.motion) {
        case COUNT:
            value = Share(count, field.factor, field.divisor, field.from) * static_cast<u64>(entity.value[field.times]);
            total += value;
            break;
        case QUEUED:
            value = Share(count, entity.value[SHARE], entity.value[SHARE_OF], entity.value[SHARE_FROM]);
            break;
        case SOME:
            value = count > 0 ? static_cast<u64>(slot * field.factor / field.divisor) : 0;
            break;
        case LEVEL:
            value = static_cast<u64>(slot * field.factor / field.divisor);
            break;
        case TOTAL:
            value = total;
            break;
        case LIFETIME:
            value = static_cast<u64>(Micros(now.life));
            break;
        case SECONDS:
            value = static_cast<u64>(now.clock / SECOND);
            break;
        case NANOSECONDS:
            value = static_cast<u64>(now.clock % SECOND * 1000);
            break;
        }
        Store(record, field.at.offset, field.at.width, value);
    }
}

void FillTexts(const Instance &instance, char *record) {
    for (const TextField &field : instance.kind->texts) {
        const std::string *text = instance.entity->text[field.slot];
        size_t length = text != nullptr ? std::min<size_t>(text->size(), field.at.width - 1) : 0;
        if (length > 0) {
            text->copy(record + field.at.offset, length);
        }
        record[field.at.offset + length] = 0;
    }
}

void ApplyPatch(const Patch &patch, i64 elapsed, char *record) {
    if (patch.courses.empty()) {
        std::copy(patch.bytes.begin(), patch.bytes.end(), record + patch.offset);
        return;
    }
    const Patch::Course *course = &patch.courses[0];
    for (const Patch::Course &next : patch.courses) {
        course = next.from <= elapsed ? &next : course;
    }
    Store(record, patch.offset, patch.width, course->start + Moved(course->rate, elapsed - course->from));
}

KnfStatus Get(void *context, u32 node, const Params &keys, void *buffer, u32 size) {
    const Host &host = *static_cast<const Host *>(context);
    auto found = host.instances.find(LookUpKey(node, keys));
    if (found == host.instances.end()) {
        return STATUS_NOT_FOUND;
    }
    const Instance &instance = found->second;
    if (instance.size != size) {
        return STATUS_BAD_SIZE;
    }
    Moment now = Now(host);
    char *record = static_cast<char *>(buffer);
    const char *noise = Noise().data() + Hashed(instance.seed ^ static_cast<u64>(now.elapsed)) % NOISE_SPAN;
    for (u32 done = 0; done < size; done += NOISE_SPAN) {
        memcpy(record + done, noise, std::min<size_t>(size - done, NOISE_SPAN));
    }
    if (instance.kind != nullptr) {
        FillFields(instance, now, record);
        FillTexts(instance, record);
    }
    if (instance.patches != nullptr) {
        for (const Patch &patch : *instance.patches) {
            ApplyPatch(patch, now.elapsed, record);
        }
    }
    return STATUS_OK;
}

KnfStatus List(void *context, u32 node, const Params &keys, Params *entries) {
    const Host &host = *static_cast<const Host *>(context);
    auto found = host.lists.find(LookUpKey(node, keys));
    if (found == host.lists.end()) {
        return STATUS_NOT_FOUND;
    }
    *entries = found->second;
    auto courses = host.courses.find(found->first);
    if (courses != host.courses.end()) {
        i64 elapsed = Now(host).elapsed;
        for (const ListCourse &course : courses->second) {
            *entries = course.from <= elapsed ? course.entries : *entries;
        }
    }
    return STATUS_OK;
}

// A histogram that is started again goes on; a reset keeps it running or stopped.
void Track(Tracker *tracker, i64 now, bool running, bool reset) {
    tracker->collected = reset ? 0 : Collected(*tracker, now);
    tracker->since = now;
    tracker->running = running;
}

KnfStatus SetTrackHistos(Host *host, const Params &input, void *result, u32 size) {
    if (input.size() != 1 || input[0].isText || (input[0].number != 0 && input[0].number != 1)) {
        return STATUS_BAD_PARAM;
    }
    if (result != nullptr) {
        memset(result, 0, size);
    }
    Track(&host->vcpuHistos, Micros(Now(*host).life), input[0].number != 0, false);
    host->trackOption->text[NAME] = HostText(host, std::to_string(input[0].number));
    return STATUS_OK;
}

KnfStatus SetPortHistogram(Host *host, const HistogramNodes &nodes, const Params &keys, const Params &input) {
    if (input.size() != 2 || (input[1].text != "input" && input[1].text != "output")) {
        return STATUS_BAD_PARAM;
    }
    auto found = host->instances.find(LookUpKey(input[1].text == "input" ? nodes.input : nodes.output, keys));
    if (found == host->instances.end() || found->second.tracker == nullptr) {
        return STATUS_NOT_FOUND;
    }
    Tracker *tracker = found->second.tracker;
    const std::string &operation = input[0].text;
    if (operation != "start" && operation != "reset" && operation != "stop") {
        return STATUS_BAD_PARAM;
    }
    bool running = operation == "start" || (operation == "reset" && tracker->running);
    u64 count = Count(*found->second.entity, found->second.kind->fields[0].slot, Now(*host));
    Track(tracker, static_cast<i64>(count), running, operation == "reset");
    return STATUS_OK;
}

KnfStatus Set(void *context, u32 node, const Params &keys, const Params &input, void *result, u32 size) {
    Host *host = static_cast<Host *>(context);
    if (node == NODE_CONFIG_OPTION_SET && keys.size() == 2 && keys[0].text == "Cpu" && keys[1].text == "TrackHistos") {
        return SetTrackHistos(host, input, result, size);
    }
    for (const HistogramNodes &nodes : HISTOGRAM_NODES) {
        if (nodes.control == node) {
            return SetPortHistogram(host, nodes, keys, input);
        }
    }
    return STATUS_NOT_WRITABLE;
}

const char *Signature(void *context) {
    return static_cast<const Host *>(context)->signature.c_str();
}

}  // namespace

i64 HostClock() {
    timeval now;
    gettimeofday(&now, nullptr);
    return static_cast<i64>(now.tv_sec) * SECOND + static_cast<i64>(now.tv_usec);
}

std::string HostKey(u32 node, const Params &keys) {
    std::string key;
    StartKey(&key, node);
    AppendKeys(&key, keys);
    return key;
}

std::string HostKey(u32 node) {
    return HostKey(node, Params());
}

std::string HostKey(u32 node, i64 first) {
    std::string key = HostKey(node);
    AppendKey(&key, first);
    return key;
}

std::string HostKey(u32 node, const std::string &first) {
    std::string key = HostKey(node);
    AppendKey(&key, first);
    return key;
}

std::string HostKey(u32 node, const std::string &first, i64 second) {
    std::string key = HostKey(node, first);
    AppendKey(&key, second);
    return key;
}

const std::string *HostText(Host *host, const std::string &text) {
    return &*host->texts.insert(text).first;
}

LoadCurve *HostLoad(Host *host, LoadKind kind, u64 seed) {
    return kind == LoadKind::CONSTANT ? nullptr
                                      : &host->loads.try_emplace({kind, seed}, LoadCurve{kind, seed}).first->second;
}

void HostAdd(Host *host, std::string key, const RecordKind *kind, const Entity *entity, Tracker *tracker) {
    u32 seed = SeedOf(key);
    host->instances.insert_or_assign(std::move(key),
                                     Instance{kind, entity, tracker, NodeRecordSize(kind->node), seed, nullptr});
}

void HostAddNoise(Host *host, std::string key, u32 size) {
    u32 seed = SeedOf(key);
    host->instances.insert_or_assign(std::move(key), Instance{nullptr, nullptr, nullptr, size, seed, nullptr});
}

NodeSource HostSource(Host *host) {
    return {host, Get, List, Set, Signature};
}
