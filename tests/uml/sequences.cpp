// SPDX-License-Identifier: Apache-2.0
// Runs random sequences of operations on one kernel and writes what came of each: the status, and a
// digest of the whole tree as the kernel gives it back. The operations follow from the numbers of
// the sequences alone, so that the transcripts of two kernels must be equal, line by line.
//
// usage: run_sequences (linux | emulated STATE CPUS MEMORY_MB) FIRST COUNT [--trees]
#include <signal.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <random>
#include <sstream>

#include "knob/allocation.h"
#include "knob/emulated/boot.h"
#include "knob/session.h"

namespace {

using Knob::GroupId;
using Knob::Kernel;
using Knob::Resource;

constexpr int kSteps = 12;
constexpr int kProcesses = 3;

// A process that only lives; what is in its memory came with it.
class Sleeper {
 public:
  Sleeper() = default;
  Sleeper(const Sleeper &) = delete;
  Sleeper &operator=(const Sleeper &) = delete;
  ~Sleeper() { end(); }

  pid_t start() {
    if (pid_ > 0) return pid_;
    pid_ = fork();
    if (pid_ == 0)
      for (;;) pause();
    return pid_;
  }
  void die() {  // and stay a zombie
    if (pid_ <= 0) return;
    kill(pid_, SIGKILL);
    siginfo_t info{};
    waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT);
  }
  void end() {
    if (pid_ <= 0) return;
    kill(pid_, SIGKILL);
    waitpid(pid_, nullptr, 0);
    pid_ = -1;
  }

 private:
  pid_t pid_ = -1;
};

class Sequence {
 public:
  Sequence(Kernel &kernel, unsigned seed, bool showTrees)
      : kernel_(kernel), random_(seed), showTrees_(showTrees) {}

  void run(unsigned number) {
    treeOf("", kernel_.lookUp("host"));
    for (int step = 0; step < kSteps; ++step) {
      std::ostringstream line;
      line << number << '.' << step << ' ';
      const Knob::Status status = doOne(line);
      paths_.clear();
      const std::string tree = treeOf("", kernel_.lookUp("host"));
      std::sort(paths_.begin(), paths_.end());
      line << " -> " << std::hex << static_cast<uint32_t>(status) << " tree "
           << std::hash<std::string>()(tree);
      std::cout << oneLine(line.str()) << '\n';
      if (showTrees_) std::cout << tree;
    }
    for (Sleeper &sleeper : sleepers_) sleeper.end();
    emptyTree(kernel_.lookUp("host"), "host");
  }

 private:
  static std::string oneLine(std::string text) {
    std::replace(text.begin(), text.end(), '\n', '$');
    return text;
  }

  size_t below(size_t limit) { return random_() % limit; }
  bool chance(size_t oneIn) { return below(oneIn) == 0; }

  std::string pick(const std::vector<const char *> &texts) { return texts[below(texts.size())]; }

  // Mostly that of a group that is there.
  std::string anyPath() {
    if (!chance(6)) return paths_[below(paths_.size())];
    std::string path = pick({"host/opt", "host/opt", "host/opt", "host"});
    for (size_t depth = below(4); depth > 0; --depth) path += "/" + pick({"a", "b", "c"});
    if (chance(20)) path += pick({"/", "//a", "/..", "/.", "/memory.min", "/a\nb", "x"});
    return path;
  }

  std::string anyName() {
    if (chance(10))
      return pick({"", ".", "..", "a/b", "cpu.max", "cgroup.procs", "memory.x", "x\n", "opt"});
    return pick({"a", "b", "c"});
  }

  // Where processes live a maximum is nothing or much more than they use: what lies between is
  // a matter of measurement, and not the same number on both kernels.
  std::string anyEntry() {
    if (chance(25)) {
      return pick({"min", "min=", "=1", "min=x", "min=1 ", "Min=1", "max=99999999999999999999",
                   "min=-2", "max=-2", "minLimit=-7", "shares=-1", "shares=-5", "min=0x1"});
    }
    switch (below(8)) {
      case 0:
      case 1:
      case 2:
        return "min=" + pick({"0", "-1", "1", "7", "16", "30", "64", "100", "300", "5000"});
      case 3:
      case 4:
        return "max=" + pick({"0", "-1", "64", "100", "128", "400", "1000000"});
      case 5:
      case 6:
        return "minLimit=" + pick({"0", "-1", "10", "64", "100", "500"});
      default:
        return "shares=" + pick({"-2", "-3", "-4", "0", "5", "1000", "12345678"});
    }
  }

  std::vector<std::string> anyEntries() {
    if (chance(4)) return {"min=0", "max=0", "minLimit=0", "shares=0"};
    std::vector<std::string> entries;
    for (size_t i = 0, count = chance(30) ? 0 : 1 + below(3); i < count; ++i)
      entries.push_back(anyEntry());
    return entries;
  }

  Knob::Status doOne(std::ostream &out) {
    const std::string path = anyPath();
    switch (below(10)) {
      case 0:
      case 1:
      case 2:
        return create(path, anyName(), out);
      case 3:
        return remove(path, out);
      case 4:
      case 5:
      case 6:
        return set(path, Resource::kMemory, anyEntries(), out);
      case 7:
      case 8:
        return set(path, Resource::kCpu, anyEntries(), out);
      default:
        return process(path, below(kProcesses), out);
    }
  }

