// Identifiers of this system's own `uuid` boxes: a code, then twelve bytes that they share.
#pragma once

#include <cstdint>

constexpr uint32_t MBX_UUID_PROF[4] = {0x50524F46, 0x21D24FCE, 0xBB88695C, 0xFAC9C740};  // file profile
constexpr uint32_t MBX_UUID_USMT[4] = {0x55534D54, 0x21D24FCE, 0xBB88695C, 0xFAC9C740};  // user metadata
constexpr uint32_t MBX_UUID_3DDS[4] = {0x33444453, 0x21D24FCE, 0xBB88695C, 0xFAC9C740};  // of visual entries
