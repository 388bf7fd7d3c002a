// SPDX-License-Identifier: Apache-2.0
// ServiceRing: the C library and the real service, which the test starts.
#pragma once

#include <cstdint>
#include <thread>
#include <vector>

#include "tests/clients/LibraryFixture.h"
#include "tests/e2e/support/ServiceFixture.h"

namespace tarn::reporting {

class ServiceRing : public e2e::ServiceFixture {
 protected:
  static constexpr const char* kName = "sys.oxbow.tarnkit.Playback.Start";

  struct Library : LibraryFixture {
    using LibraryFixture::beginSession;
    using LibraryFixture::client_;
    using LibraryFixture::close;
    using LibraryFixture::declareShape;
    using LibraryFixture::openAll;
    using LibraryFixture::openAt;
    using LibraryFixture::openWriter;
    using LibraryFixture::post;
    using LibraryFixture::session_;
    using LibraryFixture::shape_;
    using LibraryFixture::state;
    using LibraryFixture::writer_;
    void TestBody() override {}
  };

  void postAll(std::int64_t from, std::int64_t to) {
    for (std::int64_t number = from; number < to; ++number) {
      while (library_.post(number) == TARNREPORTING_DROPPED) {
        std::this_thread::yield();
      }
    }
  }
  std::vector<std::int64_t> recorded(std::size_t count) {
    std::vector<std::int64_t> numbers;
    for (const e2e::Event& event : eventsOnceThereAre(count, kName)) {
      numbers.push_back(event.payload.at("number").get<std::int64_t>());
    }
    return numbers;
  }
  static std::vector<std::int64_t> count(std::int64_t from, std::int64_t to) {
    std::vector<std::int64_t> numbers;
    for (std::int64_t number = from; number < to; ++number) {
      numbers.push_back(number);
    }
    return numbers;
  }

  Library library_;
};

}  // namespace tarn::reporting
