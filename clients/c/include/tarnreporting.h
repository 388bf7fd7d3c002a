// SPDX-License-Identifier: Apache-2.0
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

/* Of this header. A library of the same major number and of this minor number or a later one serves programs that
 * were built with it; what a later one adds stands at the ends of the structs, after the members that are known
 * here. */
#define TARNREPORTING_VERSION_MAJOR 1
#define TARNREPORTING_VERSION_MINOR 0

#if defined(__GNUC__)
#define TARNREPORTING_API __attribute__((visibility("default")))
#else
#define TARNREPORTING_API
#endif

/* Handles. The library owns what they stand for; a program keeps the pointers and hands them back. A handle that was
 * closed or ended is freed at once or a little later: it must not be used again. Closing a client ends all that was
 * made from it.
 *
 *   client   the connection, its helper thread, and everything below
 *   session  a run of something that is reported on: who plays what, until it is ended
 *   shape    the keys of one kind of message of a session, and the kinds of their values
 *   writer   a ring of memory that one thread posts into */
typedef struct tarnreporting_client tarnreporting_client;
typedef struct tarnreporting_session tarnreporting_session;
typedef struct tarnreporting_shape tarnreporting_shape;
typedef struct tarnreporting_writer tarnreporting_writer;

/* What a call answers. 0 is success; with any other answer nothing was made or posted. What is closed all the same
 * stands with the calls that close. errno tells nothing. */
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

/* The kinds of values. A message's value must be of just the kind that its shape says: nothing is converted. */
enum tarnreporting_kind {
  TARNREPORTING_INTEGER = 1,
  TARNREPORTING_UNSIGNED = 2,
  TARNREPORTING_DOUBLE = 3,
  TARNREPORTING_DATE = 4, /* seconds since 1970 UTC */
  TARNREPORTING_BOOLEAN = 5,
  TARNREPORTING_TEXT_VALUE = 6 /* UTF-8 */
};
typedef enum tarnreporting_kind tarnreporting_kind;

/* The most keys of a shape, of a message of fields and of a configuration (where the application counts beside
 * them); the most bytes of a key's name, and of a text. More is TARNREPORTING_TOO_LARGE. */
#define TARNREPORTING_MOST_KEYS 64
#define TARNREPORTING_MOST_KEY_BYTES 255
#define TARNREPORTING_MOST_TEXT_BYTES 1024
/* Different sets of keys and kinds that a session remembers for tarnreporting_post_fields(), in their order and with
 * category and type. Each is one of the 1024 shapes that a client may have. */
#define TARNREPORTING_MOST_FIELD_SETS 64

/* A value, best made by tarnreporting_integer() and the other functions below. `kind` is a tarnreporting_kind and
 * says which member of `as` counts. Nothing is kept of it after the call that it is given to. */
typedef struct tarnreporting_value tarnreporting_value;
struct tarnreporting_value {
  uint32_t kind;
  uint32_t length; /* of a text, in bytes */
  union {
    int64_t integer;
    uint64_t unsigned_integer;
    double number;   /* double and date; of a date, seconds since 1970-01-01 00:00:00 UTC, with fractions */
    int64_t boolean; /* 0 is false, anything else is true */
    /* UTF-8 of `length` bytes, at most TARNREPORTING_MOST_TEXT_BYTES, that need no zero at their end; may be null
     * when `length` is 0. */
    const char* text;
  } as;
};

/* A key of a shape: its name, UTF-8 with a zero at its end, from 1 to TARNREPORTING_MOST_KEY_BYTES bytes, and the
 * tarnreporting_kind of its values. The name is copied. docs/messages.md lists the keys that the service reads; any
 * others are carried as they are. */
typedef struct tarnreporting_key tarnreporting_key;
struct tarnreporting_key {
  const char* name;
  uint32_t kind;
};

/* A key, as above, with its value: of a configuration, or of a message without a declared shape. */
typedef struct tarnreporting_field tarnreporting_field;
struct tarnreporting_field {
  const char* key;
  tarnreporting_value value;
};

