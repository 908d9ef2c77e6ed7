// SPDX-License-Identifier: Apache-2.0
// The manual pages of the tools and of their configuration files: the examples run, and no command
// or key is forgotten.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>

#include "temp_folder.h"
#include "world.h"

namespace {

using ::Test::Command;
using ::Test::ProcessResult;
using ::Test::World;
using testing::HasSubstr;

std::string page(const std::string &name) {
  return ::Test::readFile(std::string(MANUAL_FOLDER) + "/" + name);
}

// The unformatted lines of the section EXAMPLES, as a terminal would show them.
std::string examples(const std::string &name) {
  std::string text = page(name);
  text.erase(0, text.find(".SH EXAMPLES"));
  text.erase(0, text.find(".nf\n") + 4);
  text.erase(text.find(".fi\n"));
  for (size_t at = text.find("\\-"); at != std::string::npos; at = text.find("\\-", at)) {
    text.erase(at, 1);
  }
  return text;
}

// Runs them one after the other in a shell; the first that fails ends it.
ProcessResult runExamples(const std::string &name) {
  const World world;
  Command shell;
  shell.program = "/bin/sh";
  shell.arguments = {"-ec", examples(name)};
  shell.environment = world.environment;
  shell.workingFolder = world.folder();
  return ::Test::run(shell);
}

TEST(ManualPage, KestrelctlsExamplesRun) {
  const ProcessResult result = runExamples("kestrelctl.8");
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_THAT(result.out, HasSubstr("host\tpools\tbackup\t\tsizeMB\tinteger\t2048\n"));
  EXPECT_THAT(result.out, HasSubstr("\n7\n"));
}

TEST(ManualPage, KnobctlsExamplesRun) {
  const ProcessResult result = runExamples("knobctl.8");
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_THAT(result.out, HasSubstr("OF 262144 MB"));
}

TEST(ManualPage, TheConfigurationFilesExamplesAreTaken) {
  for (const auto &[name, tool, file] : {std::tuple("kestrel.conf.5", "kestrelctl", "kestrel.conf"),
                                         std::tuple("knob.conf.5", "knobctl", "knob.conf")}) {
    World world;
    ::Test::writeFile(world.folder() / file, examples(name));
    const ProcessResult result = world.run(tool, {"status"});
    EXPECT_THAT(result.out, HasSubstr("/tmp/try/")) << result.err;
  }
}

// The names of the sub-commands, from the tool's own help.
std::vector<std::string> commandsOf(const std::string &tool) {
  const World world;
  std::vector<std::string> names;
  bool inList = false;
  for (const std::string &line : ::Test::lines(world.run(tool, {"--help"}).out)) {
    if (inList && line.size() > 2) names.push_back(line.substr(2, line.find(' ', 2) - 2));
    inList = inList || line == "Subcommands:";
  }
  return names;
}

TEST(ManualPage, EveryCommandIsExplained) {
  for (const std::string tool : {"kestrelctl", "knobctl"}) {
    const std::vector<std::string> names = commandsOf(tool);
    EXPECT_GT(names.size(), 6U);
    for (const std::string &name : names) {
      EXPECT_THAT(page(tool + ".8"), HasSubstr("\n.B " + tool + " " + name + "\n"));
      EXPECT_THAT(page(tool + ".8"), HasSubstr("\n.TP\n.B " + name + "\n"));
    }
  }
}

}  // namespace
