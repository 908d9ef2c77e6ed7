// SPDX-License-Identifier: Apache-2.0
// The emulated kernel: groups are rows of one SQLite file, and every operation is one transaction.
// It reserves nothing; it keeps the same records as a kernel that does.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "common/sqlite.h"
#include "knob/configuration.h"
#include "knob/emulated/group_store.h"
#include "knob/emulated/state_file.h"
#include "knob/kernel.h"

namespace Knob {

class EmulatedKernel final : public Kernel {
 public:
  // maxVms: for a kernel that was booted without one.
  EmulatedKernel(std::string path, uint32_t maxVms);

  // Opens the state, unless it is open. Throws KernelError (kernel not usable).
  void open();

  GroupId lookUp(std::string_view path) override;
  GroupId create(GroupId parent, std::string_view name) override;
  void remove(GroupId id) override;
  Allocation readAllocation(GroupId id, Resource resource) override;
  void setAllocation(GroupId id, Resource resource, const AllocationChange &change) override;
  std::vector<GroupId> childGroups(GroupId id) override;
  std::vector<int64_t> members(GroupId id) override;
  void join(GroupId id, int64_t pid) override;
  MemoryStatistics memoryStatistics(GroupId id) override;
  HostFacts facts() override;
  BuildSignature signature() override;
  GroupView view(GroupId id) override;
  std::vector<Finding> check(bool repair) override;

 private:
  using Kind = Platform::Transaction::Kind;

  // Runs an operation in one transaction. SQLite's failures become the kernel's.
  template <typename F>
  auto transact(Kind kind, const F &operation);
  // The same for an operation of one statement, which is a transaction by itself.
  template <typename F>
  auto alone(const F &operation);

  ResourceRow require(GroupId id, Resource resource);
  // Adds what the group reserves with the wanted allocation to the sums of all groups above it.
  // Throws reservation refused; then nothing has changed.
  void reserve(GroupId id, Resource resource, const ResourceRow &row, const Allocation &wanted);
  std::vector<Member> livingMembers(GroupId id);
  std::vector<Member> livingBelow(GroupId id);
  bool isBelow(GroupId id, GroupId ancestor);
  void requireAnyMemory(GroupId id);
  void requireMemoryFor(GroupId id, int64_t maxMB);

  // Everything that an open state needs, opened by the first operation that needs it.
  struct State {
    explicit State(const std::string &path);
    Platform::Database database;
    Platform::TransactionStatements transactions;
    GroupStore store;
  };
  GroupStore &store() { return state_->store; }

  const std::string path_;
  const uint32_t maxVms_;
  std::unique_ptr<State> state_;
};

// Opens the configured state, and boots it with this machine's facts when there is none yet. Throws
// KernelError (kernel not usable).
std::unique_ptr<Kernel> openEmulatedKernel(const Configuration &configuration,
                                           Opening opening = Opening::kAtOnce);

}  // namespace Knob
