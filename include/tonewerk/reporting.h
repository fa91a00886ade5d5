/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TONEWERK_REPORTING_H
#define TONEWERK_REPORTING_H

/*
 * The C interface by which audio processes report to the daemon. For C11, C++98 and later.
 *
 *   client      one connection to the daemon; opened when it is first needed, and again whenever it breaks
 *     session   one use of audio: gets a type and a configuration, starts, gets messages, stops
 *       sender  lets a real-time thread send to a session: no lock, no allocation, no system call
 *   payload     the content of a message, built in the caller's own memory
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
 * Only the three functions that take a time-out wait for the daemon. All others queue a request and return.
 * The client's background thread sends the requests; it starts with the first one. Without a daemon, all
 * calls stay cheap and report nothing: requests are kept up to a bound, and twr_client_get_info() returns the
 * state.
 *
 * All functions except a sender's may be called on any thread. Functions that the caller passes in must not
 * throw. An object must not be used while it is being destroyed or afterwards. Every function accepts NULL
 * for an object: it then does nothing and returns TWR_INVALID (or NULL, or 0). A program that had no memory
 * for a client therefore need not check each call.
 *
 * After fork() the child cannot use its copies of the parent's objects: calls return TWR_FORKED and send
 * nothing to the daemon, and destroying an object only frees its memory. The child may create a client of its
 * own. Unloading the library ends its threads; requests that are still queued are lost.
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
  TWR_INVALID = 1,   /* an argument is not valid: NULL, wrong text (see twr_put_text), or a payload with a map
                        or list that is still open */
  TWR_TOO_LARGE = 2, /* larger than the payload's memory, the ring or the protocol's frame (1 MiB) */
  TWR_FULL = 3,      /* no room in the queue or the ring: dropped; dropped messages are counted */
  TWR_NO_MEMORY = 4,
  TWR_NOT_CONNECTED = 5, /* no daemon, or the connection ended before the answer came */
  TWR_REFUSED = 6,       /* the daemon answered with an error; it is in twr_answer */
  TWR_TIMED_OUT = 7,
  TWR_FORKED = 8,     /* the object belongs to the parent process */
  TWR_WOULD_WAIT = 9, /* a waiting function was called inside a callback */
  TWR_DESTROYED = 10  /* the client was destroyed before the answer came */
} twr_status;

/* Describes the status in English, for logs. Never NULL. */
TWR_API const char* twr_status_text(twr_status status);

/* The library's version, "major.minor.patch". */
TWR_API const char* twr_version(void);

/* ---- payloads ---- */

enum { TWR_MOST_PAYLOAD_DEPTH = 28 };

/*
 * A map of named values. It is built entry by entry in the caller's memory, which must stay valid until the
 * payload was passed to a function that sends it. The values are copied. The functions do not allocate, lock
 * or make system calls. Any thread may use a payload, one at a time. A payload may be sent any number of
 * times; the caller may add entries in between, or empty it with twr_payload_init().
 *
 * A put that fails changes no entry, and marks the payload. A marked payload is refused as a whole with the
 * first failure, so that an incomplete payload is never reported as a complete one.
 */
typedef struct twr_payload {
  /* Only for the functions below. */
  unsigned char* bytes;
  uint32_t capacity;
  uint32_t size;
  uint32_t entries; /* of the outermost map or list */
  uint32_t flags;
  uint32_t problem; /* a twr_status */
  uint32_t depth;
  uint32_t open[TWR_MOST_PAYLOAD_DEPTH]; /* where each container that is still open begins */
} twr_payload;

/* Begins an empty map. An entry takes the bytes of its name and text and at most 20 more; a container takes
 * the bytes of its name and 10 more. */
TWR_API void twr_payload_init(twr_payload* payload, void* memory, size_t size);
/* Begins an empty list, for twr_client_request(). Its values are put with NULL for a name. */
TWR_API void twr_payload_init_list(twr_payload* payload, void* memory, size_t size);
/* TWR_OK, or why the payload will be refused: the status of the first put that failed, or TWR_INVALID while a
 * container is open. */
TWR_API twr_status twr_payload_problem(const twr_payload* payload);

