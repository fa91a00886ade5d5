/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TONEWERK_REPORTING_H
#define TONEWERK_REPORTING_H

/*
 * What audio processes say to the reporting daemon: C11, C++98 and later.
 *
 *   client      one connection, made when it is first needed, and made again whenever it breaks
 *     session   what one use of audio reports: typed, configured, started, sent to, stopped
 *       sender  a real-time thread's way into a session: no lock, no allocation, no system call
 *   payload     what a message says, built in the caller's own memory
 *
 *   twr_client* client = twr_client_create(NULL);
 *   twr_session* session = twr_session_create(client, TWR_NEW_ID);
 *   twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, NULL, NULL);
 *   twr_session_start(session, NULL, NULL);
 *
 *   unsigned char memory[128];
 *   twr_payload payload;
 *   twr_payload_init(&payload, memory, sizeof memory);
 *   twr_put_bool(&payload, "session_output_running", 1);
 *   twr_put_double(&payload, "QMSessionVolume", 0.5);
 *   twr_session_send(session, TWR_CATEGORY_PLAYBACK, TWR_TYPE_START, &payload, NULL, NULL);
 *
 *   twr_session_destroy(session, NULL, NULL);
 *   twr_client_destroy(client, 1000);
 *
 * Nothing here waits for the daemon but the three functions that take a time: requests are queued and go out
 * on the client's one background thread, which starts with the first of them. Without a daemon everything is
 * cheap and silent, what is queued is kept up to a bound, and twr_client_get_info() tells.
 *
 * Any function but a sender's may be called on any thread; callers' functions must not throw. An object must
 * not be used while or after it is destroyed. NULL for an object is allowed everywhere: the call then does
 * nothing and returns TWR_INVALID (or NULL, or 0), so that a program without memory for a client need not
 * check each call.
 *
 * After fork() the child's copies of the parent's objects are dead: calls return TWR_FORKED, nothing of them
 * reaches the daemon, and destroying them only frees their memory. The child may create a client of its own.
 * Unloading the library ends its threads; what is then still queued is lost.
 */

/* NOLINTBEGIN(readability-identifier-naming,modernize-*): these are C's names. */

#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#if defined(__GNUC__)
#define TWR_API __attribute__((visibility("default")))
#else
#define TWR_API
#endif

/* ---- results ---- */

typedef enum twr_status {
  TWR_OK = 0,
  TWR_INVALID = 1,   /* an argument that cannot be: NULL, text that is not valid (see twr_put_text), an
                        unbalanced payload */
  TWR_TOO_LARGE = 2, /* does not fit into the payload's memory, the ring or the protocol's frame (1 MiB) */
  TWR_FULL = 3,      /* no room in the queue or the ring: dropped, and counted where it was a message */
  TWR_NO_MEMORY = 4,
  TWR_NOT_CONNECTED = 5, /* no daemon, or the connection ended before the answer came */
  TWR_REFUSED = 6,       /* the daemon's answer is an error; twr_answer says which */
  TWR_TIMED_OUT = 7,
  TWR_FORKED = 8,     /* the object belongs to the parent process */
  TWR_WOULD_WAIT = 9, /* a waiting function was called inside a callback */
  TWR_DESTROYED = 10  /* the client was destroyed before the answer came */
} twr_status;

/* In English words, for logs; never NULL. */
TWR_API const char* twr_status_text(twr_status status);

/* The library's version, "major.minor.patch". */
TWR_API const char* twr_version(void);

/* ---- payloads ---- */

enum { TWR_MOST_PAYLOAD_DEPTH = 28 };

/*
 * A map of named values, built entry by entry in memory that the caller brings and keeps until the payload
 * has been handed over. Copies what it is given; allocates nothing, locks nothing, makes no system call: for
 * any thread, one at a time. May be handed over any number of times, emptied by twr_payload_init(), or gone
 * on with.
 *
 * A put that fails leaves what is there as it was, and marks the payload: it is then refused as a whole with
 * the first failure, so that half of what was meant is never reported as all of it.
 */
typedef struct twr_payload {
  /* For the functions below alone. */
  unsigned char* bytes;
  uint32_t capacity;
  uint32_t size;
  uint32_t entries; /* of the outermost map or list */
  uint32_t flags;
  uint32_t problem; /* a twr_status */
  uint32_t depth;
  uint32_t open[TWR_MOST_PAYLOAD_DEPTH]; /* where the containers begin that are still open */
} twr_payload;

