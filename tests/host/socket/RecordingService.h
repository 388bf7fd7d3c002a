// SPDX-License-Identifier: Apache-2.0
// RecordingService: in place of the service. It notes each request, answers it on the server queue,
// and can misbehave on demand. It lives in the test process; its fields are touched on the loop's thread, so tests look
// at them through RunningLoop::onQueue.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <new>
#include <string>
#include <utility>
#include <vector>

#include "host/loop/ServerQueue.h"
#include "platform/Listener.h"
#include "platform/TarnReportingServiceProtocol.h"

namespace tarn::testing {

class RecordingService final : public platform::ListenerDelegate,
                               public std::enable_shared_from_this<RecordingService> {
 public:
  explicit RecordingService(std::shared_ptr<linux_host::ServerQueue> queue) : queue_(std::move(queue)) {}
  RecordingService(const RecordingService&) = delete;
  RecordingService& operator=(const RecordingService&) = delete;

  // The interface. Clients are numbered from 1 in the order in which they were accepted.
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<platform::Connection>& connection) override;

  // Controls.
  bool replyTwice = false;                        // every message is answered twice
  std::size_t replyPadding = 0;                   // bytes of the dictionary that reporterID answers
  std::vector<std::int64_t> reporters{1, -2, 3};  // that getAllReporters answers
  int slices = 0;                           // a stop is so many events "1 slice" first, each of which may give way
  std::function<void(int)> onSlice;         // called with how many are left
  std::size_t runCost = 0;                  // of each message of a run
  std::function<std::uint64_t()> received;  // asked with each message of a run
  std::map<int, std::size_t> logBytes;      // that the sessions of a client take, by its number
  // Where memory is missing from now on.
  enum class Short { Nowhere, Accepting, HandingOver, Working, AfterTheReply, Ending };
  Short shortOfMemory = Short::Nowhere;

  // Observations.
  struct Held {
    std::int64_t reporterID;
    platform::Acknowledge reply;
  };
  std::vector<std::string> events;  // "1 createReportingSession 7", "1 interrupted", "1 invalidated"
  std::vector<Held> heldStarts;     // the reply of every start
  std::vector<std::int32_t> processIdentifiers;
  std::vector<std::pair<std::int64_t, std::uint32_t>> openers;  // number and user of each connection
  std::vector<std::string> descriptions;
  std::vector<std::uint64_t> receivedThen;  // what it answered
  std::size_t mostWaiting = 0;              // pieces of work that waited when a request came

 private:
  class Client;
  void allocate(Short where) const {
    if (shortOfMemory == where) throw std::bad_alloc();
  }

  std::shared_ptr<linux_host::ServerQueue> queue_;
  int clients_ = 0;
};

}  // namespace tarn::testing
