// Numbers of the kernel's interface that are newer than the oldest headers this is built with, under names of our own.
#pragma once

#include "interface/types.h"

// Family "netdev", kernel 6.3; its queues since 6.8, their counters since 6.9.
constexpr char NETDEV_FAMILY[] = "netdev";
constexpr u8 NETDEV_QUEUE_GET = 10;
constexpr u8 NETDEV_QSTATS_GET = 12;
constexpr u16 NETDEV_QUEUE_INDEX = 1;
constexpr u16 NETDEV_QUEUE_IFINDEX = 2;
constexpr u16 NETDEV_QUEUE_TYPE = 3;
constexpr u16 NETDEV_QSTATS_IFINDEX = 1;
constexpr u16 NETDEV_QSTATS_QUEUE_TYPE = 2;
constexpr u16 NETDEV_QSTATS_QUEUE_INDEX = 3;
constexpr u16 NETDEV_QSTATS_SCOPE = 4;
constexpr u16 NETDEV_QSTATS_TX_PACKETS = 10;
constexpr u16 NETDEV_QSTATS_TX_BYTES = 11;
constexpr u16 NETDEV_QSTATS_TX_DROPS = 24;  // 6.10, as the next
constexpr u16 NETDEV_QSTATS_TX_STOP = 33;
constexpr u32 NETDEV_TX_QUEUE = 1;
constexpr u64 NETDEV_SCOPE_QUEUE = 1;
