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

struct Words {
  bool mark = false;
  bool remove = false;
  std::vector<std::string> operands;
};

Tools::ExitStatus act(const Words &words) {
  if (words.mark) {
    Install::markFiles(words.operands);
  } else if (words.remove) {
    Install::removeFiles(words.operands);
  } else {
    Install::installFiles(words.operands);
  }
  return Tools::kExitSuccess;
}

void addWords(CLI::App &app, Tools::Action *action) {
  const auto words = std::make_shared<Words>();
  CLI::Option *const mark = app.add_flag(
      "--mark", words->mark, "Mark the files as installed where they stand; copy nothing");
  app.add_flag("--remove", words->remove, "Remove the installed files of these names")
      ->excludes(mark);
  app.add_option("FILE", words->operands, "Definition files; with --remove, names in /etc/rp.d")
      ->required();
  app.footer(
      "Exit status: 0 done; 1 refused or failed; 2 wrong usage; 3 no such file.\n"
      "Nothing has changed unless it is 0.\n");
  *action = [words] { return act(*words); };
}

}  // namespace

int main(int argc, char **argv) {
  return Tools::runTool(
      {"poolctl-install",
       "Install pool definition files in /etc/rp.d, all that are named or none of them.", addWords},
      argc, argv);
}
