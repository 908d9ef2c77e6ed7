// SPDX-License-Identifier: Apache-2.0
// Collecting and laying out are two functions, so that the second is a pure one.
#include "knobctl/tree.h"

#include <algorithm>
#include <cmath>

#include "knob/status.h"
#include "shared/text.h"

namespace Knobctl {

namespace {

constexpr uint64_t kBytesPerMB = 1048576;
constexpr uint64_t kKBPerMB = 1024;
constexpr uint64_t kMicrosecondsPerTenth = 100000;
constexpr int64_t kBarColumns = 20;
constexpr const char *kGreen = "\033[32m";
constexpr const char *kPlain = "\033[0m";

struct Pending {
  size_t depth;
  Knob::GroupId id;
  std::string name;
};

// Descending by name: the last one is taken next.
std::vector<Pending> childrenOf(Knob::Kernel &kernel, const Pending &parent) {
  std::vector<Pending> children;
  for (const Knob::GroupId id : kernel.childGroups(parent.id)) {
    try {
      children.push_back({parent.depth + 1, id, kernel.view(id).name});
    } catch (const Knob::KernelError &error) {
      // One that went away meanwhile hides none of its siblings.
      if (error.status != Knob::Status::kNotFound) throw;
    }
  }
  std::sort(children.begin(), children.end(),
            [](const Pending &a, const Pending &b) { return a.name > b.name; });
  return children;
}

void take(Knob::Kernel &kernel, const Pending &next, std::vector<TreeRow> *rows,
          std::vector<Pending> *pending) {
  rows->push_back({next.depth, kernel.view(next.id), kernel.members(next.id).size()});
  for (Pending &child : childrenOf(kernel, next)) pending->push_back(std::move(child));
}

std::string limit(int64_t value) {
  return value < 0 ? "-" : std::to_string(value);
}

std::string used(const std::optional<uint64_t> &bytes) {
  return bytes ? std::to_string(*bytes / kBytesPerMB) : "-";
}

// Seconds with a tenth.
std::string secondsUsed(const std::optional<uint64_t> &microseconds) {
  if (!microseconds) return "-";
  const uint64_t tenths = *microseconds / kMicrosecondsPerTenth;
  return std::to_string(tenths / 10) + "." + std::to_string(tenths % 10);
}

// The reserved part of the machine as "#", and the maximum as "|".
std::string bar(int64_t reserved, int64_t max, int64_t machine, Look look) {
  const auto columns = [machine](int64_t amount) {
    if (machine <= 0 || amount <= 0) return int64_t{0};
    const double part = static_cast<double>(amount) / static_cast<double>(machine);
    return int64_t{std::lround(std::min(part, 1.0) * static_cast<double>(kBarColumns))};
  };
  const auto filled = static_cast<size_t>(std::max(columns(reserved), int64_t{reserved > 0}));
  std::string text = std::string(filled, '#') + std::string(kBarColumns - filled, '.');
  if (max >= 0 && max < machine) {
    const auto at = static_cast<size_t>(columns(max));
    text[std::min(at, text.size() - 1)] = '|';
  }
  if (look == Look::kColour) text = kGreen + text + kPlain;
  return "[" + text + "]";
}

using Cells = std::vector<std::string>;

Cells headings(int64_t machineMB, int64_t machinePercent) {
  return {"GROUP",
          "MEM MIN",
          "MAX",
          "RESERVED",
          "USED",
          "OF " + std::to_string(machineMB) + " MB",
          "CPU MIN",
          "MAX",
          "RESERVED",
          "USED S",
          "OF " + std::to_string(machinePercent) + " %",
          "PROCESSES"};
}

bool isLeftAligned(size_t column) {
  return column == 0 || column == 5 || column == 10;
}

Cells cellsOf(const TreeRow &row, int64_t machineMB, int64_t machinePercent, Look look) {
  const Knob::GroupView &group = row.group;
  return {std::string(2 * row.depth, ' ') + Tools::printable(group.name),
          limit(group.memory.min),
          limit(group.memory.max),
          std::to_string(group.memoryReservationMB),
          used(group.usage.memoryBytes),
          bar(group.memoryReservationMB, group.memory.max, machineMB, look),
          limit(group.cpu.min),
          limit(group.cpu.max),
          std::to_string(group.cpuReservationPercent),
          secondsUsed(group.usage.cpuMicroseconds),
          bar(group.cpuReservationPercent, group.cpu.max, machinePercent, look),
          std::to_string(row.processes)};
}

// A bar's colour takes no columns.
size_t widthOf(const std::string &cell) {
  const size_t colours =
      cell.find('\033') == std::string::npos
          ? 0
          : std::char_traits<char>::length(kGreen) + std::char_traits<char>::length(kPlain);
  return Tools::displayWidth(cell) - colours;
}

std::string line(const Cells &cells, const std::vector<size_t> &widths) {
  std::string text;
  for (size_t i = 0; i < cells.size(); ++i) {
    const std::string blanks(widths[i] - widthOf(cells[i]), ' ');
    text += i == 0 ? "" : "  ";
    text += isLeftAligned(i) ? cells[i] + blanks : blanks + cells[i];
  }
  return text + "\n";
}

}  // namespace

std::vector<TreeRow> collectTree(Knob::Kernel &kernel, const std::string &path) {
  std::vector<TreeRow> rows;
  std::vector<Pending> pending = {{0, kernel.lookUp(path), {}}};
  while (!pending.empty()) {
    const Pending next = std::move(pending.back());
    pending.pop_back();
    try {
      take(kernel, next, &rows, &pending);
    } catch (const Knob::KernelError &error) {
      const bool gone = error.status == Knob::Status::kNotFound && !rows.empty();
      if (!gone) throw;
    }
  }
  return rows;
}

std::string layOutTree(const std::vector<TreeRow> &rows, const Knob::HostFacts &facts, Look look) {
  const auto machineMB = static_cast<int64_t>(facts.memoryKB / kKBPerMB);
  const int64_t machinePercent = int64_t{100} * facts.cpus;
  std::vector<Cells> table = {headings(machineMB, machinePercent)};
  for (const TreeRow &row : rows) table.push_back(cellsOf(row, machineMB, machinePercent, look));

  std::vector<size_t> widths(table[0].size());
  for (const Cells &cells : table) {
    for (size_t i = 0; i < cells.size(); ++i) widths[i] = std::max(widths[i], widthOf(cells[i]));
  }
  std::string text = line(table[0], widths);
  for (size_t i = 0; i < rows.size(); ++i) {
    text += line(table[i + 1], widths);
    const std::string &deviation = rows[i].group.deviation;
    if (!deviation.empty()) {
      text += std::string(2 * rows[i].depth, ' ') + "! " + Tools::printable(deviation) + "\n";
    }
  }
  return text;
}

}  // namespace Knobctl
