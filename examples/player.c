/* SPDX-License-Identifier: Apache-2.0 */
/* Says what a player does, without a key: cc player.c $(pkg-config --cflags --libs twreporting) -pthread */
#define _POSIX_C_SOURCE 200809L /* nanosleep */
#include <stdio.h>
#include <time.h>
#include <tonewerk/reporting_audio.h>

static void play(void) { nanosleep(&(struct timespec){.tv_nsec = 750000000}, NULL); }

int main(void) {
  twr_client* client = twr_client_create(NULL);
  twr_session* session = twr_session_create(client, TWR_NEW_ID);
  twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, NULL, NULL);
  twr_session_application(session, "org.example.Player");
  twr_session_start(session, NULL, NULL);

  twr_session_device(session, "Speaker");
  twr_session_format(session, 48000, 2, "lpcm");
  twr_session_playing(session, 0.5);
  play();
  twr_session_overload(session, NULL); /* the device ran out of data */
  twr_session_volume(session, 0.3);    /* begins another summary */
  play();
  twr_session_playing_stopped(session);

  twr_session_destroy(session, NULL, NULL); /* stops it, and the daemon makes its summaries */
  twr_status status = twr_client_flush(client, 2000);
  twr_client_destroy(client, 1000);
  printf("player: %s\n", twr_status_text(status));
  return 0;
}
