// SPDX-License-Identifier: Apache-2.0
// The values of control files as text: the one place where MB become bytes and percent become
// microseconds, and back. Linux silently accepts wrong values, so every text that is written is
// made here.
#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "knob/admission.h"
#include "knob/kernel.h"
#include "knob/linux/cgroup_files.h"

namespace Knob::Linux {

// "max" in a control file.
inline constexpr uint64_t kUnlimited = std::numeric_limits<uint64_t>::max();

// What a control file should contain.
struct ControlText {
  Control control;
  std::string text;
};

// The files of one resource that the group's own state determines: memory.min and memory.max, or
// cpu.max alone, since cpu.weight depends on the other groups too.
using ControlTexts = std::vector<ControlText>;
ControlTexts controlTextsFor(Resource resource, const ResourceState &state);

// memory.min and memory.max. megabytes: 0 and up, or -1 for no limit. A number of bytes that Linux
// cannot represent is no limit either.
std::string memoryText(int64_t megabytes);

// cpu.max. percent of one CPU: 0 and up, or -1 for no limit. The smallest quota of Linux is 1000
// microseconds, so 0 percent is written as 1.
std::string cpuMaxText(int64_t percent);

// The cpu.weight of shares where no CPU is reserved, 1 to 10000: low 50, normal 100, high 200, a
// number divided by 10.
int64_t weightOfShares(int64_t shares);

// A decimal number or "max", with or without a line feed at its end. Nothing: it is neither.
std::optional<uint64_t> parseLimit(std::string_view text);

// The whole percent that a text of cpu.max, "QUOTA PERIOD", allows, rounded down; -1 for no limit.
std::optional<int64_t> parseCpuMax(std::string_view text);

// MB, rounded up as a minimum and down as a maximum; -1 for no limit.
int64_t minimumMegabytes(uint64_t bytes);
int64_t maximumMegabytes(uint64_t bytes);

// The shares that give a weight: -2, -3 or -4 where one of these does.
int64_t sharesOfWeight(uint64_t weight);

// The number of "KEY NUMBER" in a text of such lines.
std::optional<uint64_t> keyedValue(std::string_view text, std::string_view key);

// Whether a list separated by blanks holds a word.
bool hasWord(std::string_view list, std::string_view word);

}  // namespace Knob::Linux
