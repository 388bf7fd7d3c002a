// SPDX-License-Identifier: Apache-2.0
// What a client may send that no client library would: each wrong frame is answered or cut off as it must be, and
// another client, which works all the while, never notices.
#include <csignal>

#include <span>

#include "tests/e2e/support/RawSocket.h"
#include "tests/e2e/support/ServiceFixture.h"
#include "wire/ReplyDecoder.h"

namespace tarn::e2e {
namespace {

using namespace std::string_literals;

// Made readable: pieces of CBOR.
const std::string kGetAllReporters = "\x82\x01\x0a"s;  // [1, 10]
const std::string kSendHead = "\x86\x05\x06"s;         // [5, 6, ... (four more)
const std::string kSendTail = "\x04\x01\x81\x07"s;     // ... 4, 1, [7]]
std::string sendMessage(const std::string& dictionary) {
  return kSendHead + dictionary + kSendTail;
}

class WireFaults : public ServiceFixture {
 protected:
  void SetUp() override {
    ASSERT_TRUE(startService());
    bystander_ = connect();
    ASSERT_TRUE(bystander_);
    ASSERT_TRUE(bystander_->call(client::createReportingSession(1000)).ok());
  }
  void TearDown() override {
    const client::Reply reply = bystander_->call(client::getAllReporters());
    EXPECT_TRUE(reply.ok()) << "the other client was disturbed: " << reply.error.text;
    EXPECT_EQ(reply.numbers(), std::vector<std::int64_t>{1000});
    EXPECT_TRUE(service().isRunning());
  }

  // The error code that answers the frame, 0 for a good reply, -1 for none.
  std::int64_t answerTo(RawSocket& socket, const std::string& body) {
    EXPECT_TRUE(socket.sendFrame(body));
    const std::string frame = socket.receiveFrame();
    wire::ReplyDecoder decoder;
    wire::DecodedReply reply;
    if (frame.empty() || decoder.decode(std::as_bytes(std::span(frame)), reply).failed()) return -1;
    if (!reply.error) return 0;
    EXPECT_EQ(reply.error->domain, "sys.oxbow.audio.reporting.ipc");
    return reply.error->code;
  }
  void expectCutOff(const std::string& bytes, const std::string& reason) {
    RawSocket socket(this->socket());
    ASSERT_TRUE(socket.isConnected());
    socket.send(bytes);
    EXPECT_TRUE(socket.isAtEnd()) << reason;
    EXPECT_TRUE(eventually([&] { return status().at("connections_cut").at(reason) == 1; })) << status().dump();
    EXPECT_TRUE(logWillSay("cut off"));
  }
  std::size_t cutLines() const {
    std::size_t count = 0;
    const std::string log = serviceLog();
    for (auto at = log.find("cut off"); at != std::string::npos; at = log.find("cut off", at + 1)) {
      ++count;
    }
    return count;
  }

