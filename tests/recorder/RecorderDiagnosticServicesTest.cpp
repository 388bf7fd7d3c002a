// SPDX-License-Identifier: Apache-2.0
// The bug-filing prompt and the stack-sampling service as the recorder stands in for them.
#include "recorder/RecorderGyreService.h"
#include "recorder/RecorderTattleService.h"
#include "testing/ManualWorkQueues.h"
#include "tests/recorder/RecorderFixture.h"

namespace tarn::recorder {
namespace {

using tarn::testing::ManualWorkQueues;

class RecorderTattleServiceTest : public RecorderFixture {
 protected:
  static platform::TattleDraft draft() {
    platform::TattleDraft draft;
    draft.title = "a \"title\"";
    draft.description = "what happened";
    draft.component = {"Core", "All", 1084682};
    draft.reproducibility = 6;
    draft.classification = 7;
    draft.diagnosticExtensions = {"one", "two"};
    return draft;
  }
  // A completion that counts its calls and keeps the last error.
  platform::TattleService::Completion completion() {
    return [this](const Status& error) {
      ++completions_;
      error_ = error;
    };
  }

  ManualWorkQueues workQueues_{clock_};
  int completions_ = 0;
  Status error_ = Error{1, "not called"};
};

TEST_F(RecorderTattleServiceTest, RecordsTheDraftWithItsProcessAndReason) {
  RecorderTattleService service(start(), clock_, workQueues_);
  clock_.setEpochSeconds(1763632800.5);
  service.createDraft(draft(), "parleyd", "an error occurred", completion());
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id, time, backend, name, payload, detail FROM events"),
            R"(1|1763632800.5|tattle|createDraft|{"title":"a \"title\"","description":"what happened",)"
            R"("component":{"name":"Core","version":"All","identifier":1084682},"reproducibility":6,)"
            R"("classification":7,"extensions":["one","two"]}|{"process":"parleyd","reason":"an error occurred"})");
}

TEST_F(RecorderTattleServiceTest, LeavesOutAProcessThatIsNotKnown) {
  RecorderTattleService service(start(), clock_, workQueues_);
  platform::TattleDraft bare;
  service.createDraft(bare, std::nullopt, "", completion());
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT payload ->> 'extensions', detail FROM events"), R"([]|{"reason":""})");
}

TEST_F(RecorderTattleServiceTest, CompletesOnceOnAQueueOfItsOwnBehindTheCall) {
  RecorderTattleService service(start(), clock_, workQueues_);
  EXPECT_TRUE(workQueues_.names().empty());
  service.createDraft(draft(), "a", "b", completion());
  service.createDraft(draft(), "a", "b", completion());
  EXPECT_EQ(completions_, 0);
  EXPECT_EQ(workQueues_.names().size(), 1U);
  workQueues_.runUntilIdle();
  EXPECT_EQ(completions_, 2);
  EXPECT_TRUE(error_.ok());
}

TEST_F(RecorderTattleServiceTest, CompletesThoughTheServiceIsGone) {
  {
    RecorderTattleService service(start(), clock_, workQueues_);
    service.createDraft(draft(), "a", "b", completion());
  }
  workQueues_.runUntilIdle();
  EXPECT_EQ(completions_, 1);
}

class RecorderGyreServiceTest : public RecorderFixture {};

TEST_F(RecorderGyreServiceTest, RecordsTheRequest) {
  RecorderGyreService service(start(), clock_);
  clock_.setEpochSeconds(1763632800.5);
  service.requestGyre({.subsystem = "sys.oxbow.tarnkit",
                       .reason = "AudioOverloads",
                       .applicationIdentifier = "org.example",
                       .payload = {{"io_cycle", 4}, {"when", plist::Date{0}}},
                       .options = {1, 1, 0, 0, 0}});
  ASSERT_TRUE(flush());
  EXPECT_EQ(askOne(file(), "SELECT id, time, backend, name, payload, detail FROM events"),
            R"(1|1763632800.5|gyre|requestGyre|{"io_cycle":4,"when":"1970-01-01T00:00:00Z"}|)"
            R"({"subsystem":"sys.oxbow.tarnkit","reason":"AudioOverloads","application":"org.example",)"
            R"("options":[1,1,0,0,0]})");
}

}  // namespace
}  // namespace tarn::recorder
