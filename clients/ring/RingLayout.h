// SPDX-License-Identifier: Apache-2.0
/* RingLayout: where things stand in the memory that a client shares with the service. Plain C, for both sides.
 *
 *   [header, one page][data area, a power of two]
 *
 * docs/ring.md tells what each number means and in which order it is read and written. Stateless. Threads: any.
 */
#pragma once

/* C knows it by this name alone. NOLINTNEXTLINE(modernize-deprecated-headers) */
#include <stdint.h>

/* The first 16 bytes of each ring, by which the service knows that the memory is meant as one and laid out like
 * this. A ring of any other magic or version is refused when it is opened. */
#define TARNRING_MAGIC UINT64_C(0x474E49524E524154) /* the bytes TARNRING */
#define TARNRING_VERSION UINT64_C(1)
/* Of the header one page, so that the data area begins at a page of its own. */
#define TARNRING_HEADER_BYTES 4096U
/* The data area is a power of two between these, so that a position becomes an offset by a mask, and no client can
 * make the service map more than a megabyte and a page a ring. */
#define TARNRING_LEAST_DATA_BYTES 4096U
#define TARNRING_MOST_DATA_BYTES 1048576U
/* A record takes at most this part of the data area, its head included: so a filler never wastes more than a
 * quarter, and the longest record fits into an empty ring wherever its head stands. */
#define TARNRING_RECORD_SHARE 4U
/* Before each record's content: its length in the lower 32 bits, its kind in the upper ones. */
#define TARNRING_RECORD_HEAD_BYTES 8U
/* What one connection may declare, for all of its rings together: a shape's number is below the first, it has at
 * most so many keys, and none of them is longer, in bytes of UTF-8. */
#define TARNRING_MOST_SHAPES 1024U
#define TARNRING_MOST_KEYS 64U
#define TARNRING_MOST_KEY_BYTES 255U

/* Names as C has them: NOLINTBEGIN(readability-identifier-naming) */
/* What a record is. Its content: of a filler nothing that counts (it takes what is left before the end of the area),
 * of a frame one request of the wire without the length before it, of a message a tarnring_message and its values,
 * of a gap a tarnring_gap. */
enum tarnring_kind { TARNRING_FILLER = 1, TARNRING_FRAME = 2, TARNRING_MESSAGE = 3, TARNRING_GAP = 4 };

/* Why a record was refused, as `last_refusal` tells it. The ring goes on after it. The first three are what a
 * frame's request is refused for, the fourth is a frame that is no request at all, the two after it are about messages.
 */
enum tarnring_refusal {
  TARNRING_UNKNOWN_OPERATION = 1,
  TARNRING_BAD_ARGUMENTS = 2,
  TARNRING_NOT_PROPERTY_LIST = 3,
  TARNRING_UNREADABLE = 4,
  TARNRING_UNKNOWN_SHAPE = 5,
  TARNRING_BAD_VALUES = 6,
  TARNRING_OUT_OF_MEMORY = 7,
  TARNRING_ADMIN_ONLY = 8
};

/* The header. Each writer's numbers have cache lines of their own, so that neither side takes the other's line away
 * by writing; `asleep` has one because it is read at every post and written once in a while. All numbers are
 * little-endian and loaded and stored as whole words. Positions count bytes since the ring was made; they never go
 * back, never wrap and are multiples of 8. */
struct tarnring_header {
  /* Written by the client before the ring is opened, and never again. */
  uint64_t magic;
  uint64_t version;
  uint64_t data_bytes;
  uint64_t padding0[5];
  /* The client's. Position after the last record that is published: stored with release order once the record is
   * whole. */
  uint64_t head;
  /* Records that were published but for fillers and gaps, counted after `head`; and those that found no room, with
   * the bytes that they would have taken. */
  uint64_t posted;
  uint64_t dropped;
  uint64_t dropped_bytes;
  /* Not 0: nothing more comes, and the service closes the ring once it has read all of it. */
  uint64_t ended;
  uint64_t padding1[3];
  /* The service's. Position up to which records are read: what lies before it may be written over. */
  uint64_t taken;
  /* Position up to which what came of the records is safe on the disk; it follows `taken`. */
  uint64_t committed;
  /* Messages and frames before those two positions. */
  uint64_t taken_messages;
  uint64_t committed_messages;
  /* How many records were refused so far, and why the last one was (tarnring_refusal; 0: none). */
  uint64_t refused;
  uint64_t last_refusal;
  uint64_t padding2[2];
  /* 0: the service looks by itself. Else the number of its sleep, which no other sleep of this ring had; who posts
   * wakes it once for each number, by the eventfd. */
  uint64_t asleep;
  uint64_t padding3[7];
};

/* What stands before the values of a message: the event's time in nanoseconds since 1970 UTC, the number of its
 * declared shape, and how many values follow, which must be as many as the shape has keys. */
struct tarnring_message {
  uint64_t stamp;
  uint32_t shape;
  uint32_t count;
};

/* What was dropped since the last gap: so many messages, whose records would have taken so many bytes. */
struct tarnring_gap {
  uint64_t messages;
  uint64_t bytes;
};

/* The next multiple of 8: so much room a content of this length takes. `length` must be at most 2^32 - 8. */
static inline uint32_t tarnring_padded(uint32_t length) {
  return (length + 7U) & ~UINT32_C(7);
}
/* NOLINTEND(readability-identifier-naming) */
