// SPDX-License-Identifier: Apache-2.0
// poolctl-install: puts definition files in place, marked as installed, or removes them.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <memory>
#include <string>
#include <vector>

#include "installer.h"
#include "shared/tool.h"

namespace {

struct Options {
  bool mark = false;
  bool remove = false;
  bool force = false;
  std::vector<std::string> operands;
};

Tools::ExitStatus act(const Options &options) {
  if (options.mark) {
    Install::markFiles(options.operands);
  } else if (options.remove) {
    Install::removeFiles(options.operands);
  } else {
    Install::installFiles(options.operands,
                          options.force ? Install::Errors::kReport : Install::Errors::kRefuse);
  }
  return Tools::kExitSuccess;
}

void declareOptions(CLI::App &app, Tools::Action *action) {
  const auto options = std::make_shared<Options>();
  CLI::Option *const mark = app.add_flag(
      "--mark", options->mark, "Mark the files as installed where they are; copy nothing");
  CLI::Option *const remove =
      app.add_flag("--remove", options->remove, "Remove the installed files of these names")
          ->excludes(mark);
  app.add_flag("--force", options->force, "Install files with errors all the same")
      ->excludes(mark)
      ->excludes(remove);
  app.add_option("FILE", options->operands, "Definition files; with --remove, names in /etc/rp.d")
      ->required();
  app.footer(
      "Exit status: 0 done; 1 refused or failed; 2 wrong usage; 3 no such file;\n"
      "4 another run of poolctl-install is in the way.\n"
      "Nothing has changed unless it is 0.\n");
  *action = [options] { return act(*options); };
}

}  // namespace

int main(int argc, char **argv) {
  return Tools::runTool(
      {"poolctl-install",
       "Install pool definition files in /etc/rp.d, all that are named or none of them.",
       declareOptions},
      argc, argv);
}
