// SPDX-License-Identifier: Apache-2.0
#include "shared/tool.h"

#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <cstdio>
#include <exception>
#include <iostream>

#include "shared/version.h"

namespace Tools {

namespace {

ExitStatus complain(const CLI::App &app, ExitStatus status, const char *message) {
  std::cerr << app.get_name() << ": " << message << '\n';
  return status;
}

// The parser reports a request for help or for the version as an error too, with exit code 0.
ExitStatus reportParseError(const CLI::App &app, const CLI::ParseError &error) {
  if (error.get_exit_code() == 0) {
    (void)app.exit(error, std::cout, std::cerr);
    return kExitSuccess;
  }
  complain(app, kExitUsage, error.what());
  std::cerr << "Try '" << app.get_name() << " --help'.\n";
  return kExitUsage;
}

ExitStatus act(CLI::App &app, int argc, char **argv, const Action &action) {
  try {
    app.parse(argc, argv);
    if (action) return action();
    throw CLI::RequiredError("a sub-command");
  } catch (const CLI::ParseError &error) {
    return reportParseError(app, error);
  } catch (const Failure &failure) {
    return complain(app, failure.status, failure.what());
  } catch (const std::exception &error) {
    return complain(app, kExitFailure, error.what());
  }
}

}  // namespace

int runTool(const Tool &tool, int argc, char **argv) noexcept {
  try {
    CLI::App app(tool.description, tool.name);
    app.set_version_flag("--version", versionOf(tool.name), "Print the version and exit");
    Action action;
    tool.declareOptions(app, &action);
    const ExitStatus status = act(app, argc, argv, action);
    if (std::cout.flush()) return status;
    return complain(app, kExitFailure, "standard output: cannot be written");
  } catch (...) {
    // Not even the parser could be made: there may be no memory for a longer message.
    (void)std::fprintf(stderr, "%s: out of memory\n", tool.name);
    return kExitFailure;
  }
}

}  // namespace Tools
