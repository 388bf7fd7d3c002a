// SPDX-License-Identifier: Apache-2.0
#include "host/system/SmallFile.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cerrno>

#include "tests/host/TemporaryFolder.h"

namespace tarn::linux_host {
namespace {

TEST(SmallFile, OneLargerThanTheLimitIsAnErrorBesideItsBeginning) {
  const TemporaryFolder folder;
  const std::string content(20'000, 's');  // several blocks
  folder.write("f", content);

  const auto whole = readSmallFile(folder.path("f"), content.size());
  const auto cut = readSmallFile(folder.path("f"), content.size() - 1);

  EXPECT_FALSE(whole.failed());
  EXPECT_EQ(whole.value, content);
  ASSERT_TRUE(cut.failed());
  EXPECT_EQ(cut.error->code, EFBIG);
  EXPECT_TRUE(content.starts_with(cut.value));
  EXPECT_FALSE(cut.value.empty());
}

TEST(SmallFile, OnlyARegularFileIsRead) {
  const TemporaryFolder folder;
  ASSERT_EQ(::mkfifo(folder.path("pipe").c_str(), 0600), 0);
  const auto codeOf = [&](std::string_view name) {
    const auto read = readSmallFile(folder.path(name), 10);
    return read.failed() ? read.error->code : 0;
  };
  EXPECT_EQ(codeOf("pipe"), ENODEV);
  EXPECT_EQ(codeOf(""), EISDIR);
  EXPECT_EQ(codeOf("none"), ENOENT);
}

}  // namespace
}  // namespace tarn::linux_host
