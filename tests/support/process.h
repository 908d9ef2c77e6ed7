// SPDX-License-Identifier: Apache-2.0
// Runs one program to its end and returns its output, byte for byte, and how it ended. The program
// can have an /etc of its own (private_etc.h).
#pragma once

#include <chrono>
#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace Test {

// How the program's two output streams are kept.
enum class Streams {
  kApart,
  kMerged,  // both in ProcessResult::out, in the order in which they were written
};

struct Command {
  std::filesystem::path program;                   // a path; PATH is not searched
  std::vector<std::string> arguments;              // without the program's own name
  std::map<std::string, std::string> environment;  // nothing is inherited
  std::string input;
  std::filesystem::path workingFolder = "/";
  // The folder that the program sees as /etc, created by makePrivateEtc(); empty: the machine's
  // /etc.
  std::filesystem::path etc;
  Streams streams = Streams::kApart;
  std::chrono::seconds limit{120};
};

struct ProcessResult {
  std::string out, err;
  int status = -1;        // the exit status; -1: ended by a signal
  int signal = 0;         // the signal that ended it; 0: none
  bool timedOut = false;  // killed at the limit, with its children
};

// Throws std::system_error when the program can't be started.
ProcessResult run(const Command &command);

}  // namespace Test
