// SPDX-License-Identifier: Apache-2.0
// Which definition files are read, and the message of each way in which one can be bad. Seen
// through the list command in CSV form.
#include "cli_fixture.h"

namespace Test {
namespace {

namespace fs = std::filesystem;

std::string pool(const std::string &name) {
  return name + ",yes,0,-,-,-,0,-,1000\n";
}

class DefinitionFiles : public Cli {
 protected:
  void expectError(const std::string &path, const std::string &message) {
    expectRun(world.poolctl({"list", "-v", path}), 1, kCsvHeader, path + ": " + message + "\n");
  }

  // The message for a definition file of that content.
  void expectBad(const std::string &yaml, const std::string &message) {
    expectError(world.file("bad.yaml", yaml), message);
  }
};

class RpD : public CliWithRpD {
 protected:
  ProcessResult list() { return world.poolctl({"list", "-v"}); }
};

TEST_F(DefinitionFiles, WithoutTheMarkAreNotInstalled) {
  const fs::path path = world.folder() / "a.yaml";
  writeFile(path, "- name: a\n");
  expectError(path, "is not installed");
}

TEST_F(DefinitionFiles, ThatDoNotExistAreNotInstalled) {
  expectError(world.folder() / "none.yaml", "is not installed");
}

TEST_F(DefinitionFiles, AnEmptyNameIsNotInstalled) {
  expectError("", "is not installed");
}

TEST_F(DefinitionFiles, AreTestedForTheMarkBeforeTheyAreParsed) {
  const fs::path path = world.folder() / "a.yaml";
  writeFile(path, "[unfinished");
  expectError(path, "is not installed");
}

class MarkOfAnotherValue : public testing::TestWithParam<std::string> {};

TEST_P(MarkOfAnotherValue, IsNoMark) {
  StandInWorld world;
  const fs::path path = world.folder() / "a.yaml";
  writeFile(path, "- name: a\n");
  setInstalledMark(path, GetParam());
  expectRun(world.poolctl({"list", "-v", path}), 1, kCsvHeader,
            path.string() + ": is not installed\n");
}

INSTANTIATE_TEST_SUITE_P(Values, MarkOfAnotherValue,
                         testing::Values(std::string(), std::string(1, '\0'), std::string("1"),
                                         std::string("\x02"), std::string("\x01\x01"),
                                         std::string("\x01\0", 2)));

TEST_F(DefinitionFiles, RelativePathsStayRelative) {
  world.file("a.yaml", "- b\n");
  expectRun(world.poolctl({"list", "-v", "./a.yaml"}), 1, kCsvHeader,
            "./a.yaml: line 1 column 3: expected a map\n");
}

TEST_F(DefinitionFiles, NamedThroughALinkAreRead) {
  fs::create_symlink(world.file("a.yaml", "- name: a\n"), world.folder() / "link");
  EXPECT_EQ(world.poolctl({"list", "-v", "link"}).out, kCsvHeader + pool("host/opt/a"));
}

TEST_F(DefinitionFiles, ThatAreHiddenAreReadWhenNamed) {
  world.file(".hidden", "- name: a\n");
  EXPECT_EQ(world.poolctl({"list", "-v", ".hidden"}).out, kCsvHeader + pool("host/opt/a"));
}

TEST_F(DefinitionFiles, ThatHoldNoSequenceDeclareNoPools) {
  for (const char *content : {"", "\n# a comment\n", "~\n", "a word\n", "[]\n", "---\n...\n"})
    expectRun(world.poolctl({"list", "-v", world.file("a.yaml", content)}), 0, kCsvHeader, "");
}

TEST_F(DefinitionFiles, CountWithTheirFirstDocumentAlone) {
  const auto file = world.file("a.yaml", "- name: a\n---\n- name: b\n--- {broken\n");
  EXPECT_EQ(world.poolctl({"list", "-v", file}).out, kCsvHeader + pool("host/opt/a"));
}

TEST_F(DefinitionFiles, WithAMappingAtTheTopHoldAnInvalidNode) {
  expectBad("name: a\n",
            "invalid node; this may result from using a map iterator as a sequence iterator, or "
            "vice-versa");
}

TEST_F(DefinitionFiles, WithASyntaxErrorNameItsPlaceCountedFromOne) {
  expectBad("- name: a\n- name: b\n  x:y: z: a\n", "line 3 column 9: illegal map value");
}

TEST_F(DefinitionFiles, WithASyntaxErrorAtTheThirdLinesFifthColumnSaySo) {
  expectBad("- name: a\n- name: b\n-   @\n", "line 3 column 5: unknown token");
}

TEST_F(DefinitionFiles, ThatCannotBeReadAreBadFilesWithoutAPlace) {
  const auto file = world.file("a.yaml", "- name: a\n");
  world.hostCalls();
  world.environment["HOST_CALLS_UNREADABLE"] = file;
  expectError(file, "bad file");
}

TEST_F(DefinitionFiles, ThatAreFoldersAreErrorsOfTheFile) {
  const fs::path path = world.folder() / "folder";
  fs::create_directory(path);
  setInstalledMark(path);
  // The yaml library loses the buffer of a stream that throws while it is opened.
  world.environment["ASAN_OPTIONS"] += ":detect_leaks=0";
  const ProcessResult result = world.poolctl({"list", "-v", path});
  EXPECT_EQ(result.status, 1);
  EXPECT_EQ(result.err.substr(0, path.string().size() + 2), path.string() + ": ");
  EXPECT_EQ(lines(result.err).size(), 1u);
}

TEST_F(DefinitionFiles, TheFirstBadFileEndsTheLoad) {
  const auto bad = world.file("bad.yaml", "- b\n"), worse = world.file("worse.yaml", "{");
  const ProcessResult result = world.poolctl({"list", "-v", bad, worse});
  expectRun(result, 1, kCsvHeader, bad.string() + ": line 1 column 3: expected a map\n");
}

TEST_F(DefinitionFiles, ReportAKernelThatTellsNoFactsWithoutAPlace) {
  world.knob("fail node=system_vmLimits status=0x0bad0001");
  expectBad("- name: a\n", "KNOB_Get failed");
  EXPECT_EQ(world.kernelCalls().size(), 2u);
}

TEST_F(DefinitionFiles, NeedNoFactsOfTheMachineWithoutPools) {
  world.knob("fail function=KNOB_Get status=0x0bad0001");
  expectRun(world.poolctl({"list", "-v", world.file("a.yaml", "[]\n")}), 0, kCsvHeader, "");
}

struct BadPool {
  const char *name, *yaml, *message;
};

class BadDefinition : public testing::TestWithParam<BadPool> {};

TEST_P(BadDefinition, IsReportedWithItsPlace) {
  StandInWorld world;
  const auto path = world.file("bad.yaml", GetParam().yaml);
  expectRun(world.poolctl({"list", "-v", path}), 1, kCsvHeader,
            path.string() + ": " + GetParam().message + "\n");
}

INSTANTIATE_TEST_SUITE_P(
    Each, BadDefinition,
    testing::Values(
        BadPool{"ItemThatIsAWord", "- name: a\n- b\n", "line 2 column 3: expected a map"},
        BadPool{"ItemThatIsASequence", "- [a]\n", "line 1 column 3: expected a map"},
        BadPool{"ItemWithoutContent", "- name: a\n- ~\n", "line 2 column 3: expected a map"},
        BadPool{"UnknownKey", "- name: a\n  color: 1\n", "line 2 column 3: invalid rp field"},
        BadPool{"CpuMinLimit", "- {name: a, cpuMinLimit: 1}\n",
                "line 1 column 13: invalid rp field"},
        BadPool{"CapitalName", "- Name: a\n", "line 1 column 3: invalid rp field"},
        BadPool{"KeyThatIsASequence", "- name: a\n  ? [b]\n  : 1\n",
                "line 2 column 5: bad conversion"},
        BadPool{"NoName", "- mem: 1\n", "line 1 column 3: rp missing name"},
        BadPool{"EmptyName", "- name: ''\n", "line 1 column 3: rp missing name"},
        BadPool{"EmptyItem", "- {}\n", "line 1 column 3: rp missing name"},
        BadPool{"NameThatIsNull", "- name: ~\n", "line 1 column 9: bad conversion"},
        BadPool{"NameThatIsASequence", "- name: [a]\n", "line 1 column 9: bad conversion"},
        BadPool{"NumberWithAUnit", "- {name: a, mem: 12 MB}\n", "line 1 column 18: bad conversion"},
        BadPool{"HexadecimalNumber", "- {name: a, mem: 0x10}\n",
                "line 1 column 18: bad conversion"},
        BadPool{"QuotedNumber", "- {name: a, mem: \"5\"}\n", "line 1 column 18: Unexpected tag !"},
        BadPool{"OtherTag", "- {name: a, mem: !math 3}\n",
                "line 1 column 18: Unexpected tag !math"},
        BadPool{"NumberThatIsASequence", "- {name: a, mem: [1]}\n",
                "line 1 column 18: Node is not a scalar."},
        BadPool{"NoTruthValue", "- {name: a, isEnabled: maybe}\n",
                "line 1 column 24: bad conversion"},
        BadPool{"UnknownVariable", "- {name: a, mem: !calc foo + 1}\n",
                "line 1 column 18: unexpected symbol: foo at 'foo + 1'"},
        BadPool{"UnfinishedExpression", "- {name: a, mem: !calc 2 +}\n",
                "line 1 column 18: Missing numeric value. at ''"},
        BadPool{"ConfigWithoutDefault", "- {name: a, mem: !config {object: [a, b, c]}}\n",
                "line 1 column 18: missing default"}),
    [](const auto &bad) { return std::string(bad.param.name); });

TEST_F(RpD, HiddenFilesLinksAndFoldersAreSkipped) {
  world.definition("a.yaml", "- name: a\n");
  world.definition(".hidden", "- name: hidden\n");
  fs::create_symlink(world.file("elsewhere.yaml", "- name: linked\n"), world.rpD() / "link.yaml");
  fs::create_directory(world.rpD() / "folder");
  setInstalledMark(world.rpD() / "folder");
  expectRun(list(), 0, kCsvHeader + pool("host/opt/a"), "");
}

TEST_F(RpD, FilesOfAnySuffixAreRead) {
  world.definition("a", "- name: a\n");
  world.definition("b.txt", "- name: b\n");
  world.definition("c~", "- name: c\n");
  expectRun(list(), 0, kCsvHeader + pool("host/opt/a") + pool("host/opt/b") + pool("host/opt/c"),
            "");
}

TEST_F(RpD, AFileWithoutTheMarkFailsEveryLoad) {
  world.definition("a.yaml", "- name: a\n");
  writeFile(world.rpD() / "b.yaml", "- name: b\n");
  expectRun(list(), 1, kCsvHeader, "/etc/rp.d/b.yaml: is not installed\n");
}

TEST_F(RpD, AnErrorNamesTheFileBelowTheFolder) {
  world.definition("b.yaml", "- c\n");
  expectRun(list(), 1, kCsvHeader, "/etc/rp.d/b.yaml: line 1 column 3: expected a map\n");
}

TEST_F(RpD, TwoFilesMayDeclareOneName) {
  world.definition("a.yaml", "- name: a\n");
  world.definition("b.yaml", "- name: a\n");
  expectRun(list(), 0, kCsvHeader + pool("host/opt/a") + pool("host/opt/a"), "");
}

TEST_F(RpD, PoolsAreSortedByteByByte) {
  world.definition("a.yaml", "- name: b\n- name: a/b\n- name: a\n- name: a-b\n- name: Z\n");
  EXPECT_EQ(list().out, kCsvHeader + pool("host/opt/Z") + pool("host/opt/a") +
                            pool("host/opt/a-b") + pool("host/opt/a/b") + pool("host/opt/b"));
}

TEST_F(RpD, IsNotReadWhenFilesAreNamed) {
  writeFile(world.rpD() / "unmarked.yaml", "");
  expectRun(world.poolctl({"list", "-v", world.file("a.yaml", "[]\n")}), 0, kCsvHeader, "");
}

TEST(RpDThatIsMissing, IsAnErrorWithoutNamedFilesAlone) {
  SKIP_WITHOUT_PRIVATE_ETC();
  StandInWorld world;
  world.etc();
  expectRun(world.poolctl({"list", "-v"}), 1, kCsvHeader, "/etc/rp.d: No such file or directory\n");
  expectRun(world.poolctl({"list", "-v", world.file("a.yaml", "[]\n")}), 0, kCsvHeader, "");
}

TEST(RpDThatIsAFile, IsAnError) {
  SKIP_WITHOUT_PRIVATE_ETC();
  StandInWorld world;
  writeFile(world.etc() / "rp.d", "");
  expectRun(world.poolctl({"list", "-v"}), 1, kCsvHeader, "/etc/rp.d: Not a directory\n");
}

TEST_F(DefinitionFiles, NamesGetTheirFullPathOnceAndAreOtherwiseKept) {
  const auto file = world.file("a.yaml",
                               "- name: host/x\n- name: host\n- name: hostx/y\n- name: a//b/\n"
                               "- name: a b\n- name: !calc c\n- name: /d\n");
  EXPECT_EQ(world.poolctl({"list", "-v", file}).out,
            kCsvHeader + pool("host/opt//d") + pool("host/opt/a b") + pool("host/opt/a//b/") +
                pool("host/opt/c") + pool("host/opt/host") + pool("host/opt/hostx/y") +
                pool("host/x"));
}

}  // namespace
}  // namespace Test
