// SPDX-License-Identifier: Apache-2.0
// Preloaded into a program: from the first operation on, every request of C++ code for memory
// fails. It starts with KNOB_CheckSig, the first thing that poolctl calls.
#include <dlfcn.h>

#include <cstdlib>
#include <new>

namespace {

bool isShort = false;

}  // namespace

#pragma GCC visibility push(default)

extern "C" int KNOB_CheckSig(char *runningBuild, int size, const char **myBuild) {
  using Function = int(char *, int, const char **);
  const int result =
      reinterpret_cast<Function *>(dlsym(RTLD_NEXT, "KNOB_CheckSig"))(runningBuild, size, myBuild);
  isShort = true;
  return result;
}

void *operator new(std::size_t size) {
  void *const memory = isShort ? nullptr : std::malloc(size);
  if (memory == nullptr) throw std::bad_alloc();
  return memory;
}

#pragma GCC visibility pop
