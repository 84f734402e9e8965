// Reports as the collector prints them, with any texts in them, for tests and the fuzz target.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

inline std::string Joined(std::initializer_list<std::string_view> parts) {
    std::string text;
    for (std::string_view part : parts) {
        text += part;
    }
    return text;
}

struct MadePort {
    std::string name = "web1", switchName = "vSwitch0";
    long id = 50331650;
    bool gone = false;
    std::string sections = {};  // behind the client's counters
};

struct MadeRecord {
    int iteration = 0;
    std::vector<MadePort> ports = {MadePort{}};
};

inline std::string PortHead(const MadePort &port) {
    return Joined(
        {"{\"name\": \"", port.name, "\", \"switch\": \"", port.switchName, "\", \"id\": ", std::to_string(port.id)});
}

// What stands behind a port's number.
inline std::string PortRest(const MadePort &port) {
    return Joined({", \"mac\": \"02:0a:02:00:00:02\", \"rxmode\": 12, \"uplink\": \"false\",\n  \"txpps\": 47999, "
                   "\"txmbps\": 314.9, \"txsize\": 820, \"txeps\": 2.00, \"rxpps\": -3, \"rxmbps\": 0.0, "
                   "\"rxsize\": 819, \"rxeps\": 4.00",
                   port.sections, "}"});
}

inline std::string RecordHead(int iteration) {
    return Joined(
        {"{ \"time\": ", std::to_string(1795416700 + iteration),
         ", \"interval\": 1, \"iteration\": ", std::to_string(iteration),
         ",\n\"cpu\": { \"topology\": { \"core\": 2, \"llc\": 2, \"package\": 4},\n\"used\": [ 64.00,  -1.00, "
         " 213.00],\n\"wdt\": [ 22.00,   0.50,   53.00] },\n\"ports\":[\n\n"});
}

inline std::string RecordTail() {
    return "],\n\n\"overhead\": {\"used\": 0.07 } }";
}

inline std::string RecordOf(const MadeRecord &record) {
    std::string text = RecordHead(record.iteration);
    for (size_t i = 0; i < record.ports.size(); i++) {
        const MadePort &port = record.ports[i];
        text += i == 0 ? "" : ",\n\n";
        text += port.gone ? "{}" : PortHead(port) + PortRest(port);
    }
    return text + RecordTail();
}

inline std::string DocumentHead(std::string_view host) {
    return Joined({"{ \"sysinfo\": { \"hostname\": \"", host, "\" },\n\"stats\": [\n"});
}

inline std::string ReportOf(const std::vector<MadeRecord> &records, std::string_view host = "labhost",
                            bool whole = true) {
    std::string text = DocumentHead(host);
    for (size_t i = 0; i < records.size(); i++) {
        text += i == 0 ? "" : ",\n";
        text += RecordOf(records[i]);
    }
    return text + (whole ? "\n] }\n" : "");
}

inline std::string CoalesceSection(std::string_view scheme, std::string_view params) {
    return Joined({",\n  \"coalesce\": { \"scheme\": \"", scheme, "\", \"params\": \"", params, "\"}"});
}

inline std::string DeviceSection(std::string_view device) {
    return Joined({",\n  \"physnic\": {\"devname\": \"", device,
                   "\",\n    \"txpps\": 1, \"txmbps\": 0.1, \"txsize\": 2, \"txeps\": 0.00, \"rxpps\": 1, "
                   "\"rxmbps\": 0.1, \"rxsize\": 3, \"rxeps\": 0.00 }"});
}

inline std::string WorldletSection(const std::vector<std::string> &names) {
    std::string text = ",\n  \"wdt\": [";
    for (size_t i = 0; i < names.size(); i++) {
        text += Joined({i == 0 ? "" : ",",
                        "\n    {\"used\": 1.00, \"ready\": 0.10, \"wait\": 98.90, \"runct\": 9, \"remoteactct\": 3, "
                        "\"migct\": 0, \"overrunct\": 0, \"afftype\": \"pcpu\", \"affval\": -1, \"name\": \"",
                        names[i], "\"}"});
    }
    return text + " ]";
}
