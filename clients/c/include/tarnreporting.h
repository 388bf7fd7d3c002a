/* tarnreporting: reports what audio software does to the reporting service, from threads that must not wait too.
 *
 *   client ---- session (who plays what) ---- shape (what its messages look like)
 *      '------- writer (one for each thread that posts)
 *
 * tarnreporting_post() is for real-time threads: no lock, no allocation, no page fault, no system call but at most one
 * write to an eventfd after a second of quiet, and none with TARNREPORTING_NO_SYSTEM_CALL. It never waits for the
 * service: with a service that is absent or slow, messages wait in the writer's ring (256 KiB unless asked otherwise)
 * and are dropped and counted once that is full. Every other call may wait for a lock, or up to the time it is given.
 *
 * The client's helper thread connects (to the path asked for, else TARNREPORTING_SOCKET, else the user's socket, else
 * the system's), connects again when the service went away, and then makes the sessions once more.
 *
 * Threads: a writer belongs to one thread at a time; everything else may be used by any. After fork() the child's
 * handles are dead: every call on them answers TARNREPORTING_FORKED. Nothing here ends the process, installs a signal
 * handler or has work done when it is loaded. A client and its default writer take less than 512 KiB.
 */
#pragma once

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define TARNREPORTING_VERSION_MAJOR 1
#define TARNREPORTING_VERSION_MINOR 0

#if defined(__GNUC__)
#define TARNREPORTING_API __attribute__((visibility("default")))
#else
#define TARNREPORTING_API
#endif

typedef struct tarnreporting_client tarnreporting_client;
typedef struct tarnreporting_session tarnreporting_session;
typedef struct tarnreporting_shape tarnreporting_shape;
typedef struct tarnreporting_writer tarnreporting_writer;

/* What a call answers. */
enum tarnreporting_result {
  TARNREPORTING_OK = 0,
  TARNREPORTING_DROPPED = 1,   /* posting: the ring was full; it is counted */
  TARNREPORTING_ARGUMENT = 2,  /* a null pointer, a number out of range, a size field that this library doesn't know */
  TARNREPORTING_KIND = 3,      /* posting: the values aren't as many as the shape's keys, or not of their kinds */
  TARNREPORTING_TEXT = 4,      /* a text isn't UTF-8 */
  TARNREPORTING_TOO_LARGE = 5, /* a text, a message or a number of things over its bound */
  TARNREPORTING_CLOSED = 6,    /* the handle was closed or ended */
  TARNREPORTING_FORKED = 7,    /* the handle belongs to the parent process */
  TARNREPORTING_BUSY = 8,      /* posting: another thread is just posting with this writer, which is an error */
  TARNREPORTING_MEMORY = 9,
  TARNREPORTING_SYSTEM = 10, /* the system refused a descriptor, a mapping or a thread */
  TARNREPORTING_TIMEOUT = 11 /* the time was up first */
};
typedef enum tarnreporting_result tarnreporting_result;

/* The kinds of values. */
enum tarnreporting_kind {
  TARNREPORTING_INTEGER = 1,
  TARNREPORTING_UNSIGNED = 2,
  TARNREPORTING_DOUBLE = 3,
  TARNREPORTING_DATE = 4, /* seconds since 1970 UTC */
  TARNREPORTING_BOOLEAN = 5,
  TARNREPORTING_TEXT_VALUE = 6 /* UTF-8 */
};
typedef enum tarnreporting_kind tarnreporting_kind;

#define TARNREPORTING_MOST_KEYS 64
#define TARNREPORTING_MOST_KEY_BYTES 255
#define TARNREPORTING_MOST_TEXT_BYTES 1024
/* Different sets of keys and kinds that a session remembers for tarnreporting_post_fields(). */
#define TARNREPORTING_MOST_FIELD_SETS 64

typedef struct tarnreporting_value tarnreporting_value;
struct tarnreporting_value {
  uint32_t kind;
  uint32_t length; /* of a text, in bytes */
  union {
    int64_t integer;
    uint64_t unsigned_integer;
    double number; /* double and date */
    int64_t boolean;
    const char* text;
  } as;
};

typedef struct tarnreporting_key tarnreporting_key;
struct tarnreporting_key {
  const char* name;
  uint32_t kind;
};

typedef struct tarnreporting_field tarnreporting_field;
struct tarnreporting_field {
  const char* key;
  tarnreporting_value value;
};

/* Each of these begins with its size, sizeof the struct, so that later versions may add members. What is 0 or null is
 * left to the library. */
typedef struct tarnreporting_client_options tarnreporting_client_options;
struct tarnreporting_client_options {
  size_t size;
  const char* socket_path;
  /* Called on the helper thread when the service refuses something; must not call back into the library. */
  void (*on_refusal)(void* context, const char* text);
  void* context;
};

typedef struct tarnreporting_session_options tarnreporting_session_options;
struct tarnreporting_session_options {
  size_t size;
  uint32_t service_type;   /* 0 to 65535 */
  const char* application; /* the HostApplicationDisplayID of the configuration */
  const tarnreporting_field* configuration;
  size_t configuration_count;
};

typedef struct tarnreporting_shape_options tarnreporting_shape_options;
struct tarnreporting_shape_options {
  size_t size;
  uint32_t category;
  uint32_t type; /* 0 to 65535 */
  const tarnreporting_key* keys;
  size_t key_count;
};

typedef struct tarnreporting_message_options tarnreporting_message_options;
struct tarnreporting_message_options {
  size_t size;
  uint32_t category;
  uint32_t type; /* 0 to 65535 */
  const tarnreporting_field* fields;
  size_t field_count;
  uint64_t stamp_ns; /* of the event, in nanoseconds since 1970 UTC; 0: the time of the call */
};

