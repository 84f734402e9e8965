// The page of a series: one HTML file that needs nothing else. Its first screen is plain HTML; behind it stand a
// manifest in JSON and blocks of numbers (see web/decode.js), which the scripts draw. Owns nothing; folds the store
// when it must, and needs as much memory again as the file is long.
//
// A file above the limit loses, in this order: details, the two columns of Mbit/s, time (records in buckets, with
// maximum and mean), quiet ports. The head of the page tells it.
#pragma once

#include "report/page/manifest.h"
#include "report/support/output.h"

namespace report {

struct PageOptions {
    size_t detail = 200;  // ports shown closely, at most
    bool compress = true;
    size_t limit = 15 << 20;  // bytes of the file
};

// The store must hold a record; what had to be given up is added to the notes. False: the page can't be made as small
// as the limit, and nothing was written.
bool PageWrite(Output *output, const PageOptions &options, PageSource *source);

}  // namespace report
