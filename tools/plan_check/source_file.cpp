// SPDX-License-Identifier: Apache-2.0
// A scalar's value and its spelling are walked side by side: a fold makes one blank, or a line
// feed, of a line end and the indentation that follows.
#include "plan_check/source_file.h"

#include <algorithm>
#include <cctype>
#include <utility>

namespace Plan {
namespace {

bool isSpace(char c) {
  return std::isspace(static_cast<unsigned char>(c)) != 0;
}

bool isNull(const YAML::Mark &mark) {
  return mark.pos == -1 && mark.line == -1 && mark.column == -1;
}

// Behind tags ("!calc") and anchors ("&name").
size_t skipProperties(std::string_view text, size_t at) {
  for (;;) {
    while (at < text.size() && isSpace(text[at])) ++at;
    if (at >= text.size() || (text[at] != '!' && text[at] != '&')) return at;
    while (at < text.size() && !isSpace(text[at])) ++at;
  }
}

// Behind an opening quote, or behind the header of a block scalar.
size_t skipStyle(std::string_view text, size_t at) {
  if (at >= text.size()) return at;
  if (text[at] == '"' || text[at] == '\'') return at + 1;
  if (text[at] != '|' && text[at] != '>') return at;
  const size_t end = text.find('\n', at);
  if (end == std::string_view::npos) return text.size();
  at = end + 1;
  while (at < text.size() && isSpace(text[at])) ++at;
  return at;
}

}  // namespace

SourceFile::SourceFile(std::string path, std::string text)
    : path_(std::move(path)), text_(std::move(text)), lineStarts_{0} {
  for (size_t at = 0; at < text_.size(); ++at) {
    const bool lineFeed = text_[at] == '\n';
    const bool loneReturn = text_[at] == '\r' && (at + 1 == text_.size() || text_[at + 1] != '\n');
    if (lineFeed || loneReturn) lineStarts_.push_back(at + 1);
  }
}

std::string_view SourceFile::line(int number) const {
  if (number < 0 || static_cast<size_t>(number) >= lineStarts_.size()) return {};
  const size_t start = lineStarts_[static_cast<size_t>(number)];
  const size_t end = std::min(text_.find_first_of("\r\n", start), text_.size());
  return std::string_view(text_).substr(start, end - start);
}

Place SourceFile::placeOf(const YAML::Mark &mark) const {
  if (isNull(mark)) return {};
  const size_t lines = lineStarts_.size();
  if (static_cast<size_t>(mark.line) >= lines) return placeAt(text_.size());
  return {mark.line, mark.column};
}

Place SourceFile::placeInScalar(const YAML::Mark &mark, std::string_view text,
                                size_t offset) const {
  const Place begin = placeOf(mark);
  if (begin.line < 0) return begin;
  const std::string_view source = text_;
  size_t at = skipStyle(source, skipProperties(source, offsetOf(begin)));
  size_t behind = at;  // behind the last character that was found
  for (size_t i = 0; i < offset && i < text.size();) {
    if (isSpace(text[i])) {
      while (i < offset && i < text.size() && isSpace(text[i])) ++i;
      while (at < source.size() && isSpace(source[at])) ++at;
      continue;
    }
    if (at >= source.size() || source[at] != text[i]) return begin;
    ++at;
    ++i;
    behind = at;
  }
  return placeAt(offset < text.size() ? at : behind);
}

bool SourceFile::isOpenQuote(Place place) const {
  if (place.line < 0) return false;
  const size_t at = skipProperties(text_, offsetOf(place));
  const bool quote = at < text_.size() && (text_[at] == '"' || text_[at] == '\'');
  return quote && text_.find(text_[at], at + 1) == std::string::npos;
}

size_t SourceFile::offsetOf(Place place) const {
  const size_t start = lineStarts_[static_cast<size_t>(place.line)];
  return std::min(start + static_cast<size_t>(place.column), text_.size());
}

Place SourceFile::placeAt(size_t offset) const {
  const auto next = std::upper_bound(lineStarts_.begin(), lineStarts_.end(), offset);
  const auto line = static_cast<int>(next - lineStarts_.begin()) - 1;
  return {line, static_cast<int>(offset - lineStarts_[static_cast<size_t>(line)])};
}

}  // namespace Plan
