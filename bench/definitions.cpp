// SPDX-License-Identifier: Apache-2.0
// The text depends only on the number of pools.
#include "definitions.h"

#include <fstream>
#include <stdexcept>

namespace Bench {
namespace {

constexpr std::size_t kPoolsInService = 50;

void writeService(std::ofstream &file, std::size_t service) {
  file << "- name: service" << service << "\n"
       << "  memMax: 4096\n"
       << "  cpuShares: 2000\n";
}

void writePart(std::ofstream &file, std::size_t service, std::size_t part) {
  file << "- name: service" << service << "/part" << part << "\n"
       << "  isEnabled: true\n"
       << "  memMin: 2\n";
  if (part % 5 == 0) {
    file << "  memMax: !calc min(physKB / 4096, 512) + numPCPUs * 2\n";
  } else {
    file << "  memMax: " << 16 + part << "\n";
  }
  file << "  memShares: 1000\n"
       << "  cpuMax: 100\n";
}

}  // namespace

void writeDefinitions(const std::string &path, std::size_t pools) {
  std::ofstream file(path);
  for (std::size_t pool = 0; pool < pools; ++pool) {
    const std::size_t service = pool / kPoolsInService;
    const std::size_t part = pool % kPoolsInService;
    if (part == 0) {
      writeService(file, service);
    } else {
      writePart(file, service, part);
    }
  }
  if (!file.flush()) {
    throw std::runtime_error(path + ": cannot be written");
  }
}

}  // namespace Bench
