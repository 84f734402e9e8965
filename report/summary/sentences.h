// The words of a finding. Nothing here looks at a record.
#pragma once

#include "report/summary/findings.h"

#include <string>

namespace report {

// Sets what, tryThis, and where the sentence ends with somebody's name ofKind; `of` is set already.
void FindingTell(Finding *finding, const FindingsOptions &options);
// The key as sentences have it: "r1full" of "vnic.r1full"; keys of other sections whole, which else say too little.
std::string KeyText(const char *key);
// Name and id of its port, those of the others after it; the host where it has no port.
std::string SubjectText(const Findings &findings, const Finding &finding);
// The sentence with its sign, rule, worst record and advice: one line, without its end.
std::string FindingText(const Findings &findings, const Finding &finding);

}  // namespace report
