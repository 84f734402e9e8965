// What statistics a port brings: one word of bits for each port, its private copy. Companions clear bits in it when a
// read fails. Letters of the stats specification set them.
#pragma once

#include "interface/types.h"

using PortPrefs = u32;

constexpr PortPrefs PREF_COALESCE = 0x0001;         // coalescing of a virtual NIC
constexpr PortPrefs PREF_HISTO = 0x0002;            // the kernel's packet and cluster histograms of the port
constexpr PortPrefs PREF_ERRORS = 0x0004;           // never tested by itself; its letter makes all figures absolute
constexpr PortPrefs PREF_HISTO_ARGS = 0x0008;       // the argument list of the histogram operations, no histograms
constexpr PortPrefs PREF_QUEUE = 0x0010;            // queues of a physical NIC
constexpr PortPrefs PREF_INTR = 0x0020;             // interrupts of a physical NIC
constexpr PortPrefs PREF_VNIC = 0x0040;             // main statistics of the NIC behind the port
constexpr PortPrefs PREF_WDT = 0x0080;              // the port's worldlets
constexpr PortPrefs PREF_COALESCE_DETAIL = 0x0100;  // transmit worldlet counters of a virtual NIC
constexpr PortPrefs PREF_QUEUE_DETAIL = 0x0200;     // never tested by itself
constexpr PortPrefs PREF_VCPU_HISTO = 0x0400;       // run, ready, co-stop and wait histograms of the port's vcpus