/*
 * Put a value under a name. If a name is given twice, the last value counts. Within a list, `name` is NULL.
 * Texts are UTF-8 without Unicode's noncharacters (such as U+FFFF) and end with a zero byte; others are
 * TWR_INVALID. The daemon reads a space in a name as an underscore.
 */
TWR_API twr_status twr_put_bool(twr_payload* payload, const char* name, int value);
TWR_API twr_status twr_put_int(twr_payload* payload, const char* name, int64_t value);
TWR_API twr_status twr_put_uint(twr_payload* payload, const char* name, uint64_t value);
TWR_API twr_status twr_put_double(twr_payload* payload, const char* name, double value);
TWR_API twr_status twr_put_text(twr_payload* payload, const char* name, const char* value);
/* Puts `size` bytes of UTF-8, which may contain zero bytes. */
TWR_API twr_status twr_put_text_n(twr_payload* payload, const char* name, const char* value, size_t size);
/* Puts a time in seconds since 1970 UTC, precise to nanoseconds. TWR_INVALID for NaN and for times that do
 * not fit into 64-bit seconds. */
TWR_API twr_status twr_put_date(twr_payload* payload, const char* name, double seconds);
/* Puts a parameter that is left out. Only in the outermost list, for twr_client_request(). */
TWR_API twr_status twr_put_nil(twr_payload* payload);
/* Open a map or a list of that name. Values put from here to twr_close() go into it. */
TWR_API twr_status twr_open_map(twr_payload* payload, const char* name);
TWR_API twr_status twr_open_list(twr_payload* payload, const char* name);
TWR_API twr_status twr_close(twr_payload* payload);

/* ---- answers ---- */

/* Valid during the callback. Later versions may add members at the end. */
typedef struct twr_answer {
  twr_status status; /* TWR_OK, TWR_REFUSED, TWR_NOT_CONNECTED or TWR_DESTROYED */
  /* The daemon's error for TWR_REFUSED; otherwise "", 0, "". */
  const char* error_domain;
  int64_t error_code;
  const char* error_message;
  /* For twr_client_validate(): the identifier; 0 when no session has it. */
  int64_t reporter_id;
  /* For twr_client_validate() and twr_client_get_service_type(): a TWR_SERVICE_ number. */
  uint16_t service_type;
  /* For twr_client_get_all_reporters(). */
  const int64_t* reporter_ids;
  size_t reporter_id_count;
  /* The result as MessagePack; NULL and 0 when there is none. */
  const void* result;
  size_t result_size;
} twr_answer;

/*
 * Called once for each request that was queued (TWR_OK), on the client's background thread, in the order in
 * which the daemon completes requests. The status is TWR_NOT_CONNECTED when there was no connection or it
 * ended before the answer, and TWR_DESTROYED when the client was destroyed before; it is then unknown whether
 * the daemon carried out the request. twr_client_destroy() waits for this call, twr_client_flush() does not.
 * It may call every function here that does not wait. Pass NULL when no answer is wanted: the request is then
 * sent as a notification, which costs both sides less.
 */
typedef void (*twr_reply)(void* context, const twr_answer* answer);

/* ---- the client ---- */

typedef struct twr_client twr_client;

typedef enum twr_state {
  TWR_STATE_IDLE = 0, /* there was no request yet */
  TWR_STATE_CONNECTING = 1,
  TWR_STATE_CONNECTED = 2,
  TWR_STATE_WAITING = 3, /* no daemon; the client tries again by itself after 0.25 s to 30 s */
  TWR_STATE_ENDED = 4    /* TWR_CLIENT_ONCE and the connection has ended, or the process has forked */
} twr_state;

enum {
  TWR_CLIENT_ONCE = 1 /* tries to connect only once and never again: for command-line tools */
};

typedef struct twr_client_options {
  size_t size;             /* sizeof(twr_client_options) */
  const char* socket_path; /* NULL or "": $TONEWERK_REPORTING_SOCKET if set, otherwise the user's and
                              then the system's socket */
  size_t queue_bytes;      /* the most bytes of messages that wait for the daemon; 0: 256 KiB */
  unsigned flags;          /* TWR_CLIENT_ONCE */
  /* Called on the background thread at each change of the state; may be NULL. Rules as for twr_reply. */
  void (*state_changed)(void* context, twr_state state);
  void* context;
} twr_client_options;

