// SPDX-License-Identifier: Apache-2.0
// The checks of scripts/lint that are this project's own: each finds what it is there for.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include "world.h"

namespace Test {
namespace {

namespace fs = std::filesystem;
using testing::HasSubstr;

// What the layout check prints about a source file of that content.
std::string layout(const World &world, const std::string &content) {
  writeFile(world.folder() / "file.cpp", content);
  return world.run("/usr/bin/awk", {"-f", SOURCE_FOLDER "/scripts/lint.d/layout.awk", "file.cpp"})
      .out;
}

TEST(LayoutCheck, AcceptsAFileInOrder) {
  const World world;
  writeFile(world.folder() / "file.h", "#pragma once\n");
  EXPECT_EQ(layout(world,
                   "#include \"file.h\"\n\n#include <string>\n\n"
                   "void f() {\n  if (true) g();\n  for (;;)\n    g();\n}\n\nvoid g() {}\n"),
            "");
}

TEST(LayoutCheck, FindsAnOwnHeaderThatIsNotFirst) {
  const World world;
  writeFile(world.folder() / "file.h", "#pragma once\n");
  EXPECT_EQ(layout(world, "#include <string>\n#include \"file.h\"\n"),
            "file.cpp:1: the file's own header is to be included first\n");
}

TEST(LayoutCheck, FindsALongBodyWithoutBraces) {
  EXPECT_EQ(layout(World(), "void f() {\n  for (;;)\n    if (g())\n      h();\n}\n"),
            "file.cpp:2: a body of several lines needs braces\n");
}

TEST(LayoutCheck, FindsDefinitionsWithoutABlankLineBetween) {
  EXPECT_EQ(layout(World(), "void f() {\n  g();\n}\nvoid g() {\n  f();\n}\n"),
            "file.cpp:4: a blank line is missing before a definition\n");
}

TEST(LayoutCheck, FindsABlankLineBeforeAClosingBrace) {
  EXPECT_EQ(layout(World(), "void f() {\n  {\n    g();\n\n  }\n}\n"),
            "file.cpp:4: a blank line before a closing brace\n");
}

TEST(LayoutCheck, FindsBlanksAtTheEndOfALine) {
  EXPECT_EQ(layout(World(), "int a; \n"), "file.cpp:1: blanks at the end of the line\n");
}

// A tree of its own with the lint scripts, under version control as they expect it.
class TreeCheck : public testing::Test {
 protected:
  TreeCheck() {
    fs::create_directories(world.folder() / "docs/man");
    fs::create_directories(world.folder() / "scripts");
    fs::copy(SOURCE_FOLDER "/scripts/lint.d", world.folder() / "scripts/lint.d");
  }

  ProcessResult check(const std::string &script) {
    for (const Arguments &arguments : {Arguments{"init", "-q"}, Arguments{"add", "-A"}})
      EXPECT_EQ(world.run("/usr/bin/git", arguments).status, 0);
    return world.run((world.folder() / "scripts/lint.d" / script).string(), {});
  }

  World world;
};

TEST_F(TreeCheck, LinksThatLeadSomewhereAreAccepted) {
  writeFile(world.folder() / "docs/page.md", "# A Heading, here\n");
  writeFile(world.folder() / "README.md",
            "[a](docs/page.md) [b](docs/page.md#a-heading-here) [c](https://example.org/x) "
            "`docs/page.md` `docs/*.md`\n");
  const ProcessResult result = check("links");
  EXPECT_EQ(result.out, "");
  EXPECT_EQ(result.status, 0) << result.err;
}

TEST_F(TreeCheck, LinksThatLeadNowhereAreFound) {
  writeFile(world.folder() / "README.md", "# Title\n\n[a](none.md) [b](#none)\n`src/none.cpp`\n");
  writeFile(world.folder() / "docs/man/poolctl.8", ".BR poolctl\\-none (8)\n.BR systemd (1)\n");
  const ProcessResult result = check("links");
  EXPECT_EQ(result.out,
            "README.md:3: leads nowhere: none.md\nREADME.md:3: leads nowhere: #none\n"
            "README.md:4: leads nowhere: src/none.cpp\n"
            "docs/man/poolctl.8:1: leads nowhere: poolctl-none.8\n");
  EXPECT_EQ(result.status, 1);
}

TEST_F(TreeCheck, AHeaderThatDoesNotCompileAloneIsFound) {
  writeFile(world.folder() / "good.h", "#pragma once\n#include <string>\nextern std::string a;\n");
  EXPECT_EQ(check("headers").status, 0);
  writeFile(world.folder() / "bad.h", "#pragma once\nextern std::string b;\n");
  const ProcessResult result = check("headers");
  EXPECT_NE(result.status, 0);
  EXPECT_THAT(result.err, HasSubstr("bad.h"));
}

}  // namespace
}  // namespace Test
