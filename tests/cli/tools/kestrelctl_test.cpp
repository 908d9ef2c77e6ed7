// SPDX-License-Identifier: Apache-2.0
// kestrelctl as its users run it: what each command prints, returns and changes, byte for byte.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <string>

#include "temp_folder.h"
#include "world.h"

namespace {

using ::Test::Arguments;
using ::Test::lines;
using ::Test::ProcessResult;
using ::Test::readFile;
using ::Test::withoutFolder;
using ::Test::World;
using ::Test::writeFile;
using testing::HasSubstr;
using testing::StartsWith;
namespace fs = std::filesystem;

constexpr const char *kExport =
    "- component: host\n"
    "  group: pools\n"
    "  key: backup\n"
    "  fields:\n"
    "    big: 9223372036854775807\n"
    "    name: \"quoted \\\"x\\\"\\nline\"\n"
    "    \"off\": false\n"
    "    ratio: 0.1\n"
    "    seven: \"7\"\n"
    "    whole: 7.0\n"
    "- component: host\n"
    "  group: pools\n"
    "  key: backup\n"
    "  extra: x\n"
    "  fields:\n"
    "    none: \"\"\n";

class Kestrelctl : public testing::Test {
 protected:
  ProcessResult run(const Arguments &arguments) const {
    return world_.run("kestrelctl", arguments);
  }

  // Runs a command that must succeed without a word on standard error; what it printed.
  std::string out(const Arguments &arguments) const {
    const ProcessResult result = run(arguments);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.err, "");
    return result.out;
  }

  // Runs a command that must fail with this status and print nothing; what it said.
  std::string err(int status, const Arguments &arguments) const {
    const ProcessResult result = run(arguments);
    EXPECT_EQ(result.status, status);
    EXPECT_EQ(result.out, "");
    return withoutFolder(result.err, world_);
  }

  void set(const std::string &field, const std::string &value) const {
    EXPECT_EQ(out({"set", "host", "pools", "backup", field, "--", value}), "");
  }

  std::string get(const std::string &field) const {
    return out({"get", "host", "pools", "backup", field});
  }

  std::string path(const std::string &name) const { return (world_.folder() / name).string(); }

  World world_;
};

TEST_F(Kestrelctl, SetValuesComeBackWithALineEnd) {
  for (const char *value : {"7",
                            "-7",
                            "0.5",
                            "-0.25",
                            "true",
                            "false",
                            "some text",
                            "",
                            "a\nb",
                            "\"",
                            "'",
                            "gr\xc3\xbcn \xe6\xbc\xa2",
                            "{}",
                            "[]",
                            "[a,b]",
                            "%%",
                            "--",
                            "--type",
                            "9223372036854775807",
                            "`x`",
                            "a\\tb"}) {
    set("x", value);
    EXPECT_EQ(get("x"), std::string(value) + "\n");
  }
}

TEST_F(Kestrelctl, TheFormOfAValueDecidesItsType) {
  set("a", "7");
  set("b", "0.5");
  set("c", "1e3");
  set("d", "true");
  set("e", "7 MB");
  EXPECT_EQ(out({"get", "host", "pools", "backup"}),
            "a\tinteger\t7\n"
            "b\treal\t0.5\n"
            "c\treal\t1000.0\n"
            "d\tboolean\ttrue\n"
            "e\ttext\t7 MB\n");
}

TEST_F(Kestrelctl, TheTypeCanBeGiven) {
  EXPECT_EQ(out({"set", "a", "b", "c", "r", "7", "--type", "real"}), "");
  EXPECT_EQ(out({"set", "a", "b", "c", "t", "7", "--type=text"}), "");
  EXPECT_EQ(out({"set", "--type", "real", "a", "b", "c", "n", "nan"}), "");
  EXPECT_EQ(out({"set", "a", "b", "c", "i", "+7", "--type", "integer"}), "");
  EXPECT_EQ(out({"set", "a", "b", "c", "l", "true", "--type", "boolean"}), "");
  EXPECT_EQ(out({"get", "a", "b", "c"}),
            "i\tinteger\t7\nl\tboolean\ttrue\nn\treal\tnan\nr\treal\t7.0\nt\ttext\t7\n");
}