/* Each of the following begins with its size, sizeof the struct, so that later versions may add members. A size
 * below that of `size` or above 4096, and anything but 0 in members that the library doesn't know, is
 * TARNREPORTING_ARGUMENT. What is 0 or null is left to the library. Nothing in them is kept after the call unless it
 * says so. */
typedef struct tarnreporting_client_options tarnreporting_client_options;
struct tarnreporting_client_options {
  size_t size;
  /* Of the service's socket, at most 107 bytes; copied. Null: the helper looks for one, as told above, at each
   * attempt. */
  const char* socket_path;
  /* Called on the helper thread when the service refuses a session, a shape or a ring, with a text of at most 159
   * bytes for people, which lives as long as the call. Of several refusals that come together the last one is told.
   * Must not call back into the library; while it runs the helper does nothing else. Messages that are refused are
   * only counted (tarnreporting_state). */
  void (*on_refusal)(void* context, const char* text);
  void* context; /* handed to `on_refusal` as it is */
};

/* What a session is. Everything in it is copied, and said again to each service that the client connects to. */
typedef struct tarnreporting_session_options tarnreporting_session_options;
struct tarnreporting_session_options {
  size_t size;
  /* What the session is for, which decides what the service derives from its messages: TARN_SERVICE_... of
   * tarnreporting_messages.h. */
  uint32_t service_type; /* 0 to 65535 */
  /* UTF-8 with a zero at its end, at most TARNREPORTING_MOST_TEXT_BYTES bytes; null: the configuration has no such
   * key unless it is among the fields. */
  const char* application; /* the HostApplicationDisplayID of the configuration */
  /* Further fields of the configuration, at most TARNREPORTING_MOST_KEYS. */
  const tarnreporting_field* configuration;
  size_t configuration_count;
};

/* What the messages of a shape have in common. Everything in it is copied. */
typedef struct tarnreporting_shape_options tarnreporting_shape_options;
struct tarnreporting_shape_options {
  size_t size;
  /* What the messages are about and what happened: TARN_CATEGORY_... and TARN_TYPE_... of tarnreporting_messages.h. */
  uint32_t category;
  uint32_t type; /* 0 to 65535 */
  /* All different, in the order in which values will be given. Null when `key_count` is 0. */
  const tarnreporting_key* keys;
  size_t key_count;
};

/* A message without a declared shape. */
typedef struct tarnreporting_message_options tarnreporting_message_options;
struct tarnreporting_message_options {
  size_t size;
  uint32_t category;
  uint32_t type; /* 0 to 65535 */
  /* All different, at most TARNREPORTING_MOST_KEYS. Null when `field_count` is 0. */
  const tarnreporting_field* fields;
  size_t field_count;
  uint64_t stamp_ns; /* of the event, in nanoseconds since 1970 UTC; 0: the time of the call */
};

#define TARNREPORTING_NO_SYSTEM_CALL 1U /* the helper thread looks every 50 ms instead */

/* A writer's memory, and what posting with it may do. */
typedef struct tarnreporting_writer_options tarnreporting_writer_options;
struct tarnreporting_writer_options {
  size_t size;
  /* Room for messages that the service hasn't taken. A message takes 24 bytes, 8 for each value, and for each text
   * its bytes up to a multiple of 8; it may take a quarter of the ring at most. */
  uint32_t ring_bytes; /* a power of two from 4096 to 1048576; 0: 262144 */
  uint32_t flags;      /* TARNREPORTING_NO_SYSTEM_CALL or 0; any other bit is TARNREPORTING_ARGUMENT */
};

enum tarnreporting_connection {
  TARNREPORTING_CONNECTING = 0, /* no service answers; it is tried again */
  TARNREPORTING_CONNECTED = 1
};
typedef enum tarnreporting_connection tarnreporting_connection;

