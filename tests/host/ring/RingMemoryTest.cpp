// SPDX-License-Identifier: Apache-2.0
#include "host/ring/RingMemory.h"

#include <gtest/gtest.h>

#include "tests/host/ring/ClientRing.h"

namespace tarn::linux_host {
namespace {

using testing::ClientRing;

TEST(RingMemory, ASealedFileOfTheRightSizeIsMapped) {
  ClientRing client(8192);
  RingMemory memory;
  EXPECT_EQ(memory.map(client.memory()), std::nullopt);
  EXPECT_EQ(memory.dataBytes(), 8192U);
  client.header()->head = 4711;
  EXPECT_EQ(memory.header()->head, 4711U);
}

TEST(RingMemory, AFileThatCouldChangeItsSizeIsRefused) {
  for (const int seals : {0, F_SEAL_SHRINK, F_SEAL_GROW | F_SEAL_SEAL, F_SEAL_SHRINK | F_SEAL_GROW}) {
    RingMemory memory;
    EXPECT_EQ(memory.map(ClientRing(4096, seals).memory()), RingFault::NotSealed) << seals;
    EXPECT_EQ(memory.header(), nullptr);
  }
}

TEST(RingMemory, AFileThatTheServiceCannotWriteToIsRefused) {
  RingMemory memory;
  EXPECT_EQ(memory.map(ClientRing(4096, ClientRing::kSeals | F_SEAL_FUTURE_WRITE).memory()), RingFault::NotSealed);
}

TEST(RingMemory, OtherSizesThanPowersOfTwoWithinTheBoundsAreRefused) {
  for (const std::size_t bytes : {std::size_t{4096}, std::size_t{4096 + 2048}, std::size_t{4096 + 4095},
                                  std::size_t{4096 + 4097}, std::size_t{4096 + 12288}, std::size_t{4096 + 2097152}}) {
    RingMemory memory;
    EXPECT_EQ(memory.map(ClientRing(4096, ClientRing::kSeals, bytes).memory()), RingFault::BadSize) << bytes;
  }
}

TEST(RingMemory, TheHeaderMustBeThatOfARing) {
  for (std::uint64_t tarnring_header::*member :
       {&tarnring_header::magic, &tarnring_header::version, &tarnring_header::data_bytes}) {
    ClientRing client;
    ++(client.header()->*member);
    RingMemory memory;
    EXPECT_EQ(memory.map(client.memory()), RingFault::BadHeader);
  }
}

TEST(RingMemory, WhatIsNoMemoryFileIsRefused) {
  int pipe[2];
  ASSERT_EQ(::pipe(pipe), 0);
  const UniqueDescriptor reads(pipe[0]);
  const UniqueDescriptor writes(pipe[1]);
  RingMemory memory;
  EXPECT_EQ(memory.map(reads.get()), RingFault::Descriptors);
  EXPECT_EQ(memory.map(-1), RingFault::Descriptors);
  EXPECT_FALSE(isEventDescriptor(reads.get()));
  EXPECT_TRUE(isEventDescriptor(ClientRing().wake()));
}

TEST(RingMemory, TheSameFileIsKnownByAnyDescriptor) {
  const ClientRing one;
  const ClientRing other;
  RingMemory first;
  RingMemory again;
  RingMemory second;
  ASSERT_EQ(first.map(one.memory()), std::nullopt);
  ASSERT_EQ(again.map(one.descriptors()[0].get()), std::nullopt);
  ASSERT_EQ(second.map(other.memory()), std::nullopt);
  EXPECT_EQ(first.identity(), again.identity());
  EXPECT_FALSE(first.identity() == second.identity());
}

}  // namespace
}  // namespace tarn::linux_host
