// poolctl-install: puts definition files in place, marked as installed, or removes them.
#include <CLI/App.hpp>
#include <CLI/Config.hpp>
#include <CLI/Formatter.hpp>
#include <string>
#include <vector>

#include "installer.h"
#include "shared/tool.h"

int main(int argc, char **argv) {
  CLI::App app("Install pool definition files in /etc/rp.d, all that are named or none of them.",
               "poolctl-install");
  bool mark = false;
  bool remove = false;
  std::vector<std::string> operands;
  CLI::Option *const markFlag =
      app.add_flag("--mark", mark, "Mark the files as installed where they stand; copy nothing");
  app.add_flag("--remove", remove, "Remove the installed files of these names")->excludes(markFlag);
  app.add_option("FILE", operands, "Definition files; with --remove, names in /etc/rp.d")
      ->required();
  app.footer(
      "Exit status: 0 done; 1 refused or failed; 2 wrong usage; 3 no such file.\n"
      "Nothing has changed unless it is 0.\n");
  return Tools::runTool(app, argc, argv, [&] {
    if (mark) {
      Install::markFiles(operands);
    } else if (remove) {
      Install::removeFiles(operands);
    } else {
      Install::installFiles(operands);
    }
    return Tools::kExitSuccess;
  });
}
