// SPDX-License-Identifier: Apache-2.0
// Reads files of expression cases, whose form is told at the head of expressions.test.
#pragma once

#include <iosfwd>
#include <string>
#include <vector>

#include "calc/variable_table.h"

struct ExpressionCase {
  int line = 0;  // of the expression
  std::string expression;
  Calc::VariableTable variables;
  bool fails = false;
  float value = 0;
  std::string message;
  std::string rest;  // the text from the fault's position to the end
};

// Names the case in a test's report.
std::ostream &operator<<(std::ostream &out, const ExpressionCase &one);

// Throws std::runtime_error, with the line, when the file cannot be read or breaks its form.
std::vector<ExpressionCase> readExpressionFile(const std::string &path);
