// SPDX-License-Identifier: Apache-2.0
// What tests of YAML values share: a document from its text, and errors with their place.
#pragma once

#include <gtest/gtest.h>
#include <yaml-cpp/yaml.h>

#include <exception>
#include <string>
#include <typeinfo>

#include "yaml/exception.h"

// Where an error points to, with lines and columns from 1 as a user counts them.
struct Place {
  int line;
  int column;
};

// The place of an error that names none.
constexpr Place kNowhere{0, 0};

constexpr const char *kInvalidNode =
    "invalid node; this may result from using a map iterator as a sequence iterator, or vice-versa";

inline YAML::Node yaml(const std::string &text) {
  return YAML::Load(text);
}

// A node that stands for nothing, as the yaml library hands it out for a missing element.
inline YAML::Node invalidNode() {
  const YAML::Node sequence = YAML::Load("[]");
  return sequence[0];
}

// BODY must throw an Error of that message at that place.
template <typename Error, typename Body>
void expectError(Body body, Place place, const std::string &message) {
  try {
    body();
    ADD_FAILURE() << "nothing was thrown instead of: " << message;
  } catch (const Error &error) {
    EXPECT_EQ(message, error.msg);
    EXPECT_EQ(place.line, error.mark.line + 1) << error.what();
    EXPECT_EQ(place.column, error.mark.column + 1) << error.what();
  } catch (const std::exception &other) {
    ADD_FAILURE() << typeid(other).name() << " was thrown: " << other.what();
  }
}

// BODY must throw an Error of that message, wherever it points to.
template <typename Error, typename Body>
void expectErrorAnywhere(Body body, const std::string &message) {
  try {
    body();
    ADD_FAILURE() << "nothing was thrown instead of: " << message;
  } catch (const Error &error) {
    EXPECT_EQ(message, error.msg);
  } catch (const std::exception &other) {
    ADD_FAILURE() << typeid(other).name() << " was thrown: " << other.what();
  }
}

// The errors of a value that contains too many others, one in the other or in all.
constexpr const char *kTooDeep = "value nested too deeply";
constexpr const char *kTooMany = "more than 100000 values in one";

// BODY must end with the loader's error of that message at a real place.
template <typename Body>
void expectErrorAtSomePlace(Body body, const std::string &message) {
  try {
    body();
    ADD_FAILURE() << "nothing was thrown instead of: " << message;
  } catch (const Loader::Exception &error) {
    EXPECT_EQ(message, error.msg);
    EXPECT_GE(error.mark.line, 0);
    EXPECT_GE(error.mark.column, 0);
  } catch (const std::exception &other) {
    ADD_FAILURE() << typeid(other).name() << " was thrown: " << other.what();
  }
}