/* NULL for `options` stands for the defaults. Does not connect yet. Returns NULL without memory. */
TWR_API twr_client* twr_client_create(const twr_client_options* options);

/*
 * Waits up to `timeout_ms` until all queued requests are sent, the daemon has answered them and has closed
 * its end of the connection. Then drops the rest. Without a daemon it does not wait. The client's sessions
 * and senders are destroyed with it; the daemon stops started sessions and reports them. No callback runs
 * after this has returned.
 *
 * It does not wait for the stop of sessions that are still started, nor for answers to twr_client_request(),
 * which the daemon may hold back. Their callbacks get TWR_DESTROYED.
 *
 * Inside one of the client's own callbacks it does not wait; the background thread finishes the work. Pending
 * replies are still called, state_changed is not. A later twr_client_create() or twr_client_destroy() frees
 * the memory.
 */
TWR_API void twr_client_destroy(twr_client* client, int timeout_ms);

/* Connects now, not with the first request. TWR_OK, TWR_NOT_CONNECTED or TWR_TIMED_OUT. */
TWR_API twr_status twr_client_connect(twr_client* client, int timeout_ms);

/*
 * Waits until all requests and messages from before the call are sent, including senders' messages. TWR_OK,
 * TWR_TIMED_OUT, or TWR_NOT_CONNECTED as soon as an attempt to connect fails.
 */
TWR_API twr_status twr_client_flush(twr_client* client, int timeout_ms);

/* The client's state and counters. Later versions may add members at the end. */
typedef struct twr_client_info {
  size_t size; /* sizeof(twr_client_info), set by the caller */
  twr_state state;
  int last_error;         /* errno of the last attempt that failed or connection that broke; 0 for none */
  char socket_path[108];  /* of the present or else the last connection; "" before the first one */
  uint64_t connections;   /* how many were made so far */
  uint64_t messages_sent; /* handed to the daemon's socket */
  uint64_t messages_dropped;
  uint64_t queued_bytes; /* of requests and messages that wait for the daemon, without those in rings */
} twr_client_info;

TWR_API twr_status twr_client_get_info(const twr_client* client, twr_client_info* info);

/*
 * Requests about any session, of this client or another. TWR_OK means that the request is queued and `reply`
 * will be called. Otherwise nothing is sent and `reply` is not called: TWR_INVALID, TWR_TOO_LARGE, TWR_FULL,
 * TWR_NO_MEMORY, TWR_FORKED, or TWR_NOT_CONNECTED for a client in TWR_STATE_ENDED.
 */

/* Sends a message to these sessions. With a `count` of 0 it goes to every started session, or, if there is
 * none, to the daemon's own single-message session. */
TWR_API twr_status twr_client_send(twr_client* client, uint32_t category, uint16_t type,
                                   const twr_payload* payload, const int64_t* reporter_ids, size_t count,
                                   twr_reply reply, void* context);
TWR_API twr_status twr_client_get_service_type(twr_client* client, int64_t reporter_id, twr_reply reply,
                                               void* context);
TWR_API twr_status twr_client_validate(twr_client* client, int64_t reporter_id, twr_reply reply,
                                       void* context);
TWR_API twr_status twr_client_get_all_reporters(twr_client* client, twr_reply reply, void* context);
/* Ends the daemon. The only answer is the end of the connection: TWR_NOT_CONNECTED. */
TWR_API twr_status twr_client_kill_service(twr_client* client, twr_reply reply, void* context);
/* Calls any method of the protocol by its name. `parameters` is a list; NULL for none. */
TWR_API twr_status twr_client_request(twr_client* client, const char* method, const twr_payload* parameters,
                                      twr_reply reply, void* context);

/* ---- sessions ---- */

/*
 * After a restart of the daemon the client makes its sessions again, with their service type and
 * configuration, and starts those that were started. Then it sends what was queued. The reply of a start
 * still waits for the stop.
 */
typedef struct twr_session twr_session;

#define TWR_NEW_ID 0

