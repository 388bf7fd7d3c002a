// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/sessions/SessionTable.h"

#include "tests/ctl/SessionMessages.h"

namespace tarn::ctl {
namespace {

using Lines = std::vector<std::string>;

TEST(SessionTable, HasAColumnForEachKeyThatAnyMessageHas) {
  EXPECT_EQ(tableOf({messageAt(10, "Playback.Start", R"("b":1,"a":true)", 4),
                     messageAt(11.5, "Volume.Summary", R"("msgidx":1,"msgcnt":1,"a":0.5)", 7)}),
            (Lines{"event,time,stamp,category,type,derived,tarnreporting_timestamp,b,a,msgidx,msgcnt",
                   "4,10.0,10.0,Playback,Start,false,10.0,1,true,,", "7,11.5,11.5,Volume,Summary,true,11.5,,0.5,1,1"}));
}

TEST(SessionTable, QuotesWhatWouldBeMistaken) {
  const Lines lines =
      tableOf({messageAt(10, "Playback.Start", R"("a,b":"say \"x\", twice","list":[1,"two"],"plain":"a b")")});
  EXPECT_EQ(lines[0], "event,time,stamp,category,type,derived,tarnreporting_timestamp,\"a,b\",list,plain");
  EXPECT_EQ(lines[1], R"(1,10.0,10.0,Playback,Start,false,10.0,"say ""x"", twice","[1,""two""]",a b)");
}

TEST(SessionTable, WithoutMessagesThereIsTheHeading) {
  EXPECT_EQ(tableOf({}), Lines{"event,time,stamp,category,type,derived"});
}

}  // namespace
}  // namespace tarn::ctl
