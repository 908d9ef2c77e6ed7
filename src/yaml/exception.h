// SPDX-License-Identifier: Apache-2.0
// The error of a definition that knows its place in the file. It is below the loader because every
// room that reads definitions throws it. The mark and the bare message stay readable (`mark`,
// `msg`).
#pragma once

#include <yaml-cpp/exceptions.h>

#include <string>

namespace Loader {

class Exception : public YAML::RepresentationException {
 public:
  // mark: where in the file; the null mark where there is no place to name.
  Exception(const YAML::Mark &where, const std::string &message)
      : YAML::RepresentationException(where, message) {}
};

}  // namespace Loader
