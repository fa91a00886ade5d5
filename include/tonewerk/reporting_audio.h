/* SPDX-License-Identifier: Apache-2.0 */
#ifndef TONEWERK_REPORTING_AUDIO_H
#define TONEWERK_REPORTING_AUDIO_H

/*
 * Says what a session's audio does. These functions choose the category, the type and the keys of each
 * message, so that the daemon's summaries are right. For C11, C++98 and later; part of the same library.
 *
 *   twr_session_application(session, "org.example.Player");
 *   twr_session_start(session, NULL, NULL);
 *   twr_session_device(session, "Speaker");
 *   twr_session_format(session, 48000, 2, "lpcm");
 *   twr_session_playing(session, 0.5);
 *   ...
 *   twr_session_volume(session, 0.3);
 *   ...
 *   twr_session_playing_stopped(session);
 *
 * This makes two volume summaries, one for each volume: how long it played, how loud, on which device and in
 * which format. The session's own summary has the time during which it played or recorded, and the number of
 * overloads.
 *
 * Each function that sends a message exists twice. That of a session may be called on any thread and queues
 * the message, like twr_session_send(). That of a sender is for one thread at a time, such as an audio
 * callback, and puts it into the sender's ring: no lock, no allocation, no system call. A session and its
 * senders may be mixed: they share what is running.
 *
 * All of them return TWR_OK, or what twr_session_send() or twr_sender_send() returns. TWR_INVALID for NULL
 * and for an argument outside of its range, and TWR_TOO_LARGE for a text of more than
 * TWR_MOST_AUDIO_TEXT_BYTES; then nothing is sent or changed. Texts are UTF-8, not empty, and are copied.
 *
 * A daemon that has restarted knows nothing of what was said before. Say the device, the format and what runs
 * again then: twr_client_options' state_changed says TWR_STATE_CONNECTED.
 */

/* NOLINTBEGIN(readability-identifier-naming,modernize-*): these are C's names. */

#include <tonewerk/reporting.h>

#ifdef __cplusplus
extern "C" {
#endif

enum { TWR_MOST_AUDIO_TEXT_BYTES = 256 };

/*
 * The reports of the session have this name of the application, as "org.example.Player"; without one,
 * "Unknown". Part of the session's configuration: say it before the start. Not for real-time threads.
 */
TWR_API twr_status twr_session_application(twr_session* session, const char* application);

/*
 * The session begins to play. `volume` is from 0 to 1; a program without a volume of its own passes 1. A
 * session that plays already only changes its volume. The message of the start has TWR_CATEGORY_PLAYBACK and
 * TWR_TYPE_STATE; the volume is a message of its own before it.
 */
TWR_API twr_status twr_session_playing(twr_session* session, double volume);
TWR_API twr_status twr_sender_playing(twr_sender* sender, double volume);
/*
 * The session plays no more. Does nothing when it did not play. When the session does not record either, the
 * message has the time since it began to do the first of the two, which the session's summary adds up.
 *
 * twr_session_stop() and twr_session_destroy() say this for what is still running. The end of the client or
 * of the process does not: what it had not stopped gets no summary.
 */
TWR_API twr_status twr_session_playing_stopped(twr_session* session);
TWR_API twr_status twr_sender_playing_stopped(twr_sender* sender);

/* The same for recording, with TWR_CATEGORY_RECORD. A session may play and record at the same time. */
TWR_API twr_status twr_session_recording(twr_session* session);
TWR_API twr_status twr_sender_recording(twr_sender* sender);
TWR_API twr_status twr_session_recording_stopped(twr_session* session);
TWR_API twr_status twr_sender_recording_stopped(twr_sender* sender);

/*
 * The volume is now this, from 0 to 1. While it plays, another volume begins another summary; intervals of
 * half a second or less get none, so the steps of a drag need not be held back. TWR_CATEGORY_VOLUME,
 * TWR_TYPE_STATE.
 */
TWR_API twr_status twr_session_volume(twr_session* session, double volume);
TWR_API twr_status twr_sender_volume(twr_sender* sender, double volume);

/*
 * The session's devices are now these: a name for people, as "Speaker", or several in one text. A session has
 * one such text for playing and recording. Another one begins another summary. TWR_CATEGORY_ROUTE_CHANGE,
 * TWR_TYPE_STATE.
 */
TWR_API twr_status twr_session_device(twr_session* session, const char* device);
TWR_API twr_status twr_sender_device(twr_sender* sender, const char* device);
/* The same with the reason for the change, as "headphones unplugged". */
TWR_API twr_status twr_session_route(twr_session* session, const char* device, const char* reason);
TWR_API twr_status twr_sender_route(twr_sender* sender, const char* device, const char* reason);

/*
 * The format is now this: the sample rate in Hz and the number of channels, each at least 1, and the coding,
 * as "lpcm" or "aac". Another one begins another summary. TWR_CATEGORY_SETUP, TWR_TYPE_STATE.
 */
TWR_API twr_status twr_session_format(twr_session* session, uint32_t sample_rate, uint32_t channels,
                                      const char* coding);
TWR_API twr_status twr_sender_format(twr_sender* sender, uint32_t sample_rate, uint32_t channels,
                                     const char* coding);

/* What is known of an overload. Later versions may add members at the end. */
typedef struct twr_overload {
  size_t size;            /* sizeof(twr_overload) */
  const char* node;       /* where in the audio graph; NULL or "" when not known */
  double silence_seconds; /* for how long a channel was silent; at least 0 */
  uint32_t buffer_frames; /* the smallest buffer in frames; 0 when not known */
  uint64_t io_cycle;      /* the number of the cycle; 0 when not known */
} twr_overload;

/*
 * Data was not ready in time. The session's summary counts each call, so call it for each overload, or at
 * most once in a second when they come often. NULL for `overload` when nothing is known of it.
 * TWR_CATEGORY_IO, TWR_TYPE_ERROR.
 */
TWR_API twr_status twr_session_overload(twr_session* session, const twr_overload* overload);
TWR_API twr_status twr_sender_overload(twr_sender* sender, const twr_overload* overload);

#ifdef __cplusplus
}
#endif

/* NOLINTEND(readability-identifier-naming,modernize-*) */

#endif /* TONEWERK_REPORTING_AUDIO_H */
