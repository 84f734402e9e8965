// Fixed-width names for kernel records and counters. 64-bit counters are `long long`, which is what the report's
// "%Ld" and "%Lu" take, so that the compiler can check every format against its arguments.
#pragma once

#include <cstddef>
#include <cstdint>

using u8 = std::uint8_t;
using u16 = std::uint16_t;
using u32 = std::uint32_t;
using u64 = unsigned long long;
using i32 = std::int32_t;
using i64 = long long;
using f32 = float;

static_assert(sizeof(u64) == 8 && sizeof(i64) == 8 && sizeof(f32) == 4);
