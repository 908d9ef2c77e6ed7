// SPDX-License-Identifier: Apache-2.0
// Keeps the processes of a group with a memory minimum from being killed when the whole machine is
// out of memory: Linux then chooses by size and does not consider memory.min. With an oom_score_adj
// of ours the first MB, as many as the minimum, do not count.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

namespace Knob::Linux {

// The oom_score_adj of the processes of a group: -1000 times the minimum's part of the machine's
// memory and swap, rounded away from zero, at least -999; 0 without a minimum.
int oomScoreAdjFor(int64_t minMB, uint64_t machineBytes);

// Memory and swap of this machine.
uint64_t oomMachineBytes();

// The value of a process; nothing when it has ended.
std::optional<int> readOomScoreAdj(int64_t pid);

// Gives a process the wanted value, unless another program chose one: a value that is neither 0 nor
// former, which is what the process had from us. Returns false when this process has not the right
// to lower it.
bool changeOomScoreAdj(int64_t pid, int former, int wanted);

// Those of the processes whose value is 0 although another one is wanted.
std::vector<int64_t> withoutOomScoreAdj(const std::vector<int64_t> &pids, int wanted);

// Marks a group's directory for systemd-oomd, or removes the marks. A failure is ignored: only
// systemd-oomd reads them.
void markForOomd(int directory, bool hasMinimum) noexcept;

}  // namespace Knob::Linux
