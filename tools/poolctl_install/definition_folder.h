// SPDX-License-Identifier: Apache-2.0
// The folder of the installed definition files, locked against other runs of poolctl-install. What
// a run has under way is in files with a leading dot, which no reader of the folder looks at.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "common/unique_fd.h"
#include "folder_lock.h"
#include "signal_guard.h"

namespace Install {

class DefinitionFolder {
 public:
  enum class IfMissing { kFail, kCreate };

  // Waits up to 60 s for another run to end. A folder that was created here is removed again when
  // it is empty in the end. Throws std::system_error, Tools::Failure when there is no folder or
  // the other run does not end, or Interrupted.
  DefinitionFolder(IfMissing ifMissing, const SignalGuard &signals);
  DefinitionFolder(const DefinitionFolder &) = delete;
  DefinitionFolder &operator=(const DefinitionFolder &) = delete;

  int fd() const { return fd_.get(); }
  static std::string pathOf(const std::string &name);

  // Whether users other than the one who runs this program may change the folder's entries.
  bool othersMayWrite() const;

  // All entries but "." and "..". Throws std::system_error.
  std::vector<std::string> entries() const;

  // Makes renames and removals survive a crash of the machine. Throws std::system_error.
  void sync() const;

 private:
  // Removes the folder on leaving, which fails unless it is empty.
  struct Created {
    ~Created();
    bool here = false;
  };

  // Destroyed in reverse order: the lock's file is gone before the folder is removed.
  Created created_;
  Platform::UniqueFd fd_;
  std::optional<FolderLock> lock_;
};

}  // namespace Install
