/* SPDX-License-Identifier: Apache-2.0 */
/* A session with an audio thread: cc report.c $(pkg-config --cflags --libs twreporting) -pthread */
#define _POSIX_C_SOURCE 200809L /* nanosleep */
#include <pthread.h>
#include <stdio.h>
#include <stdlib.h>
#include <time.h>
#include <tonewerk/reporting.h>

static void* play(void* sender) { /* a real-time thread: the calls do not lock, allocate or wait */
  unsigned char memory[256];
  twr_payload payload;
  for (int cycle = 0; cycle <= 4; cycle++) { /* the last one stops */
    twr_payload_init(&payload, memory, sizeof memory);
    twr_put_bool(&payload, "session_output_running", cycle < 4);
    twr_put_double(&payload, "QMSessionVolume", 0.5);
    twr_put_text(&payload, "active_devices", "Speaker");
    twr_put_int(&payload, "cycle", cycle);
    twr_sender_send(sender, TWR_CATEGORY_PLAYBACK, TWR_TYPE_STATE, &payload);
    if (cycle < 4) nanosleep(&(struct timespec){.tv_nsec = 250000000}, NULL); /* the device plays */
  }
  return NULL;
}
int main(void) {
  twr_client* client = twr_client_create(NULL);
  twr_session* session = twr_session_create(client, TWR_NEW_ID);
  unsigned char memory[128];
  twr_payload names;
  twr_payload_init(&names, memory, sizeof memory);
  twr_put_text(&names, "HostApplicationDisplayID", "org.example.Report");
  twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, NULL, NULL);
  twr_session_set_configuration(session, &names, NULL, NULL);
  twr_session_start(session, NULL, NULL);
  twr_sender* sender = twr_sender_open(session, TWR_DEFAULT_RING_BYTES);
  pthread_t audio;
  if (pthread_create(&audio, NULL, play, sender) == 0) pthread_join(audio, NULL);
  twr_session_destroy(session, NULL, NULL); /* stops it, and the daemon makes its reports */
  twr_status status = twr_client_flush(client, 2000);
  twr_client_destroy(client, 1000);
  printf("report: %s\n", twr_status_text(status));
  fflush(stdout);
  /* Shows the report, if this user may read the store. */
  const char show[] =
      "for try in 1 2 3 4 5 6 7 8 9; do sleep 1; "
      "twctl events --name '*.Volume.Summary' --limit 1 2>/dev/null | grep org.example.Report && break; done";
  if (status == TWR_OK && system(show) != 0) puts("report: twctl shows none");
  return 0;
}
