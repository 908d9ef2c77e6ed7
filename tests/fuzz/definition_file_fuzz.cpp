// SPDX-License-Identifier: Apache-2.0
// Any bytes as a definition file: either pools with full names, or an error that names the file.
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "loader/definition_files.h"
#include "loader/file_error.h"

namespace {

// A file in memory that a path leads to.
class MemoryFile {
 public:
  MemoryFile(const uint8_t *data, size_t size)
      : descriptor_(memfd_create("definitions", MFD_CLOEXEC)) {
    if (descriptor_ < 0 || write(descriptor_, data, size) != static_cast<ssize_t>(size)) abort();
  }
  MemoryFile(const MemoryFile &) = delete;
  MemoryFile &operator=(const MemoryFile &) = delete;
  ~MemoryFile() { close(descriptor_); }

  std::string path() const { return "/proc/self/fd/" + std::to_string(descriptor_); }

 private:
  int descriptor_;
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const MemoryFile file(data, size);
  try {
    for (const auto &pool : Loader::readFile(file.path())) {
      if (pool->name.compare(0, 5, "host/") != 0) abort();
    }
  } catch (const Loader::FileError &error) {
    if (std::string(error.what()).compare(0, file.path().size() + 2, file.path() + ": ") != 0)
      abort();
  }
  return 0;
}
