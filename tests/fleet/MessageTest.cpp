// SPDX-License-Identifier: Apache-2.0
#include "fleet/format/Message.h"

#include <gtest/gtest.h>

#include <functional>
#include <limits>
#include <random>

#include "tests/fleet/Batches.h"
#include "tests/support/Seeds.h"

namespace tarn::fleet {
namespace {

using testing::someBatch;

PackedMessage packedWithId(v1::Batch batch) {
  MessagePacker packer;
  Result<PackedMessage> message = packer.pack(batch);
  EXPECT_TRUE(message.ok()) << message.error.text();
  return message.value;
}

std::string packed(const v1::Batch& batch) {
  return packedWithId(batch).bytes;
}

TEST(FleetMessage, WhatIsPackedIsUnpackedAgain) {
  const v1::Batch batch = someBatch();
  const auto unpacked = unpackMessage(packed(batch));
  ASSERT_TRUE(unpacked.ok()) << unpacked.error.text();
  EXPECT_EQ(unpacked.value->SerializeAsString(), batch.SerializeAsString());
}

TEST(FleetMessage, BeginsWithItsNameAndVersion) {
  EXPECT_EQ(packed(someBatch()).substr(0, 4), std::string("tnf\x01"));
}

TEST(FleetMessage, AnotherVersionIsToldApartFromOthersBytes) {
  std::string message = packed(someBatch());
  message[3] = 2;
  EXPECT_EQ(unpackMessage(message).error.text(), "its version is 2, which isn't known here");
  message[0] = 'x';
  EXPECT_EQ(unpackMessage(message).error.text(), "it isn't a message of a fleet");
  EXPECT_TRUE(unpackMessage("").failed());
  EXPECT_TRUE(unpackMessage("tnf").failed());
}

TEST(FleetMessage, FieldsOfALaterWriterArePassedOver) {
  v1::Batch batch = someBatch();
  batch.GetReflection()->MutableUnknownFields(&batch)->AddVarint(1000, 7);
  EXPECT_TRUE(unpackMessage(packed(batch)).ok());
}

TEST(FleetMessage, AFrameThatSaysMoreThanABatchMayHoldIsRefusedBeforeItIsUnpacked) {
  v1::Batch batch = someBatch();
  batch.mutable_events(0)->set_payload(std::string(kMostBatchBytes + 1, ' '));
  EXPECT_EQ(unpackMessage(packed(batch)).error.text(), "its frame is damaged or too large");
}

TEST(FleetMessage, DamagedBytesAreRefusedOrAreABatchThatFitsTogether) {
  const std::string whole = packed(someBatch());
  for (const std::uint64_t seed : testing::testSeeds(1)) {
    SCOPED_TRACE(testing::seedNote(seed));
    std::mt19937 random(static_cast<std::mt19937::result_type>(seed));
    for (int i = 0; i < 2000; ++i) {
      std::string message = whole;
      message[random() % message.size()] = static_cast<char>(random());
      message.resize(message.size() - random() % 3);
      const auto unpacked = unpackMessage(message);
      ASSERT_TRUE(unpacked.failed() || batchFault(*unpacked.value).empty());
    }
  }
}

TEST(FleetMessage, EveryIdOfABatchIsToldOfOnce) {
  EXPECT_EQ(batchFault(someBatch()), "");
  const auto faultWith = [](const std::function<void(v1::Batch&)>& change) {
    v1::Batch batch = someBatch();
    change(batch);
    return batchFault(batch);
  };
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.set_left_out(0); }), "nothing tells of the id 22");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.set_left_out(2); }), "nothing tells of the id 22");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.mutable_gaps(0)->set_first(13); }), "its gaps are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.mutable_gaps(0)->set_last(21); }), "its gaps are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.mutable_gaps(0)->set_last(10); }), "its gaps are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.mutable_events(1)->set_ahead(0); }), "its ids are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.mutable_events(2)->set_ahead(11); }), "its ids are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { b.set_last(20); }), "its ids are out of order");
  EXPECT_EQ(faultWith([](v1::Batch& b) { *b.add_gaps() = b.gaps(0); }), "its gaps are out of order");
}

TEST(FleetMessage, IndexesLeadToSomething) {
  v1::Batch batch = someBatch();
  batch.mutable_events(0)->set_kind(1);
  EXPECT_EQ(batchFault(batch), "an event's kind isn't in it");
  batch = someBatch();
  batch.mutable_events(0)->set_session(2);
  EXPECT_EQ(batchFault(batch), "an event's session isn't in it");
  batch = someBatch();
  batch.mutable_sessions(0)->set_run(1);
  EXPECT_EQ(batchFault(batch), "a session's run isn't in it");
}

TEST(FleetMessage, ARangeMayBeEmptyAndNotLessThanThat) {
  v1::Batch batch;
  batch.set_device(std::string(kDeviceBytes, 'd'));
  batch.set_first(5);
  batch.set_last(4);
  EXPECT_EQ(batchFault(batch), "");
  batch.set_last(3);
  EXPECT_EQ(batchFault(batch), "its ids aren't a range");
  batch.set_first(0);
  batch.set_last(0);
  EXPECT_EQ(batchFault(batch), "its ids aren't a range");
  batch.set_first(1);
  batch.set_last(std::numeric_limits<std::int64_t>::max());
  EXPECT_EQ(batchFault(batch), "its ids aren't a range");
  batch = someBatch();
  batch.set_device("short");
  EXPECT_EQ(batchFault(batch), "its device isn't one");
}

TEST(FleetMessage, TheSameRecordsHaveTheSameIdWheneverTheyAreLookedAtAndOthersHaveAnother) {
  v1::Batch batch = someBatch();
  const PackedMessage message = packedWithId(batch);
  EXPECT_EQ(message.id.substr(0, 39), "64646464646464646464646464646464.11-21.");
  batch.set_looked_at(batch.looked_at() + 1);
  EXPECT_EQ(packedWithId(batch).id, message.id);
  EXPECT_NE(packedWithId(batch).bytes, message.bytes);
  batch.mutable_events(0)->set_payload("{}");
  EXPECT_NE(packedWithId(batch).id, message.id);
}

}  // namespace
}  // namespace tarn::fleet