/* An empty map. An entry takes its name, its text, and at most 20 bytes more; a container its name and 10. */
TWR_API void twr_payload_init(twr_payload* payload, void* memory, size_t size);
/* An empty list, for twr_client_request(); its values are put with NULL for a name. */
TWR_API void twr_payload_init_list(twr_payload* payload, void* memory, size_t size);
/* TWR_OK, or why the payload will be refused: the first put that failed, or a container still open. */
TWR_API twr_status twr_payload_problem(const twr_payload* payload);

/*
 * Puts a value under a name; a name given twice leaves the last. Within a list `name` is NULL. Texts are
 * UTF-8 without Unicode's noncharacters (U+FFFF and the like) and end with a zero byte: TWR_INVALID for
 * others. The daemon understands a name's spaces as underscores.
 */
TWR_API twr_status twr_put_bool(twr_payload* payload, const char* name, int value);
TWR_API twr_status twr_put_int(twr_payload* payload, const char* name, int64_t value);
TWR_API twr_status twr_put_uint(twr_payload* payload, const char* name, uint64_t value);
TWR_API twr_status twr_put_double(twr_payload* payload, const char* name, double value);
TWR_API twr_status twr_put_text(twr_payload* payload, const char* name, const char* value);
/* `size` bytes of UTF-8, a zero byte among them or not. */
TWR_API twr_status twr_put_text_n(twr_payload* payload, const char* name, const char* value, size_t size);
/* Seconds since 1970 UTC, with fractions down to nanoseconds; TWR_INVALID for what is no time, as NaN. */
TWR_API twr_status twr_put_date(twr_payload* payload, const char* name, double seconds);
/* Only in the outermost list of twr_client_request(): a parameter that is left out. */
TWR_API twr_status twr_put_nil(twr_payload* payload);
/* What is put from here to twr_close() goes into a map, or a list, of that name. */
TWR_API twr_status twr_open_map(twr_payload* payload, const char* name);
TWR_API twr_status twr_open_list(twr_payload* payload, const char* name);
TWR_API twr_status twr_close(twr_payload* payload);

/* ---- answers ---- */

/* Valid during the callback. Later versions may add members at the end. */
typedef struct twr_answer {
  twr_status status; /* TWR_OK, TWR_REFUSED, TWR_NOT_CONNECTED or TWR_DESTROYED */
  /* Of TWR_REFUSED: the daemon's error; else "", 0, "". */
  const char* error_domain;
  int64_t error_code;
  const char* error_message;
  /* Of twr_client_validate(): the identifier, 0 when it names no session. */
  int64_t reporter_id;
  /* Of twr_client_validate() and twr_client_get_service_type(): a TWR_SERVICE_ number. */
  uint16_t service_type;
  /* Of twr_client_get_all_reporters(). */
  const int64_t* reporter_ids;
  size_t reporter_id_count;
  /* The result as it came: MessagePack; NULL and 0 for none. */
  const void* result;
  size_t result_size;
} twr_answer;

/*
 * Called once for a request that was taken (TWR_OK), on the client's background thread, in the order in which
 * the daemon completes requests; with TWR_NOT_CONNECTED when there was no connection or it ended before, with
 * TWR_DESTROYED when the client did: whether the request was carried out is then not known.
 * twr_client_flush() does not wait for it, twr_client_destroy() does. May call anything here but what waits.
 * NULL where no answer is wanted: the request is then sent as one that has none, which costs both sides less.
 */
typedef void (*twr_reply)(void* context, const twr_answer* answer);

/* ---- the client ---- */

typedef struct twr_client twr_client;

typedef enum twr_state {
  TWR_STATE_IDLE = 0, /* nothing has been asked for yet */
  TWR_STATE_CONNECTING = 1,
  TWR_STATE_CONNECTED = 2,
  TWR_STATE_WAITING = 3, /* no daemon; the next attempt comes by itself, after 0.25 s to 30 s */
  TWR_STATE_ENDED = 4    /* TWR_CLIENT_ONCE and the connection is gone, or the process has forked */
} twr_state;

enum {
  TWR_CLIENT_ONCE = 1 /* neither waits for a daemon nor connects again: for command-line tools */
};

