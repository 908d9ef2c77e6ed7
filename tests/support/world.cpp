// SPDX-License-Identifier: Apache-2.0
#include "world.h"

#include <cstdlib>
#include <sstream>

namespace Test {

namespace fs = std::filesystem;

namespace {

// Adds the variables of the tests' own environment that the built programs need: for sanitizers,
// coverage, and a yaml library outside the system's folders.
void inheritBuildVariables(std::map<std::string, std::string> *environment) {
  for (const char *name : {"ASAN_OPTIONS", "UBSAN_OPTIONS", "LSAN_OPTIONS", "TSAN_OPTIONS",
                           "GCOV_PREFIX", "GCOV_PREFIX_STRIP", "LD_LIBRARY_PATH"})
    if (const char *value = getenv(name)) (*environment)[name] = value;
  // Lets a preloaded stand-in come before the sanitizer's runtime.
  std::string &asan = (*environment)["ASAN_OPTIONS"];
  asan += std::string(asan.empty() ? "" : ":") + "verify_asan_link_order=0";
}

}  // namespace

fs::path binFolder() {
  const char *other = getenv("POOLCTL_BIN");
  return other == nullptr || *other == 0 ? BIN_FOLDER : other;
}

fs::path standInFolder(const std::string &name) {
  return fs::path(STAND_INS_FOLDER) / name;
}

World::World() {
  const std::string own = folder().string();
  environment = {{"PATH", binFolder().string() + ":/usr/sbin:/usr/bin:/sbin:/bin"},
                 {"LC_ALL", "C"},
                 {"HOME", own},
                 {"TMPDIR", own},
                 {"XDG_RUNTIME_DIR", own},
                 {"XDG_DATA_HOME", own},
                 {"KNOB_CONF", own + "/knob.conf"},
                 {"KESTREL_CONF", own + "/kestrel.conf"}};
  inheritBuildVariables(&environment);
  writeFile(folder() / "knob.conf", "kernel = emulated\nstate = " + own + "/kernel.db\n");
  writeFile(folder() / "kestrel.conf", "store = sqlite\npath = " + own + "/store.db\n");
}

World::~World() {
  if (!etc_.empty()) removePrivateEtc(etc_);
}

fs::path World::file(const std::string &name, std::string_view yaml) {
  const fs::path path = folder() / name;
  writeFile(path, yaml);
  setInstalledMark(path);
  return path;
}

const fs::path &World::etc() {
  if (etc_.empty()) {
    makePrivateEtc(folder() / "etc");
    etc_ = folder() / "etc";
  }
  return etc_;
}

fs::path World::rpD() {
  const fs::path path = etc() / "rp.d";
  fs::create_directory(path);
  return path;
}

void World::definition(const std::string &name, std::string_view yaml) {
  const fs::path path = rpD() / name;
  writeFile(path, yaml);
  setInstalledMark(path);
}

ProcessResult World::run(const std::string &program, const Arguments &arguments,
                         Streams streams) const {
  Command command;
  command.program = program.front() == '/' ? fs::path(program) : binFolder() / program;
  command.arguments = arguments;
  command.environment = environment;
  command.input = input;
  command.workingFolder = folder();
  command.etc = etc_;
  command.streams = streams;
  return Test::run(command);
}

std::string withoutFolder(std::string text, const World &world) {
  const std::string own = world.folder().string();
  for (size_t at = text.find(own); at != std::string::npos; at = text.find(own, at))
    text.replace(at, own.size(), "FOLDER");
  return text;
}

std::vector<std::string> lines(const std::string &text) {
  std::vector<std::string> result;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) result.push_back(line);
  return result;
}

}  // namespace Test
