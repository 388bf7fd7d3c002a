// SPDX-License-Identifier: Apache-2.0
// WatchedStore: hands all on to a fake overflow store, shows each call before it's carried out, and harms single
// blocks.
#pragma once

#include <functional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "testing/FakeOverflowStore.h"

namespace tarn::testing {

class WatchedStore final : public platform::OverflowStore {
 public:
  enum class Call { Write, Read };

  explicit WatchedStore(FakeOverflowStore& store) : store_(store) {}

  const Bounds& bounds() const override { return store_.bounds(); }
  Result<Place> write(std::string_view bytes) override {
    show(Call::Write);
    Result<Place> written = store_.write(bytes);
    if (written.ok()) {
      places_.push_back(written.value);
    }
    return written;
  }
  Result<std::string> read(Place place) override {
    show(Call::Read);
    Result<std::string> bytes = store_.read(place);
    if (lost_.contains(place)) return {{}, Error{5, "Input/output error"}};
    if (harm_) {
      harm_(bytes.value);
    }
    return bytes;
  }
  void remove(Place place) noexcept override { store_.remove(place); }

  // Controls. `watch` may throw; `harm` changes what is read.
  void setWatch(std::function<void(Call)> watch) { watch_ = std::move(watch); }
  void setHarm(std::function<void(std::string&)> harm) { harm_ = std::move(harm); }
  // The block can't be read from now on.
  void lose(Place place) { lost_.insert(place); }

  // Observations: where blocks went, in the order in which they were written.
  const std::vector<Place>& places() const { return places_; }

 private:
  void show(Call call) const {
    if (watch_) {
      watch_(call);
    }
  }

  FakeOverflowStore& store_;
  std::function<void(Call)> watch_;
  std::function<void(std::string&)> harm_;
  std::set<Place> lost_;
  std::vector<Place> places_;
};

}  // namespace tarn::testing
