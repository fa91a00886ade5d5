// SPDX-License-Identifier: Apache-2.0
//
// Runs a real-time thread that sends while all forbidden actions are trapped. Prints "taken N dropped N" and
// ends with status 0 when nothing was trapped, otherwise prints "trapped WHAT" and ends with 1. Ends with 3
// when the kernel does not allow system calls to be trapped.
//
//   trapped_sender ACTION [without-system-calls]
//
// ACTION is "send", "say" (which says what the audio does), or a forbidden action, which the thread does
// once between messages.

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <map>
#include <mutex>
#include <new>
#include <optional>
#include <pthread.h>
#include <semaphore.h>
#include <shared_mutex>
#include <string>
#include <sys/socket.h>
#include <thread>
#include <tuple>
#include <unistd.h>

#include "client/programs/traps.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "tonewerk/reporting.h"
#include "tonewerk/reporting_audio.h"

namespace {

constexpr std::uint32_t kMessages = 100'000;
constexpr std::size_t kRingBytes = 4096;  // is full long before the background thread reads it again
constexpr std::uint32_t kCycles = 1000;
constexpr std::uint32_t kMessagesOfACycle = 10;
constexpr int kPatienceMs = 30'000;

// Exit statuses.
constexpr int kTrapped = 1;
constexpr int kCannot = 2;
constexpr int kNotPermitted = 3;
constexpr int kMiscounted = 4;

// Keeps compilers from removing an allocation whose result is not used.
void* volatile allocatedMemory = nullptr;

// The actions that the traps must catch.
const std::map<std::string, std::function<void()>>& forbiddenActions() {
  static void* const memory = std::malloc(16);
  static std::mutex mutex;
  static std::shared_mutex sharedMutex;
  static pthread_spinlock_t spinLock;
  static pthread_cond_t condition = PTHREAD_COND_INITIALIZER;
  static sem_t semaphore;
  pthread_spin_init(&spinLock, PTHREAD_PROCESS_PRIVATE);
  sem_init(&semaphore, 0, 1);
  static const std::map<std::string, std::function<void()>> all = {
      {"send", [] {}},
      {"say", [] {}},
      {"malloc", [] { allocatedMemory = std::malloc(16); }},
      {"calloc", [] { allocatedMemory = std::calloc(1, 16); }},
      {"realloc", [] { allocatedMemory = std::realloc(memory, 32); }},
      {"free", [] { std::free(memory); }},
      {"aligned_alloc", [] { allocatedMemory = std::aligned_alloc(64, 64); }},
      {"new", [] { allocatedMemory = ::operator new(16); }},
      {"delete", [] { ::operator delete(memory); }},
      {"mutex", [] { mutex.lock(); }},
      {"rwlock", [] { sharedMutex.lock_shared(); }},
      {"spin", [] { pthread_spin_lock(&spinLock); }},
      {"cond", [] { pthread_cond_signal(&condition); }},
      {"sem", [] { sem_post(&semaphore); }},
      {"getppid", [] { std::ignore = ::getppid(); }},
  };
  return all;
}

// Reads and drops the client's bytes until the client closes the connection.
class Reader {
 public:
  explicit Reader(const std::string& path) : listener_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const std::optional<sockaddr_un> address = tonewerk::unixAddressOf(path);
    isListening_ = address && ::bind(listener_.get(), tonewerk::generic(*address), sizeof(*address)) == 0 &&
                   ::listen(listener_.get(), 1) == 0;
    if (isListening_) thread_ = std::thread([this] { read(); });
  }
  ~Reader() {
    if (thread_.joinable()) thread_.join();
  }

  bool isListening() const { return isListening_; }

 private:
  void read() const {
    const tonewerk::FileDescriptor client(::accept(listener_.get(), nullptr, nullptr));
    std::array<char, 65536> bytes;
    while (::recv(client.get(), bytes.data(), bytes.size(), 0) > 0) {
    }
  }

  const tonewerk::FileDescriptor listener_;
  bool isListening_ = false;
  std::thread thread_;
};

struct Run {
  twr_sender* sender = nullptr;
  const std::function<void()>* forbiddenAction = nullptr;
  bool says = false;
  bool forbidsSystemCalls = true;
  int problem = 0;  // the errno when they cannot be forbidden
  std::uint64_t sent = 0;
  std::uint64_t dropped = 0;
};

// Calls every function that builds a payload, and sends it. One of them fails for every 1000th payload.
void sendOne(Run& run, std::uint32_t number) {
  unsigned char memory[256];
  twr_payload payload;
  twr_payload_init(&payload, memory, sizeof memory);
  twr_put_uint(&payload, "number", number);
  twr_put_int(&payload, "offset", -5);
  twr_put_bool(&payload, "running", 1);
  twr_put_double(&payload, "level", 0.5 + number);
  twr_put_date(&payload, "at", 1763633999.25 + number);
  twr_put_text(&payload, "device", "Kopfh\xC3\xB6rer");
  twr_open_map(&payload, "inner");
  twr_open_list(&payload, "list");
  twr_put_text_n(&payload, nullptr, "abcdef", 3);
  twr_close(&payload);
  twr_close(&payload);
  if (number % 1000 == 0) twr_put_text(&payload, "bad", "\xFF");
  if (twr_sender_send(run.sender, TWR_CATEGORY_IO, TWR_TYPE_STATE, &payload) == TWR_OK) {
    ++run.sent;
  } else {
    ++run.dropped;
  }
}

