// SPDX-License-Identifier: Apache-2.0
#include "plist/formats/Base64.h"

#include <gtest/gtest.h>

namespace tarn::plist {
namespace {

TEST(Base64, IsDecodedStrictly) {
  EXPECT_EQ(decodeBase64(""), "");
  EXPECT_EQ(decodeBase64("YQ=="), "a");
  EXPECT_EQ(decodeBase64("YWI="), "ab");
  EXPECT_EQ(decodeBase64("YWJj"), "abc");
  for (const char* wrong : {"YQ", "YQ=", "YR==", "Y===", "====", "YQ==YQ==", "Y Q=", "YWJ\n"}) {
    EXPECT_FALSE(decodeBase64(wrong)) << wrong;
  }
}

TEST(Base64, EndsAreFilledUpAndEveryByteReadsBack) {
  std::string bytes;
  for (int byte = 0; byte < 256; ++byte) {
    std::string text;
    appendBase64(text, bytes);
    EXPECT_EQ(text.size(), (bytes.size() + 2) / 3 * 4);
    EXPECT_EQ(decodeBase64(text), bytes);
    bytes.push_back(static_cast<char>(byte));
  }
}

}  // namespace
}  // namespace tarn::plist
