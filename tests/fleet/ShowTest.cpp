// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <sstream>

#include "fleet/export/ShowCommand.h"
#include "tests/ctl/SessionStoreFixture.h"

namespace tarn::fleet {
namespace {

class FleetShow : public testing::SessionStoreFixture {
 protected:
  // The lines that hold a text.
  std::string shown(std::string_view holding, std::optional<double> since = {}) {
    Rules rules;
    rules.keys = {"play_seconds"};
    rules.hashed = {"application"};
    PrivacySieve sieve(rules, FleetKey::parse(std::string(64, '7')).value);
    StoreTail store(file());
    std::ostringstream out;
    const Status status = showStore(store, sieve, std::string(kDeviceBytes, 'd'), since, 1795244400, out);
    EXPECT_TRUE(status.ok()) << status.text();
    std::istringstream lines(out.str());
    std::string found;
    for (std::string line; std::getline(lines, line);) {
      found += line.find(holding) == std::string::npos ? "" : line + "\n";
    }
    return found;
  }
  void makeSessions() {
    makeStore();
    addSession({});
    addPeriod(1, 1795158000.5, 1795158010, 1, 3, 4, 1);
    addMessage(1, 1795158000, "Volume.Summary", R"({"play_seconds":31,"secret":"S"})");
    addMessage(0, 1795201200, "Volume.Summary", R"({"play_seconds":57.25})");
  }
};

TEST_F(FleetShow, WithoutAFileThereIsNothing) {
  EXPECT_EQ(shown(""), "{\"kind\":\"total\",\"events\":0,\"messages\":0,\"bytes\":0}\n");
}

TEST_F(FleetShow, PrintsWhatWouldLeaveAndNothingElse) {
  makeSessions();
  EXPECT_EQ(shown("event\""),
            "{\"kind\":\"event\",\"id\":1,\"time\":1795158000,\"backend\":\"tally\",\"name\":"
            "\"sys.oxbow.tarnkit.Volume.Summary\",\"payload\":{\"play_seconds\":31},\"detail\":{},\"session\":1}\n"
            "{\"kind\":\"event\",\"id\":4,\"time\":1795201200,\"backend\":\"tally\",\"name\":"
            "\"sys.oxbow.tarnkit.Volume.Summary\",\"payload\":{\"play_seconds\":57.25},\"detail\":{}}\n");
  EXPECT_EQ(shown("batch\""),
            "{\"kind\":\"batch\",\"device\":\"64646464646464646464646464646464\",\"looked_at\":1795244400000000,"
            "\"first\":1,\"last\":6,\"left_out\":4,\"gaps\":[]}\n");
  EXPECT_EQ(shown("session\",\"id"),
            "{\"kind\":\"session\",\"id\":1,\"run\":1,\"process\":\"\",\"application\":\"" +
                FleetKey::parse(std::string(64, '7')).value.hashOf(0, "org.example.music") +
                "\",\"service_type\":7,\"service_name\":\"longformaudio\",\"created\":1795158000,\"periods\":"
                "[[1,1795158000.5,1795158010,4,1]]}\n");
  EXPECT_EQ(shown("secret"), "");
  EXPECT_EQ(shown("org.example"), "");
}

TEST_F(FleetShow, TellsWhatItIsADay) {
  makeSessions();
  const std::string total = shown("total\"");
  // From the first event on it was a day.
  const std::size_t bytes = total.find("\"bytes\":") + 8;
  const std::string number = total.substr(bytes, total.find(',', bytes) - bytes);
  EXPECT_EQ(total, "{\"kind\":\"total\",\"events\":2,\"messages\":1,\"bytes\":" + number +
                       ",\"bytes_a_day\":" + number + "}\n");
}

TEST_F(FleetShow, SinceAMomentOnlyWhatCameFromThenOn) {
  makeSessions();
  EXPECT_EQ(shown("batch\"", 1795201200),
            "{\"kind\":\"batch\",\"device\":\"64646464646464646464646464646464\",\"looked_at\":1795244400000000,"
            "\"first\":4,\"last\":6,\"left_out\":2,\"gaps\":[]}\n");
  EXPECT_EQ(shown("event\"", 1795201201), "");
}

TEST_F(FleetShow, WhatWasRemovedIsAGap) {
  makeSessions();
  sql("DELETE FROM event_rows WHERE id IN (2, 3)");
  EXPECT_NE(shown("batch\"").find("\"gaps\":[[2,3]]"), std::string::npos);
}

}  // namespace
}  // namespace tarn::fleet
