// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderPylonService.h"

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

class FixedRecord final : public platform::MetricRecord {
 public:
  FixedRecord(std::string bytes, Dictionary fields) : bytes_(std::move(bytes)), fields_(std::move(fields)) {}
  std::string serialized() const override { return bytes_; }
  Dictionary textFields() const override { return fields_; }

 private:
  const std::string bytes_;
  const Dictionary fields_;
};

class RecorderPylonServiceTest : public RecorderFixture {};

TEST_F(RecorderPylonServiceTest, RecordsIdentifierFieldsAndBytes) {
  RecorderPylonService service(start(), clock_);
  clock_.setEpochSeconds(1763632800.5);
  service.post(0x5B0003, FixedRecord("\x10\x02\x1a\xff", {{"duration", 2}, {"issuetype", "\"glitch\""}}));
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id, time, backend, name, payload, detail FROM events"),
            R"(1|1763632800.5|pylon|5963779|{"duration":2,"issuetype":"\"glitch\""}|{"wire":"10021aff"})");
}

TEST_F(RecorderPylonServiceTest, EveryByteIsTwoLowerCaseDigits) {
  RecorderPylonService service(start(), clock_);
  std::string bytes;
  for (int byte = 0; byte < 256; ++byte) {
    bytes += static_cast<char>(static_cast<unsigned char>(byte));
  }
  service.post(0xffffffff, FixedRecord(bytes, {}));
  service.post(0, FixedRecord("", {}));
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(),
                "SELECT name, payload, length(detail ->> 'wire'), substr(detail ->> 'wire', 1, 6), "
                "substr(detail ->> 'wire', 507) FROM events ORDER BY id"),
            (std::vector<std::string>{"4294967295|{}|512|000102|fdfeff", "0|{}|0||"}));
  EXPECT_EQ(askOne(file(), "SELECT lower(detail ->> 'wire') = detail ->> 'wire' FROM events"), "1");
}

}  // namespace
}  // namespace tarn::recorder
