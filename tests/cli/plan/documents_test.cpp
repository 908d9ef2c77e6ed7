// SPDX-License-Identifier: Apache-2.0
// The JSON documents have the shape of the schema, and the examples of the manual page run.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

#include "temp_folder.h"
#include "world.h"

namespace {

using nlohmann::json;
using ::Test::Arguments;
using ::Test::ProcessResult;
using ::Test::World;
using ::Test::writeFile;
using testing::HasSubstr;

const json &schema() {
  static const json kSchema = json::parse(::Test::readFile(SCHEMA));
  return kSchema;
}

bool hasType(const json &value, const std::string &type) {
  if (type == "object") return value.is_object();
  if (type == "array") return value.is_array();
  if (type == "integer") return value.is_number_integer();
  return type == "string" && value.is_string();
}

// The parts of JSON Schema that the document uses. Adds what does not fit to PROBLEMS.
void validate(const json &value, const json &shape, const std::string &where,
              std::vector<std::string> *problems) {
  if (shape.contains("$ref")) {
    const std::string name = shape["$ref"].get<std::string>().substr(8);
    validate(value, schema()["$defs"].at(name), where, problems);
    return;
  }
  if (shape.contains("type") && !hasType(value, shape["type"])) {
    problems->push_back(where + ": not of the type " + shape["type"].get<std::string>());
    return;
  }
  if (shape.contains("minimum") && value < shape["minimum"]) problems->push_back(where + ": small");
  if (shape.contains("enum")) {
    const json &words = shape["enum"];
    if (std::find(words.begin(), words.end(), value) == words.end()) {
      problems->push_back(where + ": not one of the words");
    }
  }
  for (const json &key : shape.value("required", json::array())) {
    if (!value.contains(key)) problems->push_back(where + ": without " + key.get<std::string>());
  }
  if (value.is_object()) {
    for (const auto &[key, part] : value.items()) {
      if (shape["properties"].contains(key)) {
        validate(part, shape["properties"][key], where + "." + key, problems);
      } else {
        problems->push_back(where + ": unknown " + key);
      }
    }
  }
  if (value.is_array()) {
    for (const json &part : value) validate(part, shape.at("items"), where + "[]", problems);
  }
}

class PlanDocument : public testing::Test {
 protected:
  PlanDocument() {
    EXPECT_EQ(world.run("knobctl", {"boot", "--cpus", "4", "--memory", "8192"}).status, 0);
    writeFile(world.folder() / "good.yaml",
              "- name: a\n  memMin: 16\n  memMax: !calc physKB / 4096\n- name: b\n  memMax: 64\n");
    writeFile(world.folder() / "bad.yaml", "- name: a\n  memMax: 1G\n- name: b\n  memMax: 2\n");
  }

  void expectShape(const std::string &name, const Arguments &arguments) const {
    const ProcessResult result = world.run("poolctl-plan", arguments);
    EXPECT_EQ(result.err, "");
    std::vector<std::string> problems;
    validate(json::parse(result.out), schema()["$defs"].at(name), name, &problems);
    EXPECT_THAT(problems, testing::IsEmpty()) << result.out;
  }

  World world;
};

TEST_F(PlanDocument, OfEachCommandHasTheShapeOfTheSchema) {
  expectShape("facts", {"facts", "--json"});
  expectShape("check", {"check", "--json", "bad.yaml"});
  expectShape("explain", {"explain", "--json", "--file", "good.yaml"});
  expectShape("apply", {"apply", "--json", "--dry-run", "good.yaml"});
  expectShape("diff", {"diff", "--json", "good.yaml"});
  EXPECT_EQ(world.run("knobctl", {"create", "host/opt/a"}).status, 0);
  expectShape("diff", {"diff", "--json", "good.yaml"});
  expectShape("apply", {"apply", "--json", "good.yaml"});
  std::filesystem::create_directory(world.folder() / "hosts");
  writeFile(world.folder() / "hosts" / "a.facts", world.run("poolctl-plan", {"facts"}).out);
  expectShape("test", {"test", "--json", "hosts", "good.yaml"});
}

TEST_F(PlanDocument, TextsThatAreNotUtf8AreStillJson) {
  writeFile(world.folder() / "bytes.yaml", "- name: a\n  memMax: \xff\xfe\n");
  expectShape("check", {"check", "--json", "bytes.yaml"});
}

TEST_F(PlanDocument, TheManualsExamplesRun) {
  std::string text = ::Test::readFile(MANUAL);
  text.erase(0, text.find(".SH EXAMPLES"));
  text.erase(0, text.find(".nf\n") + 4);
  text.erase(text.find(".fi\n"));
  for (size_t at = 0; (at = text.find("\\-", at)) != std::string::npos;) text.erase(at, 1);
  for (size_t at = 0; (at = text.find("\\\\", at)) != std::string::npos; ++at) text.erase(at, 1);
  ::Test::Command shell;
  shell.program = "/bin/sh";
  shell.arguments = {"-ec", text};
  shell.environment = world.environment;
  shell.workingFolder = world.folder();
  const ProcessResult result = ::Test::run(shell);
  EXPECT_EQ(result.status, 0) << result.err;
  EXPECT_THAT(result.out, HasSubstr("create host/opt/web"));
}

TEST_F(PlanDocument, TheManualExplainsEveryCommand) {
  const std::string page = ::Test::readFile(MANUAL);
  size_t commands = 0;
  bool inList = false;
  for (const std::string &line : ::Test::lines(world.run("poolctl-plan", {"--help"}).out)) {
    if (inList && line.size() > 2 && line[0] == ' ') {
      const std::string name = line.substr(2, line.find(' ', 2) - 2);
      EXPECT_THAT(page, HasSubstr("\n.B poolctl-plan " + name + "\n"));
      EXPECT_THAT(page, HasSubstr("\n.TP\n.B " + name + "\n"));
      ++commands;
    }
    inList = inList || line == "Subcommands:";
  }
  EXPECT_EQ(commands, 6U);
}

}  // namespace