TEST_F(Kestrelctl, AValueThatIsNotOfItsTypeIsAUsageErrorAndMakesNoStore) {
  EXPECT_EQ(err(2, {"set", "a", "b", "c", "x", "7.5", "--type", "integer"}),
            "kestrelctl: \"7.5\" is not an integer\n");
  EXPECT_EQ(err(2, {"set", "a", "b", "c", "x", "9223372036854775808"}),
            "kestrelctl: \"9223372036854775808\" does not fit into 64 bits\n");
  EXPECT_EQ(err(2, {"set", "a", "b", "c", "x", "1", "--type", "date"}),
            "kestrelctl: --type: \"date\" is none of integer, real, boolean or text\n");
  EXPECT_EQ(err(2, {"set", "a", "b", "c", "x", "\xff"}), "kestrelctl: the text is not UTF-8\n");
  EXPECT_EQ(err(2, {"set", "a", "\xff", "c", "x", "1"}), "kestrelctl: the group is not UTF-8\n");
  EXPECT_EQ(err(2, {"set", "a", "b", "c", "", "1"}), "kestrelctl: the field's name is empty\n");
  EXPECT_FALSE(fs::exists(path("store.db")));
}

TEST_F(Kestrelctl, ExtraNamesAnotherObject) {
  EXPECT_EQ(out({"set", "a", "b", "c", "x", "1"}), "");
  EXPECT_EQ(out({"set", "a", "b", "c", "x", "2", "--extra", "e"}), "");
  EXPECT_EQ(out({"get", "a", "b", "c", "x"}), "1\n");
  EXPECT_EQ(out({"get", "a", "b", "c", "x", "--extra", "e"}), "2\n");
  EXPECT_EQ(out({"delete", "a", "b", "c", "--extra", "e"}), "");
  EXPECT_EQ(out({"get", "a", "b", "c", "x"}), "1\n");
}

TEST_F(Kestrelctl, WordsThatAreCommandsAndEmptyWordsAreNamesToo) {
  EXPECT_EQ(out({"set", "list", "set", "get", "delete", "export"}), "");
  EXPECT_EQ(out({"set", "", "", "", "f", ""}), "");
  EXPECT_EQ(out({"get", "list", "set", "get", "delete"}), "export\n");
  EXPECT_EQ(out({"get", "", "", "", "f"}), "\n");
}

TEST_F(Kestrelctl, WhatDoesNotExistIsStatus3) {
  EXPECT_EQ(err(3, {"get", "a", "b", "c", "x"}),
            "kestrelctl: FOLDER/store.db: there is no store\n");
  EXPECT_EQ(err(3, {"delete", "a", "b", "c"}), "kestrelctl: FOLDER/store.db: there is no store\n");
  EXPECT_EQ(err(3, {"list"}), "kestrelctl: FOLDER/store.db: there is no store\n");
  EXPECT_EQ(err(3, {"export"}), "kestrelctl: FOLDER/store.db: there is no store\n");
  EXPECT_FALSE(fs::exists(path("store.db")));
  set("x", "1");
  EXPECT_EQ(err(3, {"get", "a", "b", "c"}), "kestrelctl: a/b/c: no such object\n");
  EXPECT_EQ(err(3, {"get", "host", "pools", "backup", "y"}),
            "kestrelctl: host/pools/backup: no such field: y\n");
  EXPECT_EQ(err(3, {"get", "host", "pools", "backup", "--extra", "\t"}),
            "kestrelctl: host/pools/backup/\\t: no such object\n");
  EXPECT_EQ(err(3, {"delete", "host", "pools", "backup", "y"}),
            "kestrelctl: host/pools/backup: no such field: y\n");
  EXPECT_EQ(err(3, {"delete", "a", "b", "c"}), "kestrelctl: a/b/c: no such object\n");
}

TEST_F(Kestrelctl, DeleteTakesAFieldOrAnObject) {
  set("x", "1");
  set("y", "2");
  EXPECT_EQ(out({"delete", "host", "pools", "backup", "x"}), "");
  EXPECT_EQ(out({"get", "host", "pools", "backup"}), "y\tinteger\t2\n");
  EXPECT_EQ(out({"delete", "host", "pools", "backup"}), "");
  EXPECT_EQ(out({"list"}), "");
}

TEST_F(Kestrelctl, ListPrintsOneFieldALineAndEscapesWhatWouldBreakIt) {
  set("x", "a\tb\nc\\d");
  EXPECT_EQ(out({"set", "host", "other", "k", "y", "0.5", "--extra", "e"}), "");
  EXPECT_EQ(out({"set", "fleet", "pools", "k", "z", "1"}), "");
  EXPECT_EQ(out({"list"}),
            "fleet\tpools\tk\t\tz\tinteger\t1\n"
            "host\tother\tk\te\ty\treal\t0.5\n"
            "host\tpools\tbackup\t\tx\ttext\ta\\tb\\nc\\\\d\n");
  EXPECT_EQ(out({"list", "fleet"}), "fleet\tpools\tk\t\tz\tinteger\t1\n");
  EXPECT_EQ(out({"list", "host", "other"}), "host\tother\tk\te\ty\treal\t0.5\n");
  EXPECT_EQ(out({"list", "nobody"}), "");
  EXPECT_EQ(out({"list", ""}), "");
}

