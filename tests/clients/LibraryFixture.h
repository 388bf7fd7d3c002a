// SPDX-License-Identifier: Apache-2.0
// LibraryFixture: a client of the C library with a session, a shape of two keys and a writer.
#pragma once

#include <gtest/gtest.h>
#include <tarnreporting.h>

#include <string>
#include <string_view>

namespace tarn::reporting {

inline tarnreporting_value text(std::string_view value) {
  return tarnreporting_text(value.data(), static_cast<std::uint32_t>(value.size()));
}

class LibraryFixture : public ::testing::Test {
 protected:
  ~LibraryFixture() override {
    if (client_ != nullptr) {
      close(0);
    }
  }

  void openAt(const std::string& path, void (*onRefusal)(void*, const char*) = nullptr, void* context = nullptr) {
    const tarnreporting_client_options options = {sizeof options, path.c_str(), onRefusal, context};
    ASSERT_EQ(tarnreporting_client_open(&options, &client_), TARNREPORTING_OK);
  }
  void beginSession() {
    tarnreporting_session_options options = {};
    options.size = sizeof options;
    options.service_type = 7;
    options.application = "sys.oxbow.music";
    ASSERT_EQ(tarnreporting_session_begin(client_, &options, &session_), TARNREPORTING_OK);
  }
  // Playback, Start.
  void declareShape() {
    const tarnreporting_key keys[] = {{"number", TARNREPORTING_INTEGER}, {"name", TARNREPORTING_TEXT_VALUE}};
    const tarnreporting_shape_options options = {sizeof options, 4, 1, keys, 2};
    ASSERT_EQ(tarnreporting_shape_declare(session_, &options, &shape_), TARNREPORTING_OK);
  }
  void openWriter(std::uint32_t ringBytes = 0, std::uint32_t flags = 0) {
    const tarnreporting_writer_options options = {sizeof options, ringBytes, flags};
    ASSERT_EQ(tarnreporting_writer_open(client_, &options, &writer_), TARNREPORTING_OK);
  }
  void openAll(const std::string& path, std::uint32_t ringBytes = 0, std::uint32_t flags = 0) {
    openAt(path);
    beginSession();
    declareShape();
    openWriter(ringBytes, flags);
  }
  int post(std::int64_t number, std::string_view name = "a") {
    const tarnreporting_value values[] = {tarnreporting_integer(number), text(name)};
    return tarnreporting_post(writer_, shape_, values, 2);
  }
  tarnreporting_state state() {
    tarnreporting_state state = {};
    state.size = sizeof state;
    EXPECT_EQ(tarnreporting_client_state(client_, &state), TARNREPORTING_OK);
    return state;
  }
  std::uint64_t close(std::uint32_t timeoutMs) {
    std::uint64_t left = 0;
    tarnreporting_client_close(client_, timeoutMs, &left);
    client_ = nullptr;
    return left;
  }

  tarnreporting_client* client_ = nullptr;
  tarnreporting_session* session_ = nullptr;
  tarnreporting_shape* shape_ = nullptr;
  tarnreporting_writer* writer_ = nullptr;
};

}  // namespace tarn::reporting
