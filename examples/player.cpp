// SPDX-License-Identifier: Apache-2.0
// Says what a player does, without a key: c++ player.cpp $(pkg-config --cflags --libs twreporting) -pthread
#include <chrono>
#include <iostream>
#include <thread>
#include <tonewerk/reporting_audio.hpp>

namespace tr = tonewerk::reporting;

static void play() { std::this_thread::sleep_for(std::chrono::milliseconds(750)); }

static tr::Status report() {
  tr::Client client;
  {
    tr::Session session(client);
    session.setServiceType(tr::Service::kLongFormAudio);
    tr::setApplication(session, "org.example.Player");
    session.start();

    tr::reportDevice(session, "Speaker");
    tr::reportFormat(session, 48000, 2, "lpcm");
    tr::Playing playing(session, 0.5);
    play();
    tr::reportOverload(session);  // the device ran out of data
    playing.setVolume(0.3);       // begins another summary
    play();
  }  // it plays no more, the session stops, and the daemon makes its summaries
  return client.flush(std::chrono::seconds(2));
}

int main() { std::cout << "player: " << tr::text(report()) << "\n"; }
