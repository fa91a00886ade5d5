/* SPDX-License-Identifier: Apache-2.0 */
/* A session with an audio thread: cc report.c $(pkg-config --cflags --libs twreporting) -pthread */
#include <pthread.h>
#include <stdio.h>
#include <tonewerk/reporting.h>

static void* play(void* given) { /* a real-time thread: nothing here locks, allocates or calls the system */
  unsigned char memory[128];
  twr_payload payload;
  for (int cycle = 0; cycle < 4; cycle++) {
    twr_payload_init(&payload, memory, sizeof memory);
    twr_put_int(&payload, "cycle", cycle);
    twr_put_double(&payload, "load", 0.25 * cycle);
    twr_sender_send(given, TWR_CATEGORY_PERFORMANCE, TWR_TYPE_STATE, &payload);
  }
  return NULL;
}
int main(void) {
  twr_client* client = twr_client_create(NULL);
  twr_session* session = twr_session_create(client, TWR_NEW_ID);
  twr_session_set_service_type(session, TWR_SERVICE_LONG_FORM_AUDIO, NULL, NULL);
  twr_session_start(session, NULL, NULL);
  twr_sender* sender = twr_sender_open(session, TWR_DEFAULT_RING_BYTES);
  pthread_t audio;
  if (pthread_create(&audio, NULL, play, sender) == 0) pthread_join(audio, NULL);
  twr_sender_close(sender);
  twr_session_destroy(session, NULL, NULL); /* stops it, and the daemon makes its reports */
  printf("report: %s\n", twr_status_text(twr_client_flush(client, 2000)));
  twr_client_destroy(client, 1000);
}
