// SPDX-License-Identifier: Apache-2.0
// poolctl-exec: joins a pool, then executes the command in its own place. So the process id, the
// streams, the signals and the exit status are the command's own.
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <iostream>
#include <memory>
#include <optional>
#include <string>

#include "loader/group_path.h"
#include "pool_membership.h"
#include "shared/version.h"

namespace {

// The same as those of env(1) and of shells.
constexpr int kOwnFailure = 125;
constexpr int kNotExecutable = 126;
constexpr int kNoCommand = 127;

// The parser never sees the command, so its own usage line would not show it.
struct UsageLine : CLI::Formatter {
  std::string make_usage(const CLI::App *, std::string) const override {
    return "Usage: poolctl-exec [OPTIONS] POOL -- COMMAND [ARGUMENT]...\n";
  }
};

int complain(const std::string &text, int status) {
  std::cerr << "poolctl-exec: " << text << std::endl;
  return status;
}

// The index of the first "--", or argc. What follows it is never parsed.
int findSeparator(int argc, char **argv) {
  int at = 1;
  while (at < argc && strcmp(argv[at], "--") != 0) ++at;
  return at;
}

// Returns only if the command was not executed.
int run(int argc, char **argv) {
  CLI::App app("Join a pool and execute a command in it.", "poolctl-exec");
  std::string pool;
  app.formatter(std::make_shared<UsageLine>());
  app.set_version_flag("--version", Tools::versionOf("poolctl-exec"), "Print the version and exit");
  app.add_option("POOL", pool, "A loaded pool: host/..., or NAME for host/opt/NAME")->required();
  std::optional<int> oomScoreAdj;
  app.add_option("--oom-score-adj", oomScoreAdj,
                 "The command's oom_score_adj, instead of the one that the pool's memory minimum "
                 "asks for")
      ->check(CLI::Range(-1000, 1000))
      ->type_name("N");
  app.footer(
      "Exit status: the command's own; 125 the pool could not be joined, or wrong usage;\n"
      "126 the command cannot be executed; 127 it was not found.");

  const int separator = findSeparator(argc, argv);
  try {
    app.parse(separator, argv);
  } catch (const CLI::ParseError &error) {
    return app.exit(error) == 0 ? 0 : kOwnFailure;
  }
  char **command = argv + separator + 1;
  if (separator >= argc || command[0] == nullptr) {
    return complain("no command given (POOL -- COMMAND [ARGUMENT]...)", kOwnFailure);
  }

  try {
    Exec::joinGroup(Loader::groupPath(pool));
    if (oomScoreAdj) Exec::setOomScoreAdj(*oomScoreAdj);
  } catch (const std::exception &error) {
    return complain(error.what(), kOwnFailure);
  }
  execvp(command[0], command);
  const int error = errno;
  return complain(std::string(command[0]) + ": " + strerror(error),
                  error == ENOENT ? kNoCommand : kNotExecutable);
}

}  // namespace

int main(int argc, char **argv) {
  try {
    return run(argc, argv);
  } catch (...) {
    // There may be no memory for a longer message.
    (void)std::fputs("poolctl-exec: out of memory\n", stderr);
    return kOwnFailure;
  }
}
