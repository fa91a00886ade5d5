// SPDX-License-Identifier: Apache-2.0
// A session with an audio thread: c++ report.cpp $(pkg-config --cflags --libs twreporting) -pthread
#include <chrono>
#include <cstdio>
#include <functional>
#include <thread>
#include <tonewerk/reporting.hpp>

namespace tr = tonewerk::reporting;

// A real-time thread: nothing here locks, allocates or calls the system.
static void play(tr::Sender& sender) {
  for (int cycle = 0; cycle < 4; ++cycle) {
    tr::Payload<128> payload;
    payload.put("cycle", cycle).put("load", 0.25 * cycle);
    sender.send(tr::Category::kPerformance, tr::Type::kState, payload);
  }
}
int main() {
  tr::Client client;
  {
    tr::Session session(client);
    session.setServiceType(tr::Service::kLongFormAudio);
    session.start([](const tr::Answer& stopped) { std::printf("stopped: %s\n", tr::text(stopped.status)); });
    tr::Sender sender(session);
    std::thread audio(play, std::ref(sender));
    audio.join();
  }  // the session stops here, and the daemon makes its reports
  std::printf("report: %s\n", tr::text(client.flush(std::chrono::seconds(2))));
}
