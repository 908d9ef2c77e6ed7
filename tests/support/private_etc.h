// SPDX-License-Identifier: Apache-2.0
// Gives one program an /etc of its own: the machine's files, except that rp.d and the configuration
// files of the two platform libraries are the test's. It exists only in that program's mount
// namespace; the machine is not changed.
#pragma once

#include <filesystem>
#include <string>

namespace Test {

// Why this machine cannot give a program its own /etc; empty where it can. Tried once.
const std::string &privateEtcUnavailable();

// Creates FOLDER and fills it with links into a second view of the real /etc, which is mounted
// later at FOLDER.real. The test adds its own rp.d, knob.conf and kestrel.conf where it needs them.
void makePrivateEtc(const std::filesystem::path &folder);

// Removes what makePrivateEtc created outside FOLDER. Call it before FOLDER's parent is removed.
void removePrivateEtc(const std::filesystem::path &folder);

// Makes FOLDER the /etc of this process. For use between fork and exec. Returns null, or the name
// of the step that failed, with errno set.
const char *enterPrivateEtc(const std::filesystem::path &folder);

}  // namespace Test