// Calls every function that says what the audio does. The ring has room for all messages.
void sayAll(Run& run) {
  const auto note = [&](twr_status status, std::uint64_t messages = 1) {
    (status == TWR_OK ? run.sent : run.dropped) += messages;
  };
  twr_overload overload{};
  overload.size = sizeof(overload);
  overload.node = "mixer";
  overload.silence_seconds = 0.5;
  overload.buffer_frames = 512;
  for (overload.io_cycle = 1; overload.io_cycle <= kCycles; ++overload.io_cycle) {
    note(twr_sender_device(run.sender, "Speaker"));
    note(twr_sender_route(run.sender, "Kopfh\xC3\xB6rer", "plugged"));
    note(twr_sender_format(run.sender, 48000, 2, "lpcm"));
    note(twr_sender_playing(run.sender, 0.5), 2);
    note(twr_sender_recording(run.sender));
    note(twr_sender_volume(run.sender, 0.25));
    note(twr_sender_overload(run.sender, &overload));
    note(twr_sender_playing_stopped(run.sender));
    note(twr_sender_recording_stopped(run.sender));
  }
}

void sendEach(Run& run) {
  for (std::uint32_t number = 0; number < kMessages; ++number) {
    if (number == kMessages / 2) (*run.forbiddenAction)();
    sendOne(run, number);
  }
}

void* sendAll(void* given) {
  Run& run = *static_cast<Run*>(given);
  if (run.forbidsSystemCalls) run.problem = traps_forbid_system_calls();
  if (run.problem == 0) {
    traps_begin();
    if (run.says) {
      sayAll(run);
    } else {
      sendEach(run);
    }
    traps_end();
  }
  traps_exit();
  return nullptr;
}

// The action that was trapped; none when there was none.
std::string trapped() {
  if (traps_function() != nullptr) return traps_function();
  if (traps_system_call() >= 0) return "system call " + std::to_string(traps_system_call());
  return {};
}

// True when every message that was taken was sent, and every loss is counted.
bool isAccountedFor(const Run& run, twr_client* client) {
  twr_client_info info{};
  info.size = sizeof(info);
  if (twr_client_flush(client, kPatienceMs) != TWR_OK || twr_client_get_info(client, &info) != TWR_OK) {
    return false;
  }
  // One more message may report losses that no later message has reported.
  const bool isSent = info.messages_sent == run.sent || info.messages_sent == run.sent + 1;
  const std::uint64_t messages = run.says ? std::uint64_t{kCycles} * kMessagesOfACycle : kMessages;
  return isSent && info.messages_dropped == run.dropped && run.sent + run.dropped == messages;
}

int report(const Run& run, twr_client* client) {
  if (run.problem != 0) {
    std::printf("%s\n", std::strerror(run.problem));
    return kNotPermitted;
  }
  if (const std::string what = trapped(); !what.empty()) {
    std::printf("trapped %s\n", what.c_str());
    return kTrapped;
  }
  std::printf("taken %llu dropped %llu\n", static_cast<unsigned long long>(run.sent),
              static_cast<unsigned long long>(run.dropped));
  return isAccountedFor(run, client) ? 0 : kMiscounted;
}

int runAll(Run& run, const std::string& socketPath) {
  const Reader reader(socketPath);
  twr_client_options options{};
  options.size = sizeof(options);
  options.socket_path = socketPath.c_str();
  twr_client* client = twr_client_create(&options);
  twr_session* session = twr_session_create(client, TWR_NEW_ID);
  run.sender = twr_sender_open(session, run.says ? TWR_MOST_RING_BYTES : kRingBytes);
  pthread_t thread{};
  if (!reader.isListening() || twr_client_connect(client, kPatienceMs) != TWR_OK || run.sender == nullptr ||
      pthread_create(&thread, nullptr, sendAll, &run) != 0) {
    std::_Exit(kCannot);
  }
  pthread_join(thread, nullptr);
  twr_sender_close(run.sender);
  const int status = report(run, client);
  twr_client_destroy(client, kPatienceMs);
  return status;
}

}  // namespace

int main(int count, char** arguments) {
  const auto& all = forbiddenActions();
  const auto chosen = count > 2 ? all.find(arguments[2]) : all.end();
  if (chosen == all.end()) return kCannot;
  Run run;
  run.forbiddenAction = &chosen->second;
  run.says = chosen->first == "say";
  run.forbidsSystemCalls = count == 3;
  traps_prepare();
  return runAll(run, arguments[1]);
}
