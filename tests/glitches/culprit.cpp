// SPDX-License-Identifier: Apache-2.0
//
// A player or filter that misses its time in a known way, for the question whether a verdict names it.
//
//     tonewerk_culprit [--filter | --alone] [--name NAME] [--log FILE]
//
// Plays silence; with --filter it passes its input on; with --alone it has nothing to do with PipeWire. Links
// nothing. Reads commands from standard input, one a line, and ends with it. The audio thread does these, in
// its next cycle:
//
//     compute MS        computes for MS milliseconds, once
//     compute-each US   computes for US microseconds in each cycle from now on; 0 ends it
//     storage MS        waits MS milliseconds for a page of its memory, which another thread brings late
//     demote N          gives up its real-time policy, for the usual one with niceness N
//     promote           takes the real-time policy that it had
//
// Other threads do these:
//
//     hog MS            computes for MS milliseconds on each processor, at a real-time policy below
//                       PipeWire's; only with --alone
//     load MS           the same with many threads at the usual policy
//
// For each command that is done it writes a line "BEGIN END WHAT" to the log, in monotonic nanoseconds. For
// each cycle that it did not finish within the period it writes "BEGIN END missed AWAKE": the times of the
// cycle's begin, of its own end, and of its waking. So the log tells what was done and what came of it.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <iostream>
#include <linux/userfaultfd.h>
#include <mutex>
#include <pipewire/filter.h>
#include <pipewire/pipewire.h>
#include <pthread.h>
#include <sched.h>
#include <spa/param/audio/format-utils.h>
#include <sstream>
#include <string>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using std::chrono::milliseconds;
using std::chrono::nanoseconds;
using std::chrono::steady_clock;

constexpr int kHogPriority = 50;  // PipeWire's own threads have 88
constexpr int kLoadThreads = 24;  // for each processor

// Every thread of the program may note what it did.
class Record {
 public:
  explicit Record(const char* path) : file_(path == nullptr ? stdout : std::fopen(path, "a")) {}
  void write(steady_clock::time_point begin, const std::string& what) {
    const std::lock_guard lock(mutex_);
    if (file_ == nullptr) return;
    std::fprintf(file_, "%lld %lld %s\n", count(begin), count(steady_clock::now()), what.c_str());
    std::fflush(file_);
  }
  static long long count(steady_clock::time_point time) {
    return static_cast<long long>(nanoseconds(time.time_since_epoch()).count());
  }

 private:
  std::mutex mutex_;
  FILE* file_;
};

void computeFor(nanoseconds time) {
  const auto end = steady_clock::now() + time;
  while (steady_clock::now() < end) {
  }
}

bool setNiceness(int niceness) {
  return ::setpriority(PRIO_PROCESS, static_cast<id_t>(::syscall(SYS_gettid)), niceness) == 0;
}

bool setPolicy(int policy, int priority) {
  sched_param parameter{};
  parameter.sched_priority = priority;
  return ::pthread_setschedparam(::pthread_self(), policy, &parameter) == 0;
}

// Threads on all processors that compute when they are told to.
class Computers {
 public:
  Computers(int threadsOfProcessor, bool isRealTime) {
    const long processors = ::sysconf(_SC_NPROCESSORS_ONLN);
    for (long i = 0; i < processors * threadsOfProcessor; ++i) {
      threads_.emplace_back([this, processor = i % processors, isRealTime] { run(processor, isRealTime); });
    }
  }
  Computers(const Computers&) = delete;
  Computers& operator=(const Computers&) = delete;
  ~Computers() {
    tell([this] { isEnding_ = true; });
    for (std::thread& thread : threads_) thread.join();
  }

  // Waits until all have done it.
  void compute(steady_clock::time_point until) {
    tell([&] {
      until_ = until;
      ++round_;
      working_ = threads_.size();
    });
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [this] { return working_ == 0; });
  }

 private:
  template <typename Change>
  void tell(Change change) {
    const std::lock_guard lock(mutex_);
    change();
    changed_.notify_all();
  }

  void run(long processor, bool isRealTime) {
    cpu_set_t set;
    CPU_ZERO(&set);
    CPU_SET(static_cast<std::size_t>(processor), &set);
    ::pthread_setaffinity_np(::pthread_self(), sizeof set, &set);
    if (isRealTime) setPolicy(SCHED_FIFO, kHogPriority);
    for (int done = 0;;) {
      std::unique_lock lock(mutex_);
      changed_.wait(lock, [&] { return isEnding_ || round_ != done; });
      if (isEnding_) return;
      done = round_;
      const steady_clock::time_point until = until_;
      lock.unlock();
      computeFor(until - steady_clock::now());
      tell([this] { --working_; });
    }
  }

  std::mutex mutex_;
  std::condition_variable changed_;
  steady_clock::time_point until_;
  int round_ = 0;
  std::size_t working_ = 0;
  bool isEnding_ = false;
  std::vector<std::thread> threads_;
};