/* How the client is doing. The caller sets `size`; a library of another version fills in the members that both know. */
typedef struct tarnreporting_state tarnreporting_state;
struct tarnreporting_state {
  size_t size;
  uint32_t connection;  /* a tarnreporting_connection */
  uint32_t connections; /* that were made so far */
  /* Messages of all writers since the client was opened, closed writers included. Posted and not taken waits in the
   * rings; taken and not committed is what is lost if the service is killed. */
  uint64_t posted;
  uint64_t taken;     /* by the service */
  uint64_t committed; /* safe on its disk */
  uint64_t dropped;   /* found their ring full, and so were not posted */
  uint64_t refused;   /* by the service, requests included */
  uint32_t unlocked;  /* writers whose memory the system wouldn't lock: it may be paged out */
  /* What went wrong last, with a zero at its end, cut to what fits. It stays when all is well again: `connection`
   * tells that. */
  char last_error[160]; /* empty when there was none */
};

/* The text of a result in English, which lives for ever; "unknown" for a number that is none. Threads: any, also a
 * real-time one. */
TARNREPORTING_API const char* tarnreporting_result_text(int result);

/* Opens a client and starts its helper thread, which blocks all signals; doesn't wait for the service, whose absence
 * is no error. `options` may be null. TARNREPORTING_ARGUMENT for a null `client` and for options with a wrong size,
 * TOO_LARGE for a path over 107 bytes, MEMORY, or SYSTEM when there is no descriptor, page or thread. `*client` is
 * set only with OK. */
TARNREPORTING_API int tarnreporting_client_open(const tarnreporting_client_options* options,
                                                tarnreporting_client** client);
/* Ends all sessions and waits at most so long until the service has taken everything; TARNREPORTING_TIMEOUT when it
 * hasn't. All handles of the client are gone then, whatever the answer. `left`, if not null: the messages that the
 * service had not taken. No other thread may call anything with the client's handles meanwhile; posts that are under
 * way are waited for, up to a second. With 0 it doesn't wait for the service. TARNREPORTING_ARGUMENT for null,
 * FORKED in a child. */
TARNREPORTING_API int tarnreporting_client_close(tarnreporting_client* client, uint32_t timeout_ms, uint64_t* left);
/* Waits at most so long until the service has taken all that was posted, by any writer, until now and while it
 * waits. Taken isn't committed yet: tarnreporting_client_state() tells that. TARNREPORTING_OK or TIMEOUT; ARGUMENT
 * for null, FORKED in a child. Other threads may post meanwhile, but then it may never be quite empty. */
TARNREPORTING_API int tarnreporting_client_flush(tarnreporting_client* client, uint32_t timeout_ms);
/* Fills in the members that fit into `state->size`. It costs a lock and a look at each ring's header, and asks the
 * service nothing. TARNREPORTING_ARGUMENT for null and for a size below that of `size` or above 4096, FORKED in a
 * child. */
TARNREPORTING_API int tarnreporting_client_state(tarnreporting_client* client, tarnreporting_state* state);

/* Begins a session that runs until it is ended; the service sees it as soon as there is one, and after each restart
 * again. Messages may be posted to it at once. Null `options`: service type 0 and no configuration.
 * TARNREPORTING_ARGUMENT for a null handle, a service type over 65535 or an empty key, KIND for a kind of value that
 * there isn't, TEXT for what isn't UTF-8, TOO_LARGE for more or longer than the bounds above, MEMORY, or FORKED.
 * `*session` is set only with OK. */
TARNREPORTING_API int tarnreporting_session_begin(tarnreporting_client* client,
                                                  const tarnreporting_session_options* options,
                                                  tarnreporting_session** session);
/* Ends the session once the service has taken what was posted until now; doesn't wait for that. The session and its
 * shapes are gone: no thread may post with them any more. A service that wasn't there yet sees session and messages
 * later, unless the client is closed before. TARNREPORTING_ARGUMENT for null, FORKED in a child, else OK. */
TARNREPORTING_API int tarnreporting_session_end(tarnreporting_session* session);