/*
 * No other session may have the same `reporter_id`; TWR_NEW_ID chooses a random one. Returns NULL without
 * memory, after fork(), and when the client has 4,096 sessions already.
 */
TWR_API twr_session* twr_session_create(twr_client* client, int64_t reporter_id);
TWR_API int64_t twr_session_id(const twr_session* session);

/*
 * Results and replies are those of a client's requests, with one difference: a full queue never loses a
 * change of a session. The change is made once there is room, and TWR_FULL only means that `reply` will not
 * be called.
 *
 * Another type turns a started session into a new one that is stopped.
 */
TWR_API twr_status twr_session_set_service_type(twr_session* session, uint16_t service_type, twr_reply reply,
                                                void* context);
/* Merges this into the configuration. TWR_TOO_LARGE when the two together do not fit into a frame. */
TWR_API twr_status twr_session_set_configuration(twr_session* session, const twr_payload* configuration,
                                                 twr_reply reply, void* context);
/*
 * `stopped` is called when the session stops: by twr_session_stop(), by another type, or when the session is
 * destroyed. If the session is still started when the client is destroyed, `stopped` gets TWR_DESTROYED
 * (without a daemon TWR_NOT_CONNECTED).
 */
TWR_API twr_status twr_session_start(twr_session* session, twr_reply stopped, void* context);
/*
 * A message is dropped when the queue has no room for it (TWR_FULL). The next message that the session or one
 * of its senders sends contains the number of dropped ones under "twreporting_dropped". If no message
 * follows, a message with only that entry is sent when the session stops. A message gets the time of this
 * call, unless it contains "twreporting_timestamp" (seconds since 1970, a double).
 */
TWR_API twr_status twr_session_send(twr_session* session, uint32_t category, uint16_t type,
                                    const twr_payload* payload, twr_reply reply, void* context);
TWR_API twr_status twr_session_stop(twr_session* session, twr_reply reply, void* context);
/*
 * Stops the session if it is started, and destroys it. `session` and its senders must not be used after the
 * call, whatever it returns. After fork() their memory is freed with their client.
 */
TWR_API twr_status twr_session_destroy(twr_session* session, twr_reply reply, void* context);

/* ---- senders ---- */

/*
 * For one thread at a time, such as an audio callback. Messages wait in a ring of fixed size until the
 * background thread takes them: after 10 ms while messages keep coming, after up to 100 ms following a pause.
 * They keep their order relative to the session's other calls. The ring's memory is allocated and touched
 * when the sender is opened.
 */
typedef struct twr_sender twr_sender;

enum { TWR_DEFAULT_RING_BYTES = 65536, TWR_MOST_RING_BYTES = 16777216 };

/*
 * `ring_bytes` is rounded up to a power of two; 0 stands for the default. Not for real-time threads. Returns
 * NULL without memory, after fork(), for more than TWR_MOST_RING_BYTES, and when the client has 4,096 senders
 * already.
 */
TWR_API twr_sender* twr_sender_open(twr_session* session, size_t ring_bytes);

/*
 * Wait-free: no lock, no allocation, no system call. A message takes the bytes of its payload and about 40
 * more in the ring. Returns TWR_OK; TWR_FULL when there is no room; TWR_TOO_LARGE or the payload's problem
 * when the message can never be sent. Dropped messages are counted and reported together with those of
 * twr_session_send(). If no message follows, a message with only their number is sent when the sender is
 * closed. Messages get their time as with twr_session_send(), to the resolution of the system's coarse clock
 * (1 to 10 ms).
 */
TWR_API twr_status twr_sender_send(twr_sender* sender, uint32_t category, uint16_t type,
                                   const twr_payload* payload);

/* How many messages this sender has dropped since it was opened. Any thread. */
TWR_API uint64_t twr_sender_dropped(const twr_sender* sender);

/*
 * Messages in the ring are still sent, in their order. While there is no connection, or the daemon does not
 * read, they move to the client's queue; a message that finds no room there is dropped, counted and reported.
 * Not for real-time threads.
 */
TWR_API void twr_sender_close(twr_sender* sender);

/* ---- vocabulary ---- */

/* What a message is about: a category, alone or combined (|) with the part of the audio stack it is from. */
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

/* The service for which a session reports. */
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
