// SPDX-License-Identifier: Apache-2.0
// The options of `knobctl set`, one table for both resources, and the order of the changes.
#include "knobctl/set.h"

#include <array>
#include <optional>

#include "common/number.h"
#include "knobctl/kernel_access.h"
#include "shared/text.h"

namespace Knobctl {

namespace {

using Knob::Allocation;
using Knob::AllocationChange;
using Knob::Kernel;
using Knob::Resource;

struct Level {
  const char *name;
  int64_t shares;
};
constexpr std::array<Level, 3> kLevels = {{{"low", -2}, {"normal", -3}, {"high", -4}}};

constexpr int64_t kNoLimit = -1;

std::optional<int64_t> parseAmount(const std::string &text) {
  const auto number = Platform::parseNumber<int64_t>(text);
  return number && *number >= 0 ? number : std::nullopt;
}

std::optional<int64_t> parseLimit(const std::string &text) {
  return text == "none" ? std::optional<int64_t>(kNoLimit) : parseAmount(text);
}

std::optional<int64_t> parseShares(const std::string &text) {
  for (const Level &level : kLevels) {
    if (text == level.name) return level.shares;
  }
  return parseAmount(text);
}

using Parse = std::optional<int64_t> (*)(const std::string &);

struct Setting {
  const char *name, *form, *help;
  Parse parse;
  std::optional<int64_t> AllocationChange::*field;
};

constexpr std::array<Setting, 4> kSettings = {{
    {"min", "a number from 0 up", "What is reserved for the group", parseAmount,
     &AllocationChange::min},
    {"max", "a number from 0 up, or none", "The most that the group may use", parseLimit,
     &AllocationChange::max},
    {"min-limit", "a number from 0 up, or none", "The most that the group may reserve", parseLimit,
     &AllocationChange::minLimit},
    {"shares", "low, normal, high or a number from 0 up", "Its weight against its siblings",
     parseShares, &AllocationChange::shares},
}};

void declare(CLI::App &command, const std::string &resource, const std::string &unit,
             AllocationChange *change) {
  for (const Setting &setting : kSettings) {
    const bool isShares = setting.field == &AllocationChange::shares;
    command
        .add_option_function<std::string>(
            "--" + resource + "-" + setting.name,
            [change, &setting](const std::string &text) {
              change->*setting.field = setting.parse(text);
            },
            setting.help)
        ->type_name(isShares ? "N" : unit)
        ->check([&setting](const std::string &text) {
          return setting.parse(text) ? ""
                                     : "\"" + Tools::printable(text) + "\" is not " + setting.form;
        });
  }
}

bool isEmpty(const AllocationChange &change) {
  for (const Setting &setting : kSettings) {
    if (change.*setting.field) return false;
  }
  return true;
}

// The change that sets back what CHANGE set.
AllocationChange inverse(const AllocationChange &change, const Allocation &before) {
  AllocationChange undo;
  if (change.min) undo.min = before.min;
  if (change.max) undo.max = before.max;
  if (change.minLimit) undo.minLimit = before.minLimit;
  if (change.shares) undo.shares = before.shares;
  return undo;
}

// Sets the memory back after the CPU was refused. Returns what to add to the message.
std::string setBack(Kernel &kernel, Knob::GroupId id, const AllocationChange &undo) {
  if (isEmpty(undo)) return {};
  try {
    kernel.setAllocation(id, Resource::kMemory, undo);
    return {};
  } catch (const Knob::KernelError &error) {
    return std::string("; the memory was changed and cannot be set back: ") +
           failure("memory", error).what();
  }
}

}  // namespace

void declareSetOptions(CLI::App &command, SetOptions *options) {
  declare(command, "mem", "MB", &options->memory);
  declare(command, "cpu", "PERCENT", &options->cpu);
}

void setAllocations(const std::string &path, const SetOptions &options) {
  const std::string what = "set " + path;
  if (isEmpty(options.memory) && isEmpty(options.cpu)) {
    throw Tools::Failure(Tools::kExitUsage, what + ": no setting is given");
  }
  onKernel(what, [&](Kernel &kernel) {
    const Knob::GroupId id = kernel.lookUp(path);
    AllocationChange undo;
    if (!isEmpty(options.memory)) {
      undo = inverse(options.memory, kernel.readAllocation(id, Resource::kMemory));
      reporting(what + ": memory",
                [&] { kernel.setAllocation(id, Resource::kMemory, options.memory); });
    }
    if (isEmpty(options.cpu)) return;
    try {
      kernel.setAllocation(id, Resource::kCpu, options.cpu);
    } catch (const Knob::KernelError &error) {
      const Tools::Failure refused = failure(what + ": CPU", error);
      throw Tools::Failure(refused.status, refused.what() + setBack(kernel, id, undo));
    }
  });
}

std::string sharesText(int64_t shares) {
  for (const Level &level : kLevels) {
    if (level.shares == shares) return level.name;
  }
  return std::to_string(shares);
}

}  // namespace Knobctl
