// The two sections of a virtual NIC's report on coalescing. They show the latest cumulative values, not differences.
#pragma once

#include "meter/support/report.h"
#include "meter/vnic/vnic.h"

void CoalescePrint(const Vnic *vnic, f32 elapsed, ReportBuf *report);

void TxWdtPrint(const Vnic *vnic, f32 elapsed, ReportBuf *report);
