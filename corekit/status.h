// The library's status values and the text of every possible value.
#pragma once

#include "corekit/exported.h"

constexpr KnfStatus STATUS_OK = 0;
constexpr KnfStatus STATUS_NOT_CONNECTED = 0xbad0002;  // neither a host nor a snapshot is there to be read
constexpr KnfStatus STATUS_NOT_FOUND = 0xbad0003;      // no instance, or no list, under this node and these keys
constexpr KnfStatus STATUS_BAD_SIZE = 0xbad0004;       // the instance is there, its record has another size
constexpr KnfStatus STATUS_BAD_PARAM = 0xbad0005;      // null or unsuitable arguments, a list of the wrong kind
constexpr KnfStatus STATUS_LIST_FULL = 0xbad0006;
constexpr KnfStatus STATUS_NOT_WRITABLE = 0xbad0007;
constexpr KnfStatus STATUS_BAD_SIGNATURE = 0xbad0008;
constexpr KnfStatus STATUS_NOT_SNAPSHOT = 0xbad0009;
constexpr KnfStatus STATUS_SNAPSHOT_UNREADABLE = 0xbad000a;
constexpr KnfStatus STATUS_SNAPSHOT_VERSION = 0xbad000b;
constexpr KnfStatus STATUS_SNAPSHOT_TRUNCATED = 0xbad000c;
constexpr KnfStatus STATUS_SNAPSHOT_CORRUPT = 0xbad000d;
constexpr KnfStatus STATUS_SIMULATED = 0xbad000f;  // of a fault that names no status of its own

const char *StatusText(KnfStatus status);
