#include "meter/driver/selection.h"

#include "meter/driver/config_file.h"
#include "meter/driver/watched.h"
#include "meter/pnic/physnic.h"
#include "meter/ports/enumerate.h"
#include "meter/support/log.h"
#include "meter/support/run.h"
#include "meter/support/termination.h"

#include <cstdlib>
#include <cstring>

namespace {

constexpr u32 MAX_UPLINKS = 64;  // of one switch, under -V

u64 PortNumber(KnfParamList ports, u32 index) {
    return static_cast<u64>(KNF_ParamGetInt(KNF_ParamListGetParam(ports, index)));
}

const char *SwitchName(KnfParamList switches, u32 index) {
    return KNF_ParamGetString(KNF_ParamListGetParam(switches, index));
}

// All ports of one switch. A switch that can't be read ends the run.
void AddSwitchPorts(const char *switchName, const PortPrefs *prefs) {
    LocalList ports(GetSwitchPorts(switchName));
    if (ports.list == nullptr) {
        Panic("Bad switch name provided: %s\n", switchName);
    }
    for (u32 i = 0; i < KNF_ParamListUsedCount(ports.list); i++) {
        AppendPort(PortNumber(ports.list, i), prefs);
    }
}

void AddAllPorts(const PortPrefs *prefs) {
    LocalList switches(GetSwitchList());
    for (u32 i = 0; i < KNF_ParamListUsedCount(switches.list); i++) {
        AddSwitchPorts(SwitchName(switches.list, i), prefs);
    }
}

// All ports of the switch that holds the NIC, with the defaults of their kinds.
void AddNicPorts(const char *pnicName) {
    physnicPrefs |= PREF_QUEUE_DETAIL;
    u64 uplink = PhysNicPortOf(pnicName);
    PortInfo info = {};
    if (uplink != 0 && GetPortsInfo(uplink, &info) == 0) {
        AddSwitchPorts(info.type.switchName, nullptr);
    }
}

struct Uplinks {
    u64 ports[MAX_UPLINKS];
    u32 count;
};

// Adds the port if it is the VM's, which gives true; remembers it if it is an uplink.
bool SortVmPort(u64 portNum, const char *vmname, Uplinks *uplinks) {
    PortInfo info = {};
    if (GetPortsInfo(portNum, &info) != 0) {
        return false;
    }
    if (std::strcmp(info.status.clientName, vmname) == 0) {
        AppendPort(portNum, &vnicPrefs);
        return true;
    }
    if ((info.status.statusFlags & PORT_STATUS_UPLINK) != 0) {
        if (uplinks->count == MAX_UPLINKS) {
            Panic("More than %d uplinks. Ordering not maintained\n", static_cast<i32>(MAX_UPLINKS));
        }
        uplinks->ports[uplinks->count++] = portNum;
    }
    return false;
}

// The VM's ports on one switch, then the switch's uplinks wherever they stand in its list.
void AddVmPortsOf(KnfParamList ports, const char *vmname) {
    Uplinks uplinks = {};
    bool foundVm = false;
    for (u32 i = 0; i < KNF_ParamListUsedCount(ports); i++) {
        foundVm |= SortVmPort(PortNumber(ports, i), vmname, &uplinks);
        LeaveIfTerminated();
    }
    for (u32 i = 0; foundVm && i < uplinks.count; i++) {
        AppendPort(uplinks.ports[i], &physnicPrefs);
    }
}

void AddVmPorts(const char *vmname) {
    LocalList switches(GetSwitchList());
    for (u32 i = 0; i < KNF_ParamListUsedCount(switches.list); i++) {
        LocalList ports(GetSwitchPorts(SwitchName(switches.list, i)));
        AddVmPortsOf(ports.list, vmname);
    }
}

// One entry of the configuration file, its first word read already. The bits of a switch entry are dropped: its ports
// get the defaults of their kinds.
void AddEntry(ConfigFile *file, const char *word, PortPrefs cmdPrefs) {
    i64 number = std::strtoll(word, nullptr, 10);
    PortPrefs entryPrefs = cmdPrefs;
    char spec[CONFIG_TEXT];
    if (ConfigReadRest(file, spec)) {
        ParseStatsSpec(spec, &entryPrefs);
    }
    LeaveIfTerminated();
    if (number != 0) {
        AppendPort(static_cast<u64>(number), &entryPrefs);
    } else {
        AddSwitchPorts(word, nullptr);
    }
}

// A read error ends the file as its end does.
void AddConfiguredPorts(const char *cfgFile, PortPrefs cmdPrefs) {
    ConfigFile file;
    int error = ConfigOpen(cfgFile, &file);
    LeaveIfTerminated();
    if (error != 0) {
        Panic("Unable to open config file. Error:%s\n", std::strerror(error));
    }
    numPorts = 0;
    for (i32 line = 1; !ConfigEnded(file); line++) {
        char word[CONFIG_TEXT];
        bool found = ConfigReadWord(&file, word);
        LeaveIfTerminated();
        if (!found) {
            LogMsg(2, "Bad switch in %d line in %s file\n", line, cfgFile);
        } else if (word[0] != '#') {
            AddEntry(&file, word, cmdPrefs);
        }
        ConfigSkipLine(&file);
        LeaveIfTerminated();
    }
    ConfigClose(&file);
}

// The bits that a letter adds; 0 for a bad one.
PortPrefs LetterBits(signed char letter) {
    switch (letter) {
    case 'c':
        return PREF_COALESCE;
    case 'C':
        return PREF_COALESCE | PREF_COALESCE_DETAIL;
    case 'h':
        return PREF_HISTO;
    case 'e':
        return PREF_ERRORS;
    case 'l':
        return PREF_HISTO_ARGS;
    case 'q':
        return PREF_QUEUE;
    case 'Q':
        return PREF_QUEUE | PREF_QUEUE_DETAIL;
    case 'i':
        return PREF_INTR | PREF_VNIC;
    case 'v':
        return PREF_VNIC;
    case 'W':
        return PREF_WDT;
    case 'V':
        return PREF_VCPU_HISTO;
    default:
        return 0;
    }
}

// A word given with -t replaces the defaults of all port kinds.
PortPrefs CommandPrefs(const char *typeSpec) {
    PortPrefs prefs = 0;
    if (typeSpec != nullptr) {
        ParseStatsSpec(typeSpec, &prefs);
        vnicPrefs = prefs;
        physnicPrefs = prefs;
        hostNicPrefs = prefs;
    }
    return prefs;
}

}  // namespace

