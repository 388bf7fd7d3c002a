// SPDX-License-Identifier: Apache-2.0
#include "host/traces/LinuxPerfDataWriters.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <cerrno>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "tests/host/InChild.h"
#include "tests/host/ScratchFolder.h"

namespace tarn::linux_host {
namespace {

using nlohmann::json;
using platform::PerfDataUnit;
using testing::inChild;
using testing::ScratchFolder;

class LinuxPerfDataWritersTest : public ::testing::Test {
 protected:
  static std::string contentOf(const std::string& path) {
    std::ostringstream content;
    content << std::ifstream(path, std::ios::binary).rdbuf();
    return content.str();
  }
  static std::string golden(const std::string& name) { return contentOf(std::string(TARN_GOLDEN_FILES) + "/" + name); }

  std::string path() const { return folder_.file("result.pdj"); }
  std::unique_ptr<platform::PerfDataWriter> open(const std::string& name = "TarnReporting") {
    auto opened = writers_.open(path(), name, 4, 0);
    EXPECT_FALSE(opened.failed()) << opened.error->text;
    return std::move(opened.value);
  }
  std::vector<std::string> files() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(folder_.file(""))) {
      names.push_back(entry.path().filename());
    }
    return names;
  }

  ScratchFolder folder_;
  LinuxPerfDataWriters writers_;
};

TEST_F(LinuxPerfDataWritersTest, WritesValuesAndExtensionsInTheirOrder) {
  const auto writer = open();
  writer->newValue("start", PerfDataUnit::Milliseconds, 1.25);
  writer->newValue("start Total", PerfDataUnit::Milliseconds, 1.25);
  const auto variables = writer->startExtension("@tdg-perf.key_variables");
  EXPECT_NE(variables, 0U);
  writer->stringMember(variables, "start", "[]");
  writer->newValue("a \"quoted\"\nname", PerfDataUnit::Milliseconds, 2);
  writer->stringMember(variables, "a \"quoted\"\nname", "[]");
  writer->endExtension(variables);
  const auto database = writer->startExtension("@tdg-perf.database_id");
  EXPECT_NE(database, variables);
  writer->stringMember(database, "InfluxDB", "TarnReporter");
  writer->endExtension(database);
  writer->newValue("small", PerfDataUnit::Milliseconds, 1e-300);
  writer->endExtension(writer->startExtension("empty"));

  EXPECT_TRUE(writer->close().ok());

  EXPECT_EQ(contentOf(path()), golden("perfdata.pdj"));
  EXPECT_TRUE(json::accept(contentOf(path())));
  EXPECT_EQ(files(), std::vector<std::string>{"result.pdj"});
}

TEST_F(LinuxPerfDataWritersTest, AFileWithoutContentIsWhole) {
  const auto opened = writers_.open(path(), "", -1, 0);
  ASSERT_FALSE(opened.failed());
  EXPECT_TRUE(opened.value->close().ok());
  EXPECT_EQ(contentOf(path()), golden("perfdata_empty.pdj"));
}

TEST_F(LinuxPerfDataWritersTest, ValuesThatAreNotFiniteAreTexts) {
  const auto writer = open();
  for (const double value : {std::nan(""), HUGE_VAL, -HUGE_VAL}) {
    writer->newValue("v", PerfDataUnit::Milliseconds, value);
  }
  ASSERT_TRUE(writer->close().ok());
  const json values = json::parse(contentOf(path())).at("values");
  EXPECT_EQ(values.at(0).at("value"), "nan");
  EXPECT_EQ(values.at(1).at("value"), "inf");
  EXPECT_EQ(values.at(2).at("value"), "-inf");
}

TEST_F(LinuxPerfDataWritersTest, TextsThatAreNotUtf8AreMended) {
  const auto writer = open("\xFF");
  writer->newValue("a\xC3", PerfDataUnit::Milliseconds, 1);
  writer->stringMember(writer->startExtension("\x80"), "m\xFE", "t\xFD");
  ASSERT_TRUE(writer->close().ok());
  const json file = json::parse(contentOf(path()));
  EXPECT_EQ(file.at("name"), "\uFFFD");
  EXPECT_EQ(file.at("values").at(0).at("name"), "a\uFFFD");
  EXPECT_EQ(file.at("extensions").at(0).at("members").at("m\uFFFD"), "t\uFFFD");
}

TEST_F(LinuxPerfDataWritersTest, AnExtensionThatIsNotOpenTakesNothing) {
  const auto writer = open();
  const auto first = writer->startExtension("first");
  writer->endExtension(first);
  writer->stringMember(first, "late", "x");
  writer->endExtension(first);
  writer->stringMember(0, "none", "x");
  ASSERT_TRUE(writer->close().ok());
  EXPECT_EQ(json::parse(contentOf(path())).at("extensions"), json::parse(R"([{"name": "first", "members": {}}])"));
}

