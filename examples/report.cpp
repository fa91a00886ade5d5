// SPDX-License-Identifier: Apache-2.0
// A session with an audio thread: c++ report.cpp $(pkg-config --cflags --libs twreporting) -pthread
#include <chrono>
#include <cstdlib>
#include <functional>
#include <iostream>
#include <thread>
#include <tonewerk/reporting.hpp>

namespace tr = tonewerk::reporting;

// Runs on a real-time thread: the calls do not lock, allocate or wait.
static void play(tr::Sender& sender) {
  for (int cycle = 0; cycle <= 4; ++cycle) {  // the last one stops
    tr::Payload<256> payload;
    payload.put("session_output_running", cycle < 4).put("QMSessionVolume", 0.5);
    payload.put("active_devices", "Speaker").put("cycle", cycle);
    sender.send(tr::Category::kPlayback, tr::Type::kState, payload);
    if (cycle < 4) std::this_thread::sleep_for(std::chrono::milliseconds(250));  // the device plays
  }
}
static tr::Status report() {
  tr::Client client;
  {
    tr::Session session(client);
    tr::Payload<128> names;
    session.setServiceType(tr::Service::kLongFormAudio);
    session.setConfiguration(names.put("HostApplicationDisplayID", "org.example.Report"));
    session.start([](const tr::Answer& end) { std::cout << "stopped: " << tr::text(end.status) << "\n"; });
    tr::Sender sender(session);
    std::thread audio(play, std::ref(sender));
    audio.join();
  }  // the session stops here, and the daemon makes its reports
  return client.flush(std::chrono::seconds(2));
}
int main() {
  const tr::Status status = report();
  std::cout << "report: " << tr::text(status) << std::endl;
  // Shows the report, if this user may read the store.
  const char show[] =
      "for try in 1 2 3 4 5 6 7 8 9; do sleep 1; "
      "twctl events --name '*.Volume.Summary' --limit 1 2>/dev/null | grep org.example.Report && break; done";
  if (status == tr::Status::kOk && std::system(show) != 0) std::cout << "report: twctl shows none\n";
}
