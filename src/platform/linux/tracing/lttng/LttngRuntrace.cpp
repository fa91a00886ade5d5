// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/LttngRuntrace.h"

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <optional>
#include <system_error>
#include <unistd.h>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/tracing/lttng/CallLimit.h"
#include "platform/linux/tracing/lttng/CheckSignpost.h"
#include "platform/linux/tracing/lttng/LttngTrace.h"
#include "platform/linux/tracing/lttng/ProbeListReader.h"
#include "platform/linux/tracing/lttng/SessionDaemon.h"
#include "platform/linux/tracing/lttng/TraceDirectory.h"
#include "tonewerk/signpost.h"
#include "values/Mutex.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kEndTimeout{15};
constexpr char kSharedMemory[] = "/dev/shm";

// The tracer shares memory with programs there. Without it, everything seems to work but no events are
// recorded.
std::string checkSharedMemory() {
  std::string name = std::string(kSharedMemory) + "/tonewerk-XXXXXX";
  const int file = ::mkstemp(name.data());
  if (file < 0) {
    return "shared memory (" + std::string(kSharedMemory) +
           ") cannot be written: " + std::generic_category().message(errno);
  }
  ::close(file);
  ::unlink(name.c_str());
  return {};
}

void passCheckSignpost() { const signpost::Interval interval(kCheckSignpost); }

}  // namespace

// One trace from its start to its end, and the delegate that gets its results.
class LttngRuntrace::TraceRun {
 public:
  explicit TraceRun(RuntraceConfiguration wanted) : configuration(std::move(wanted)) {}

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) {
    const RecursiveMutexLock lock(mutex_);
    delegate_ = std::move(delegate);
  }
  // Calls the delegate under the lock, so that setDelegate() waits for the call to end. The delegate may call
  // setDelegate() itself, because the mutex is recursive.
  template <typename Call>
  void callDelegate(Call call) {
    const RecursiveMutexLock lock(mutex_);
    if (const auto delegate = delegate_.lock()) call(*delegate);
  }

  const RuntraceConfiguration configuration;
  std::atomic<bool> isValid = true;

  // Used on the control thread only.
  std::optional<LttngTrace> trace;  // none unless it is running
  std::shared_ptr<TraceDirectory> directory;

 private:
  RecursiveMutex mutex_;
  std::weak_ptr<RuntraceSessionDelegate> delegate_ GUARDED_BY(mutex_);
};

// Does the work of the control thread.
class LttngRuntrace::Control {
 public:
  explicit Control(const TracingParts& parts)
      : parts_(parts), daemon_(parts.directory + "/session-daemon.log", parts.log) {}

  void prepare() { TraceDirectory::removeLeftovers(parts_.directory); }
  void end() { daemon_.end(); }

  void start(TraceRun& run) {
    const std::string problem = begin(run);
    if (!problem.empty()) run.isValid = false;
    run.callDelegate([&](RuntraceSessionDelegate& delegate) { delegate.runtraceDidStart(errorOf(problem)); });
  }

  void stop(TraceRun& run) {
    if (!run.trace) return;
    passCheckSignpost();
    std::string problem = run.trace->stop();
    run.callDelegate([&](RuntraceSessionDelegate& delegate) { delegate.runtraceDidStop(errorOf(problem)); });
    const std::string problemAtTheEnd = run.trace->destroy();
    if (problem.empty()) problem = problemAtTheEnd;
    complete(run, problem);
  }

  void abandon(TraceRun& run) {
    if (!run.trace) return;
    --runningTraces_;
    run.isValid = false;
    run.trace.reset();
    run.directory.reset();
  }

 private:
  static RuntraceError errorOf(const std::string& problem) {
    return problem.empty() ? RuntraceError() : problem;
  }

  [[nodiscard]] std::string begin(TraceRun& run) {
    const WantedSignposts wanted =
        readWantedSignposts(run.configuration.probeListPath, parts_.files, parts_.json);
    if (!wanted.problem.empty()) return wanted.problem;
    std::string problem = checkSharedMemory();
    if (!problem.empty()) return problem;
    if (const char* reason = signpost::load(parts_.signpostLibrary.c_str())) {
      return std::string("the signpost library cannot be loaded: ") + reason;
    }
    problem = startTrace(run, wanted.names);
    // A private session daemon whose writer process has died cannot trace any more. That is only noticed
    // here.
    if (!problem.empty() && daemon_.isPrivate() && runningTraces_ == 0) {
      errorLog(parts_.log, "starting the tracer's session daemon again: %@", problem);
      daemon_.end();
      problem = startTrace(run, wanted.names);
    }
    if (problem.empty()) passCheckSignpost();
    return problem;
  }

