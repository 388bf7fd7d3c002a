// SPDX-License-Identifier: Apache-2.0
// The metric record against the Protocol Buffers compiler, as an independent decoder and encoder. Many records go
// through one run of it, as the elements of a list.
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <random>
#include <string>
#include <vector>

#include "diagnostics/pylon/AudioIssueDetected.h"
#include "diagnostics/pylon/ProtobufText.h"
#include "diagnostics/pylon/WireReader.h"
#include "diagnostics/pylon/WireWriter.h"
#include "host/machine/LinuxCommandRunner.h"
#include "tests/diagnostics/pylon/AudioIssueModels.h"
#include "tests/host/TemporaryFolder.h"
#include "tests/support/Seeds.h"

namespace pylonmetrics::testing {
namespace {

using namespace std::string_literals;

constexpr int kRecords = 2000;

std::string written(const AudioIssueDetected& record) {
  WireWriter writer;
  record.writeTo(writer);
  return writer.take();
}

std::string textOf(const AudioIssueDetected& record) {
  ProtobufText lines;
  record.formatText(lines, "record");
  return lines.text();
}

// The text with the fields of each record in one order: the compiler prints them by number, the record by name.
std::vector<std::string> sortedFields(const std::string& text) {
  std::vector<std::string> records;
  std::vector<std::string> fields;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t end = text.find('\n', at);
    const std::string line = text.substr(at, end - at);
    at = end == std::string::npos ? text.size() : end + 1;
    if (line == "}") {
      std::sort(fields.begin(), fields.end());
      std::string record;
      for (const std::string& field : fields) {
        record += field + "\n";
      }
      records.push_back(record);
      fields.clear();
    } else if (line != "record {") {
      fields.push_back(line);
    }
  }
  return records;
}

class AudioIssueProtoc : public ::testing::Test {
 protected:
  // What the compiler makes of the input.
  std::string protoc(const std::string& options, const std::string& input) {
    folder_.write("input", input);
    const std::string command = "'"s + TARN_PROTOC + "' " + options + " < '" + folder_.path("input") + "' > '" +
                                folder_.path("output") + "' 2> '" + folder_.path("complaints") + "'";
    tarn::linux_host::LinuxCommandRunner runner;
    auto started = runner.start(command, std::chrono::seconds(60));
    if (started.failed()) {
      ADD_FAILURE() << started.error->text;
      return {};
    }
    const tarn::platform::CommandEnd end = started.value->close();
    EXPECT_EQ(end.kind, tarn::platform::CommandEnd::Kind::Exited);
    EXPECT_EQ(end.status, 0) << folder_.read("complaints");
    return folder_.read("output");
  }
  std::string protocWithSchema(const std::string& verb, const std::string& input) {
    return protoc(
        "--" + verb + "=tarnkit.AudioIssueRecords '--proto_path=" TARN_PROTO_FOLDER "' AudioIssueRecords.proto", input);
  }

 private:
  tarn::linux_host::TemporaryFolder folder_;
};

TEST_F(AudioIssueProtoc, DecodesADefaultRecord) {
  EXPECT_EQ(protoc("--decode_raw", written(AudioIssueDetected())), "2: 0\n3: \"\"\n4: \"\"\n5: \"\"\n");
}

TEST_F(AudioIssueProtoc, DecodesAFullRecord) {
  AudioIssueDetected record;
  record.setTimestamp(1763632800123);
  record.setDuration(-1);
  record.setIssuetype("Silence on a channel");
  record.setNode("Speaker 3");
  record.setRtaidclient("org.example.music");
  EXPECT_EQ(protoc("--decode_raw", written(record)),
            "1: 1763632800123\n2: 18446744073709551615\n3: \"Silence on a channel\"\n4: \"Speaker 3\"\n"
            "5: \"org.example.music\"\n");
}

TEST_F(AudioIssueProtoc, RandomRecordsAreDecodedToWhatTheirTextSays) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(1)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    RandomIssues random(seed);
    std::string bytes;
    std::string text;
    for (int i = 0; i < kRecords; ++i) {
      const AudioIssueDetected record = recordOf(random.issue());
      const std::string one = written(record);
      bytes += "\x0a" + varint(one.size()) + one;
      text += textOf(record);
    }
    const std::vector<std::string> decoded = sortedFields(protocWithSchema("decode", bytes));
    ASSERT_EQ(decoded.size(), std::size_t{kRecords});
    EXPECT_EQ(decoded, sortedFields(text));
  }
}

TEST_F(AudioIssueProtoc, EncodesTheTextOfRandomRecordsToTheSameBytesWhichAreReadBack) {
  for (const std::uint64_t seed : tarn::testing::testSeeds(2)) {
    SCOPED_TRACE(tarn::testing::seedNote(seed));
    RandomIssues random(seed);
    std::vector<AudioIssueDetected> records;
    std::string text;
    for (int i = 0; i < kRecords; ++i) {
      records.push_back(recordOf(random.issue()));
      text += textOf(records.back());
    }
    const std::string bytes = protocWithSchema("encode", text);
    WireReader list(bytes);
    for (const AudioIssueDetected& record : records) {
      ASSERT_EQ(list.readVarint(), 0x0aU);
      std::string one;
      list.readString(one);
      ASSERT_FALSE(list.failed());
      ASSERT_EQ(one, written(record));
      WireReader reader(one);
      AudioIssueDetected again;
      ASSERT_TRUE(again.readFrom(reader));
      ASSERT_TRUE(again == record);
    }
    EXPECT_TRUE(list.atEnd());
  }
}

}  // namespace
}  // namespace pylonmetrics::testing
