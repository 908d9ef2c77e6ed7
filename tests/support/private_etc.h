// SPDX-License-Identifier: Apache-2.0
// Another /etc for one program: everything that the machine has there, but rp.d and the
// configuration files of the two platform libraries are the test's own. It exists in that
// program's mount namespace alone; nothing of the machine is changed.
#pragma once

#include <filesystem>
#include <string>

namespace Test {

// Why no program can be given an /etc of its own here; empty where that works. Asked once.
const std::string &privateEtcUnavailable();

// Makes the folder FOLDER, filled with links into a second view of the real /etc, which will be
// mounted beside it. The test puts its own rp.d, knob.conf and kestrel.conf in it, or leaves them
// out.
void makePrivateEtc(const std::filesystem::path &folder);

// Removes what makePrivateEtc made outside FOLDER itself. Must come before FOLDER's parent is
// removed with all its content.
void removePrivateEtc(const std::filesystem::path &folder);

// Called between fork and exec: makes FOLDER the /etc of this process. Null when that worked,
// otherwise the step that failed, with errno set.
const char *enterPrivateEtc(const std::filesystem::path &folder);

}  // namespace Test
