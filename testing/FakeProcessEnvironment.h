// SPDX-License-Identifier: Apache-2.0
// FakeProcessEnvironment: variables that no process sees. Threads: one at a time.
#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "platform/ProcessEnvironment.h"

namespace tarn::testing {

class FakeProcessEnvironment final : public platform::ProcessEnvironment {
 public:
  // The interface.
  Status set(std::string_view name, std::string_view value) override {
    if (refusal_.failed()) return refusal_;
    variables_.insert_or_assign(std::string(name), std::string(value));
    return {};
  }

  // Controls.
  void refuse(Status error) { refusal_ = std::move(error); }

  // Observations.
  std::optional<std::string> value(std::string_view name) const {
    const auto found = variables_.find(name);
    return found == variables_.end() ? std::nullopt : std::optional(found->second);
  }

 private:
  Status refusal_;
  std::map<std::string, std::string, std::less<>> variables_;
};

}  // namespace tarn::testing
