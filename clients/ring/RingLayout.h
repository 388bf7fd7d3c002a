/* RingLayout: where things stand in the memory that a client shares with the service. Plain C, for both sides.
 *
 *   [header, one page][data area, a power of two]
 *
 * docs/ring.md tells what each number means and in which order it is read and written. Stateless. Threads: any.
 */
#pragma once

/* C knows it by this name alone. NOLINTNEXTLINE(modernize-deprecated-headers) */
#include <stdint.h>

#define TARNRING_MAGIC UINT64_C(0x474E49524E524154) /* the bytes TARNRING */
#define TARNRING_VERSION UINT64_C(1)
#define TARNRING_HEADER_BYTES 4096U
#define TARNRING_LEAST_DATA_BYTES 4096U
#define TARNRING_MOST_DATA_BYTES 1048576U
/* A record takes at most this part of the data area. */
#define TARNRING_RECORD_SHARE 4U
#define TARNRING_RECORD_HEAD_BYTES 8U
#define TARNRING_MOST_SHAPES 1024U
#define TARNRING_MOST_KEYS 64U
#define TARNRING_MOST_KEY_BYTES 255U

/* Names as C has them: NOLINTBEGIN(readability-identifier-naming) */
enum tarnring_kind { TARNRING_FILLER = 1, TARNRING_FRAME = 2, TARNRING_MESSAGE = 3, TARNRING_GAP = 4 };

/* Why a record was refused. */
enum tarnring_refusal {
  TARNRING_UNKNOWN_OPERATION = 1,
  TARNRING_BAD_ARGUMENTS = 2,
  TARNRING_NOT_PROPERTY_LIST = 3,
  TARNRING_UNREADABLE = 4,
  TARNRING_UNKNOWN_SHAPE = 5,
  TARNRING_BAD_VALUES = 6
};

/* Each writer's numbers have cache lines of their own; `asleep` has one because it is read at every post and written
 * once in a while. */
struct tarnring_header {
  uint64_t magic;
  uint64_t version;
  uint64_t data_bytes;
  uint64_t padding0[5];
  /* The client's. */
  uint64_t head;
  uint64_t posted;
  uint64_t dropped;
  uint64_t dropped_bytes;
  uint64_t ended;
  uint64_t padding1[3];
  /* The service's. */
  uint64_t taken;
  uint64_t committed;
  uint64_t taken_messages;
  uint64_t committed_messages;
  uint64_t refused;
  uint64_t last_refusal;
  uint64_t padding2[2];
  uint64_t asleep;
  uint64_t padding3[7];
};

/* What stands before the values of a message. */
struct tarnring_message {
  uint64_t stamp;
  uint32_t shape;
  uint32_t count;
};

struct tarnring_gap {
  uint64_t messages;
  uint64_t bytes;
};

static inline uint32_t tarnring_padded(uint32_t length) {
  return (length + 7U) & ~UINT32_C(7);
}
/* NOLINTEND(readability-identifier-naming) */
