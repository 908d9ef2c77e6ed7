// SPDX-License-Identifier: Apache-2.0
// Opening directories below one directory without ever leaving it: no link, no mount and no ".."
// leads out. And the ids of groups, which are the file handles of their directories.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "common/unique_fd.h"
#include "knob/kernel.h"

namespace Knob::Linux {

// Where a directory is: the id of its group, and the mount through which it was reached.
struct Identity {
  GroupId id = 0;
  uint64_t mount = 0;
};

// Opens the directory at a path of names below another. 0, or the errno (ENOENT, ENOTDIR; ELOOP: a
// link; EXDEV: a mount or ".."). Nothing is assumed about the path's length.
int openBeneath(int directory, std::string_view path, Platform::UniqueFd &opened);

// The same part by part, for kernels without openat2.
int openPartByPart(int directory, std::string_view path, Platform::UniqueFd &opened);

// Of the object at a path below a directory, or of the directory itself for an empty path. The last
// part is not followed when it is a link. 0, or the errno.
int identify(int directory, const char *path, Identity &identity);

// Opens the directory of a group by its id. anyDirectory: any one of the same mount. 0, or the
// errno (ESTALE: no such group; EPERM: this process may not open by id).
int openById(int anyDirectory, GroupId id, Platform::UniqueFd &opened);

}  // namespace Knob::Linux
