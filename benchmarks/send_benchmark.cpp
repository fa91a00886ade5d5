// SPDX-License-Identifier: Apache-2.0
//
// Measures the cost of a message for the thread that sends it: through a sender's ring, by a write to a
// socket, and by the systemd journal's client library, alternately.
//
//   send_benchmark [MESSAGES]     default: 200,000

#include <array>
#include <cinttypes>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <string>
#include <sys/socket.h>
#include <systemd/sd-journal.h>
#include <unistd.h>

#include "JournalSocket.h"
#include "Latencies.h"
#include "SocketDrain.h"
#include "client/MessageFrame.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "support/TemporaryDirectory.h"
#include "tonewerk/reporting.h"

namespace tonewerk {
namespace {

constexpr std::size_t kDefaultMessages = 200'000;
constexpr std::size_t kWarmUp = 2'000;
// A running journal keeps its messages, so it gets only one for every 20 measured messages.
constexpr std::size_t kJournalShare = 20;
constexpr int kTimeoutMs = 10'000;
constexpr double kTime = 1763633999.25;

constexpr std::int64_t kMaxMedian = 100;
constexpr std::int64_t kMax999 = 1'000;

// Builds a message that describes a playing stream.
void build(twr_payload& payload, unsigned char* memory, std::size_t size, std::int64_t position) {
  twr_payload_init(&payload, memory, size);
  twr_put_bool(&payload, "session_output_running", 1);
  twr_put_text(&payload, "session_selected_format", "48000 Hz, 2 ch, Float32, interleaved");
  twr_put_text(&payload, "active_devices", "Speaker");
  twr_put_text(&payload, "mFormatID", "lpcm");
  twr_put_int(&payload, "mChannelsPerFrame", 2);
  twr_put_double(&payload, "QMSessionVolume", 0.4375);
  twr_put_double(&payload, "load", 0.25);
  twr_put_int(&payload, "position", position);
}

void sendToJournal(std::int64_t position) {
  sd_journal_send("MESSAGE=playback", "PRIORITY=7", "SESSION_OUTPUT_RUNNING=1",
                  "SESSION_SELECTED_FORMAT=48000 Hz, 2 ch, Float32, interleaved", "ACTIVE_DEVICES=Speaker",
                  "MFORMATID=lpcm", "MCHANNELSPERFRAME=%d", 2, "QMSESSIONVOLUME=%g", 0.4375, "LOAD=%g", 0.25,
                  "POSITION=%" PRId64, position, nullptr);
}

struct Table {
  explicit Table(std::size_t messages)
      : clock(messages), send(messages), buildAndSend(messages), socket(messages), journal(messages) {}

  Latencies clock;
  Latencies send;
  Latencies buildAndSend;
  Latencies socket;
  Latencies journal;
};

void printRow(const char* name, Latencies& latencies) {
  latencies.sort();
  std::printf("| %s | %zu |", name, latencies.count());
  for (const double share : {0.5, 0.9, 0.99, 0.999, 0.9999}) {
    std::printf(" %" PRId64 " |", latencies.within(share));
  }
  std::printf(" %" PRId64 " |\n", latencies.within(1));
}

void printVerdict(const char* aim, bool isMet) {
  std::printf("%s: %s\n", aim, isMet ? "met" : "NOT met in this run");
}

bool isNeverMore(const Latencies& ours, const Latencies& theirs) {
  bool isNever = true;
  for (const double share : {0.5, 0.9, 0.99, 0.999, 0.9999}) {
    isNever = isNever && ours.within(share) <= theirs.within(share);
  }
  return isNever;
}

class SendBenchmark {
 public:
  ~SendBenchmark() {
    twr_sender_close(sender_);
    twr_session_destroy(session_, nullptr, nullptr);
    twr_client_destroy(client_, kTimeoutMs);
  }

  bool open(const std::string& socketPath) {
    twr_client_options options{};
    options.size = sizeof(options);
    options.socket_path = socketPath.c_str();
    options.queue_bytes = std::size_t{64} << 20;
    client_ = twr_client_create(&options);
    session_ = twr_session_create(client_, TWR_NEW_ID);
    sender_ = twr_sender_open(session_, TWR_MOST_RING_BYTES);
    const std::optional<sockaddr_un> address = unixAddressOf(socketPath);
    socket_.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    return sender_ != nullptr && twr_client_connect(client_, kTimeoutMs) == TWR_OK && address &&
           ::connect(socket_.get(), generic(*address), sizeof(*address)) == 0;
  }