typedef struct twr_client_options {
  size_t size;             /* sizeof(twr_client_options) */
  const char* socket_path; /* NULL or "": $TONEWERK_REPORTING_SOCKET, else the own, then the system's */
  size_t queue_bytes;      /* of messages that wait for the daemon; 0: 256 KiB */
  unsigned flags;          /* TWR_CLIENT_ONCE */
  /* On the background thread, at each change; NULL for none. The same rules as for twr_reply. */
  void (*state_changed)(void* context, twr_state state);
  void* context;
} twr_client_options;

/* With NULL for `options` the defaults. Opens nothing yet. NULL without memory. */
TWR_API twr_client* twr_client_create(const twr_client_options* options);

/*
 * Waits up to `timeout_ms` until what is queued has gone out, the daemon has answered those who wait for it,
 * and has closed its end, then drops the rest; without a daemon it does not wait. The client's sessions and
 * senders are destroyed with it; the daemon stops and reports started ones. Nothing is called any more once
 * it has returned.
 *
 * Not waited for are the stop of sessions that are still started, and answers to twr_client_request(), which
 * the daemon may hold back: those are told TWR_DESTROYED.
 *
 * Inside one of the client's own callbacks it does not wait but leaves that to the background thread: pending
 * replies are still called, state_changed is not. The memory is freed by a later twr_client_create() or
 * twr_client_destroy().
 */
TWR_API void twr_client_destroy(twr_client* client, int timeout_ms);

/* Connects now instead of with the first request. TWR_OK, TWR_NOT_CONNECTED or TWR_TIMED_OUT. */
TWR_API twr_status twr_client_connect(twr_client* client, int timeout_ms);

/*
 * Waits until everything said before the call has gone out, senders' messages, too. TWR_OK, TWR_TIMED_OUT, or
 * TWR_NOT_CONNECTED as soon as an attempt to connect fails.
 */
TWR_API twr_status twr_client_flush(twr_client* client, int timeout_ms);

/* How the client is doing. Later versions may add members at the end. */
typedef struct twr_client_info {
  size_t size; /* sizeof(twr_client_info), set by the caller */
  twr_state state;
  int last_error;         /* errno of the last attempt that failed or connection that broke; 0 for none */
  char socket_path[108];  /* where it is, or was last, connected; "" for nowhere yet */
  uint64_t connections;   /* made so far */
  uint64_t messages_sent; /* handed to the daemon's socket */
  uint64_t messages_dropped;
  uint64_t queued_bytes; /* that wait for the daemon, rings not included */
} twr_client_info;

TWR_API twr_status twr_client_get_info(const twr_client* client, twr_client_info* info);

/*
 * Requests about any session, of this client or another. TWR_OK: queued, and `reply` will be called. Else
 * TWR_INVALID, TWR_TOO_LARGE, TWR_FULL, TWR_NO_MEMORY, TWR_FORKED, or TWR_NOT_CONNECTED for a client that has
 * ended; nothing is then sent and `reply` not called.
 */

/* To the sessions named; with `count` 0 to every started one, or else the daemon's own single-message
 * session. */
TWR_API twr_status twr_client_send(twr_client* client, uint32_t category, uint16_t type,
                                   const twr_payload* payload, const int64_t* reporter_ids, size_t count,
                                   twr_reply reply, void* context);
TWR_API twr_status twr_client_get_service_type(twr_client* client, int64_t reporter_id, twr_reply reply,
                                               void* context);
TWR_API twr_status twr_client_validate(twr_client* client, int64_t reporter_id, twr_reply reply,
                                       void* context);
TWR_API twr_status twr_client_get_all_reporters(twr_client* client, twr_reply reply, void* context);
/* Ends the daemon. There is no answer but the connection's end: TWR_NOT_CONNECTED. */
TWR_API twr_status twr_client_kill_service(twr_client* client, twr_reply reply, void* context);
/* Any method of the protocol by its name. `parameters` is a list; NULL for none. */
TWR_API twr_status twr_client_request(twr_client* client, const char* method, const twr_payload* parameters,
                                      twr_reply reply, void* context);

/* ---- sessions ---- */

/*
 * After a daemon's restart the client's sessions are made again: with their service type, their
 * configuration, and started where they were. What was queued follows. A start's reply stays in place until
 * the stop.
 */
typedef struct twr_session twr_session;

#define TWR_NEW_ID 0

/*
 * `reporter_id` must be of nobody else; TWR_NEW_ID chooses a random one. NULL without memory, after fork(),
 * or past 4,096 sessions of a client.
 */
