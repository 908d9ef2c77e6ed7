// SPDX-License-Identifier: Apache-2.0
// The minimum that any program with yaml-cpp does with a definition file: parse it, and read the
// text of every key and value once. The benchmark compares poolctl with it.
#include <yaml-cpp/yaml.h>

#include <cstddef>
#include <iostream>

int main(int argc, char **argv) {
  std::size_t characters = 0;
  for (int i = 1; i < argc; ++i) {
    const YAML::Node document = YAML::LoadFile(argv[i]);
    for (const auto &item : document) {
      for (const auto &field : item) {
        characters += field.first.Scalar().size() + field.second.Scalar().size();
      }
    }
  }
  std::cout << characters << '\n';
  return 0;
}