// One page of memory that is absent until it is touched, and then comes as late as wanted: to the thread that
// touches it, this is a page on slow storage.
class LatePage {
 public:
  LatePage() {
    descriptor_ = static_cast<int>(::syscall(SYS_userfaultfd, O_CLOEXEC));
    uffdio_api api{};
    api.api = UFFD_API;
    if (descriptor_ < 0 || ::ioctl(descriptor_, UFFDIO_API, &api) != 0) return;
    size_ = static_cast<std::size_t>(::sysconf(_SC_PAGESIZE));
    void* const page = ::mmap(nullptr, size_, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (page == MAP_FAILED) return;
    uffdio_register range{};
    range.range.start = reinterpret_cast<std::uintptr_t>(page);
    range.range.len = size_;
    range.mode = UFFDIO_REGISTER_MODE_MISSING;
    if (::ioctl(descriptor_, UFFDIO_REGISTER, &range) != 0) return;
    page_ = static_cast<volatile char*>(page);
    std::thread([this] { serve(); }).detach();
  }

  bool isUsable() const { return page_ != nullptr; }
  // Any thread; one at a time.
  void touch(milliseconds delay) {
    delay_ = delay.count();
    ::madvise(const_cast<char*>(page_), size_, MADV_DONTNEED);
    static_cast<void>(*page_);
  }

 private:
  void serve() const {
    // The delay must not become longer while the machine is busy.
    setPolicy(SCHED_FIFO, 95);
    for (;;) {
      uffd_msg message{};
      if (::read(descriptor_, &message, sizeof message) != sizeof message) return;
      if (message.event != UFFD_EVENT_PAGEFAULT) continue;
      std::this_thread::sleep_for(milliseconds(delay_.load()));
      uffdio_zeropage zero{};
      zero.range.start = message.arg.pagefault.address & ~(static_cast<__u64>(size_) - 1);
      zero.range.len = size_;
      ::ioctl(descriptor_, UFFDIO_ZEROPAGE, &zero);
    }
  }

  int descriptor_ = -1;
  std::size_t size_ = 0;
  volatile char* page_ = nullptr;
  std::atomic<long> delay_{0};
};

enum class Deed { kNone, kCompute, kStorage, kDemote, kPromote };

// What the audio thread shall do next. Written by the thread that reads commands.
struct Orders {
  std::atomic<Deed> deed{Deed::kNone};
  std::atomic<long> milliseconds{0};
  std::atomic<long> eachMicroseconds{0};
};

class Culprit {
 public:
  // Only a program that does nothing else has hogs.
  Culprit(const char* log, bool hasHogs) : record_(log), hogs_(hasHogs ? 1 : 0, true) {}

  Orders orders;

  // In the audio thread, in each cycle.
  void cycle(const spa_io_clock& clock) {
    const auto awake = steady_clock::now();
    if (const long each = orders.eachMicroseconds.load(); each > 0)
      computeFor(std::chrono::microseconds(each));
    if (const Deed deed = orders.deed.exchange(Deed::kNone); deed != Deed::kNone) carryOut(deed);

    const steady_clock::time_point begin{nanoseconds(static_cast<std::int64_t>(clock.nsec))};
    const auto period = std::chrono::duration<double>(static_cast<double>(clock.duration) * clock.rate.num /
                                                      std::max(clock.rate.denom, 1U));
    if (clock.nsec == 0 || steady_clock::now() - begin <= period) return;
    record_.write(begin, "missed " + std::to_string(Record::count(awake)));
  }

  // Holds all processors; waits until the end. The real-time threads live as long as the program: one that
  // lived only as long as its burst could not be found by anybody who looks ten times a second.
  void hold(milliseconds time, bool isRealTime) {
    const auto begin = steady_clock::now();
    if (isRealTime) {
      hogs_.compute(begin + time);
    } else {
      Computers load(kLoadThreads, false);
      load.compute(begin + time);
    }
    record_.write(begin, isRealTime ? "hog" : "load");
  }

  // Until standard input ends.
  void readCommands() {
    std::string line;
    while (std::getline(std::cin, line)) {
      std::istringstream words(line);
      std::string command;
      long time = 0;
      words >> command >> time;
      if (command == "hog") hold(milliseconds(time), true);
      if (command == "load") hold(milliseconds(time), false);
      if (command == "compute-each") orders.eachMicroseconds = time;
      const Deed deed = command == "compute"   ? Deed::kCompute
                        : command == "storage" ? Deed::kStorage
                        : command == "demote"  ? Deed::kDemote
                        : command == "promote" ? Deed::kPromote
                                               : Deed::kNone;
      if (deed == Deed::kNone) continue;
      orders.milliseconds = time;
      orders.deed = deed;
    }
  }

