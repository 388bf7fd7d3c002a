// SPDX-License-Identifier: Apache-2.0
#include "testing/FakeDefaultsStore.h"

namespace tarn::testing {

plist::Value FakeDefaultsStore::value(std::string_view suite, std::string_view key) const {
  const std::lock_guard lock(mutex_);
  return find(suite, key);
}

plist::Value FakeDefaultsStore::preference(std::string_view key, std::string_view applicationDomain,
                                           std::string_view user) const {
  const std::lock_guard lock(mutex_);
  preferenceReads_.push_back({std::string(key), std::string(applicationDomain), std::string(user)});
  return find(applicationDomain, key);
}

bool FakeDefaultsStore::setValue(std::string_view suite, std::string_view key, const plist::ValueView& value) {
  happened("store", key);
  const std::lock_guard lock(mutex_);
  if (writesFail_) return false;
  store(suite, key, value);
  writes_.push_back({std::string(suite), std::string(key), plist::Value(value)});
  return true;
}

void FakeDefaultsStore::set(std::string_view suite, std::string_view key, const plist::ValueView& value) {
  const std::lock_guard lock(mutex_);
  store(suite, key, value);
}

void FakeDefaultsStore::failReads(bool fail) {
  const std::lock_guard lock(mutex_);
  readsFail_ = fail;
}

void FakeDefaultsStore::failWrites(bool fail) {
  const std::lock_guard lock(mutex_);
  writesFail_ = fail;
}

std::vector<FakeDefaultsStore::PreferenceRead> FakeDefaultsStore::preferenceReads() const {
  const std::lock_guard lock(mutex_);
  return preferenceReads_;
}

std::vector<FakeDefaultsStore::Write> FakeDefaultsStore::writes() const {
  const std::lock_guard lock(mutex_);
  return writes_;
}

plist::Value FakeDefaultsStore::find(std::string_view suite, std::string_view key) const {
  const auto foundSuite = suites_.find(suite);
  if (readsFail_ || foundSuite == suites_.end()) return {};
  const auto found = foundSuite->second.find(key);
  return found == foundSuite->second.end() ? plist::Value() : found->second;
}

void FakeDefaultsStore::store(std::string_view suite, std::string_view key, const plist::ValueView& value) {
  Suite& keys = suites_[std::string(suite)];
  if (value.present()) {
    keys.insert_or_assign(std::string(key), plist::Value(value));
  } else {
    keys.erase(std::string(key));
  }
}

}  // namespace tarn::testing
