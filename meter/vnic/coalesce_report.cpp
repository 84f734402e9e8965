#include "meter/vnic/coalesce_report.h"

#include "meter/support/number.h"

namespace {

// What both schemes report, gathered from their records.
struct CoalesceDetails {
    u8 txDyn;
    u32 txDepth;
    u32 splitCall;
    u32 splitOppor;
    u32 splitTo;
    u32 splitHc;
    u8 txCompDyn;
    u32 txCompDepth;
    u8 rxDyn;
    u32 rxDepth;
    u32 intrReq;
    u32 intrPost;
};

CoalesceDetails Scheme1Details(const Vnic *vnic) {
    const VnicCoalesceTx &tx = vnic->coalesceTx;
    const VnicCoalesceTxComp &txComp = vnic->coalesceTxComp;
    const VnicCoalesceRx &rx = vnic->coalesceRx;
    return {.txDyn = tx.dyn,
            .txDepth = tx.depth,
            .splitCall = tx.splitCall,
            .splitOppor = tx.splitOppor,
            .splitTo = tx.splitTo,
            .splitHc = tx.splitHc,
            .txCompDyn = txComp.dyn,
            .txCompDepth = txComp.depth,
            .rxDyn = rx.dyn,
            .rxDepth = rx.depth,
            .intrReq = rx.intrReq,
            .intrPost = rx.intrPost};
}

CoalesceDetails Scheme2Details(const VnicCoalesceScheme2 &all) {
    return {.txDyn = all.txDyn,
            .txDepth = all.txDepth,
            .splitCall = all.splitCall,
            .splitOppor = all.splitOppor,
            .splitTo = all.splitTo,
            .splitHc = all.splitHc,
            .txCompDyn = all.txCompDyn,
            .txCompDepth = all.txCompDepth,
            .rxDyn = all.rxDyn,
            .rxDepth = all.rxDepth,
            .intrReq = all.intrReq,
            .intrPost = all.intrPost};
}

// The 1 keeps the whole from being 0, unless the sum wraps.
double SplitPercent(const CoalesceDetails &details, u32 part) {
    u32 whole = details.splitCall + details.splitOppor + details.splitTo + details.splitHc + 1;
    return Quotient(part, whole / 100.0);
}

void PrintDetails(const CoalesceDetails &details, bool scheme1, f32 elapsed, ReportBuf *report) {
    ReportPrintf(report, ",\n    \"tx\": { \"dyn\": %d, \"depth\": %d", details.txDyn,
                 static_cast<i32>(details.txDepth));
    ReportPrintf(report,
                 scheme1 ? ", \"split\": {\"hckcall\": %.0f, \"oppor\": %.0f, \"to\": %.0f, \"hc\": %.0f} }"
                         : ", \"split\": {\"hck\": %.0f, \"oppor\": %.0f, \"to\": %.0f, \"hc\": %.0f} }",
                 SplitPercent(details, details.splitCall), SplitPercent(details, details.splitOppor),
                 SplitPercent(details, details.splitTo), SplitPercent(details, details.splitHc));
    ReportPrintf(report, ",\n    \"txcomp\": { \"dyn\": %d, \"depth\": %d}", details.txCompDyn,
                 static_cast<i32>(details.txCompDepth));
    ReportPrintf(report, ",\n    \"rx\": { \"dyn\": %d, \"depth\": %d, ", details.rxDyn,
                 static_cast<i32>(details.rxDepth));
    ReportPrintf(report, "\"intrreq\": %.0f, \"intrpost\": %.0f}", Rate32(details.intrReq, elapsed),
                 Rate32(details.intrPost, elapsed));
}

}  // namespace

void CoalescePrint(const Vnic *vnic, f32 elapsed, ReportBuf *report) {
    const VnicCoalesceInfo &info = vnic->coalesceInfo;
    ReportPrintf(report, ",\n  \"coalesce\": { \"scheme\": \"%s\", \"params\": \"%s\"", info.schemeName,
                 info.schemeParams);
    if (info.scheme == 1) {
        PrintDetails(Scheme1Details(vnic), true, elapsed, report);
    } else if (info.scheme == 2) {
        PrintDetails(Scheme2Details(vnic->coalesceScheme2), false, elapsed, report);
    }
    ReportPrintf(report, "}");
}

void TxWdtPrint(const Vnic *vnic, f32 elapsed, ReportBuf *report) {
    const VnicTxWdtStats &stats = vnic->txWdtStats;
    u32 total = stats.pollCount + stats.callCount + stats.toCount + stats.hcCount + stats.otherCount + 1;
    ReportPrintf(report,
                 ",\n  \"txwdt\": { \"total\": %.0f, \"hckcall\": %.1f, \"poll\": %.1f, \"to\": %.1f, \"hc\": %.1f, "
                 "\"other\": %.1f }",
                 Rate(total, elapsed), Percent(stats.callCount, total), Percent(stats.pollCount, total),
                 Percent(stats.toCount, total), Percent(stats.hcCount, total), Percent(stats.otherCount, total));
}
