// SPDX-License-Identifier: Apache-2.0
// FakeDefaultsStore: a defaults store in memory. A suite and an application domain of one name are one and the same.
//
// Threads: any.
#pragma once

#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/DefaultsStore.h"
#include "testing/backends/OrderRecord.h"

namespace tarn::testing {

class FakeDefaultsStore final : public platform::DefaultsStore, public Recorded {
 public:
  struct PreferenceRead {
    std::string key;
    std::string applicationDomain;
    std::string user;
    friend bool operator==(const PreferenceRead&, const PreferenceRead&) = default;
  };
  struct Write {
    std::string suite;
    std::string key;
    plist::Value value;
  };

  // The interface.
  plist::Value value(std::string_view suite, std::string_view key) const override;
  plist::Value preference(std::string_view key, std::string_view applicationDomain,
                          std::string_view user) const override;
  [[nodiscard]] bool setValue(std::string_view suite, std::string_view key, const plist::ValueView& value) override;

  // Controls.
  // What another process would write; an absent value removes the key. Not counted among the writes.
  void set(std::string_view suite, std::string_view key, const plist::ValueView& value);
  // While true, everything reads as empty, as from a store that can't be read.
  void failReads(bool fail);
  // While true, nothing is stored.
  void failWrites(bool fail);

  // Observations.
  // The preferences asked for, in order.
  std::vector<PreferenceRead> preferenceReads() const;
  // The writes that worked, in order.
  std::vector<Write> writes() const;

 private:
  using Suite = std::map<std::string, plist::Value, std::less<>>;

  plist::Value find(std::string_view suite, std::string_view key) const;
  void store(std::string_view suite, std::string_view key, const plist::ValueView& value);

  mutable std::mutex mutex_;  // guards all below
  std::map<std::string, Suite, std::less<>> suites_;
  bool readsFail_ = false;
  bool writesFail_ = false;
  mutable std::vector<PreferenceRead> preferenceReads_;
  std::vector<Write> writes_;
};

}  // namespace tarn::testing
