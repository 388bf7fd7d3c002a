// SPDX-License-Identifier: Apache-2.0
// Which lines about clients tell of a condition that a person acts on, and of whom.
#include <unistd.h>

#include <atomic>
#include <cstdint>
#include <memory>

#include "host/log/LogClient.h"
#include "tests/host/socket/SocketFixture.h"
#include "tests/support/ConditionLog.h"

namespace tarn::linux_host {
namespace {

using platform::LogCondition;

// Also on whose behalf the thread logs.
class ClientLog : public testing::ConditionLog {
 public:
  void write(const platform::LogEntry& entry) noexcept override {
    if (platform::LogConditionScope::current() != LogCondition::None) {
      process = LogClientScope::current().process;
    }
    ConditionLog::write(entry);
  }
  std::atomic<std::int32_t> process{0};
};

class ConnectionConditionsTest : public testing::SocketFixture {
 protected:
  void serveWithConditions() {
    host_ = std::make_unique<ConnectionHost>(running_.loop, conditions_, limits);
    auto socket = testing::bindTo(path_);
    ASSERT_EQ(socket.error.text(), "");
    listener_ = std::make_shared<SocketListener>(*host_, std::move(socket.value));
    listener_->setDelegate(service_);
    listener_->resume();
    running_.start();
  }

  ClientLog conditions_;
};

TEST_F(ConnectionConditionsTest, AClientThatIsCutOffIsOne) {
  serveWithConditions();
  TestClient client(path_);
  client.send(std::string("\1\0\0\0\xFF", 5));
  EXPECT_TRUE(eventually([this] { return conditions_.countOf(LogCondition::ClientCut) == 1; }));
  EXPECT_EQ(conditions_.process, ::getpid());
}

TEST_F(ConnectionConditionsTest, TheFirstRequestOfAConnectionThatIsOverQuotaIsOne) {
  limits.quotas.sessionsPerConnection = 1;
  serveWithConditions();
  TestClient client(path_);
  for (const std::int64_t session : {1, 2, 3}) {
    ASSERT_TRUE(client.ask(5, requestOf(Operation::CreateReportingSession, session)));
  }
  EXPECT_EQ(ledger().requestsRefused[3], 2U);
  EXPECT_EQ(conditions_.countOf(LogCondition::QuotaRefused), 1U);
  EXPECT_EQ(conditions_.process, ::getpid());
}

}  // namespace
}  // namespace tarn::linux_host
