/* SPDX-License-Identifier: Apache-2.0 */
/* A session with an audio thread: cc report.c $(pkg-config --cflags --libs twreporting) -pthread */
#include <stdio.h>
#include <stdlib.h>
#include <threads.h>
#include <tonewerk/reporting.h>

static int play(void* sender) { /* a real-time thread: what reports here neither locks, allocates nor waits */
  unsigned char memory[256];
  twr_payload payload;
  for (int cycle = 0; cycle <= 4; cycle++) { /* the last one stops */
    twr_payload_init(&payload, memory, sizeof memory);
    twr_put_bool(&payload, "session_output_running", cycle < 4);
    twr_put_double(&payload, "QMSessionVolume", 0.5);
    twr_put_text(&payload, "active_devices", "Speaker");
    twr_put_int(&payload, "cycle", cycle);
    twr_sender_send(sender, TWR_CATEGORY_PLAYBACK, TWR_TYPE_STATE, &payload);
    if (cycle < 4) thrd_sleep(&(struct timespec){.tv_nsec = 250000000}, NULL); /* the device plays */
  }
  return 0;
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
  thrd_t audio;
  if (thrd_create(&audio, play, sender) == thrd_success) thrd_join(audio, NULL);
  twr_session_destroy(session, NULL, NULL); /* stops it, and the daemon makes its reports */
  twr_status status = twr_client_flush(client, 2000);
  twr_client_destroy(client, 1000);
  printf("report: %s\n", twr_status_text(status));
  fflush(stdout);
  if (status != TWR_OK) return 0;
  return system("sleep 1; twctl events --name '*.Volume.Summary' --limit 1") == 0 ? 0 : 1;
}
