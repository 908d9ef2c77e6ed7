// SPDX-License-Identifier: Apache-2.0
// The surroundings of one test: a temporary folder with definition files, configuration and kernel
// state, in which it runs programs. Tests share none of it.
#pragma once

#include <filesystem>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "private_etc.h"
#include "process.h"
#include "temp_folder.h"

namespace Test {

using Arguments = std::vector<std::string>;

// The folder of the built programs: the build's, or the one that POOLCTL_BIN names.
std::filesystem::path binFolder();

// The folder of one of the stand-in libraries: "knob", "config" or "host".
std::filesystem::path standInFolder(const std::string &name);

class World {
 public:
  // Its kernel is an emulated one with state in the world's folder; its store is a file there.
  World();
  World(const World &) = delete;
  World &operator=(const World &) = delete;
  ~World();

  const std::filesystem::path &folder() const { return temp_.path(); }

  // Writes an installed definition file into the folder; its path is the result.
  std::filesystem::path file(const std::string &name, std::string_view yaml);

  // The folder that programs see as /etc; made at the first call. Needs a private /etc.
  const std::filesystem::path &etc();

  // The folder that programs see as /etc/rp.d; made at the first call.
  std::filesystem::path rpD();

  // Writes an installed definition file into rpD().
  void definition(const std::string &name, std::string_view yaml);

  // Runs a program of the build in the folder, with the world's environment.
  ProcessResult run(const std::string &program, const Arguments &arguments,
                    Streams streams = Streams::kApart) const;
  ProcessResult poolctl(const Arguments &arguments, Streams streams = Streams::kApart) const {
    return run("poolctl", arguments, streams);
  }

  std::map<std::string, std::string> environment;
  std::string input;  // what the programs read from standard input

 private:
  TempFolder temp_;
  std::filesystem::path etc_;
};

// TEXT without the machine's own folder: each occurrence of WORLD's path becomes "FOLDER".
std::string withoutFolder(std::string text, const World &world);

std::vector<std::string> lines(const std::string &text);

}  // namespace Test

// For the SetUp of a fixture, or the begin of a test, whose programs read /etc/rp.d.
#define SKIP_WITHOUT_PRIVATE_ETC() \
  if (!::Test::privateEtcUnavailable().empty()) GTEST_SKIP() << ::Test::privateEtcUnavailable()
