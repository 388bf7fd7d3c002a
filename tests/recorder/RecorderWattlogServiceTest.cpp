// SPDX-License-Identifier: Apache-2.0
#include "recorder/RecorderWattlogService.h"

#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

class RecorderWattlogServiceTest : public RecorderFixture {};

TEST_F(RecorderWattlogServiceTest, RecordsNamePayloadAndAgent) {
  RecorderWattlogService service(start(), clock_);
  clock_.setEpochSeconds(1763632800.5);
  service.logRegisteredEvent(28, "Loom_Haptics_ClientStatus", {{"Status", 1}, {"TimestampEnd", plist::Date{0}}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(
      askOne(file(), "SELECT id, time, backend, name, payload, detail FROM events"),
      R"(1|1763632800.5|wattlog|Loom_Haptics_ClientStatus|{"Status":1,"TimestampEnd":"1970-01-01T00:00:00Z"}|{"agent":28})");
}

TEST_F(RecorderWattlogServiceTest, PayloadIsTakenAsItIsAtTheHandOver) {
  RecorderWattlogService service(start(), clock_);
  Dictionary payload{{"Status", 1}};
  service.logRegisteredEvent(-1, "first", payload);
  payload.set("Status", 0);
  service.logRegisteredEvent(28, "second", payload);
  ASSERT_TRUE(flush());
  EXPECT_EQ(ask(file(), "SELECT name, payload ->> 'Status', detail ->> 'agent' FROM events ORDER BY id"),
            (std::vector<std::string>{"first|1|-1", "second|0|28"}));
}

}  // namespace
}  // namespace tarn::recorder
