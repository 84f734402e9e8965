#include "corekit/simulated/description.h"

#include "corekit/simulated/host_nodes.h"

#include <algorithm>
#include <utility>

namespace {

constexpr i64 MAX_RECORD = 1 << 20;
constexpr i64 DEFAULT_UPTIME = 7384;     // seconds; two hours, three minutes and four seconds
constexpr i64 MAX_REPEATS = 1000000;     // lines that all count= of a description stand for
constexpr size_t MAX_ENTRIES = 1000000;  // records and instance lists of a host

// Shares of one and the same time.
void RequireShares(Line *line, const char *names, i64 sum, i64 most) {
    if (sum > most) {
        Fail(line,
             std::string(names) + ": " + std::to_string(sum) + " per mille, expected at most " + std::to_string(most));
    }
}

void RequireNew(Line *line, bool exists, const std::string &what) {
    if (exists) {
        Fail(line, what + " is there already: expected one that no line above has");
    }
}

// A number that follows from the whole host where the line leaves it out.
std::optional<i64> TakeStated(Line *line, const char *key, i64 low, i64 high) {
    bool stated = std::any_of(line->words.begin(), line->words.end(), [key](const Word &w) { return w.key == key; });
    i64 number = TakeNumber(line, key, low, low, high);
    return stated ? std::optional<i64>(number) : std::nullopt;
}

// constant, wave, burst or burst:SEED; null is constant.
LoadCurve *TakeLoad(Line *line, LoadCurve *fallback) {
    std::optional<Word> word = Take(line, "load");
    if (!word) {
        return fallback;
    }
    std::string kind = word->text.substr(0, word->text.find(':'));
    i64 seed = kind == "burst" && kind != word->text
                   ? CheckNumber(line, "load=burst:", word->text.substr(kind.size() + 1), 0, MAX_LOAD_SEED)
                   : 0;
    if (kind == "burst") {
        return HostLoad(line->host, LoadKind::BURST, static_cast<u64>(seed));
    }
    if (word->text != "constant" && word->text != "wave") {
        Fail(line, "load= " + Quoted(word->text) + ": expected constant, wave, burst or burst:SEED");
    }
    return HostLoad(line->host, kind == "wave" ? LoadKind::WAVE : LoadKind::CONSTANT, 0);
}

void ApplyHost(Line *line) {
    HostSpec spec;
    spec.name = TakeText(line, "name", "host");
    spec.pcpus = TakeNumber(line, "pcpus", 8, 0, 65536);
    spec.packages = TakeNumber(line, "packages", 2, 0, 65536);
    spec.cores = TakeNumber(line, "cores", 4, 0, 65536);
    spec.llc = TakeNumber(line, "llc", 2, 0, MAX_ID);
    spec.uptime = TakeNumber(line, "uptime", DEFAULT_UPTIME, 0, 1000000000);
    spec.load = TakeLoad(line, nullptr);
    std::string signature = TakeText(line, "signature", HOST_SIGNATURE);
    if (Complete(line)) {
        line->host->signature = signature;
        NodesAddHost(line->host, spec);
    }
}

void ApplyPcpu(Line *line) {
    std::string range = TakePlain(line, "a pcpu number or a range such as 0..7").text;
    size_t dots = range.find("..");
    i64 last = static_cast<i64>(line->host->pcpus.size()) - 1;
    i64 from = CheckNumber(line, "pcpu", range.substr(0, dots), 0, last);
    i64 to = dots == std::string::npos ? from : CheckNumber(line, "pcpu", range.substr(dots + 2), from, last);
    std::optional<i64> busy = TakeStated(line, "busy", 0, 1000);
    std::optional<i64> worldlet = TakeStated(line, "worldlet", 0, 1000);
    if (busy && worldlet) {
        RequireShares(line, "worldlet=, a part of busy=", *worldlet, *busy);
    }
    for (i64 pcpu = from; Complete(line) && pcpu <= to; pcpu++) {
        NodesSetPcpu(line->host, pcpu, busy, worldlet);
    }
}

void ApplySelf(Line *line) {
    i64 used = TakePerMille(line, "used");
    if (Complete(line)) {
        NodesSetSelf(line->host, used);
    }
}

void ApplyStack(Line *line) {
    std::optional<i64> tx = TakeStated(line, "tx", -MAX_RATE, MAX_RATE);
    std::optional<i64> rx = TakeStated(line, "rx", -MAX_RATE, MAX_RATE);
    LoadCurve *load = TakeLoad(line, line->host->load);
    if (Complete(line)) {
        NodesSetStack(line->host, tx, rx, load);
    }
}

void ApplySwitch(Line *line) {
    std::string name = TakePlain(line, "a switch name").text;
    RequireNew(line, line->host->lists.contains(HostKey(NODE_SWITCH_PORTS, name)), "switch " + Quoted(name));
    if (Complete(line)) {
        NodesAddSwitch(line->host, name);
    }
}

void ApplyVm(Line *line) {
    VmSpec spec;
    spec.name = TakePlain(line, "a VM name").text;
    spec.leader = TakeNumber(line, "leader", std::nullopt, 1, MAX_ID - 2);
    spec.vcpus = TakeNumber(line, "vcpus", 1, 0, 999);
    spec.used = TakePerMille(line, "used");
    spec.ready = TakePerMille(line, "ready");
    spec.costop = TakePerMille(line, "costop");
    RequireShares(line, "used=, ready= and costop= together", spec.used + spec.ready + spec.costop, 1000);
    spec.pcpu = TakeStated(line, "pcpu", 0, MAX_ID).value_or(UNSTATED);
    spec.load = TakeLoad(line, line->host->load);
    RequireNew(line, line->host->vms.contains(spec.name), "VM " + Quoted(spec.name));
    RequireNew(line, line->host->instances.contains(HostKey(NODE_WORLD_CARTEL, spec.leader)),
               "leader " + std::to_string(spec.leader));
    if (Complete(line)) {
        NodesAddVm(line->host, spec);
    }
}

// What all ports have; their own lines add the rest.
PortSpec TakePort(Line *line, i64 type) {
    PortSpec spec = {};
    spec.type = type;
    spec.switchName = TakeText(line, "switch");
    spec.port = TakeNumber(line, "port", std::nullopt, 1, MAX_ID);
    spec.tx = TakeStated(line, "tx", -MAX_RATE, MAX_RATE);
    spec.rx = TakeStated(line, "rx", -MAX_RATE, MAX_RATE);
    spec.size = TakeStated(line, "size", 0, 1000000);
    spec.txErrors = TakeRate(line, "errors");
    spec.rxErrors = TakeStated(line, "rxerrors", -MAX_RATE, MAX_RATE).value_or(2 * spec.txErrors);
    spec.load = line->host->load;
    spec.flags = 1;
    if (!line->host->lists.contains(HostKey(NODE_SWITCH_PORTS, spec.switchName))) {
        Fail(line, "switch " + Quoted(spec.switchName) + " unknown: expected the name of a switch line above");
    }
    RequireNew(line, line->host->instances.contains(HostKey(NODE_PORT_TYPE, spec.port)),
               "port " + std::to_string(spec.port));
    return spec;
}

// Takes the load, which a virtual NIC has from its VM otherwise. Null when the line has a problem.
Entity *AddPort(Line *line, PortSpec spec) {
    spec.load = TakeLoad(line, spec.load);
    return Complete(line) ? NodesAddPort(line->host, spec) : nullptr;
}

void ApplyVnic(Line *line) {
    PortSpec spec = TakePort(line, PORT_VNIC);
    std::optional<Word> vmName = Take(line, "vm");
    std::string model = TakeText(line, "model");
    spec.scheme = TakeNumber(line, "scheme", 0, 0, MAX_ID);
    if (model == "parlan2" || model == "parlan3") {
        spec.subType = model == "parlan2" ? MODEL_PARLAN2 : MODEL_PARLAN3;
    } else if (std::optional<i64> number = ParseSigned(model); number && *number >= 0 && *number <= MAX_ID) {
        spec.subType = *number;
    } else {
        Fail(line, "model= " + Quoted(model) + ": expected parlan2, parlan3 or a number");
    }
    if (vmName) {  // without one it is a port of nobody
        spec.client = vmName->text;
        auto vm = line->host->vms.find(spec.client);
        if (vm == line->host->vms.end()) {
            return Fail(line, "vm " + Quoted(spec.client) + " unknown: expected the name of a vm line above");
        }
        spec.leader = vm->second->value[LEADER];
        spec.load = vm->second->load;
    }
    AddPort(line, spec);
}

void ApplyUplink(Line *line) {
    PortSpec port = TakePort(line, PORT_UPLINK);
    port.flags |= PORT_FLAG_UPLINK;
    NicSpec nic;
    nic.name = port.client = TakeText(line, "nic");
    nic.device = TakeText(line, "device", "");
    nic.txQueues = TakeNumber(line, "txqueues", 1, 0, 1024);
    nic.first = TakeStated(line, "first", 0, 1000);
    i64 rxQueues = TakeNumber(line, "rxqueues", 1, 0, 1024);
    for (const std::string &count : SplitCommas(TakeText(line, "filters", ""))) {
        nic.filters.push_back(CheckNumber(line, "filters=", count, 0, 1024));
    }
    if (nic.filters.size() > static_cast<size_t>(rxQueues)) {
        Fail(line, "filters= is too long: expected at most " + std::to_string(rxQueues) + " counts, one a queue");
    }
    nic.filters.resize(static_cast<size_t>(rxQueues));
    RequireNew(line, line->host->instances.contains(HostKey(NODE_NIC_PROPERTIES, nic.name)), "nic " + Quoted(nic.name));
    if (Entity *entity = AddPort(line, port)) {
        NodesAddNic(line->host, nic, entity);
    }
}

void ApplyHostNic(Line *line) {
    PortSpec spec = TakePort(line, PORT_HOST_STACK);
    spec.client = TakeText(line, "name");
    AddPort(line, spec);
}

void ApplyPlain(Line *line) {
    PortSpec spec = TakePort(line, TakeNumber(line, "type", std::nullopt, 0, MAX_ID));
    spec.client = TakeText(line, "client", "");
    AddPort(line, spec);
}

// A vcpu's id, or VM/N for a VM's vcpu N; 0 when it is left out.
i64 TakeVcpu(Line *line) {
    std::optional<Word> word = Take(line, "vcpu");
    size_t slash = word ? word->text.rfind('/') : std::string::npos;
    if (slash == std::string::npos) {
        return word ? CheckNumber(line, "vcpu=", word->text, 0, MAX_ID) : 0;
    }
    auto vm = line->host->vms.find(word->text.substr(0, slash));
    if (vm == line->host->vms.end()) {
        Fail(line, "vcpu= " + Quoted(word->text) + ": expected a number, or VM/N with the name of a vm line above");
        return 0;
    }
    i64 last = vm->second->value[VCPUS] - 1;
    return NodesVcpuId(vm->second->value[LEADER], CheckNumber(line, "vcpu=", word->text.substr(slash + 1), 0, last));
}

// A worldlet's number, which is its place among the worldlet lines from 0 on, or its name.
i64 TakeWorldlet(Line *line) {
    std::optional<Word> word = Take(line, "worldlet");
    if (!word) {
        return MAX_ID;
    }
    auto named = line->host->instances.find(HostKey(NODE_WORLDLET_STATS, word->text));
    bool known = named != line->host->instances.end() && named->second.entity != nullptr;
    return known ? named->second.entity->value[WORLDLET_ID] : CheckNumber(line, "worldlet=", word->text, 0, MAX_ID);
}

void ApplyWorldlet(Line *line) {
    WorldletSpec spec;
    spec.name = TakePlain(line, "a worldlet name").text;
    spec.used = TakePerMille(line, "used");
    spec.ready = TakePerMille(line, "ready");
    spec.wait = TakeStated(line, "wait", 0, 1000);
    RequireShares(line, "used=, ready= and wait= together", spec.used + spec.ready + spec.wait.value_or(0), 1000);
    spec.pcpu = TakeStated(line, "pcpu", 0, MAX_ID);
    spec.vcpu = TakeVcpu(line);
    spec.worldlet = TakeWorldlet(line);
    spec.load = TakeLoad(line, line->host->load);
    RequireNew(line, line->host->instances.contains(HostKey(NODE_WORLDLET_STATS, spec.name)),
               "worldlet " + Quoted(spec.name));
    if (Complete(line)) {
        NodesAddWorldlet(line->host, spec);
    }
}

void ApplyVector(Line *line) {
    VectorSpec spec;
    spec.vector = CheckNumber(line, "vector", TakePlain(line, "a vector number").text, 0, MAX_I64);
    for (const std::string &name : SplitCommas(TakeText(line, "names", ""))) {
        spec.names.push_back(ParamOf(name));
    }
    spec.rate = TakeRate(line, "rate");
    spec.time = TakeRate(line, "time");
    spec.load = TakeLoad(line, line->host->load);
    RequireNew(line, line->host->lists.contains(HostKey(NODE_VECTOR_NAMES, spec.vector)),
               "vector " + std::to_string(spec.vector));
    if (Complete(line)) {
        NodesAddVector(line->host, spec);
    }
}

void ApplyRecord(Line *line) {
    u32 node = TakeNode(line);
    Params keys = TakeKeys(line);
    i64 size = TakeNumber(line, "size", NodeRecordSize(node), 1, MAX_RECORD);
    if (size == 0) {
        Fail(line, "no size= for a node without a record of its own: expected size=<bytes>");
    }
    if (Complete(line)) {
        HostAddNoise(line->host, HostKey(node, keys), static_cast<u32>(size));
    }
}

// Takes node, keys and at= of a line that changes `width` bytes of a record, and adds the patch.
void AddPatch(Line *line, Instance *instance, Patch patch, i64 width) {
    i64 at = TakeNumber(line, "at", std::nullopt, 0, MAX_RECORD);
    if (at + width > static_cast<i64>(instance->size)) {
        Fail(line, "at= goes past the record: expected " + std::to_string(width) + " bytes within " +
                       std::to_string(instance->size));
    }
    if (!Complete(line)) {
        return;
    }
    patch.offset = static_cast<u32>(at);
    patch.width = static_cast<u32>(width);
    if (instance->patches == nullptr) {
        instance->patches = std::make_unique<std::vector<Patch>>();
    }
    instance->patches->push_back(std::move(patch));
}

Instance *TakeInstance(Line *line) {
    u32 node = TakeNode(line);
    auto found = line->host->instances.find(HostKey(node, TakeKeys(line)));
    if (found == line->host->instances.end()) {
        Fail(line, "no such instance: expected node and keys of an entity or a record line above");
        return nullptr;
    }
    return &found->second;
}

// Whether a number, as it is written, can stand in that many bytes: signed or unsigned.
bool Fits(const std::string &text, u64 value, i64 width) {
    if (width == 8) {
        return true;
    }
    return text[0] == '-' ? static_cast<i64>(value) >= -(i64{1} << (8 * width - 1)) : value >> (8 * width) == 0;
}

u64 FieldValue(Line *line, const std::string &text, i64 width) {
    std::optional<u64> value = ParseNumber(text);
    if (!value || !Fits(text, *value, width)) {
        Fail(line, "value " + Quoted(text) + ": expected a number of " + std::to_string(8 * width) + " bits");
    }
    return value.value_or(0);
}

// From which second on; ascending from one then= to the next.
i64 ThenFrom(Line *line, const std::string &text, i64 before) {
    i64 from = CheckNumber(line, "then=", text, 0, 1000000000) * 1000000;
    if (from < before) {
        Fail(line, "then= " + Quoted(text) + ": expected ascending seconds");
    }
    return from;
}

// SEC:VALUE or SEC:VALUE:RATE
Patch::Course ParseThen(Line *line, const std::string &text, i64 width, const Patch::Course &before) {
    size_t first = text.find(':');
    size_t second = first == std::string::npos ? first : text.find(':', first + 1);
    if (first == std::string::npos) {
        Fail(line, "then= " + Quoted(text) + ": expected SECOND:VALUE or SECOND:VALUE:RATE");
        return before;
    }
    i64 from = ThenFrom(line, text.substr(0, first), before.from);
    u64 start = FieldValue(line, text.substr(first + 1, second - first - 1), width);
    bool moves = second != std::string::npos;
    return {from, start, moves ? CheckNumber(line, "then=", text.substr(second + 1), MIN_I64, MAX_I64) : 0};
}

void ApplyField(Line *line) {
    Instance *instance = TakeInstance(line);
    if (instance == nullptr) {
        return;
    }
    i64 width = TakeNumber(line, "width", std::nullopt, 1, 8);
    if (width != 1 && width != 2 && width != 4 && width != 8) {
        Fail(line, "width=" + std::to_string(width) + ": expected 1, 2, 4 or 8");
    }
    u64 start = FieldValue(line, TakeText(line, "start"), width);
    Patch patch = {0, 0, {{0, start, TakeNumber(line, "rate", 0, MIN_I64, MAX_I64)}}, {}};
    while (std::optional<Word> then = Take(line, "then")) {
        patch.courses.push_back(ParseThen(line, then->text, width, patch.courses.back()));
    }
    AddPatch(line, instance, std::move(patch), width);
}

void ApplyText(Line *line) {
    if (Instance *instance = TakeInstance(line)) {
        std::string value = TakeText(line, "value");
        value += '\0';
        i64 width = static_cast<i64>(value.size());
        AddPatch(line, instance, {0, 0, {}, std::move(value)}, width);
    }
}

void ApplyFill(Line *line) {
    if (Instance *instance = TakeInstance(line)) {
        i64 size = TakeNumber(line, "size", std::nullopt, 1, MAX_RECORD);
        i64 byte = TakeNumber(line, "byte", std::nullopt, 0, 255);
        AddPatch(line, instance, {0, 0, {}, std::string(static_cast<size_t>(size), static_cast<char>(byte))}, size);
    }
}

Params TakeEntries(Line *line) {
    Params entries;
    while (AtPlain(*line)) {
        entries.push_back(ToParam(line, TakePlain(line, "an entry"), "entry"));
    }
    return entries;
}

// Behind each then= stand the entries from that second on.
void ApplyList(Line *line) {
    u32 node = TakeNode(line);
    std::string key = HostKey(node, TakeKeys(line));
    if (TakePlain(line, "= and the entries").text != "=") {
        Fail(line, "no =: expected = and the entries");
    }
    Params entries = TakeEntries(line);
    std::vector<ListCourse> courses;
    while (std::optional<Word> then = Take(line, "then")) {
        i64 from = ThenFrom(line, then->text, courses.empty() ? 0 : courses.back().from);
        courses.push_back({from, TakeEntries(line)});
    }
    if (Complete(line)) {
        line->host->lists[key] = std::move(entries);
        line->host->courses.erase(key);
        if (!courses.empty()) {
            line->host->courses[key] = std::move(courses);
        }
    }
}

void ApplyRemove(Line *line) {
    u32 node = TakeNode(line);
    std::string key = HostKey(node, TakeKeys(line));
    line->host->courses.erase(key);
    if (Complete(line) && line->host->instances.erase(key) + line->host->lists.erase(key) == 0) {
        Fail(line, "no such instance or list: expected node and keys of a line above");
    }
}

struct Keyword {
    const char *name;
    void (*apply)(Line *line);  // null: the line is the reader's of the faults
};
constexpr Keyword KEYWORDS[] = {
    {"host", ApplyHost},       {"pcpu", ApplyPcpu},     {"self", ApplySelf},         {"stack", ApplyStack},
    {"switch", ApplySwitch},   {"vm", ApplyVm},         {"vnic", ApplyVnic},         {"uplink", ApplyUplink},
    {"hostnic", ApplyHostNic}, {"plain", ApplyPlain},   {"worldlet", ApplyWorldlet}, {"vector", ApplyVector},
    {"record", ApplyRecord},   {"field", ApplyField},   {"text", ApplyText},         {"fill", ApplyFill},
    {"list", ApplyList},       {"remove", ApplyRemove}, {"fault", nullptr},
};

const Keyword *FindKeyword(const std::string &name) {
    for (const Keyword &keyword : KEYWORDS) {
        if (name == keyword.name) {
            return &keyword;
        }
    }
    return nullptr;
}

void ApplyOne(Line *line, const LineReader &apply) {
    apply(line);
    const Host *host = line->host;
    if (host != nullptr && host->instances.size() + host->lists.size() > MAX_ENTRIES) {
        Fail(line, "too large a host: expected at most " + std::to_string(MAX_ENTRIES) + " records and lists");
    }
}

void ApplyLine(Line *line, const LineReader &apply) {
    std::optional<Word> repeats = Take(line, "count");
    if (!repeats) {
        return ApplyOne(line, apply);
    }
    i64 count = CheckNumber(line, "count=", repeats->text, 1, *line->repeats);
    *line->repeats -= count;
    for (i64 i = 0; i < count && line->problem.empty(); i++) {
        Line one = {line->host, line->words, {}, line->known, nullptr};
        Expand(&one, i);
        if (one.problem.empty()) {
            ApplyOne(&one, apply);
        }
        line->problem = std::move(one.problem);
    }
}

void LoadLine(Line *line, bool isFirst, const LineReader &fault) {
    std::string name = TakePlain(line, "a keyword").text;
    const Keyword *keyword = FindKeyword(name);
    if (keyword == nullptr || (line->host == nullptr && keyword->apply != nullptr)) {
        std::string names;
        for (const Keyword &known : KEYWORDS) {
            names += (names.empty() ? "" : ", ") + std::string(known.name);
        }
        return Fail(line, "keyword " + Quoted(name) + ": expected " + (line->host == nullptr ? "fault" : names));
    }
    if (line->host != nullptr && isFirst != (keyword->apply == ApplyHost)) {
        return Fail(line, "keyword " + Quoted(name) + ": expected one host line, ahead of all others");
    }
    if (isFirst && line->host != nullptr) {
        return ApplyHost(line);  // of which there is one: it knows no count=
    }
    ApplyLine(line, keyword->apply != nullptr ? keyword->apply : fault);
}

bool LoadText(const std::string &text, const char *file, Host *host, const LineReader &fault, std::string *error) {
    std::string_view rest = text;
    bool isFirst = true;
    int number = 0;
    i64 repeats = MAX_REPEATS;
    std::string problem;
    for (std::string source; problem.empty() && TakePart(&rest, '\n', &source);) {
        number++;
        Line line = {host, {}, {}, {}, &repeats};
        SplitWords(&line, source);
        if (line.problem.empty() && !line.words.empty()) {
            LoadLine(&line, isFirst, fault);
            isFirst = false;
        }
        problem = line.problem;
    }
    if (problem.empty() && isFirst && host != nullptr) {
        problem = "no host: expected a host line";
    }
    if (!problem.empty()) {
        *error = std::string(file) + ":" + std::to_string(number) + ": " + problem;
    }
    return problem.empty();
}

}  // namespace

bool DescriptionLoad(const std::string &text, const char *file, Host *host, const LineReader &fault,
                     std::string *error) {
    host->loadedAt = HostClock();
    if (!LoadText(text, file, host, fault, error)) {
        return false;
    }
    NodesSettle(host);
    return true;
}

bool DescriptionFaults(const std::string &text, const char *file, const LineReader &fault, std::string *error) {
    return LoadText(text, file, nullptr, fault, error);
}
