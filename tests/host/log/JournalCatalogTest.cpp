// SPDX-License-Identifier: Apache-2.0
#include "host/log/JournalCatalog.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <set>
#include <sstream>

namespace tarn::linux_host {
namespace {

using platform::LogCondition;

TEST(JournalCatalog, EachConditionHasOneEntryWithAnIdentifierOfItsOwn) {
  std::set<std::string_view> ids;
  for (auto number = static_cast<int>(LogCondition::None) + 1;
       number <= static_cast<int>(LogCondition::ConfigurationRefused); ++number) {
    const auto condition = static_cast<LogCondition>(number);
    const auto all = journalCatalog();
    EXPECT_EQ(std::count_if(all.begin(), all.end(), [=](const auto& entry) { return entry.condition == condition; }), 1)
        << number;
    const std::string_view id = messageIdOf(condition);
    EXPECT_EQ(id.size(), 32U);
    EXPECT_EQ(id.find_first_not_of("0123456789abcdef"), std::string_view::npos) << id;
    EXPECT_TRUE(ids.insert(id).second) << id;
  }
  EXPECT_EQ(journalCatalog().size(), ids.size());
}

TEST(JournalCatalog, WhatTellsOfNoConditionHasNoIdentifier) {
  EXPECT_EQ(messageIdOf(LogCondition::None), "");
}

TEST(JournalCatalog, TheInstalledFileIsMadeOfTheTable) {
  std::ifstream file(TARN_CATALOG_FILE, std::ios::binary);
  std::ostringstream content;
  content << file.rdbuf();
  EXPECT_EQ(content.str(), catalogText());
}

TEST(JournalCatalog, EachEntryTellsWhatToDoInLinesThatFit) {
  for (const CatalogEntry& entry : journalCatalog()) {
    EXPECT_FALSE(entry.subject.empty());
    EXPECT_EQ(entry.subject.find('\n'), std::string_view::npos);
    std::istringstream lines{std::string(entry.text)};
    for (std::string line; std::getline(lines, line);) {
      EXPECT_LE(line.size(), 100U) << line;
      EXPECT_FALSE(line.starts_with("-- ")) << line;
    }
  }
}

}  // namespace
}  // namespace tarn::linux_host