  void run(Table& table, std::size_t messages, std::size_t journalEvery) {
    std::array<unsigned char, 512> memory{};
    twr_payload payload;
    std::string frame;
    const std::int64_t id = twr_session_id(session_);
    for (std::size_t number = 0; number < messages; ++number) {
      const auto position = static_cast<std::int64_t>(number);
      build(payload, memory.data(), memory.size(), position);
      frame.clear();
      appendMessageFrame(
          frame, std::nullopt,
          {TWR_CATEGORY_PLAYBACK, TWR_TYPE_GENERIC, kTime, 0, payload.entries, {payload.bytes, payload.size}},
          0, {&id, 1});
      // Each measured call of the sender follows other work, which leaves little of its data in the caches.
      // This is as in an audio callback, which does other work before.
      table.clock.measure([] {});
      table.socket.measure([&] { ::send(socket_.get(), frame.data(), frame.size(), MSG_NOSIGNAL); });
      table.send.measure(
          [&] { twr_sender_send(sender_, TWR_CATEGORY_PLAYBACK, TWR_TYPE_GENERIC, &payload); });
      if (journalEvery > 0 && number % journalEvery == 0)
        table.journal.measure([&] { sendToJournal(position); });
      table.buildAndSend.measure([&] {
        build(payload, memory.data(), memory.size(), position);
        twr_sender_send(sender_, TWR_CATEGORY_PLAYBACK, TWR_TYPE_GENERIC, &payload);
      });
    }
    frameBytes_ = frame.size();
  }

  std::size_t frameBytes() const { return frameBytes_; }
  std::uint64_t dropped() const { return twr_sender_dropped(sender_); }

 private:
  twr_client* client_ = nullptr;
  twr_session* session_ = nullptr;
  twr_sender* sender_ = nullptr;
  FileDescriptor socket_;
  std::size_t frameBytes_ = 0;
};

const char* nameOf(JournalSocket::Kind kind) {
  return kind == JournalSocket::Kind::kReal ? "sd_journal_send() to the running journal"
                                            : "sd_journal_send() to a socket that is read and thrown away";
}

int runAll(std::size_t messages) {
  std::string problem;
  const JournalSocket::Kind journal = JournalSocket::prepare(problem);
  const bool hasOwnJournal = journal == JournalSocket::Kind::kOwn;
  const TemporaryDirectory directory;
  const std::string path = directory.path("sink.sock");
  const SocketDrain drain(path, hasOwnJournal ? JournalSocket::kPath : "");
  SendBenchmark benchmark;
  if (!drain.isRunning() || !benchmark.open(path)) {
    std::fprintf(stderr, "send_benchmark: the sink does not answer\n");
    return 1;
  }
  const std::size_t every = hasOwnJournal ? 1 : journal == JournalSocket::Kind::kReal ? kJournalShare : 0;

  Table warmUp(kWarmUp);
  benchmark.run(warmUp, kWarmUp, every);
  Table table(messages);
  benchmark.run(table, messages, every);

  std::array<double, 1> load{};
  ::getloadavg(load.data(), 1);
  std::printf(
      "Nanoseconds a call, the clock's own included; a message of 8 entries, %zu bytes; load %.1f\n\n",
      benchmark.frameBytes(), load[0]);
  std::printf(
      "| | calls | median | 90 %% | 99 %% | 99.9 %% | 99.99 %% | most "
      "|\n|---|--:|--:|--:|--:|--:|--:|--:|\n");
  printRow("the clock alone", table.clock);
  printRow("twr_sender_send()", table.send);
  printRow("building the payload and twr_sender_send()", table.buildAndSend);
  printRow("send() of the same message to a socket", table.socket);
  if (every > 0) {
    printRow(nameOf(journal), table.journal);
  } else {
    std::printf("\nNo journal to compare with (%s).\n", problem.c_str());
  }
  std::printf("\n");
  printVerdict("median at most 100 ns", table.send.within(0.5) <= kMaxMedian);
  printVerdict("99.9th percentile at most 1 us", table.send.within(0.999) <= kMax999);
  printVerdict("at no percentile more than the socket", isNeverMore(table.send, table.socket));
  if (benchmark.dropped() == 0) return 0;
  std::fprintf(stderr, "send_benchmark: %" PRIu64 " messages found the ring full; these are no sends\n",
               benchmark.dropped());
  return 1;
}

}  // namespace
}  // namespace tonewerk

int main(int count, char** arguments) {
  const long given = count > 1 ? std::atol(arguments[1]) : 0;
  return tonewerk::runAll(given > 0 ? static_cast<std::size_t>(given) : tonewerk::kDefaultMessages);
}
