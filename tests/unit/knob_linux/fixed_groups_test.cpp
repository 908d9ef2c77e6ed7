// SPDX-License-Identifier: Apache-2.0
// The signature of the library that made host, as text.
#include "knob/linux/fixed_groups.h"

#include <gtest/gtest.h>

namespace Knob::Linux {
namespace {

TEST(Signature, ReadsBackAsItWasWritten) {
  const BuildSignature signature{"0123456789abcdef0123456789abcdef", "Nov 20 2026 13:55:19"};
  const auto again = parseSignature(signatureText(signature));
  ASSERT_TRUE(again);
  EXPECT_EQ(again->md5, signature.md5);
  EXPECT_EQ(again->buildDate, signature.buildDate);
}

TEST(Signature, IsNothingFromAnyOtherText) {
  for (const char *text : {"", " ", "short Nov 20 2026", "0123456789abcdef0123456789abcdef",
                           "0123456789abcdef0123456789abcdef "}) {
    EXPECT_FALSE(parseSignature(text)) << text;
  }
}

}  // namespace
}  // namespace Knob::Linux
