// SPDX-License-Identifier: Apache-2.0
// What of the machine can be promised to groups: its memory and CPUs without what is kept for the
// system itself, and without what others have for certain.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "knob/configuration.h"
#include "knob/kernel.h"
#include "knob/linux/hierarchy.h"

namespace Knob::Linux {

// A part of the machine that groups cannot have, in MB or percent of one CPU.
struct Holder {
  std::string name;
  int64_t amount;
};

struct Account {
  Resource resource = Resource::kMemory;
  int64_t total = 0;
  std::vector<Holder> holders;

  // For groups; at least 0.
  int64_t capacity() const;
};

// Reads the machine as it is now. Throws KernelError.
Account readAccount(Resource resource, const Hierarchy &hierarchy, const HostFacts &facts,
                    const Reserve &reserve);

// The same, but reads at most once a second: a load of many pools needs the account for each.
class Capacity {
 public:
  // The references must outlive this object.
  Capacity(const Hierarchy &hierarchy, const HostFacts &facts, const Reserve &reserve)
      : hierarchy_(hierarchy), facts_(facts), reserve_(reserve) {}

  const Account &account(Resource resource);

 private:
  struct Reading {
    std::optional<Account> account;
    std::chrono::steady_clock::time_point time;
  };

  const Hierarchy &hierarchy_;
  const HostFacts &facts_;
  const Reserve reserve_;
  Reading memory_, cpu_;
};

// "64 MB for the system, 128 MB for huge pages"; "nothing" without holders.
std::string textOf(const Account &account);

// "MB" or "% of a CPU".
const char *unitOf(Resource resource);

// The memory in huge pages, used or not, from the text of /proc/meminfo.
int64_t hugePagesMB(std::string_view meminfo);

}  // namespace Knob::Linux
