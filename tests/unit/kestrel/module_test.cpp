// SPDX-License-Identifier: Apache-2.0
// The seam for other engines: a module found by its file name, one that is missing, and one that
// is of another version.
#include "kestrel/module.h"

#include <gmock/gmock.h>

#include "store_test.h"

namespace Kestrel {
namespace {

using ::testing::HasSubstr;
using ::testing::StartsWith;

Configuration configured() {
  Configuration configuration;
  configuration.file = "/etc/kestrel.conf";
  configuration.path = "/somewhere";
  return configuration;
}

TEST(Module, ItsBackendKnowsTheConfiguration) {
  const auto backend = openModule(ECHO_MODULE, "echo", configured());
  ASSERT_NE(backend, nullptr);
  EXPECT_EQ(backend->read({"k", "c", "g", ""}), (Fields{{"path", std::string("/somewhere")}}));
}

TEST(Module, ItsExceptionsAreTheLibrarysOwn) {
  const auto backend = openModule(ECHO_MODULE, "echo", configured());
  EXPECT_EQ(failureOf([&] { backend->removeObject({}); }), "echo: refused");
}

TEST(Module, ThatIsMissingIsAFailureThatNamesTheConfiguration) {
  const std::string text =
      failureOf([] { openModule("libkestrel-none.so.1", "none", configured()); });
  EXPECT_THAT(text, StartsWith("/etc/kestrel.conf: store: this build has no none module"));
  EXPECT_THAT(text, HasSubstr("libkestrel-none.so.1"));
}

TEST(Module, OfAnotherVersionIsRefused) {
  EXPECT_THAT(failureOf([] { openModule(OTHER_MODULE, "other", configured()); }),
              StartsWith("/etc/kestrel.conf: store: the other module is of another version"));
}

}  // namespace
}  // namespace Kestrel
