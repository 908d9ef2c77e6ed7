// SPDX-License-Identifier: Apache-2.0
// Opens directories below one directory without ever leaving it through a link, a mount or "..".
// Reads the ids of groups, which are the file handles of their directories.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "common/unique_fd.h"
#include "knob/kernel.h"

namespace Knob::Linux {

// The id of a directory's group, and the mount through which it was reached.
struct Identity {
  GroupId id = 0;
  uint64_t mount = 0;
};

// Opens the directory at a path below another, of any length. Returns 0 or the errno (ENOENT,
// ENOTDIR; ELOOP: a link; EXDEV: a mount or "..").
int openBeneath(int directory, std::string_view path, Platform::UniqueFd &opened);

// The same component by component, for kernels without openat2.
int openByComponents(int directory, std::string_view path, Platform::UniqueFd &opened);

// Identifies what is at a path below a directory, or the directory itself for an empty path. Does
// not follow a link in the last component. Returns 0 or the errno.
int identify(int directory, const char *path, Identity &identity);

// Opens the directory of a group by its id. anyDirectory: any one of the same mount. Returns 0 or
// the errno (ESTALE: no such group; EPERM: this process may not open by id).
int openById(int anyDirectory, GroupId id, Platform::UniqueFd &opened);

}  // namespace Knob::Linux
