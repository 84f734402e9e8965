// What each key of a report is worth on a Linux host: one table for the telling command, the page that lists them, and
// the test that holds both against the report's schema. Constant.
#pragma once

#include "corekit/linuxhost/features.h"

enum Worth : u8 {
    EXACT,       // the meaning that the report's page tells
    CLOSE,       // near it; the text says how
    ZERO,        // 0, and truly so: the thing does not exist on Linux
    UNMEASURED,  // shown as 0, which nobody measured
    ABSENT,      // the section never appears
};

struct KeyRow {
    const char *path;  // from the iteration on, "ports.vcpu.used"; one ending in ".*" stands for all keys below
    Worth worth;
    const char *how;
    FeatureId need = FEATURES;   // FEATURES: none
    Worth without = UNMEASURED;  // worth when the host lacks the need
};

extern const KeyRow KEY_ROWS[];
extern const size_t KEY_ROW_COUNT;

const char *WorthText(Worth worth);
// The path of the object that the key stands in; "" at the top. A row for all keys of a section belongs to that
// section.
std::string KeySection(const KeyRow &row);
// A key of a report as the schema has it, "ports.vnic.tsopct"; null when no row covers it.
const KeyRow *KeyFind(std::string_view path);
