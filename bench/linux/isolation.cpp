// SPDX-License-Identifier: Apache-2.0
// How well a pool's minimum keeps a service from hogs of all kinds: the share of the operations
// wanted in each second that were served, at most a second late. Once in a pool with a memory and a
// CPU minimum, once in a group beside the hogs'. Wanted is what takes three tenths of a CPU while
// the machine is idle. A service that the kernel kills is started again at once.
//
// usage: bench_isolation BIN_FOLDER, in a machine of its own
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <filesystem>
#include <fstream>
#include <functional>
#include <new>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "child_process.h"
#include "hogs.h"
#include "pools.h"
#include "sample.h"

namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;
using std::chrono::seconds;

constexpr int kSeconds = 30;
constexpr double kCpuPart = 0.3;
constexpr std::size_t kPages = 6144;  // each of anonymous memory and of a file: 48 MB in all
constexpr std::size_t kPageBytes = 4096;
constexpr double kMeanGoal = 99.5, kWorstGoal = 95;

// What the measuring process and the service share.
struct Shared {
  std::atomic<bool> mayStart;
  std::atomic<int> operationsAlone;  // in the service's first second, before there are hogs
  std::atomic<bool> hogsRun;
  std::atomic<int> served[kSeconds];
  Clock::time_point begin;  // set before hogsRun
};

void write(const fs::path &path, const std::string &text) {
  std::ofstream file(path);
  file << text << std::flush;
  if (!file) throw std::runtime_error(path.string() + ": cannot be written");
}

// One operation uses a few of the service's pages, some of anonymous memory and some of a file, and
// computes a little.
class Service {
 public:
  explicit Service(const fs::path &file)
      : memory_(static_cast<char *>(mmap(nullptr, kPages * kPageBytes, PROT_READ | PROT_WRITE,
                                         MAP_PRIVATE | MAP_ANONYMOUS, -1, 0))),
        file_(open(file.c_str(), O_RDONLY | O_CLOEXEC)) {
    if (memory_ == MAP_FAILED || file_ < 0) throw std::runtime_error("the service has no memory");
    for (std::size_t page = 0; page < kPages; ++page) use(page);
  }

  void operate() {
    for (int i = 0; i < 8; ++i) use(random_() % kPages);
    for (volatile int i = 0; i < 100000; i = i + 1) {
    }
  }

 private:
  void use(std::size_t page) {
    memory_[page * kPageBytes] = static_cast<char>(memory_[page * kPageBytes] + 1);
    char block[kPageBytes];
    if (pread(file_, block, sizeof block, static_cast<off_t>(page * kPageBytes)) != sizeof block)
      throw std::runtime_error("the service's file cannot be read");
  }

  char *memory_;
  int file_;
  std::minstd_rand random_;
};

// An operation that is more than a second late is left out.
void serve(Service *service, Shared *shared) {
  const int wanted = std::max(1, static_cast<int>(shared->operationsAlone * kCpuPart));
  const Clock::duration step = std::chrono::nanoseconds(std::chrono::seconds(1)) / wanted;
  const auto late = [](Clock::time_point due) { return Clock::now() - due > seconds(1); };
  for (int i = 0; i < kSeconds * wanted; ++i) {
    const Clock::time_point due = shared->begin + step * i;
    if (late(due)) continue;
    std::this_thread::sleep_until(due);
    service->operate();
    if (!late(due)) ++shared->served[i / wanted];
  }
}

[[noreturn]] void runService(const fs::path &data, Shared *shared) {
  prctl(PR_SET_PDEATHSIG, SIGKILL);
  try {
    write("/proc/self/oom_score_adj", "0");
    while (!shared->mayStart) usleep(1000);
    Service service(data);
    if (!shared->hogsRun) {
      const auto end = Clock::now() + seconds(1);
      for (; Clock::now() < end; ++shared->operationsAlone) service.operate();
      shared->mayStart = false;
      while (!shared->hogsRun) usleep(1000);
    }
    serve(&service, shared);
    _exit(0);
  } catch (const std::exception &) {
    _exit(1);
  }
}