TWR_API twr_session* twr_session_create(twr_client* client, int64_t reporter_id);
TWR_API int64_t twr_session_id(const twr_session* session);

/*
 * Results and replies as for a client's requests, but that what a session is to be is never lost to a full
 * queue: it is brought about once there is room, and TWR_FULL only says that `reply` will not be called. A
 * changed type makes a started session a new, stopped one.
 */
TWR_API twr_status twr_session_set_service_type(twr_session* session, uint16_t service_type, twr_reply reply,
                                                void* context);
/* Merged into the configuration so far. TWR_TOO_LARGE when the two together do not fit a frame. */
TWR_API twr_status twr_session_set_configuration(twr_session* session, const twr_payload* configuration,
                                                 twr_reply reply, void* context);
/*
 * `stopped` is called when the session stops, by a stop, a change of its type or its end; for a session that
 * is started when the client ends, with TWR_DESTROYED (or TWR_NOT_CONNECTED, without a daemon).
 */
TWR_API twr_status twr_session_start(twr_session* session, twr_reply stopped, void* context);
/*
 * A message that finds no room in the queue is dropped (TWR_FULL). The first that goes out of what the
 * session or one of its senders says after that tells how many were, under "twreporting_dropped"; where none
 * follows, one with nothing else does when the session stops. A message is stamped with the time of this
 * call, unless it holds "twreporting_timestamp" (seconds since 1970, a double).
 */
TWR_API twr_status twr_session_send(twr_session* session, uint32_t category, uint16_t type,
                                    const twr_payload* payload, twr_reply reply, void* context);
TWR_API twr_status twr_session_stop(twr_session* session, twr_reply reply, void* context);
/*
 * Stops it where it is started. `session` and its senders are gone with the call, whatever it returns (after
 * fork() with their client).
 */
TWR_API twr_status twr_session_destroy(twr_session* session, twr_reply reply, void* context);

/* ---- senders ---- */

/*
 * For one thread at a time, such as an audio callback. Messages lie in a ring of fixed size until the
 * background thread takes them: 10 ms later while messages come, up to 100 ms later after a pause. Relative
 * to the session's other calls they keep their order. The ring's memory is touched when the sender is opened,
 * and never again allocated.
 */
typedef struct twr_sender twr_sender;

enum { TWR_DEFAULT_RING_BYTES = 65536, TWR_MOST_RING_BYTES = 16777216 };

/*
 * `ring_bytes` is rounded up to a power of two; 0 for the default. Not for real-time threads. NULL without
 * memory, after fork(), for more than TWR_MOST_RING_BYTES, or past 4,096 senders of a client.
 */
TWR_API twr_sender* twr_sender_open(twr_session* session, size_t ring_bytes);

/*
 * Wait-free: no lock, no allocation, no system call. A message takes its payload and some 40 bytes of the
 * ring. TWR_OK; TWR_FULL when there is no room; TWR_TOO_LARGE or the payload's problem when it can never be
 * sent. What was not taken is counted, and told as twr_session_send() tells of its own, in one sum with
 * that; where no message follows, one with nothing else is sent when the sender is closed. Stamped as by
 * twr_session_send(), to the resolution of the system's coarse clock (1 to 10 ms).
 */
TWR_API twr_status twr_sender_send(twr_sender* sender, uint32_t category, uint16_t type,
                                   const twr_payload* payload);

/* So far, and for good. Any thread. */
TWR_API uint64_t twr_sender_dropped(const twr_sender* sender);

/*
 * What lies in the ring still goes out, in its place, as what twr_session_send() was given: where no daemon
 * takes it at once it moves to the client's queue, if there is none yet as well as after a connection broke;
 * each message that finds no room in the queue is dropped, counted and told. Not for real-time threads.
 */
TWR_API void twr_sender_close(twr_sender* sender);

/* ---- vocabulary ---- */

