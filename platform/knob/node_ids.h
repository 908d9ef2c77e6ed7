// SPDX-License-Identifier: Apache-2.0
// The numbers of the nodes. They are this library's own: programs pass on what the exported objects
// hold.
#pragma once

#include "platform/knob.h"

namespace Knob {

inline constexpr KNOB_NodeID kCpuInfoNode = 0x0101;
inline constexpr KNOB_NodeID kVmLimitsNode = 0x0102;
inline constexpr KNOB_NodeID kBootCmdLineNode = 0x0103;
inline constexpr KNOB_NodeID kMemoryNode = 0x0104;
inline constexpr KNOB_NodeID kPathToIdNode = 0x0201;
inline constexpr KNOB_NodeID kGroupCreateNode = 0x0202;
inline constexpr KNOB_NodeID kGroupDeleteNode = 0x0203;
inline constexpr KNOB_NodeID kMemAllocationNode = 0x0204;
inline constexpr KNOB_NodeID kCpuAllocationNode = 0x0205;
inline constexpr KNOB_NodeID kMemberGroupsNode = 0x0206;
inline constexpr KNOB_NodeID kMemberWorldsNode = 0x0207;
inline constexpr KNOB_NodeID kMemoryStatsNode = 0x0208;

}  // namespace Knob
