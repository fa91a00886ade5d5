// SPDX-License-Identifier: Apache-2.0
//
// An audio program with signposts. Each of THREADS threads has INTERVALS intervals "decode", each around one
// interval "mix". For every interval the program prints its own measurement in nanoseconds: "decode LEAST
// MOST".
//
//   signpost_program [THREADS [INTERVALS]]

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>
#include <vector>

#include "tonewerk/signpost.h"

namespace {

struct Measured {
  const char* name;
  long long least;  // from the end of begin() to the start of end()
  long long most;   // from the start of begin() to the end of end()
};

long long now() {
  return std::chrono::duration_cast<std::chrono::nanoseconds>(
             std::chrono::steady_clock::now().time_since_epoch())
      .count();
}

// Runs `work` in an interval.
template <typename Work>
Measured measure(const char* name, std::uint64_t identifier, Work work) {
  const long long before = now();
  tonewerk::signpost::begin(name, identifier);
  const long long begun = now();
  work();
  const long long ending = now();
  tonewerk::signpost::end(name, identifier);
  return {name, ending - begun, now() - before};
}

void busyFor(long long nanoseconds) {
  const long long end = now() + nanoseconds;
  while (now() < end) {
  }
}

void run(int intervals, std::vector<Measured>& measured) {
  for (int i = 0; i < intervals; ++i) {
    const auto identifier = static_cast<std::uint64_t>(i);
    measured.push_back(measure("decode", identifier, [&] {
      measured.push_back(measure("mix", identifier, [i] { busyFor(1000LL * (i % 50)); }));
      busyFor(1000LL * (i % 7));
    }));
  }
}

}  // namespace

int main(int argc, char** argv) {
  const int threads = argc > 1 ? std::atoi(argv[1]) : 2;
  const int intervals = argc > 2 ? std::atoi(argv[2]) : 250;
  std::vector<std::vector<Measured>> measured(static_cast<std::size_t>(threads));
  std::vector<std::thread> running;
  for (auto& own : measured) running.emplace_back([&own, intervals] { run(intervals, own); });
  for (std::thread& thread : running) thread.join();
  for (const auto& own : measured) {
    for (const Measured& interval : own) {
      std::printf("%s %lld %lld\n", interval.name, interval.least, interval.most);
    }
  }
}