#define TARNREPORTING_NO_SYSTEM_CALL 1U /* the helper thread looks every 50 ms instead */

typedef struct tarnreporting_writer_options tarnreporting_writer_options;
struct tarnreporting_writer_options {
  size_t size;
  uint32_t ring_bytes; /* a power of two from 4096 to 1048576; 0: 262144 */
  uint32_t flags;
};

enum tarnreporting_connection {
  TARNREPORTING_CONNECTING = 0, /* no service answers; it is tried again */
  TARNREPORTING_CONNECTED = 1
};
typedef enum tarnreporting_connection tarnreporting_connection;

typedef struct tarnreporting_state tarnreporting_state;
struct tarnreporting_state {
  size_t size;
  uint32_t connection;
  uint32_t connections; /* that were made so far */
  /* Messages of all writers, closed ones included. */
  uint64_t posted;
  uint64_t taken;     /* by the service */
  uint64_t committed; /* safe on its disk */
  uint64_t dropped;
  uint64_t refused;     /* by the service, requests included */
  uint32_t unlocked;    /* writers whose memory the system wouldn't lock: it may be paged out */
  char last_error[160]; /* empty when there was none */
};

/* The text of a result, which lives for ever. */
TARNREPORTING_API const char* tarnreporting_result_text(int result);

/* Starts the helper thread; doesn't wait for the service. `options` may be null. */
TARNREPORTING_API int tarnreporting_client_open(const tarnreporting_client_options* options,
                                                tarnreporting_client** client);
/* Ends all sessions and waits at most so long until the service has taken everything. All handles of the client are
 * gone then, whatever the answer. `left`, if not null: the messages that the service had not taken. */
TARNREPORTING_API int tarnreporting_client_close(tarnreporting_client* client, uint32_t timeout_ms, uint64_t* left);
/* Waits at most so long until the service has taken all that was posted. */
TARNREPORTING_API int tarnreporting_client_flush(tarnreporting_client* client, uint32_t timeout_ms);
/* Fills in the members that fit into `state->size`. */
TARNREPORTING_API int tarnreporting_client_state(tarnreporting_client* client, tarnreporting_state* state);

/* A session that runs until it is ended; the service sees it as soon as there is one. */
TARNREPORTING_API int tarnreporting_session_begin(tarnreporting_client* client,
                                                  const tarnreporting_session_options* options,
                                                  tarnreporting_session** session);
/* Ends the session once the service has taken what was posted to it; doesn't wait for that. The session and its shapes
 * are gone: no thread may post with them any more. */
TARNREPORTING_API int tarnreporting_session_end(tarnreporting_session* session);

/* What messages of one kind look like; their values are then given in the order of the keys. */
TARNREPORTING_API int tarnreporting_shape_declare(tarnreporting_session* session,
                                                  const tarnreporting_shape_options* options,
                                                  tarnreporting_shape** shape);

/* A ring of its own for one thread that posts. `options` may be null. */
TARNREPORTING_API int tarnreporting_writer_open(tarnreporting_client* client,
                                                const tarnreporting_writer_options* options,
                                                tarnreporting_writer** writer);
/* The writer is gone; what was posted with it is still served. */
TARNREPORTING_API int tarnreporting_writer_close(tarnreporting_writer* writer);

/* Posts a message, with the time of the call. For real-time threads. */
TARNREPORTING_API int tarnreporting_post(tarnreporting_writer* writer, const tarnreporting_shape* shape,
                                         const tarnreporting_value* values, size_t count);
/* The same with the time of the event, in nanoseconds since 1970 UTC. */
TARNREPORTING_API int tarnreporting_post_at(tarnreporting_writer* writer, const tarnreporting_shape* shape,
                                            uint64_t stamp_ns, const tarnreporting_value* values, size_t count);
/* Posts a message of any keys, all different, without a shape declared for it. Not for real-time threads: it may wait
 * for a lock and allocate. TARNREPORTING_TOO_LARGE also where the session remembers as many sets of keys and kinds as
 * it may, and the service hasn't taken the messages of the oldest yet. */
TARNREPORTING_API int tarnreporting_post_fields(tarnreporting_writer* writer, tarnreporting_session* session,
                                                const tarnreporting_message_options* options);

static inline tarnreporting_value tarnreporting_integer(int64_t value) {
  tarnreporting_value made = {TARNREPORTING_INTEGER, 0, {0}};
  made.as.integer = value;
  return made;
}
static inline tarnreporting_value tarnreporting_unsigned(uint64_t value) {
  tarnreporting_value made = {TARNREPORTING_UNSIGNED, 0, {0}};
  made.as.unsigned_integer = value;
  return made;
}
static inline tarnreporting_value tarnreporting_double(double value) {
  tarnreporting_value made = {TARNREPORTING_DOUBLE, 0, {0}};
  made.as.number = value;
  return made;
}
static inline tarnreporting_value tarnreporting_date(double epoch_seconds) {
  tarnreporting_value made = {TARNREPORTING_DATE, 0, {0}};
  made.as.number = epoch_seconds;
  return made;
}
static inline tarnreporting_value tarnreporting_boolean(int value) {
  tarnreporting_value made = {TARNREPORTING_BOOLEAN, 0, {0}};
  made.as.boolean = value != 0;
  return made;
}
/* The text must stay until the call that it is given to returns. */
static inline tarnreporting_value tarnreporting_text(const char* text, uint32_t length) {
  tarnreporting_value made = {TARNREPORTING_TEXT_VALUE, 0, {0}};
  made.length = length;
  made.as.text = text;
  return made;
}

#ifdef __cplusplus
}
#endif
