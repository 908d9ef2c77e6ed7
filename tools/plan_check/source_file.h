// SPDX-License-Identifier: Apache-2.0
// The text of a definition file, and places in it.
#pragma once

#include <yaml-cpp/mark.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace Plan {

// A line and a byte in it, both from 0. A line of -1: the file as a whole.
struct Place {
  int line = -1;
  int column = 0;
};

class SourceFile {
 public:
  SourceFile(std::string path, std::string text);

  const std::string &path() const { return path_; }
  const std::string &text() const { return text_; }

  // Without its line end; empty for a line that the file does not have.
  std::string_view line(int number) const;

  // The file as a whole for the null mark. A mark behind the last line is at the end of the text.
  Place placeOf(const YAML::Mark &mark) const;

  // Where byte OFFSET of a scalar's TEXT is in the file. MARK: where the scalar, or its tag,
  // begins. A text whose spelling in the file differs too much from its value (escapes) is at MARK.
  Place placeInScalar(const YAML::Mark &mark, std::string_view text, size_t offset) const;

  // Whether there is a quote that the rest of the file does not close.
  bool isOpenQuote(Place place) const;

 private:
  size_t offsetOf(Place place) const;
  Place placeAt(size_t offset) const;

  std::string path_;
  std::string text_;
  std::vector<size_t> lineStarts_;
};

}  // namespace Plan
