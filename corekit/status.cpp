#include "corekit/status.h"

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
    case STATUS_SIMULATED:
        return "Simulated failure";
    default:
        return "Unknown status";
    }
}
