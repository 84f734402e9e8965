#include "corekit/node_source.h"

KnfParamRec ParamOf(int64_t number) {
    return {false, number, {}};
}

KnfParamRec ParamOf(const std::string &text) {
    return {true, 0, text};
}

bool ParamEqual(const KnfParamRec &left, const KnfParamRec &right) {
    return left.isText == right.isText && left.number == right.number && left.text == right.text;
}

void ParamAppendText(std::string *line, const KnfParamRec &param) {
    if (!param.isText) {
        *line += std::to_string(param.number);
        return;
    }
    constexpr char digits[] = "0123456789abcdef";
    *line += '"';
    for (char c : param.text) {
        auto byte = static_cast<unsigned char>(c);
        if (byte < 0x20 || byte == 0x7f) {
            *line += {'\\', 'x', digits[byte >> 4], digits[byte & 15]};
        } else if (c == '"' || c == '\\') {
            *line += {'\\', c};
        } else {
            *line += c;
        }
    }
    *line += '"';
}

const char *StatusText(KnfStatus status) {
    switch (status) {
    case STATUS_OK:
        return "Success";
    case KNF_FAILURE:
        return "Failure";
    case STATUS_NOT_CONNECTED:
        return "Not connected to a kernel";
    case STATUS_NOT_FOUND:
        return "No such node instance";
    case STATUS_BAD_SIZE:
        return "Record size mismatch";
    case STATUS_BAD_PARAM:
        return "Bad parameter";
    case STATUS_LIST_FULL:
        return "Parameter list is full";
    case STATUS_NOT_WRITABLE:
        return "Node is not writable";
    case STATUS_BAD_SIGNATURE:
        return "Interface signature mismatch";
    case STATUS_NOT_SNAPSHOT:
        return "Not a snapshot file";
    case STATUS_SNAPSHOT_UNREADABLE:
        return "Snapshot file can't be read";
    case STATUS_SNAPSHOT_VERSION:
        return "Snapshot of another format version or byte order";
    case STATUS_SNAPSHOT_TRUNCATED:
        return "Snapshot file is truncated";
    case STATUS_SNAPSHOT_CORRUPT:
        return "Snapshot file is corrupted";
    case STATUS_UNTOLD:
        return "Not told by the kernel";
    case STATUS_SIMULATED:
        return "Simulated failure";
    default:
        return "Unknown status";
    }
}
