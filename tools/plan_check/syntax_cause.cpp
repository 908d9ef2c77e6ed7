// SPDX-License-Identifier: Apache-2.0
// Looks at the line where the yaml library stopped, and at the line before.
#include "plan_check/syntax_cause.h"

#include <string_view>

namespace Plan {
namespace {

bool has(const std::string &message, const char *part) {
  return message.find(part) != std::string::npos;
}

size_t indentationOf(std::string_view line) {
  const size_t first = line.find_first_not_of(" -");
  return first == std::string_view::npos ? line.size() : first;
}

// "key: value", as far as a line alone shows it.
bool hasKey(std::string_view line) {
  return line.find(": ") != std::string_view::npos || (!line.empty() && line.back() == ':');
}

std::string_view withoutComment(std::string_view line) {
  const size_t comment = line.find(" #");
  if (comment != std::string_view::npos) line = line.substr(0, comment);
  const size_t end = line.find_last_not_of(" \t");
  return line.substr(0, end == std::string_view::npos ? 0 : end + 1);
}

int lineBefore(const SourceFile &source, int line) {
  for (--line; line >= 0; --line) {
    const std::string_view text = withoutComment(source.line(line));
    if (text.find_first_not_of(" \t#") != std::string_view::npos && text[0] != '#') return line;
  }
  return 0;
}

// The last bracket that is open at the end of the text, outside quotes and comments.
Place openBracket(const SourceFile &source) {
  Place open;
  int depth = 0;
  for (int line = 0; line < 100000; ++line) {
    const std::string_view text = withoutComment(source.line(line));
    for (size_t at = 0; at < text.size(); ++at) {
      if ((text[at] == '{' || text[at] == '[') && depth++ == 0) open = {line, static_cast<int>(at)};
      if ((text[at] == '}' || text[at] == ']') && depth > 0) --depth;
    }
    if (line > 0 && text.empty() && static_cast<size_t>(line) > source.text().size()) break;
  }
  return open;
}

class Finder {
 public:
  Finder(const SourceFile &source, Place place, const std::string &message)
      : source_(source), place_(place), line_(withoutComment(source.line(place.line))) {
    finding_.code = "syntax";
    finding_.file = source.path();
    finding_.place = place;
    finding_.message = message;
  }

  Finding find(const std::string &message) {
    if (byTab() || byBracket(message) || byReserved(message) || byAlias(message)) return finding_;
    if (byQuote(message)) return finding_;
    if (has(message, "illegal map value")) {
      byMapValue();
    } else if (has(message, "end of sequence not found") || has(message, "end of map not found")) {
      set("indentation", "this line is not indented like the ones that it belongs to",
          "\"- \" at the same column for each pool, and its keys two columns further");
    } else if (has(message, "block entry") || has(message, "block sequence")) {
      set("list", "\"- \" begins a pool and cannot follow a key's colon", "a value",
          "remove \"- \"");
    }
    return finding_;
  }

 private:
  void set(const char *code, const std::string &message, const std::string &expected = "",
           const std::string &advice = "") {
    finding_.code = code;
    finding_.message = message;
    finding_.expected = expected;
    finding_.advice = advice;
  }

  // A tab in the indentation of the line, or of the one before.
  bool byTab() {
    for (const int number : {place_.line, lineBefore(source_, place_.line)}) {
      const std::string_view line = source_.line(number);
      const size_t tab = line.find('\t');
      if (tab == std::string_view::npos || tab > line.find_first_not_of(" \t-")) continue;
      finding_.place = {number, static_cast<int>(tab)};
      set("tab", "a tab cannot indent", "blanks");
      return true;
    }
    return false;
  }

  bool byBracket(const std::string &message) {
    if (!has(message, "flow not found")) return false;
    const Place open = openBracket(source_);
    if (open.line >= 0) finding_.place = open;
    const std::string_view line = source_.line(finding_.place.line);
    const auto column = static_cast<size_t>(finding_.place.column);
    const bool list = column < line.size() && line[column] == '[';
    set("bracket", "a bracket is not closed", list ? "\"]\"" : "\"}\"");
    return true;
  }

  bool byReserved(const std::string &message) {
    if (!has(message, "unknown token") && !has(message, "directive")) return false;
    set("reserved", "a value cannot begin with this character", "a plain value, !calc or !config",
        "put a text into quotes");
    return true;
  }

  bool byAlias(const std::string &message) {
    if (!has(message, "anchor")) return false;
    set("alias", "\"*\" refers to a part of the file named with \"&\"; there is none of this name",
        "", "put a text that begins with \"*\" into quotes");
    return true;
  }

  bool byQuote(const std::string &message) {
    if (!has(message, "EOF in scalar") && !has(message, "document indicator in scalar")) {
      return false;
    }
    set("quote", "a quote is not closed", "a quote at the end of the text");
    return true;
  }

  void byMapValue() {
    const size_t first = line_.find(": ");
    const bool twice = first != std::string_view::npos && hasKey(line_.substr(first + 1));
    if (twice) {
      set("colon", "a value that is not in quotes cannot hold \": \"", "one key in each line",
          "put the value into quotes, or begin a new line");
      return;
    }
    const int before = lineBefore(source_, place_.line);
    const std::string_view previous = withoutComment(source_.line(before));
    const size_t dash = previous.find_first_not_of(' ');
    if (dash != std::string_view::npos && previous[dash] == '-' &&
        previous.substr(dash, 2) != "- ") {
      finding_.place = {before, static_cast<int>(dash)};
      set("dash", "a blank is missing behind \"-\"", "\"- \" before each pool");
      return;
    }
    const bool glued = previous.find(':') != std::string_view::npos && !hasKey(previous);
    if (!hasKey(previous) && indentationOf(previous) == indentationOf(line_)) {
      finding_.place = {before, static_cast<int>(indentationOf(previous))};
      set("colon",
          glued ? "a blank is missing behind the colon" : "a colon is missing behind the key",
          "KEY: VALUE");
      return;
    }
    finding_.place = {place_.line, static_cast<int>(indentationOf(line_))};
    set("indentation", "this line is indented further than the one before",
        "the keys of a pool at the same column");
  }

  const SourceFile &source_;
  const Place place_;
  const std::string_view line_;
  Finding finding_;
};

}  // namespace

Finding syntaxFinding(const SourceFile &source, Place place, const std::string &message) {
  return Finder(source, place, message).find(message);
}

}  // namespace Plan