TEST_F(Kestrelctl, AnExportedStoreComesBackByteForByte) {
  writeFile(path("in.yaml"), kExport);
  EXPECT_EQ(out({"import", path("in.yaml")}), "");
  EXPECT_EQ(out({"export"}), kExport);
  EXPECT_EQ(out({"export", "-"}), kExport);
  EXPECT_EQ(out({"export", path("out.yaml")}), "");
  EXPECT_EQ(readFile(path("out.yaml")), kExport);
}

TEST_F(Kestrelctl, ImportReadsStandardInput) {
  world_.input = "- {component: c, group: g, key: k, fields: {x: 1}}\n";
  EXPECT_EQ(out({"import", "-"}), "");
  EXPECT_EQ(out({"get", "c", "g", "k", "x"}), "1\n");
}

TEST_F(Kestrelctl, ImportPutsWholeObjectsInPlaceAndLeavesOthers) {
  set("x", "1");
  EXPECT_EQ(out({"set", "a", "b", "c", "x", "1"}), "");
  writeFile(path("in.yaml"), "- {component: host, group: pools, key: backup, fields: {y: 2}}\n");
  EXPECT_EQ(out({"import", path("in.yaml")}), "");
  EXPECT_EQ(out({"list"}),
            "a\tb\tc\t\tx\tinteger\t1\n"
            "host\tpools\tbackup\t\ty\tinteger\t2\n");
}

TEST_F(Kestrelctl, AnImportThatIsWrongAnywhereChangesNothing) {
  set("x", "1");
  writeFile(path("in.yaml"),
            "- {component: host, group: pools, key: backup, fields: {y: 2}}\n"
            "- {component: host, group: pools, key: second, fields: {z: [1]}}\n");
  EXPECT_EQ(err(1, {"import", path("in.yaml")}),
            "kestrelctl: FOLDER/in.yaml:2:60: a field is an integer, a real, a truth value or a "
            "text\n");
  EXPECT_EQ(out({"list"}), "host\tpools\tbackup\t\tx\tinteger\t1\n");
}

TEST_F(Kestrelctl, AnImportThatFailsMakesNoStore) {
  EXPECT_THAT(err(1, {"import", path("nowhere.yaml")}),
              "kestrelctl: FOLDER/nowhere.yaml: No such file or directory\n");
  EXPECT_FALSE(fs::exists(path("store.db")));
}

TEST_F(Kestrelctl, AnImportThatRunsOutOfRoomHalfwayChangesNothing) {
  set("x", "1");
  std::string text;
  for (int i = 0; i < 3000; ++i) {
    text += "- {component: host, group: pools, key: k" + std::to_string(i) + ", fields: {y: 2}}\n";
  }
  writeFile(path("in.yaml"), text);
  ::Test::Command shell;  // files of 64 KB at most
  shell.program = "/bin/sh";
  shell.arguments = {"-c", "trap '' XFSZ; ulimit -f 128; exec kestrelctl import in.yaml"};
  shell.environment = world_.environment;
  shell.workingFolder = world_.folder();
  const ProcessResult result = ::Test::run(shell);
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.err, HasSubstr("store.db: "));
  EXPECT_EQ(out({"list"}), "host\tpools\tbackup\t\tx\tinteger\t1\n");
  EXPECT_EQ(out({"import", path("in.yaml")}), "");
  EXPECT_EQ(lines(out({"list"})).size(), 3001U);
}

TEST_F(Kestrelctl, AnExportThatFailsLeavesTheOlderOne) {
  set("x", "1");
  EXPECT_EQ(err(1, {"export", path("no/where.yaml")}),
            "kestrelctl: FOLDER/no/where.yaml: No such file or directory\n");
  writeFile(path("out.yaml"), "older");
  EXPECT_EQ(out({"delete", "host", "pools", "backup"}), "");
  EXPECT_EQ(out({"export", path("out.yaml")}), "");
  EXPECT_EQ(readFile(path("out.yaml")), "[]\n");
}

TEST_F(Kestrelctl, AnExportToADeviceOrALinkLeavesItInItsPlace) {
  set("x", "1");
  EXPECT_EQ(out({"export", "/dev/null"}), "");
  EXPECT_TRUE(fs::is_character_file("/dev/null"));
  writeFile(path("target"),
            "older and longer than what follows: it must go away entirely, and not "
            "stand behind the new bytes until the end of its days");
  fs::create_symlink(path("target"), path("link"));
  EXPECT_EQ(out({"export", path("link")}), "");
  EXPECT_TRUE(fs::is_symlink(path("link")));
  EXPECT_EQ(readFile(path("target")), out({"export"}));
  EXPECT_THAT(err(1, {"export", "/dev/full"}), HasSubstr("/dev/full: No space left on device"));
}

