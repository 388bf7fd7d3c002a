// SPDX-License-Identifier: Apache-2.0
#include "tools/ctl/views/TopLoop.h"

#include <gtest/gtest.h>

#include <deque>

#include "tools/ctl/terminal/Output.h"

namespace tarn::ctl {
namespace {

// Gives looks in their order, and the last one for ever.
class FakeSource final : public TopSource {
 public:
  TopSample look() override {
    ++looks_;
    TopSample sample;
    if (looks_ - 1 < isUp_.size() ? isUp_[looks_ - 1] : isUp_.back()) {
      sample.status = plist::Dictionary{{"frames_received", static_cast<std::int64_t>(10 * looks_ * looks_)}};
    } else {
      sample.whyNot = "nobody listens";
    }
    sample.steady = static_cast<double>(looks_);
    return sample;
  }

  // Controls.
  void setUp(std::vector<bool> isUp) { isUp_ = std::move(isUp); }

  // Observations.
  std::size_t looks() const { return looks_; }

 private:
  std::vector<bool> isUp_{true};
  std::size_t looks_ = 0;
};

class FakeScreen final : public TopScreen {
 public:
  bool show(const TopView& view) override {
    views_.push_back(view);
    return views_.size() != seenFor_;
  }
  bool pause() override {
    ++pauses_;
    return pauses_ != endsInPause_;
  }

  // Controls: nobody looks after so many views; the end is asked for in that pause.
  void setSeenFor(std::size_t views) { seenFor_ = views; }
  void setEndsInPause(std::size_t pause) { endsInPause_ = pause; }

  // Observations.
  const std::vector<TopView>& views() const { return views_; }
  std::size_t pauses() const { return pauses_; }

 private:
  std::vector<TopView> views_;
  std::size_t pauses_ = 0;
  std::size_t seenFor_ = 0;
  std::size_t endsInPause_ = 0;
};

class TopLoop : public ::testing::Test {
 protected:
  FakeSource source_;
  FakeScreen screen_;
};

TEST_F(TopLoop, ShowsAsManyViewsAsAreAskedForAndPausesBetweenThem) {
  EXPECT_EQ(runTop(source_, screen_, 3), kSuccess);
  EXPECT_EQ(screen_.views().size(), 3U);
  EXPECT_EQ(screen_.pauses(), 2U);
  EXPECT_EQ(source_.looks(), 3U);
}

TEST_F(TopLoop, EachViewKnowsTheLookBeforeIt) {
  static_cast<void>(runTop(source_, screen_, 3));
  ASSERT_EQ(screen_.views().size(), 3U);
  EXPECT_FALSE(screen_.views()[0].ledger.at(0).rate);
  EXPECT_EQ(screen_.views()[2].ledger.at(0).rate, 50);  // from 40 to 90
}

TEST_F(TopLoop, EndsQuietlyWhenNobodyLooks) {
  screen_.setSeenFor(2);
  EXPECT_EQ(runTop(source_, screen_, 0), kSuccess);
  EXPECT_EQ(screen_.views().size(), 2U);
  EXPECT_EQ(screen_.pauses(), 1U);
}

TEST_F(TopLoop, EndsQuietlyWhenItIsAskedToInAPause) {
  screen_.setEndsInPause(2);
  EXPECT_EQ(runTop(source_, screen_, 0), kSuccess);
  EXPECT_EQ(screen_.views().size(), 2U);
}

TEST_F(TopLoop, ServiceThatIsNotThereAtFirstIsUnreachable) {
  source_.setUp({false});
  EXPECT_EQ(runTop(source_, screen_, 3), kUnreachable);
  EXPECT_TRUE(screen_.views().empty());
}

TEST_F(TopLoop, ServiceThatEndsMeanwhileIsShownAndSeenAgain) {
  source_.setUp({true, false, true});
  EXPECT_EQ(runTop(source_, screen_, 3), kSuccess);
  ASSERT_EQ(screen_.views().size(), 3U);
  EXPECT_FALSE(screen_.views()[1].sample.status);
  EXPECT_EQ(screen_.views()[1].sample.whyNot, "nobody listens");
  EXPECT_TRUE(screen_.views()[2].sample.status);
}

}  // namespace
}  // namespace tarn::ctl