TEST_F(LinuxPerfDataWritersTest, ManyValuesArriveInOrder) {
  constexpr int kCount = 20000;
  const auto writer = open();
  for (int value = 0; value < kCount; ++value) {
    writer->newValue("v", PerfDataUnit::Milliseconds, value);
  }
  ASSERT_TRUE(writer->close().ok());
  const json values = json::parse(contentOf(path())).at("values");
  ASSERT_EQ(values.size(), std::size_t{kCount});
  for (int value = 0; value < kCount; ++value) {
    ASSERT_EQ(values[static_cast<std::size_t>(value)].at("value"), value);
  }
}

TEST_F(LinuxPerfDataWritersTest, WhatIsThereStaysUntilTheFileIsWhole) {
  std::ofstream(path()) << "before";
  const auto writer = open();
  for (int value = 0; value < 5000; ++value) {
    writer->newValue("v", PerfDataUnit::Milliseconds, value);
  }
  EXPECT_EQ(contentOf(path()), "before");
  ASSERT_TRUE(writer->close().ok());
  EXPECT_TRUE(json::accept(contentOf(path())));
}

TEST_F(LinuxPerfDataWritersTest, AWriterThatIsNotClosedLeavesNothing) {
  open()->newValue("v", PerfDataUnit::Milliseconds, 1);
  EXPECT_TRUE(files().empty());
}

TEST_F(LinuxPerfDataWritersTest, TwoWritersOfOneFileDoNotMeet) {
  const auto first = open("first");
  const auto second = open("second");
  ASSERT_TRUE(first->close().ok());
  ASSERT_TRUE(second->close().ok());
  EXPECT_EQ(json::parse(contentOf(path())).at("name"), "second");
  EXPECT_EQ(files().size(), 1U);
}

TEST_F(LinuxPerfDataWritersTest, AClosedWriterIsClosed) {
  const auto writer = open();
  ASSERT_TRUE(writer->close().ok());
  EXPECT_EQ(writer->close().code(), EBADF);
  EXPECT_TRUE(json::accept(contentOf(path())));
}

TEST_F(LinuxPerfDataWritersTest, ThePermissionsAreThoseOfTheMask) {
  const mode_t mask = ::umask(027);
  const auto writer = open();
  ::umask(mask);
  ASSERT_TRUE(writer->close().ok());
  struct stat status {};
  ASSERT_EQ(::stat(path().c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0640U);
}

TEST_F(LinuxPerfDataWritersTest, AFolderThatIsMissingIsAnErrorAtTheOpen) {
  const auto opened = writers_.open(folder_.file("missing/result.pdj"), "n", 4, 0);
  ASSERT_TRUE(opened.failed());
  EXPECT_EQ(opened.error->code, ENOENT);
  EXPECT_EQ(opened.value, nullptr);
}

TEST_F(LinuxPerfDataWritersTest, FlagsAreRefused) {
  EXPECT_EQ(writers_.open(path(), "n", 4, 1).error.code(), EINVAL);
  EXPECT_TRUE(files().empty());
}

TEST_F(LinuxPerfDataWritersTest, AFolderInTheFilesPlaceIsAnErrorAtTheClose) {
  std::filesystem::create_directory(path());
  const auto writer = open();
  const auto error = writer->close();
  ASSERT_TRUE(error.failed());
  EXPECT_EQ(error->code, EISDIR);
  EXPECT_EQ(files().size(), 1U);
}

// How a child's writes end that may make files of this size: what close() gave, 0 for nothing.
int closeWithRoomFor(LinuxPerfDataWriters& writers, const std::string& path, rlim_t bytes, int values) {
  return inChild([&] {
    ::signal(SIGXFSZ, SIG_IGN);
    const rlimit limit{bytes, bytes};
    if (::setrlimit(RLIMIT_FSIZE, &limit) != 0) return 255;
    auto opened = writers.open(path, "n", 4, 0);
    if (opened.failed()) return 254;
    for (int value = 0; value < values; ++value) {
      opened.value->newValue("v", PerfDataUnit::Milliseconds, value);
    }
    return static_cast<int>(opened.value->close().code());
  });
}

TEST_F(LinuxPerfDataWritersTest, ADiskWithoutRoomShowsAtTheCloseAndLeavesWhatWasThere) {
  std::ofstream(path()) << "before";
  EXPECT_EQ(closeWithRoomFor(writers_, path(), 60, 1), EFBIG);
  EXPECT_EQ(closeWithRoomFor(writers_, path(), 100'000, 50'000), EFBIG);
  EXPECT_EQ(contentOf(path()), "before");
  EXPECT_EQ(files().size(), 1U);
  EXPECT_EQ(closeWithRoomFor(writers_, path(), 1'000'000, 1), 0);
}

}  // namespace
}  // namespace tarn::linux_host