  template <typename F>
  Knob::Status statusOf(const F &call) {
    try {
      call();
      return Knob::Status::kSuccess;
    } catch (const Knob::KernelError &error) {
      return error.status;
    }
  }

  Knob::Status create(const std::string &path, const std::string &name, std::ostream &out) {
    out << "create '" << path << "' '" << name << "'";
    return statusOf([&] {
      const GroupId id = kernel_.create(kernel_.lookUp(path), name);
      if (kernel_.lookUp(path + "/" + name) != id) out << " ANOTHER ID";
    });
  }

  Knob::Status remove(const std::string &path, std::ostream &out) {
    out << "remove '" << path << "'";
    return statusOf([&] { kernel_.remove(kernel_.lookUp(path)); });
  }

  Knob::Status set(const std::string &path, Resource resource,
                   const std::vector<std::string> &entries, std::ostream &out) {
    out << (resource == Resource::kMemory ? "memory '" : "cpu '") << path << "'";
    for (const std::string &entry : entries) out << " '" << entry << "'";
    return statusOf([&] {
      const GroupId id = kernel_.lookUp(path);
      const std::vector<std::string_view> views(entries.begin(), entries.end());
      kernel_.setAllocation(id, resource, Knob::parseAllocationChange(resource, views));
    });
  }

  Knob::Status process(const std::string &path, size_t which, std::ostream &out) {
    switch (below(4)) {
      case 0:
        out << "end " << which;
        sleepers_[which].end();
        return Knob::Status::kSuccess;
      case 1:
        out << "die " << which;
        sleepers_[which].die();
        return Knob::Status::kSuccess;
      default:
        out << "join '" << path << "' " << which;
        return statusOf([&] { kernel_.join(kernel_.lookUp(path), sleepers_[which].start()); });
    }
  }

  static void print(const Knob::Allocation &allocation, std::ostream &out) {
    out << " {" << allocation.min << ' ' << allocation.max << ' ' << allocation.minLimit << ' '
        << allocation.shares << '}';
  }

  // All that the kernel gives back of a group and those below it, by name.
  std::string treeOf(const std::string &parent, GroupId id) {
    const Knob::GroupView view = kernel_.view(id);
    const Knob::MemoryStatistics peaks = kernel_.memoryStatistics(id);
    const std::string path = parent.empty() ? view.name : parent + "/" + view.name;
    paths_.push_back(path);
    std::ostringstream out;
    out << "  " << path;
    print(kernel_.readAllocation(id, Resource::kMemory), out);
    print(kernel_.readAllocation(id, Resource::kCpu), out);
    out << ' ' << view.memoryReservationMB << ' ' << view.cpuReservationPercent << ' '
        << peaks.ownReservedPeakKB << ' ' << peaks.childrenReservedPeakKB << ' '
        << kernel_.members(id).size() << view.deviation << '\n';
    std::vector<std::string> trees;
    for (GroupId child : kernel_.childGroups(id)) trees.push_back(treeOf(path, child));
    std::sort(trees.begin(), trees.end());
    for (const std::string &tree : trees) out << tree;
    return out.str();
  }

  void emptyTree(GroupId id, const std::string &path) {
    for (GroupId child : kernel_.childGroups(id))
      emptyTree(child, path + "/" + kernel_.view(child).name);
    Knob::AllocationChange defaults;
    defaults.min = 0;
    defaults.max = defaults.minLimit = -1;
    defaults.shares = -3;
    for (Resource resource : {Resource::kMemory, Resource::kCpu})
      kernel_.setAllocation(id, resource, defaults);
    if (path != "host" && path != "host/opt") kernel_.remove(id);
  }

  Kernel &kernel_;
  std::minstd_rand random_;
  bool showTrees_;
  std::vector<std::string> paths_;  // of the groups that are there
  Sleeper sleepers_[kProcesses];
};

std::unique_ptr<Kernel> openNamed(const std::vector<std::string> &words, size_t *used) {
  Knob::Configuration configuration;
  if (words.at(0) == "linux") {
    *used = 1;
    configuration.kernel = Knob::Configuration::KernelKind::kLinux;
    configuration.reserve = {0, 0};  // as on the other kernel
    return Knob::openKernel(configuration);
  }
  *used = 4;
  configuration.statePath = words.at(1);
  Knob::BootFacts facts;
  facts.cpus = static_cast<uint32_t>(std::stoul(words.at(2)));
  facts.memoryMB = std::stoull(words.at(3));
  Knob::bootEmulatedKernel(configuration, facts, true);
  return Knob::openKernel(configuration);
}

}  // namespace

int main(int argc, char **argv) {
  try {
    const std::vector<std::string> words(argv + 1, argv + argc);
    size_t used = 0;
    const std::unique_ptr<Kernel> kernel = openNamed(words, &used);
    const unsigned first = static_cast<unsigned>(std::stoul(words.at(used)));
    const unsigned count = static_cast<unsigned>(std::stoul(words.at(used + 1)));
    const bool showTrees = words.size() > used + 2;
    const Knob::HostFacts facts = kernel->facts();
    std::cout << facts.cpus << ' ' << facts.memoryKB / 1024 << '\n';
    for (unsigned number = first; number < first + count; ++number)
      Sequence(*kernel, number + 1, showTrees).run(number);
  } catch (const std::exception &error) {
    std::cerr << "run_sequences: " << error.what() << std::endl;
    return 1;
  }
  return 0;
}
