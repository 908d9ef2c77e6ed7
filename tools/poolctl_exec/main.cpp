// SPDX-License-Identifier: Apache-2.0
// poolctl-exec: joins a pool, then becomes the command. Nothing of it stays between the command and
// whoever started it: the process id, the streams, the signals and the exit status are the
// command's own.
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

#include "pool_membership.h"

namespace {

// As shells and env(1) have them.
constexpr int kOwnFailure = 125;
constexpr int kNotExecutable = 126;
constexpr int kNoCommand = 127;

// The command is no argument of ours, so the library doesn't know that it belongs to the line.
struct UsageLine : CLI::Formatter {
  std::string make_usage(const CLI::App *, std::string) const override {
    return "Usage: poolctl-exec [OPTIONS] POOL -- COMMAND [ARGUMENT]...\n";
  }
};

int complain(const std::string &text, int status) {
  std::cerr << "poolctl-exec: " << text << std::endl;
  return status;
}

// The place of the first "--", or argc. What stands behind it is never read as anything of ours.
int findSeparator(int argc, char **argv) {
  int at = 1;
  while (at < argc && strcmp(argv[at], "--") != 0) ++at;
  return at;
}

// Answers only when the command could not be become.
int run(int argc, char **argv) {
  CLI::App app("Join a pool and become a command.", "poolctl-exec");
  std::string pool;
  app.formatter(std::make_shared<UsageLine>());
  app.add_option("POOL", pool, "A loaded pool: host/..., or NAME for host/opt/NAME")->required();
  std::optional<int> oomScoreAdj;
  app.add_option("--oom-score-adj", oomScoreAdj,
                 "The command's oom_score_adj, instead of the one that the pool's memory minimum "
                 "asks for")
      ->check(CLI::Range(-1000, 1000))
      ->type_name("N");
  app.footer(
      "Exit status: the command's own; 125 the pool could not be joined, or wrong usage;\n"
      "126 the command cannot be run; 127 there is no such command.");

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
    Exec::joinGroup(Exec::groupPath(pool));
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
    // Whatever goes wrong with the very frame: there may be no memory to say more.
    (void)std::fputs("poolctl-exec: out of memory\n", stderr);
    return kOwnFailure;
  }
}