  std::unique_ptr<client::ClientConnection> bystander_;
};

TEST_F(WireFaults, AnUnknownOperationIsRefusedAndTheConnectionGoesOn) {
  RawSocket socket(this->socket());
  EXPECT_EQ(answerTo(socket, "\x82\x01\x00"s), 1);
  EXPECT_EQ(answerTo(socket, "\x82\x01\x0c"s), 1);
  EXPECT_EQ(answerTo(socket, "\x82\x01\x18\x7f"s), 1);
  EXPECT_EQ(answerTo(socket, kGetAllReporters), 0);
}

TEST_F(WireFaults, WrongArgumentsAreRefusedAndTheConnectionGoesOn) {
  const std::pair<const char*, std::string> rows[] = {
      {"too few", "\x82\x01\x01"s},
      {"too many", "\x83\x01\x0a\x05"s},
      {"a text for an ID", "\x83\x01\x01\x61x"s},
      {"an ID beyond 2^63-1", "\x83\x01\x01\x1b\x80\x00\x00\x00\x00\x00\x00\x00"s},
      {"a type beyond 16 bits", "\x84\x01\x02\x1a\x00\x01\x00\x00\x01"s},
      {"an array for a dictionary", "\x84\x01\x04\x80\x01"s},
      {"a category beyond 32 bits", "\x86\x01\x06\xa0\x1b\x00\x00\x00\x01\x00\x00\x00\x00\x01\xf6"s},
      {"a text among the IDs", "\x86\x01\x06\xa0\x04\x01\x81\x61x"s},
      {"a number for the IDs", "\x86\x01\x06\xa0\x04\x01\x05"s},
  };
  RawSocket socket(this->socket());
  for (const auto& [what, body] : rows) {
    EXPECT_EQ(answerTo(socket, body), 2) << what;
  }
  EXPECT_EQ(answerTo(socket, kGetAllReporters), 0);
}

TEST_F(WireFaults, WhatNoPropertyListHoldsIsRefusedAndTheConnectionGoesOn) {
  const std::pair<const char*, std::string> rows[] = {
      {"null", "\xa1\x61\x61\xf6"s},
      {"undefined", "\xa1\x61\x61\xf7"s},
      {"an unknown tag", "\xa1\x61\x61\xc2\x41\x01"s},
      {"a date that holds a text", "\xa1\x61\x61\xc1\x61x"s},
      {"a key that is a number", "\xa1\x01\x01"s},
      {"a key given twice", "\xa2\x61\x61\x01\x61\x61\x02"s},
      {"bad UTF-8", "\xa1\x61\x61\x61\xff"s},
      {"bad UTF-8 in a key", "\xa1\x61\xff\x01"s},
      {"an indefinite length", "\xa1\x61\x61\x9f\x01\xff"s},
      {"65 levels", "\xa1\x61\x61"s + std::string(64, '\x81') + "\x01"s},
  };
  RawSocket socket(this->socket());
  for (const auto& [what, dictionary] : rows) {
    EXPECT_EQ(answerTo(socket, sendMessage(dictionary)), 3) << what;
  }
  EXPECT_EQ(answerTo(socket, sendMessage("\xa1\x61\x61"s + std::string(63, '\x81') + "\x01"s)), 0) << "64 levels";
  EXPECT_EQ(answerTo(socket, sendMessage("\xa1\x61\x61\xf9\x3c\x00"s)), 0) << "a half float";
}

TEST_F(WireFaults, RefusalsAreCountedByReason) {
  RawSocket socket(this->socket());
  answerTo(socket, "\x82\x01\x0c"s);
  answerTo(socket, "\x82\x01\x01"s);
  answerTo(socket, "\x82\x01\x01"s);
  answerTo(socket, sendMessage("\xa1\x61\x61\xf6"s));
  const json refused = status().at("requests_refused");
  EXPECT_EQ(refused.at("unknown_operation"), 1);
  EXPECT_EQ(refused.at("bad_arguments"), 2);
  EXPECT_EQ(refused.at("not_property_list"), 1);
}

TEST_F(WireFaults, GarbageIsCutOff) {
  expectCutOff(RawSocket::frame("\xff\xff\xff\xff"s), "unreadable_frame");
}

TEST_F(WireFaults, AnEmptyFrameIsCutOff) {
  expectCutOff(RawSocket::frame(""), "unreadable_frame");
}

TEST_F(WireFaults, AMapInsteadOfAnArrayIsCutOff) {
  expectCutOff(RawSocket::frame("\xa0"s), "unreadable_frame");
}

TEST_F(WireFaults, AFrameWithoutAnIdIsCutOff) {
  expectCutOff(RawSocket::frame("\x82\x61x\x0a"s), "unreadable_frame");
}

TEST_F(WireFaults, TrailingBytesAreCutOff) {
  expectCutOff(RawSocket::frame(kGetAllReporters + "\x00"s), "unreadable_frame");
}

TEST_F(WireFaults, AnArrayThatEndsTooSoonIsCutOff) {
  expectCutOff(RawSocket::frame("\x86\x01\x06\xa1\x61"s), "unreadable_frame");
}

TEST_F(WireFaults, AFrameAnnouncedTooLongIsCutOffAtOnce) {
  expectCutOff("\x01\x00\x10\x00"s, "oversize_frame");
}

TEST_F(WireFaults, AnUnreadableFrameIsLoggedOnce) {
  expectCutOff(RawSocket::frame("\xff"s) + RawSocket::frame("\xff"s), "unreadable_frame");
  status();
  EXPECT_EQ(cutLines(), 1U);
}

TEST_F(WireFaults, WholeFramesBeforeTheEndAreServed) {
  {
    RawSocket socket(this->socket());
    socket.send(RawSocket::frame("\x83\x01\x01\x18\x63"s) + RawSocket::frame("\x83\x02\x05\x18\x63"s) +
                RawSocket::frame("\x86\x03\x06\xa0\x04\x01\x81\x18\x63"s));
  }
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.Playback.Start").size(), 1U);
  EXPECT_EQ(eventsOnceThereAre(1, "sys.oxbow.tarnkit.*.Summary").size(), 1U);
}

TEST_F(WireFaults, HalfAFrameThatWaitsHoldsNobodyUp) {
  RawSocket socket(this->socket());
  socket.send("\x00\x00\x10\x00\x82"s);
  EXPECT_TRUE(bystander_->call(client::getAllReporters(), kDeadline).ok());
  EXPECT_EQ(status().at("connections_open"), 3);
}

TEST_F(WireFaults, AFrameInSinglePiecesIsServed) {
  RawSocket socket(this->socket());
  for (const char byte : RawSocket::frame(kGetAllReporters)) {
    ASSERT_TRUE(socket.send(std::string_view(&byte, 1)));
  }
  EXPECT_FALSE(socket.receiveFrame().empty());
}

TEST_F(WireFaults, AClientThatNeverReadsIsCutOff) {
  RawSocket socket(this->socket());
  const std::string refused = RawSocket::frame("\x82\x01\x0c"s);
  std::string many;
  for (int index = 0; index < 2000; ++index) {
    many += refused;
  }
  const auto deadline = std::chrono::steady_clock::now() + kDeadline;
  bool isTaken = true;
  while (isTaken && std::chrono::steady_clock::now() < deadline) {
    isTaken = socket.send(many);
  }
  EXPECT_FALSE(isTaken);
  EXPECT_TRUE(eventually([&] { return status().at("connections_cut").at("unread_replies") == 1; })) << status().dump();
  EXPECT_TRUE(logWillSay("cut off"));
}

class WireLimits : public ServiceFixture {};

TEST_F(WireLimits, AFrameOfTheConfiguredLengthIsServedAndALongerOneIsNot) {
  writeFile(directory_ / "service.toml", "[limits]\nmax_frame_bytes = 4096\n");
  ASSERT_TRUE(startService({"--config", directory_ / "service.toml"}));
  // [5, 6, {"a": text}, 4, 1, [7]] with a text of two length bytes.
  const auto frameOf = [](std::size_t bytes) {
    const std::size_t text = bytes - kSendHead.size() - kSendTail.size() - 6;
    return sendMessage("\xa1\x61\x61\x79"s + static_cast<char>(text >> 8U) + static_cast<char>(text & 0xFFU) +
                       std::string(text, 'x'));
  };
  RawSocket socket(this->socket());
  ASSERT_EQ(frameOf(4096).size(), 4096U);
  ASSERT_TRUE(socket.sendFrame(frameOf(4096)));
  EXPECT_FALSE(socket.receiveFrame().empty());
  socket.sendFrame(frameOf(4097));
  EXPECT_TRUE(socket.isAtEnd());
  EXPECT_EQ(status().at("connections_cut").at("oversize_frame"), 1);
}

}  // namespace
}  // namespace tarn::e2e