  [[nodiscard]] std::string startTrace(TraceRun& run, std::set<std::string> signposts) {
    std::error_code error;
    const std::string name = "tonewerk-" + std::to_string(::getpid()) + "-" + std::to_string(++count_);
    run.directory = TraceDirectory::make(parts_.directory, name, error);
    if (run.directory == nullptr) return "no directory for the trace: " + error.message();
    std::string problem = ensureDaemon();
    if (problem.empty()) problem = LttngTrace::checkThisProcessIsSeen(daemon_, parts_.timers);
    if (problem.empty()) {
      signposts.insert(kCheckSignpost);
      run.trace.emplace(name, run.directory->path(), daemon_, parts_.timers);
      problem = run.trace->start(signposts);
    }
    if (problem.empty()) {
      ++runningTraces_;
    } else {
      run.trace.reset();
      run.directory.reset();
    }
    return problem;
  }

  [[nodiscard]] std::string ensureDaemon() {
    const CallLimit limit(daemon_, parts_.timers);
    return daemon_.ensureRunning();
  }

  void complete(TraceRun& run, const std::string& problem) {
    --runningTraces_;
    run.isValid = false;
    run.trace.reset();
    const std::shared_ptr<TraceDirectory> directory = std::move(run.directory);
    run.callDelegate([&](RuntraceSessionDelegate& delegate) {
      if (problem.empty()) {
        delegate.runtraceDidComplete(directory->path(), directory, std::nullopt);
      } else {
        delegate.runtraceDidComplete({}, nullptr, problem);
      }
    });
  }

  const TracingParts parts_;
  SessionDaemon daemon_;
  std::uint64_t count_ = 0;
  int runningTraces_ = 0;
};

class LttngRuntrace::Session final : public RuntraceSession {
 public:
  Session(std::shared_ptr<Control> control, std::shared_ptr<AbandonableThread::Queue> queue,
          const RuntraceConfiguration& configuration)
      : control_(std::move(control)),
        queue_(std::move(queue)),
        run_(std::make_shared<TraceRun>(configuration)) {}
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  // Abandons a running trace. A stop that was requested before is completed first.
  ~Session() override {
    post([](Control& control, TraceRun& run) { control.abandon(run); });
  }

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) override {
    run_->setDelegate(std::move(delegate));
  }
  void startRuntrace() override {
    if (queue_->busyFor() < kMaxBusy) {
      post([](Control& control, TraceRun& run) { control.start(run); });
      return;
    }
    run_->isValid = false;
    run_->callDelegate([](RuntraceSessionDelegate& delegate) {
      delegate.runtraceDidStart("the session daemon does not answer");
    });
  }
  void stopRuntrace() override {
    post([](Control& control, TraceRun& run) { control.stop(run); });
  }
  bool isValid() const override { return run_->isValid; }

 private:
  template <typename Work>
  void post(Work work) {
    queue_->post([control = control_, run = run_, work] { work(*control, *run); });
  }

  const std::shared_ptr<Control> control_;
  const std::shared_ptr<AbandonableThread::Queue> queue_;
  const std::shared_ptr<TraceRun> run_;
};

LttngRuntrace::LttngRuntrace(const TracingParts& parts)
    : control_(std::make_shared<Control>(parts)), thread_(kEndTimeout) {
  thread_.queue()->post([control = control_] { control->prepare(); });
}

// The session daemon is ended on the thread that started it, because it also ends with that thread.
LttngRuntrace::~LttngRuntrace() {
  thread_.queue()->post([control = control_] { control->end(); });
}

std::shared_ptr<RuntraceSession> LttngRuntrace::makeSession(const RuntraceConfiguration& configuration) {
  return std::make_shared<Session>(control_, thread_.queue(), configuration);
}

}  // namespace tonewerk
