// SPDX-License-Identifier: Apache-2.0
#include "service/vocabulary/FileNameText.h"

#include <gtest/gtest.h>

namespace tarn {
namespace {

TEST(FileNameText, KeepsLettersDigitsAndThreeSigns) {
  EXPECT_EQ(fileNameText("azAZ09._-"), "azAZ09._-");
  EXPECT_EQ(fileNameText(""), "");
}

TEST(FileNameText, ReplacesAllElse) {
  EXPECT_EQ(fileNameText(std::string("a/b\0c d\n\x1b'$+", 12)), "a_b_c_d_____");
  EXPECT_EQ(fileNameText("`{@[/:"), "______");  // beside the letters and digits
  EXPECT_EQ(fileNameText("\u00e9\u202e"), "_____");
}

}  // namespace
}  // namespace tarn