// Puts a process into its group.
using Join = std::function<void(pid_t)>;

pid_t startService(const fs::path &data, Shared *shared, const Join &join) {
  shared->mayStart = false;
  const pid_t pid = fork();
  if (pid < 0) throw std::runtime_error("fork");
  if (pid == 0) runService(data, shared);
  join(pid);
  shared->mayStart = true;
  return pid;
}

// The percentage that was served, for each second.
std::vector<double> measure(const fs::path &work, const Join &join) {
  void *memory =
      mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  if (memory == MAP_FAILED) throw std::runtime_error("no memory to count in");
  auto *shared = new (memory) Shared{};
  pid_t pid = startService(work / "service-data", shared, join);
  while (shared->mayStart) usleep(1000);
  {
    Bench::Hogs hogs(work, "hogs");
    shared->begin = Clock::now();
    shared->hogsRun = true;
    while (Clock::now() < shared->begin + seconds(kSeconds)) {
      hogs.restartEnded();
      if (waitpid(pid, nullptr, WNOHANG) == pid)
        pid = startService(work / "service-data", shared, join);
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    kill(pid, SIGKILL);
    waitpid(pid, nullptr, 0);
  }
  std::vector<double> percent;
  const int wanted = std::max(1, static_cast<int>(shared->operationsAlone * kCpuPart));
  for (const std::atomic<int> &served : shared->served) percent.push_back(100.0 * served / wanted);
  std::printf("  %d operations wanted each second\n", wanted);
  munmap(memory, sizeof(Shared));
  return percent;
}

double mean(const std::vector<double> &values) {
  double sum = 0;
  for (const double value : values) sum += value;
  return sum / static_cast<double>(values.size());
}

double worst(const std::vector<double> &values) {
  return *std::min_element(values.begin(), values.end());
}

void run(const std::string &bin) {
  const fs::path work = getenv("TMPDIR"), mount = Bench::kCgroupMount;
  write(work / "knob.conf", "kernel = linux\n");
  setenv("KNOB_CONF", (work / "knob.conf").c_str(), 1);
  write(work / "service-data", std::string(kPages * kPageBytes, 'x'));
  // What measures is never killed.
  write("/proc/self/oom_score_adj", "-1000");

  std::printf("\nA service beside hogs of five kinds, for %d seconds\n", kSeconds);
  const fs::path group = Bench::makePoolParent("hogs") / "..";
  fs::create_directory(group / "service");
  const std::vector<double> without =
      measure(work, [&](pid_t pid) { write(group / "service/cgroup.procs", std::to_string(pid)); });
  std::printf("  outside every pool: served %.1f percent, in the worst second %.0f\n",
              mean(without), worst(without));

  write(work / "pools.yaml", "- name: service\n  memMin: 80\n  cpuMin: 40\n");
  Bench::runProgram({bin + "/poolctl-install", "--mark", work / "pools.yaml"});
  Bench::runProgram({bin + "/poolctl", "load", work / "pools.yaml"});
  const std::vector<double> with = measure(work, [&](pid_t pid) {
    Bench::runProgram({bin + "/knobctl", "join", "host/opt/service", std::to_string(pid)});
  });
  Bench::printGoal("in a pool: served, percent", mean(with), mean(with) >= kMeanGoal,
                   "at least 99.5");
  Bench::printGoal("in a pool: served in the worst second, percent", worst(with),
                   worst(with) >= kWorstGoal, "at least 95");
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 2 || (getenv("UML_MACHINE") == nullptr && getenv("SMP_MACHINE") == nullptr)) {
    std::fprintf(stderr, "usage: tests/uml/uml-run --mem=256M -- bench_isolation BIN_FOLDER\n");
    return 2;
  }
  try {
    run(argv[1]);
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "bench_isolation: %s\n", failure.what());
    return 1;
  }
  return 0;
}