/* What a message is about: a category, alone or with the part of the audio stack that says it (|). */
#define TWR_CATEGORY_GENERIC ((uint32_t)1)
#define TWR_CATEGORY_RECORD ((uint32_t)2)
#define TWR_CATEGORY_INPUT ((uint32_t)3)
#define TWR_CATEGORY_PLAYBACK ((uint32_t)4)
#define TWR_CATEGORY_OUTPUT ((uint32_t)5)
#define TWR_CATEGORY_PLAYBACK_AND_RECORD ((uint32_t)6)
#define TWR_CATEGORY_IO ((uint32_t)7)
#define TWR_CATEGORY_SETUP ((uint32_t)8)
#define TWR_CATEGORY_CLIENT_REQUEST ((uint32_t)9)
#define TWR_CATEGORY_ROUTE_CHANGE ((uint32_t)10)
#define TWR_CATEGORY_ERROR ((uint32_t)11)
#define TWR_CATEGORY_CHANMETERING ((uint32_t)12)
#define TWR_CATEGORY_PERFORMANCE ((uint32_t)13)
#define TWR_CATEGORY_VOLUME ((uint32_t)14)
#define TWR_CATEGORY_GATHER ((uint32_t)15)
#define TWR_CATEGORY_HEARING_HEALTH ((uint32_t)16)
#define TWR_CATEGORY_UNKNOWN ((uint32_t)0xFFFFFFFFu)

#define TWR_DOMAIN_MIDI ((uint32_t)0x04000000u)
#define TWR_DOMAIN_SESSION ((uint32_t)0x08000000u)
#define TWR_DOMAIN_DSP ((uint32_t)0x10000000u)
#define TWR_DOMAIN_HAL ((uint32_t)0x20000000u)
#define TWR_DOMAIN_ROUTING ((uint32_t)0x40000000u)
#define TWR_DOMAIN_TOOLBOX ((uint32_t)0x80000000u)

/* What happened. */
#define TWR_TYPE_GENERIC ((uint16_t)0)
#define TWR_TYPE_START ((uint16_t)1)
#define TWR_TYPE_STOP ((uint16_t)2)
#define TWR_TYPE_ACTIVATE ((uint16_t)3)
#define TWR_TYPE_DEACTIVATE ((uint16_t)4)
#define TWR_TYPE_SETUP ((uint16_t)5)
#define TWR_TYPE_ERROR ((uint16_t)6)
#define TWR_TYPE_ISSUE_DETECTOR ((uint16_t)7)
#define TWR_TYPE_ENERGYBOOK ((uint16_t)8)
#define TWR_TYPE_MODULON_USAGE ((uint16_t)9)
#define TWR_TYPE_MIDI_DRIVER ((uint16_t)10)
#define TWR_TYPE_SUMMARY ((uint16_t)11)
#define TWR_TYPE_HEADPHONE_AUDIO_EXPOSURE ((uint16_t)12)
#define TWR_TYPE_AUDIO_EXPOSURE ((uint16_t)13)
#define TWR_TYPE_LISTENING_ENHANCEMENT ((uint16_t)14)
#define TWR_TYPE_PELLIX ((uint16_t)15)
#define TWR_TYPE_SIMPLE ((uint16_t)16)
#define TWR_TYPE_HISTOGRAM ((uint16_t)17)
#define TWR_TYPE_STATE ((uint16_t)18)
#define TWR_TYPE_MEMORY_LOG ((uint16_t)19)
#define TWR_TYPE_UNKNOWN ((uint16_t)65535)

/* What a session reports for. */
#define TWR_SERVICE_GENERIC ((uint16_t)0)
#define TWR_SERVICE_VOCIA ((uint16_t)1)
#define TWR_SERVICE_TELEPHONY ((uint16_t)2)
#define TWR_SERVICE_HAPTICS ((uint16_t)3)
#define TWR_SERVICE_ALARMS ((uint16_t)4)
#define TWR_SERVICE_STANDALONE ((uint16_t)5)
#define TWR_SERVICE_SOUND_AUTO_CONFIG ((uint16_t)6)
#define TWR_SERVICE_LONG_FORM_AUDIO ((uint16_t)7)
#define TWR_SERVICE_NON_LONG_FORM_AUDIO ((uint16_t)8)
#define TWR_SERVICE_AUDIO_DEVICE_USAGE ((uint16_t)9)
#define TWR_SERVICE_ALERTS ((uint16_t)10)
#define TWR_SERVICE_TEST ((uint16_t)11)
#define TWR_SERVICE_API_USAGE ((uint16_t)12)
#define TWR_SERVICE_SYSTEM_SOUNDS ((uint16_t)13)
#define TWR_SERVICE_UNKNOWN ((uint16_t)65535)

#ifdef __cplusplus
}
#endif

/* NOLINTEND(readability-identifier-naming,modernize-*) */

#endif /* TONEWERK_REPORTING_H */
