// SPDX-License-Identifier: Apache-2.0
// The file that holds the emulated kernel's state: where it is, and how it is made.
#pragma once

#include <functional>
#include <string>

#include "common/sqlite.h"
#include "common/unique_fd.h"
#include "knob/configuration.h"

namespace Knob {

// The default place of the state. root: /run/knob; others: a folder of their own below
// XDG_RUNTIME_DIR or the temp folder. Makes the folder when it is missing, and refuses one that
// other users could change. Throws KernelError (kernel not usable).
std::string defaultStatePath();

// Where the configured kernel keeps its state: the configured path, or the default one. Throws
// KernelError (kernel not usable) for a default folder that is not safe to use.
std::string emulatedStatePath(const Configuration &configuration);

// Whether there is a state to open: a regular file that is not empty. Throws KernelError (kernel
// not usable) for what cannot be a state.
bool stateExists(const std::string &path);

// Keeps other processes from booting a kernel in the same folder. The system releases it when the
// process ends in any way.
class BootLock {
 public:
  explicit BootLock(const std::string &statePath);

 private:
  Platform::UniqueFd folder_;
};

// Makes and fills a state beside its place, and moves it there when it is whole: no process sees a
// part of a state, and a failure leaves no file behind. Under the lock. Throws SqliteError and
// KernelError.
void buildState(const BootLock &lock, const std::string &path,
                const std::function<void(Platform::Database &)> &fill);

// Opens a state that exists and has this library's version. Throws KernelError (kernel not usable).
Platform::Database openState(const std::string &path);

// Turns a failure of SQLite into the one of the kernel. what: the path of the state.
[[noreturn]] void throwStateError(const std::string &path, const Platform::SqliteError &error);

}  // namespace Knob