TEST_F(Kestrelctl, AnObjectWithoutFieldsTravelsToo) {
  const std::string text = "- component: c\n  group: g\n  key: k\n  fields: {}\n";
  writeFile(path("in.yaml"), text);
  EXPECT_EQ(out({"import", path("in.yaml")}), "");
  EXPECT_EQ(out({"export"}), text);
  EXPECT_EQ(out({"list"}), "c\tg\tk\t\t\t\t\n");
  EXPECT_EQ(out({"get", "c", "g", "k"}), "");
}

TEST_F(Kestrelctl, StatusTellsWhichStoreAndThatItCanBeUsed) {
  set("x", "1");
  const std::string text = withoutFolder(out({"status"}), world_);
  EXPECT_THAT(text, StartsWith("configuration  FOLDER/kestrel.conf\n"
                               "store          sqlite\n"
                               "location       FOLDER/store.db\n"
                               "schema         version 1\n"
                               "objects        1\n"
                               "fields         1\n"
                               "responds in    "));
  EXPECT_THAT(text, HasSubstr(" ms\nstate          usable\n"));
}

TEST_F(Kestrelctl, StatusTellsWhyAStoreCannotBeUsed) {
  ProcessResult result = run({"status"});
  EXPECT_EQ(result.status, 3);
  EXPECT_THAT(result.err, HasSubstr("store.db: there is no such file"));
  writeFile(path("store.db"), std::string(4096, 'x'));
  result = run({"status"});
  EXPECT_EQ(result.status, 1);
  EXPECT_THAT(result.out, HasSubstr("store.db"));
  EXPECT_THAT(result.err, HasSubstr("the file is damaged"));
}

TEST_F(Kestrelctl, AnSqliteStoreHasNoLayers) {
  set("x", "1");
  EXPECT_EQ(err(2, {"get", "host", "pools", "backup", "--layer", "/kestrel"}),
            "kestrelctl: --layer: an SQLite store has no layers\n");
  EXPECT_EQ(err(1, {"move", "host", "pools", "backup", "--from", "/a", "--to", "/b"}),
            "kestrelctl: FOLDER/store.db: an SQLite store has no layers\n");
  EXPECT_EQ(withoutFolder(out({"get", "host", "pools", "backup", "--origin"}), world_),
            "x\tinteger\t1\tFOLDER/store.db\n");
  EXPECT_EQ(out({"check"}), "");
}

TEST_F(Kestrelctl, ABadConfigurationIsNamedWithItsLineByEveryCommand) {
  writeFile(path("kestrel.conf"), "store = sqlite\nspeed = high\n");
  writeFile(path("in.yaml"), "[]\n");
  for (const Arguments &arguments :
       {Arguments{"status"}, Arguments{"list"}, Arguments{"export"},
        Arguments{"import", path("in.yaml")}, Arguments{"get", "a", "b", "c"},
        Arguments{"delete", "a", "b", "c"}, Arguments{"set", "a", "b", "c", "d", "e"}}) {
    const ProcessResult result = run(arguments);
    EXPECT_EQ(result.status, 1);
    EXPECT_THAT(result.err, HasSubstr("kestrel.conf:2: unknown key \"speed\"")) << arguments[0];
  }
}

TEST_F(Kestrelctl, AWrongLineIsAUsageError) {
  EXPECT_EQ(err(2, {}), "kestrelctl: a sub-command is required\nTry 'kestrelctl --help'.\n");
  EXPECT_THAT(err(2, {"put"}), HasSubstr("put"));
  EXPECT_THAT(err(2, {"set", "a", "b", "c", "d"}), HasSubstr("VALUE is required"));
  EXPECT_THAT(err(2, {"get", "a", "b"}), HasSubstr("KEY is required"));
  EXPECT_THAT(err(2, {"get", "a", "b", "c", "d", "e"}), HasSubstr("e"));
  EXPECT_THAT(err(2, {"list", "--all"}), HasSubstr("--all"));
  EXPECT_THAT(err(2, {"import"}), HasSubstr("FILE is required"));
}

TEST_F(Kestrelctl, EveryCommandHasHelpOnStandardOutput) {
  EXPECT_THAT(out({"--help"}), HasSubstr("kestrelctl [OPTIONS]"));
  for (const char *command : {"set", "get", "delete", "list", "export", "import", "status"}) {
    EXPECT_THAT(out({"--help"}), HasSubstr(command));
    EXPECT_THAT(out({command, "--help"}), HasSubstr(std::string("kestrelctl ") + command));
    EXPECT_THAT(out({command, "-h"}), HasSubstr("Usage:"));
  }
}

TEST_F(Kestrelctl, AStoreOfRootIsReadableForAll) {
  set("x", "1");
  struct stat file {};
  ASSERT_EQ(stat(path("store.db").c_str(), &file), 0);
  EXPECT_EQ(file.st_mode & 0777U, 0644U);
}

}  // namespace