 private:
  void carryOut(Deed deed) {
    const auto begin = steady_clock::now();
    const milliseconds time(orders.milliseconds.load());
    const char* done = "nothing";
    bool isDone = true;
    switch (deed) {
      case Deed::kCompute:
        computeFor(time);
        done = "compute";
        break;
      case Deed::kStorage:
        isDone = page_.isUsable();
        if (isDone) page_.touch(time);
        done = "storage";
        break;
      case Deed::kDemote:
        ::pthread_getschedparam(::pthread_self(), &policy_, &parameter_);
        isDone = setPolicy(SCHED_OTHER, 0) && setNiceness(static_cast<int>(time.count()));
        done = "demote";
        break;
      case Deed::kPromote:
        isDone = setNiceness(0) && setPolicy(policy_, parameter_.sched_priority);
        done = "promote";
        break;
      case Deed::kNone:
        break;
    }
    record_.write(begin, isDone ? done : std::string("cannot ") + done);
  }

  Record record_;
  LatePage page_;
  Computers hogs_;
  int policy_ = SCHED_OTHER;  // before "demote"
  sched_param parameter_{};
};

struct Node {
  Culprit* culprit;
  pw_filter* filter;
  void* inputs[2];
  void* outputs[2];
};

void process(void* data, spa_io_position* position) {
  auto& node = *static_cast<Node*>(data);
  const auto frames = static_cast<std::uint32_t>(position->clock.duration);
  for (int channel = 0; channel < 2; ++channel) {
    const auto* in = node.inputs[channel] == nullptr
                         ? nullptr
                         : static_cast<const float*>(pw_filter_get_dsp_buffer(node.inputs[channel], frames));
    auto* out = static_cast<float*>(pw_filter_get_dsp_buffer(node.outputs[channel], frames));
    if (out == nullptr) continue;
    if (in == nullptr) {
      std::memset(out, 0, frames * sizeof(float));
    } else {
      std::memcpy(out, in, frames * sizeof(float));
    }
  }
  node.culprit->cycle(position->clock);
}

void* addPort(pw_filter* filter, bool isInput, int channel) {
  const std::string name = std::string(isInput ? "input_" : "output_") + (channel == 0 ? "FL" : "FR");
  return pw_filter_add_port(
      filter, isInput ? PW_DIRECTION_INPUT : PW_DIRECTION_OUTPUT, PW_FILTER_PORT_FLAG_MAP_BUFFERS, 0,
      pw_properties_new(PW_KEY_FORMAT_DSP, "32 bit float mono audio", PW_KEY_PORT_NAME, name.c_str(),
                        PW_KEY_AUDIO_CHANNEL, channel == 0 ? "FL" : "FR", nullptr),
      nullptr, 0);
}

}  // namespace

int main(int argc, char** argv) {
  const char* name = "culprit";
  const char* log = nullptr;
  bool isFilter = false;
  bool isAlone = false;
  for (int i = 1; i < argc; ++i) {
    const std::string argument = argv[i];
    if (argument == "--filter") isFilter = true;
    if (argument == "--alone") isAlone = true;
    if (argument == "--name" && i + 1 < argc) name = argv[++i];
    if (argument == "--log" && i + 1 < argc) log = argv[++i];
  }
  ::prctl(PR_SET_NAME, name);
  Culprit culprit(log, isAlone);
  if (isAlone) {
    culprit.readCommands();
    return 0;
  }
  pw_init(&argc, &argv);
  pw_main_loop* const loop = pw_main_loop_new(nullptr);
  static const pw_filter_events kEvents = [] {
    pw_filter_events events{};
    events.version = PW_VERSION_FILTER_EVENTS;
    events.process = process;
    return events;
  }();
  Node node{&culprit, nullptr, {}, {}};
  node.filter = pw_filter_new_simple(
      pw_main_loop_get_loop(loop), name,
      pw_properties_new(PW_KEY_MEDIA_TYPE, "Audio", PW_KEY_MEDIA_CATEGORY, isFilter ? "Filter" : "Playback",
                        PW_KEY_MEDIA_CLASS, isFilter ? "Audio/Filter" : "Stream/Output/Audio",
                        PW_KEY_MEDIA_ROLE, "Music", PW_KEY_NODE_NAME, name, PW_KEY_APP_NAME, name,
                        PW_KEY_APP_ID, name, PW_KEY_NODE_AUTOCONNECT, "false", PW_KEY_NODE_ALWAYS_PROCESS,
                        "false", nullptr),
      &kEvents, &node);
  for (int channel = 0; channel < 2; ++channel) {
    if (isFilter) node.inputs[channel] = addPort(node.filter, true, channel);
    node.outputs[channel] = addPort(node.filter, false, channel);
  }
  if (pw_filter_connect(node.filter, PW_FILTER_FLAG_RT_PROCESS, nullptr, 0) < 0) return 1;
  std::thread([&] {
    culprit.readCommands();
    pw_main_loop_quit(loop);
  }).detach();
  pw_main_loop_run(loop);
  pw_filter_destroy(node.filter);
  pw_main_loop_destroy(loop);
  pw_deinit();
  return 0;
}
