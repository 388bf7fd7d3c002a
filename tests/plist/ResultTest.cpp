// SPDX-License-Identifier: Apache-2.0
#include "plist/Result.h"

#include <gtest/gtest.h>

#include <memory>

namespace tarn {
namespace {

TEST(Status, IsASuccessUnlessItIsGivenAnError) {
  const Status status;
  EXPECT_TRUE(status.ok());
  EXPECT_FALSE(status.failed());
  EXPECT_EQ(status.code(), 0);
  EXPECT_EQ(status.text(), "");
}

TEST(Status, KeepsTheErrorThatItIsGiven) {
  const Status status = Error{2, "f: No such file or directory"};
  EXPECT_FALSE(status.ok());
  EXPECT_TRUE(status.failed());
  EXPECT_EQ(status->code, 2);
  EXPECT_EQ(*status, (Error{2, "f: No such file or directory"}));
  EXPECT_EQ(status.code(), 2);
  EXPECT_EQ(status.text(), "f: No such file or directory");
}

TEST(Status, AnErrorWithoutANumberIsAFailureToo) {
  EXPECT_TRUE(Status(Error{}).failed());
  EXPECT_NE(Status(Error{}), Status());
}

TEST(Status, EqualsOneOfTheSameNumberAndText) {
  EXPECT_EQ(Status(Error{1, "a"}), Status(Error{1, "a"}));
  EXPECT_NE(Status(Error{1, "a"}), Status(Error{2, "a"}));
  EXPECT_NE(Status(Error{1, "a"}), Status(Error{1, "b"}));
}

TEST(Result, HoldsAValueThatMayOnlyBeMoved) {
  Result<std::unique_ptr<int>> result{std::make_unique<int>(7), {}};
  ASSERT_TRUE(result.ok());
  const std::unique_ptr<int> taken = std::move(result.value);
  EXPECT_EQ(*taken, 7);
}

TEST(Result, HasAnEmptyValueBesideAnErrorUnlessItIsGivenOne) {
  const Result<int> empty{{}, Error{1, "a"}};
  EXPECT_TRUE(empty.failed());
  EXPECT_EQ(empty.value, 0);
  const Result<int> partial{5, Error{1, "a"}};
  EXPECT_FALSE(partial.ok());
  EXPECT_EQ(partial.value, 5);
}

}  // namespace
}  // namespace tarn
