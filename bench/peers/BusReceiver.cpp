// SPDX-License-Identifier: Apache-2.0
#include "bench/peers/BusReceiver.h"

#include <unistd.h>

#include <cstdlib>
#include <string>
#include <system_error>
#include <vector>

#include "bench/Message.h"
#include "plist/Dictionary.h"

namespace tarn::bench {

namespace {

constexpr const char* kPath = "/sys/oxbow/bench";
constexpr const char* kInterface = "sys.oxbow.bench";
constexpr const char* kMethod = "SendMessage";
constexpr std::uint64_t kForEver = UINT64_MAX;

void check(int result, const char* what) {
  if (result < 0) {
    fail(std::string("sd-bus, ") + what + ": " + std::generic_category().message(-result));
  }
}

// Reads one a{sv} to its end; whether it is well-formed.
bool readDictionary(sd_bus_message* message) {
  if (sd_bus_message_enter_container(message, 'a', "{sv}") < 0) return false;
  while (sd_bus_message_enter_container(message, 'e', "sv") > 0) {
    const char* key = nullptr;
    const char* type = nullptr;
    union {
      double number;
      std::int64_t integer;
      int boolean;
      const char* text;
    } value{};
    if (sd_bus_message_read_basic(message, 's', &key) < 0 || sd_bus_message_peek_type(message, nullptr, &type) < 0 ||
        sd_bus_message_enter_container(message, 'v', type) < 0 ||
        sd_bus_message_read_basic(message, type[0], &value) < 0 || sd_bus_message_exit_container(message) < 0 ||
        sd_bus_message_exit_container(message) < 0) {
      return false;
    }
  }
  return sd_bus_message_exit_container(message) >= 0;
}

int handleMessage(sd_bus_message* message, void*, sd_bus_error*) {
  if (!readDictionary(message)) return sd_bus_reply_method_errorf(message, SD_BUS_ERROR_INVALID_ARGS, "no dictionary");
  return sd_bus_reply_method_return(message, nullptr);
}

void serve(int socket) {
  static const sd_bus_vtable kTable[] = {SD_BUS_VTABLE_START(0),
                                         SD_BUS_METHOD(kMethod, "a{sv}", "", handleMessage, SD_BUS_VTABLE_UNPRIVILEGED),
                                         SD_BUS_VTABLE_END};
  sd_bus* bus = nullptr;
  sd_id128_t id{};
  if (sd_bus_new(&bus) < 0 || sd_bus_set_fd(bus, socket, socket) < 0 || sd_id128_randomize(&id) < 0 ||
      sd_bus_set_server(bus, 1, id) < 0 || sd_bus_set_anonymous(bus, 1) < 0 || sd_bus_start(bus) < 0 ||
      sd_bus_add_object_vtable(bus, nullptr, kPath, kInterface, kTable, nullptr) < 0) {
    std::_Exit(EXIT_FAILURE);
  }
  for (;;) {
    const int processed = sd_bus_process(bus, nullptr);
    if (processed < 0 || (processed == 0 && sd_bus_wait(bus, kForEver) < 0)) {
      std::_Exit(EXIT_SUCCESS);
    }
  }
}

// The message in the form that the library's calls take, made once.
struct Entry {
  std::string key;
  std::string text;  // of a text
  plist::ValueView value;
};

std::vector<Entry> makeEntries() {
  static const plist::Dictionary kMessage = makeMessage(1);
  std::vector<Entry> entries;
  for (const plist::Dictionary::Entry& entry : kMessage) {
    entries.push_back({std::string(entry.key.text()), entry.value.asText(), entry.value});
  }
  return entries;
}

int appendVariant(sd_bus_message* message, const Entry& entry, std::uint64_t number) {
  switch (entry.value.kind()) {
    case plist::Kind::Bool:
      return sd_bus_message_append(message, "v", "b", entry.value.boolValue() ? 1 : 0);
    case plist::Kind::Signed:
      return sd_bus_message_append(message, "v", "x", entry.value.signedValue());
    case plist::Kind::Unsigned:  // these count
      return sd_bus_message_append(message, "v", "t", number);
    case plist::Kind::Text:
      return sd_bus_message_append(message, "v", "s", entry.text.c_str());
    default:
      return sd_bus_message_append(message, "v", "d", entry.value.asDouble());
  }
}

}  // namespace

BusReceiver::BusReceiver() : child_([this] { serve(ends_.theirs); }) {
  ::close(ends_.theirs);
  check(sd_bus_new(&bus_), "making a connection");
  check(sd_bus_set_fd(bus_, ends_.ours, ends_.ours), "taking the socket");
  check(sd_bus_start(bus_), "starting");
}

BusReceiver::~BusReceiver() {
  sd_bus_close(bus_);
  sd_bus_unref(bus_);
}

sd_bus_message* BusReceiver::makeCall() {
  static const std::vector<Entry> kEntries = makeEntries();
  ++number_;
  sd_bus_message* call = nullptr;
  check(sd_bus_message_new_method_call(bus_, &call, nullptr, kPath, kInterface, kMethod), "making a call");
  check(sd_bus_message_open_container(call, 'a', "{sv}"), "writing");
  for (const Entry& entry : kEntries) {
    check(sd_bus_message_open_container(call, 'e', "sv"), "writing");
    check(sd_bus_message_append_basic(call, 's', entry.key.c_str()), "writing");
    check(appendVariant(call, entry, number_), "writing");
    check(sd_bus_message_close_container(call), "writing");
  }
  check(sd_bus_message_close_container(call), "writing");
  return call;
}

void BusReceiver::roundTrip() {
  sd_bus_message* call = makeCall();
  sd_bus_message* reply = nullptr;
  check(sd_bus_call(bus_, call, kForEver, nullptr, &reply), "calling");
  sd_bus_message_unref(reply);
  sd_bus_message_unref(call);
}

int BusReceiver::countReply(sd_bus_message* message, void* receiver, sd_bus_error*) {
  if (sd_bus_message_is_method_error(message, nullptr) != 0) {
    fail("sd-bus: a call was refused");
  }
  ++static_cast<BusReceiver*>(receiver)->replies_;
  return 1;
}

void BusReceiver::stream(std::size_t count, std::size_t outstanding) {
  replies_ = 0;
  std::size_t sent = 0;
  while (replies_ < count) {
    for (; sent < count && sent - replies_ < outstanding; ++sent) {
      sd_bus_message* call = makeCall();
      check(sd_bus_call_async(bus_, nullptr, call, &BusReceiver::countReply, this, kForEver), "calling");
      sd_bus_message_unref(call);
    }
    const int processed = sd_bus_process(bus_, nullptr);
    check(processed, "processing");
    if (processed == 0) {
      check(sd_bus_wait(bus_, kForEver), "waiting");
    }
  }
}

}  // namespace tarn::bench
