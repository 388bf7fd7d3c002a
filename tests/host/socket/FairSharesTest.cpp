// SPDX-License-Identifier: Apache-2.0
// Who is served next: by cost, among users and among their connections.
#include "host/socket/FairShares.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <string>
#include <vector>

namespace tarn::linux_host {
namespace {

// Has so many pieces of one cost to do, and notes each.
class Pieces final : public ShareHolder {
 public:
  Pieces(std::shared_ptr<ShareParty> party, std::string name, std::vector<std::string>& done)
      : ShareHolder(std::move(party)), name_(std::move(name)), done_(done) {}

  Turn takeTurn(std::int64_t credit) override {
    std::int64_t cost = 0;
    while (left != 0 && cost < credit) {
      doOne();
      cost += each;
    }
    return {cost, left != 0};
  }
  void finishWork() override {
    while (left != 0) {
      doOne();
    }
  }

  std::size_t left = 0;
  std::int64_t each = 1;

 private:
  void doOne() {
    --left;
    done_.push_back(name_);
  }

  std::string name_;
  std::vector<std::string>& done_;
};

class FairSharesTest : public ::testing::Test {
 protected:
  std::shared_ptr<Pieces> holder(std::uint32_t user, std::string name, std::size_t pieces, std::int64_t each = 1) {
    auto made = std::make_shared<Pieces>(shares_.partyOf(user), std::move(name), done_);
    made->left = pieces;
    made->each = each;
    shares_.ready(made);
    return made;
  }
  bool serve(std::int64_t budget) {
    return shares_.serve(budget,
                         [this](const ShareParty& party) { return open_ && !(crowded_ && shares_.isHeavy(party)); });
  }
  std::ptrdiff_t count(std::string_view name) const { return std::count(done_.begin(), done_.end(), name); }
  // Pieces of others that were done before the first of this one.
  std::ptrdiff_t before(std::string_view name) const {
    return std::find(done_.begin(), done_.end(), name) - done_.begin();
  }

