// SPDX-License-Identifier: Apache-2.0
// A case is a block of lines between empty lines; nothing here knows the language itself.
#include "expression_file.h"

#include <cstdlib>
#include <fstream>
#include <ostream>
#include <sstream>
#include <stdexcept>

namespace {

struct Block {
  int line = 0;
  std::vector<std::string> lines;
};

[[noreturn]] void refuse(int line, const std::string &why) {
  throw std::runtime_error("line " + std::to_string(line) + ": " + why);
}

// The file's blocks without their comment lines.
std::vector<Block> blocksOf(std::istream &in) {
  std::vector<Block> blocks(1);
  std::string line;
  for (int number = 1; std::getline(in, line); ++number) {
    if (line.empty()) {
      if (!blocks.back().lines.empty()) blocks.emplace_back();
    } else if (line[0] != '#') {
      if (blocks.back().lines.empty()) blocks.back().line = number;
      blocks.back().lines.push_back(line);
    }
  }
  if (blocks.back().lines.empty()) blocks.pop_back();
  return blocks;
}

// A line in double quotes is what stands between them, with the escapes \t \n \v \f \r \" \\.
std::string unquoted(const std::string &line, int number) {
  if (line[0] != '"') return line;
  if (line.size() < 2 || line.back() != '"') refuse(number, "no closing quote");
  static const std::string kLetters = "tnvfr\"\\";
  static const std::string kMeanings = "\t\n\v\f\r\"\\";
  std::string text;
  for (std::size_t i = 1; i + 1 < line.size(); ++i) {
    if (line[i] == '\\') {
      const std::size_t letter = kLetters.find(line[++i]);
      if (letter == std::string::npos) refuse(number, "unknown escape");
      text += kMeanings[letter];
    } else {
      text += line[i];
    }
  }
  return text;
}

float numberOf(const std::string &text, int line) {
  char *end = nullptr;
  const float value = std::strtof(text.c_str(), &end);
  if (text.empty() || *end != '\0') refuse(line, "not a number: " + text);
  return value;
}

// "x=1 y=nan", or "-" for none.
Calc::VariableTable variablesOf(const std::string &text, int line) {
  Calc::VariableTable variables;
  if (text == "-") return variables;
  std::istringstream words(text);
  for (std::string word; words >> word;) {
    const std::size_t equals = word.find('=');
    if (equals == std::string::npos) refuse(line, "not name=value: " + word);
    variables[word.substr(0, equals)] = numberOf(word.substr(equals + 1), line);
  }
  return variables;
}

ExpressionCase caseOf(const Block &block) {
  const int line = block.line;
  ExpressionCase one;
  one.fails = block.lines[0] == "%%FAIL";
  if (block.lines.size() != (one.fails ? 5u : 3u)) refuse(line, "wrong number of lines");
  const std::size_t first = one.fails ? 1 : 0;
  one.line = line + static_cast<int>(first);
  one.expression = unquoted(block.lines[first], line);
  one.variables = variablesOf(block.lines[first + 1], line);
  if (one.fails) {
    one.message = block.lines[first + 2];
    one.rest = unquoted(block.lines[first + 3], line);
  } else {
    one.value = numberOf(block.lines[first + 2], line);
  }
  return one;
}

}  // namespace

std::ostream &operator<<(std::ostream &out, const ExpressionCase &one) {
  return out << "expressions.test:" << one.line << ": " << one.expression;
}

std::vector<ExpressionCase> readExpressionFile(const std::string &path) {
  std::ifstream in(path);
  if (!in) throw std::runtime_error("cannot read " + path);
  std::vector<ExpressionCase> cases;
  for (const Block &block : blocksOf(in)) cases.push_back(caseOf(block));
  return cases;
}