/* Declares what messages of one kind look like; their values are then given in the order of the keys. A shape lives
 * as long as its session, and a client has at most 1024. A shape without keys is one, too. TARNREPORTING_ARGUMENT
 * for a null pointer, a type over 65535, a key that is empty or comes twice; KIND, TEXT and MEMORY as above;
 * TOO_LARGE for more or longer than the bounds, or a shape too many; CLOSED when the session is just ending; FORKED.
 * `*shape` is set only with OK. */
TARNREPORTING_API int tarnreporting_shape_declare(tarnreporting_session* session,
                                                  const tarnreporting_shape_options* options,
                                                  tarnreporting_shape** shape);

/* Makes a ring of its own for one thread that posts, at most 32 a client. `options` may be null. Its pages are
 * touched and, if the system allows it, locked now, so that posting never meets one for the first time.
 * TARNREPORTING_ARGUMENT for a null pointer, a size that is no power of two from 4096 to 1048576, or unknown flags;
 * TOO_LARGE for a writer too many; MEMORY; SYSTEM when there is no descriptor or mapping; FORKED. `*writer` is set
 * only with OK. */
TARNREPORTING_API int tarnreporting_writer_open(tarnreporting_client* client,
                                                const tarnreporting_writer_options* options,
                                                tarnreporting_writer** writer);
/* Closes the writer; what was posted with it is still served, and its place is free once that is done. Waits up to a
 * second for a post that is under way. TARNREPORTING_BUSY when that didn't end: the writer takes no more posts, and
 * is to be closed again. TARNREPORTING_ARGUMENT for null, FORKED in a child. */
TARNREPORTING_API int tarnreporting_writer_close(tarnreporting_writer* writer);

/* Posts a message of the shape, with the time of the call. For real-time threads: what it costs is a check and a
 * copy of each value. `values` are as many as the shape's keys, in their order and of their kinds; null when there
 * are none.
 *
 * With TARNREPORTING_OK the message is published: it is served also when the program is killed right after, as long
 * as the service has the ring open. Nothing is posted with any other answer: DROPPED when the ring is full; KIND for
 * values that don't fit the shape; TEXT and TOO_LARGE for a text that isn't UTF-8 or has over
 * TARNREPORTING_MOST_TEXT_BYTES, and TOO_LARGE for a message over a quarter of the ring; ARGUMENT for a null pointer
 * or a shape of another client; BUSY when another thread is inside; CLOSED; FORKED. */
TARNREPORTING_API int tarnreporting_post(tarnreporting_writer* writer, const tarnreporting_shape* shape,
                                         const tarnreporting_value* values, size_t count);
/* The same with the time of the event, in nanoseconds since 1970 UTC: for what was measured before. 0 is 1970 here. */
TARNREPORTING_API int tarnreporting_post_at(tarnreporting_writer* writer, const tarnreporting_shape* shape,
                                            uint64_t stamp_ns, const tarnreporting_value* values, size_t count);
/* Posts a message of any keys, all different, without a shape declared for it. Not for real-time threads: it may
 * wait for a lock and allocate, and takes longer the more sets of keys the session has. Answers as
 * tarnreporting_post() does, and ARGUMENT also for an empty key or one that comes twice, KIND for a kind that there
 * isn't, TEXT for a key that isn't UTF-8, CLOSED when the session is just ending, MEMORY. TARNREPORTING_TOO_LARGE also
 * where the session remembers as many sets of keys and kinds as it may, and the service hasn't taken the messages of
 * the oldest yet. */
TARNREPORTING_API int tarnreporting_post_fields(tarnreporting_writer* writer, tarnreporting_session* session,
                                                const tarnreporting_message_options* options);

/* Values, one function for each kind. They only fill in the struct: no call into the library, nothing that can fail. */
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
/* `length` bytes of UTF-8, without a zero at the end; they are not copied, so they must stay until the call that the
 * value is given to returns. */
static inline tarnreporting_value tarnreporting_text(const char* text, uint32_t length) {
  tarnreporting_value made = {TARNREPORTING_TEXT_VALUE, 0, {0}};
  made.length = length;
  made.as.text = text;
  return made;
}

#ifdef __cplusplus
}
#endif