void ParseStatsSpec(const char *spec, PortPrefs *prefs) {
    for (i32 i = 0; spec != nullptr && spec[i] != '\0'; i++) {
        auto letter = static_cast<signed char>(spec[i]);
        PortPrefs bits = LetterBits(letter);
        if (bits == 0) {
            LogMsg(2, "Bad option (%c:%x) supplied at %d idx\n", letter, static_cast<u32>(i32{letter}), i);
        }
        // Histograms are written to the kernel, which a replay never does.
        if (letter == 'h' && cacheEnabled != 0) {
            continue;
        }
        if (letter == 'e') {
            absCounts = 1;
        }
        *prefs |= bits;
    }
}

void SelectPorts(const Settings &settings) {
    PortPrefs cmdPrefs = CommandPrefs(settings.typeSpec);
    if (settings.allPorts) {
        AddAllPorts(&cmdPrefs);
    } else if (settings.switchName != nullptr) {
        AddSwitchPorts(settings.switchName, &cmdPrefs);
        if (numPorts == 0) {
            Panic("Bad switch name given: %s\n", settings.switchName);
        }
    } else if (settings.pnicName != nullptr) {
        AddNicPorts(settings.pnicName);
        if (numPorts == 0) {
            Panic("Bad nic name given: %s\n", settings.pnicName);
        }
    } else if (settings.vmname != nullptr) {
        AddVmPorts(settings.vmname);
        if (numPorts == 0) {
            Panic("Bad vm name given: %s\n", settings.vmname);
        }
    } else if (settings.portNum != 0) {
        AppendPort(settings.portNum, &cmdPrefs);
        if (numPorts == 0) {
            Panic("Invalid -p option");
        }
    } else if (settings.cfgFile != nullptr) {
        AddConfiguredPorts(settings.cfgFile, cmdPrefs);
    }
    if (numPorts == 0) {
        Panic("Please provide atleast one valid port/switch for monitoring\n");
    }
}
