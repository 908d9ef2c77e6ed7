// SPDX-License-Identifier: Apache-2.0
// A world in which poolctl-install runs, and the files that its tests install.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <string_view>
#include <vector>

#include "temp_folder.h"
#include "world.h"

namespace Test {

constexpr const char *kGood = "- name: a\n  memMin: 16\n";
constexpr const char *kOther = "- name: b\n  memMin: 32\n";
constexpr const char *kBad = "- name: a\n  memMinimum: 16\n";

inline std::vector<std::string> entriesOf(const std::filesystem::path &folder) {
  std::vector<std::string> names;
  for (const auto &entry : std::filesystem::directory_iterator(folder))
    names.push_back(entry.path().filename().string());
  return names;
}

class InstallFixture : public testing::Test {
 protected:
  void SetUp() override { SKIP_WITHOUT_PRIVATE_ETC(); }

  // A user's file, without a mark.
  std::string source(const std::string &name, std::string_view yaml) {
    const std::filesystem::path path = world.folder() / name;
    writeFile(path, yaml);
    return path.string();
  }

  ProcessResult install(const Arguments &arguments) {
    (void)world.etc();
    return world.run("poolctl-install", arguments);
  }

  void expectRefusal(const ProcessResult &result, const std::string &message, int status = 1) {
    EXPECT_EQ(result.status, status);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, "poolctl-install: " + message + "\n");
  }

  World world;
};

}  // namespace Test