  bool open_ = true;
  bool crowded_ = false;  // heavy ones aren't served
  std::vector<std::string> done_;
  FairShares shares_;
};

TEST_F(FairSharesTest, TheOnlyOneIsServedOnAndOn) {
  holder(1, "a", 1000);
  EXPECT_FALSE(serve(2000));
  EXPECT_EQ(count("a"), 1000);
}

TEST_F(FairSharesTest, ABudgetEndsTheServingAndTellsWhetherThereIsMore) {
  holder(1, "a", 100);
  EXPECT_TRUE(serve(64));
  EXPECT_EQ(count("a"), 64);
  EXPECT_FALSE(serve(64));
  EXPECT_EQ(count("a"), 100);
}

TEST_F(FairSharesTest, WhoTookMuchLatelyIsPassedOverAndOthersAreServed) {
  holder(1, "much", 5000);
  EXPECT_TRUE(serve(4000));
  holder(2, "little", 10);
  crowded_ = true;
  EXPECT_FALSE(serve(4000));
  EXPECT_EQ(count("little"), 10);
  EXPECT_EQ(count("much"), 4000);
  crowded_ = false;
  EXPECT_FALSE(serve(4000));
  EXPECT_EQ(count("much"), 5000);
}

TEST_F(FairSharesTest, AFourthOfWhatWasDoneLatelyIsNotMuchAndMoreIs) {
  const auto fourth = holder(1, "a", 1000);
  const auto rest = holder(2, "b", 3000);
  EXPECT_FALSE(serve(10000));
  EXPECT_FALSE(shares_.isHeavy(*shares_.partyOf(1)));
  EXPECT_TRUE(shares_.isHeavy(*shares_.partyOf(2)));
  fourth->left = 1;
  shares_.ready(fourth);
  EXPECT_FALSE(serve(1));
  EXPECT_TRUE(shares_.isHeavy(*shares_.partyOf(1)));
}

TEST_F(FairSharesTest, WhatWasTakenLongAgoCountsNoMore) {
  constexpr std::int64_t kEach = 64;
  const auto before = holder(1, "a", FairShares::kFadingCost / kEach, kEach);
  EXPECT_FALSE(serve(2 * FairShares::kFadingCost));
  EXPECT_TRUE(shares_.isHeavy(*shares_.partyOf(1)));
  const auto since = holder(2, "b", 4 * FairShares::kFadingCost / kEach, kEach);
  EXPECT_FALSE(serve(8 * FairShares::kFadingCost));
  EXPECT_FALSE(shares_.isHeavy(*shares_.partyOf(1)));
}

TEST_F(FairSharesTest, WhoseTurnItIsIsKnownInItOnly) {
  struct Curious final : ShareHolder {
    Curious(std::shared_ptr<ShareParty> party, const FairShares& theShares)
        : ShareHolder(std::move(party)), shares(theShares) {}
    Turn takeTurn(std::int64_t) override {
      seen = shares.served();
      return {1, false};
    }
    void finishWork() override {}
    const FairShares& shares;
    const ShareParty* seen = nullptr;
  };
  const auto curious = std::make_shared<Curious>(shares_.partyOf(1), shares_);
  shares_.ready(curious);
  serve(1);
  EXPECT_EQ(curious->seen, shares_.partyOf(1).get());
  EXPECT_EQ(shares_.served(), nullptr);
}

TEST_F(FairSharesTest, NobodyIsServedWhileItIsShut) {
  holder(1, "a", 1);
  open_ = false;
  EXPECT_FALSE(serve(64));
  EXPECT_TRUE(done_.empty());
  open_ = true;
  EXPECT_FALSE(serve(64));
  EXPECT_EQ(count("a"), 1);
}

TEST_F(FairSharesTest, ConnectionsOfAUserShareByCost) {
  holder(1, "cheap", 100000, 1);
  holder(1, "dear", 100000, 8);
  serve(6400);
  EXPECT_NEAR(static_cast<double>(count("cheap")), 3200, 200);
  EXPECT_NEAR(static_cast<double>(count("dear") * 8), 3200, 200);
}

TEST_F(FairSharesTest, UsersShareByCostHoweverManyConnectionsEachHas) {
  for (int i = 0; i < 50; ++i) {
    holder(1, "many", 100000);
  }
  holder(2, "one", 100000);
  serve(6400);
  EXPECT_NEAR(static_cast<double>(count("many")), 3200, 200);
  EXPECT_NEAR(static_cast<double>(count("one")), 3200, 200);
}

TEST_F(FairSharesTest, WhoOverspentWaitsUntilItIsPaid) {
  holder(1, "dear", 2, 320);
  serve(1);
  holder(1, "cheap", 100000);
  serve(640);
  EXPECT_EQ(count("dear"), 2);
  EXPECT_GE(std::find(done_.begin() + 1, done_.end(), "dear") - done_.begin(), 280);
}

TEST_F(FairSharesTest, ADebtIsForgivenBeyondItsBound) {
  holder(1, "dear", 2, 1000000);
  serve(1);
  holder(1, "cheap", 100000);
  serve(2 * FairShares::kMostDebt + 1000000);
  EXPECT_EQ(count("dear"), 2);
}

TEST_F(FairSharesTest, ARequestNowAndThenGoesAheadOfAThousandBusyConnections) {
  for (int i = 0; i < 1000; ++i) {
    holder(1, "busy", 100000);
  }
  serve(200000);
  done_.clear();
  holder(1, "polite", 1);
  serve(1000);
  EXPECT_LE(before("polite"), FairShares::kQuantum);
}

TEST_F(FairSharesTest, ARequestOfAnotherUserWaitsForOneVisitOfEachUser) {
  for (std::uint32_t user = 1; user <= 3; ++user) {
    for (int i = 0; i < 20; ++i) {
      holder(user, "busy", 100000);
    }
  }
  serve(20000);
  done_.clear();
  holder(9, "polite", 1);
  serve(1000);
  EXPECT_LE(before("polite"), 4 * FairShares::kQuantum);
}

TEST_F(FairSharesTest, ThoseThatComeNowAndThenLeaveTheBusyOnesTheirTurns) {
  const auto busy = holder(1, "busy", 100000);
  serve(64);
  done_.clear();
  for (int round = 0; round < 20; ++round) {
    for (int i = 0; i < 20; ++i) {
      holder(1, "now and then", 32);
    }
    serve(640);
  }
  EXPECT_GE(count("busy"), 640 * 20 / (FairShares::kFreshTurns + 2));
}

TEST_F(FairSharesTest, WhatComesWhileAHolderIsServedIsAskedForAnew) {
  const auto one = holder(1, "a", 1);
  EXPECT_FALSE(serve(10));
  one->left = 1;
  shares_.ready(one);
  shares_.ready(one);
  EXPECT_FALSE(serve(10));
  EXPECT_EQ(count("a"), 2);
}

TEST_F(FairSharesTest, FinishesWhatEverybodyHasLeft) {
  holder(1, "a", 3);
  holder(2, "b", 4);
  shares_.finishWork();
  EXPECT_EQ(done_.size(), 7U);
  EXPECT_FALSE(serve(1));
}

TEST_F(FairSharesTest, UsersThatAreGoneAreForgotten) {
  const auto first = shares_.partyOf(7);
  for (std::uint32_t user = 1000; user < 2000; ++user) {
    shares_.partyOf(user);
  }
  EXPECT_EQ(shares_.partyOf(7), first);
  // One that was remembered would have its place still.
  const std::weak_ptr<ShareParty> gone = shares_.partyOf(1000);
  for (std::uint32_t user = 2000; user < 3000; ++user) {
    shares_.partyOf(user);
  }
  EXPECT_TRUE(gone.expired());
}

TEST_F(FairSharesTest, WhoComesBackOwesWhatItOwed) {
  holder(1, "dear", 1, 100 * FairShares::kQuantum);
  serve(1);
  for (std::uint32_t user = 1000; user < 3000; ++user) {
    shares_.partyOf(user);
  }
  EXPECT_LT(shares_.partyOf(1)->credit, 0);
  holder(1, "back", 1);
  holder(2, "other", 1);
  crowded_ = true;
  serve(1000);
  EXPECT_EQ(count("back"), 0) << "what was done for it lately still counts";
  EXPECT_EQ(count("other"), 1);
}

TEST_F(FairSharesTest, WhoIsGoneIsNotVisited) {
  const auto here = shares_.partyOf(1);
  holder(2, "gone", 1, 100 * FairShares::kQuantum);
  serve(1);
  std::vector<std::uint32_t> visited;
  shares_.forEachParty([&](const ShareParty& party) { visited.push_back(party.user); });
  EXPECT_EQ(visited, std::vector<std::uint32_t>{1});
}

TEST(FairShares, LetsGoOfThoseThatWaitWhenItEnds) {
  std::vector<std::string> done;
  std::weak_ptr<Pieces> waiting;
  {
    FairShares shares;
    const auto made = std::make_shared<Pieces>(shares.partyOf(1), "waiting", done);
    made->left = 1;
    shares.ready(made);
    waiting = made;
  }
  EXPECT_TRUE(waiting.expired());
}

}  // namespace
}  // namespace tarn::linux_host
