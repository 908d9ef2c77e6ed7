// poolctl-install: puts definition files in place, marked as installed, or removes them.
#include <CLI/CLI.hpp>
#include <exception>
#include <iostream>
#include <string>
#include <vector>

#include "installer.h"

int main(int argc, char **argv) {
  CLI::App app("Install pool definition files in /etc/rp.d, all that are named or none of them.",
               "poolctl-install");
  bool mark = false;
  bool remove = false;
  std::vector<std::string> operands;
  app.add_flag("--mark", mark, "Mark the files as installed where they stand; copy nothing");
  app.add_flag("--remove", remove, "Remove the installed files of these names")->excludes("--mark");
  app.add_option("FILE", operands, "Definition files; with --remove names in /etc/rp.d")
      ->required();
  app.footer("Exit status: 0 done; 1 refused or failed, and nothing changed; 2 wrong usage.");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    return app.exit(error) == 0 ? 0 : 2;
  }
  try {
    if (mark) {
      Install::markFiles(operands);
    } else if (remove) {
      Install::removeFiles(operands);
    } else {
      Install::installFiles(operands);
    }
  } catch (const std::exception &error) {
    std::cerr << "poolctl-install: " << error.what() << std::endl;
    return 1;
  }
  return 0;
}
