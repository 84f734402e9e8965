// Damaged and made-up records: each is refused or becomes whole rows, and sections that are not wanted change nothing
// in those that are.
#include "report/rows/rows.h"
#include "report/support/message.h"

#include <cstdlib>
#include <nlohmann/json.hpp>

using namespace report;

void report::Tell(const char *, ...) {}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
    static Rows rows, few;
    static bool ready = (RowsInit(&rows), RowsInit(&few), true);
    std::string json(reinterpret_cast<const char *>(data), size);
    json.shrink_to_fit();
    RecordText record{json, "host", 0, "fuzz", false};
    bool fine = ready && RowsRead(&rows, record, ~0u);
    for (const RowsOfSection &section : rows.sections) {
        size_t sum = 0;
        for (std::string_view cell : section.cells) {
            for (char c : cell) {
                sum += static_cast<unsigned char>(c);
            }
        }
        if (section.cells.size() != section.size() * section.columns || (!fine && section.size() + sum != 0)) {
            abort();
        }
        for (uint32_t place : section.places) {
            if (place != kNoPlace && place >= rows.ports.size()) {
                abort();
            }
        }
    }
    // What is skipped is not checked, and a stream hands out nothing that is no JSON.
    if (fine && nlohmann::json::accept(json) &&
        (!RowsRead(&few, record, Wanted(Section::Vcpu)) ||
         few.of(Section::Vcpu).cells != rows.of(Section::Vcpu).cells)) {
        abort();
    }
    return 0;
}
