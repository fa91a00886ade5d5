/* SPDX-License-Identifier: Apache-2.0 */
/* Compiled as C11, as C++98 and as C++20: includes the C interface as programs do, and uses all of it. */
/* NOLINTBEGIN(modernize-*) */
#include <tonewerk/reporting.h>
#include <tonewerk/reporting_audio.h>

static void on_reply(void* context, const twr_answer* answer) {
  if (answer->status == TWR_REFUSED) *(int64_t*)context = answer->error_code;
}

int tonewerk_c_header(void);

int tonewerk_c_header(void) {
  unsigned char memory[64];
  int64_t code = 0;
  twr_client_options options = {sizeof(twr_client_options), NULL, 0, TWR_CLIENT_ONCE, NULL, NULL};
  twr_payload payload;
  twr_client* client = twr_client_create(&options);
  twr_session* session = twr_session_create(client, TWR_NEW_ID);
  twr_sender* sender = twr_sender_open(session, TWR_DEFAULT_RING_BYTES);
  twr_payload_init(&payload, memory, sizeof memory);
  twr_put_double(&payload, "level", 0.5);
  twr_sender_send(sender, TWR_CATEGORY_IO | TWR_DOMAIN_HAL, TWR_TYPE_STATE, &payload);
  twr_session_start(session, on_reply, &code);
  {
    twr_overload overload = {sizeof(twr_overload), "mixer", 0.25, 512, 7};
    twr_session_device(session, "Speaker");
    twr_sender_playing(sender, 0.5);
    twr_sender_overload(sender, &overload);
    twr_sender_playing_stopped(sender);
  }
  twr_sender_close(sender);
  twr_session_destroy(session, NULL, NULL);
  twr_client_destroy(client, 1000);
  return (int)code;
}
/* NOLINTEND(modernize-*) */
