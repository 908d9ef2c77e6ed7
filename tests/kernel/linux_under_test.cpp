// SPDX-License-Identifier: Apache-2.0
// Puts the Linux kernel under the contract's cases. It runs as root of a machine of its own, whose
// groups it may do away with. That machine is too small for the cases; what it answers about itself
// is put in place of the C library's answers, so that both kernels are asked the same.
#include <sys/mount.h>
#include <sys/sysinfo.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <system_error>

#include "kernel_under_test.h"
#include "knob/configuration.h"
#include "knob/linux/linux_kernel.h"
#include "temp_folder.h"

extern "C" {

int get_nprocs() noexcept {
  return Contract::kCpus;
}

int sysinfo(struct sysinfo *info) noexcept {
  *info = {};
  info->totalram = static_cast<unsigned long>(Contract::kMemoryMB);
  info->mem_unit = 1024 * 1024;
  return 0;
}

}  // extern "C"

namespace Contract {
namespace {

const std::filesystem::path kHost = "/sys/fs/cgroup/host";

void killMembers(const std::filesystem::path &group) {
  std::ofstream(group / "cgroup.kill") << 1;
}

// A group whose last process was just killed stays busy for some milliseconds.
void removeGroup(const std::filesystem::path &group) {
  while (::rmdir(group.c_str()) != 0) {
    if (errno != EBUSY) throw std::system_error(errno, std::generic_category(), group);
    ::usleep(1000);
  }
}

void removeTree(const std::filesystem::path &group) {
  for (const auto &entry : std::filesystem::directory_iterator(group)) {
    if (entry.is_directory()) removeTree(entry.path());
  }
  removeGroup(group);
}

class LinuxUnderTest final : public KernelUnderTest {
 public:
  LinuxUnderTest() {
    const auto file = folder_.path() / "knob.conf";
    Test::writeFile(file, "kernel = linux\nreserve-memory = 0\nreserve-cpu = 0\nmax-vms = " +
                              std::to_string(kMaxVms) + "\n");
    ::setenv("KNOB_CONF", file.c_str(), 1);
    configuration_ = Knob::readConfiguration();

    const auto commandLine = folder_.path() / "cmdline";
    Test::writeFile(commandLine, std::string(kCommandLine) + "\n");
    if (::mount(commandLine.c_str(), "/proc/cmdline", nullptr, MS_BIND, nullptr) != 0) {
      throw std::system_error(errno, std::generic_category(), "/proc/cmdline");
    }
  }

  void startAnew() override {
    if (!std::filesystem::exists(kHost)) return;
    killMembers(kHost);
    removeTree(kHost);
  }

  std::vector<std::string> check(bool repair) override {
    std::vector<std::string> lines;
    for (const Knob::Finding &finding : Knob::openLinuxKernel(configuration_)->check(repair)) {
      lines.push_back(finding.path + ": " + finding.text);
    }
    return lines;
  }

 private:
  Test::TempFolder folder_;
  Knob::Configuration configuration_;
};

}  // namespace

KernelUnderTest &kernelUnderTest() {
  static LinuxUnderTest kernel;
  return kernel;
}

}  // namespace Contract
