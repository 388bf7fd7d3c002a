// SPDX-License-Identifier: Apache-2.0
#include "testing/backends/FakePerformanceTraceService.h"

#include <gtest/gtest.h>

namespace tarn::testing {
namespace {

class Delegate final : public platform::PerformanceTraceDelegate {
 public:
  void performanceTraceDidStart(const Status& error) override { note("start", error); }
  void performanceTraceDidStop(const Status& error) override { note("stop", error); }
  void performanceTraceDidComplete(const std::string& location, const std::string&, const Status& error) override {
    note("complete " + location, error);
  }

  std::vector<std::string> calls;

 private:
  void note(const std::string& name, const Status& error) {
    calls.push_back(error.failed() ? name + ": " + error->text : name);
  }
};

class FakePerformanceTraceServiceTest : public ::testing::Test {
 protected:
  void makeSession() {
    session_ = service_.createSession({3, false});
    session_->setDelegate(delegate_);
  }

  FakePerformanceTraceService service_;
  std::shared_ptr<Delegate> delegate_ = std::make_shared<Delegate>();
  std::shared_ptr<platform::PerformanceTraceSession> session_;
};

TEST_F(FakePerformanceTraceServiceTest, ATraceRunsFromStartToCompletion) {
  makeSession();
  EXPECT_FALSE(session_->isValid());

  session_->startTrace();
  EXPECT_TRUE(session_->isValid());
  session_->stopTrace();

  EXPECT_FALSE(session_->isValid());
  EXPECT_EQ(delegate_->calls, (std::vector<std::string>{"start", "stop", "complete /device/traces/1"}));
  EXPECT_EQ(service_.traces().at(0).configuration.templateNumber, 3);
  EXPECT_FALSE(service_.traces().at(0).configuration.compressWhenFinished);
}

TEST_F(FakePerformanceTraceServiceTest, NothingFollowsACallbackWithAnError) {
  service_.failStop(Error{1, "no buffer"});
  makeSession();
  session_->startTrace();

  session_->stopTrace();

  EXPECT_EQ(delegate_->calls, (std::vector<std::string>{"start", "stop: no buffer"}));
}

TEST_F(FakePerformanceTraceServiceTest, AFailedCompletionHasNoLocation) {
  service_.failCompletion(Error{1, "no disk"});
  makeSession();
  session_->startTrace();

  session_->stopTrace();

  EXPECT_EQ(delegate_->calls.back(), "complete : no disk");
}

TEST_F(FakePerformanceTraceServiceTest, AFailedStartLeavesNoTrace) {
  service_.failStart(Error{1, "busy"});
  makeSession();

  session_->startTrace();

  EXPECT_EQ(delegate_->calls, std::vector<std::string>{"start: busy"});
  EXPECT_FALSE(session_->isValid());
}

TEST_F(FakePerformanceTraceServiceTest, ASessionThatWasLetGoOfMakesNoMoreCallbacks) {
  service_.callbacks().set(ReplyFault::Hold);
  makeSession();
  session_->startTrace();
  session_.reset();

  EXPECT_EQ(service_.callbacks().deliverHeld(), 1U);

  EXPECT_TRUE(delegate_->calls.empty());
  EXPECT_TRUE(service_.traces().at(0).released);
}

TEST_F(FakePerformanceTraceServiceTest, ADelegateThatIsGoneIsNotCalled) {
  service_.callbacks().set(ReplyFault::Hold);
  makeSession();
  session_->startTrace();
  delegate_.reset();

  EXPECT_EQ(service_.callbacks().deliverHeld(), 1U);

  EXPECT_TRUE(session_->isValid());
}

}  // namespace
}  // namespace tarn::testing
