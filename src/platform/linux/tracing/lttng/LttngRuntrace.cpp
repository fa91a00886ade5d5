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

constexpr std::chrono::seconds kPatienceAtTheEnd{15};
constexpr char kSharedMemory[] = "/dev/shm";

// Programs and writers share memory there; without it everything seems to work and no event arrives.
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

// A trace on its way, and who hears of it.
class LttngRuntrace::Course {
 public:
  explicit Course(RuntraceConfiguration wanted) : configuration(std::move(wanted)) {}

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) {
    const RecursiveMutexLock lock(mutex_);
    delegate_ = std::move(delegate);
  }
  // Under the lock, so that setDelegate() waits for it; it may come from inside.
  template <typename Call>
  void tell(Call call) {
    const RecursiveMutexLock lock(mutex_);
    if (const auto delegate = delegate_.lock()) call(*delegate);
  }

  const RuntraceConfiguration configuration;
  std::atomic<bool> isValid = true;

  // On the control thread.
  std::optional<LttngTrace> trace;  // while it runs
  std::shared_ptr<TraceDirectory> directory;

 private:
  RecursiveMutex mutex_;
  std::weak_ptr<RuntraceSessionDelegate> delegate_ GUARDED_BY(mutex_);
};

// What happens on the control thread.
class LttngRuntrace::Control {
 public:
  explicit Control(const TracingParts& parts)
      : parts_(parts), daemon_(parts.directory + "/session-daemon.log", parts.log) {}

  void prepare() { TraceDirectory::removeLeftovers(parts_.directory); }
  void end() { daemon_.end(); }

  void start(Course& course) {
    const std::string problem = begin(course);
    if (!problem.empty()) course.isValid = false;
    course.tell([&](RuntraceSessionDelegate& delegate) { delegate.runtraceDidStart(errorOf(problem)); });
  }

  void stop(Course& course) {
    if (!course.trace) return;
    passCheckSignpost();
    std::string problem = course.trace->stop();
    course.tell([&](RuntraceSessionDelegate& delegate) { delegate.runtraceDidStop(errorOf(problem)); });
    const std::string problemAtTheEnd = course.trace->destroy();
    if (problem.empty()) problem = problemAtTheEnd;
    complete(course, problem);
  }

  void giveUp(Course& course) {
    if (!course.trace) return;
    --running_;
    course.isValid = false;
    course.trace.reset();
    course.directory.reset();
  }

 private:
  static RuntraceError errorOf(const std::string& problem) {
    return problem.empty() ? RuntraceError() : problem;
  }

  [[nodiscard]] std::string begin(Course& course) {
    const WantedSignposts wanted =
        readWantedSignposts(course.configuration.probeListPath, parts_.files, parts_.json);
    if (!wanted.problem.empty()) return wanted.problem;
    std::string problem = checkSharedMemory();
    if (!problem.empty()) return problem;
    if (const char* reason = signpost::load(parts_.signpostLibrary.c_str())) {
      return std::string("the signpost library cannot be loaded: ") + reason;
    }
    problem = startTrace(course, wanted.names);
    // A private session daemon that has lost its writer is of no use any more, which only shows now.
    if (!problem.empty() && daemon_.isPrivate() && running_ == 0) {
      errorLog(parts_.log, "starting the tracer's session daemon again: %@", problem);
      daemon_.end();
      problem = startTrace(course, wanted.names);
    }
    if (problem.empty()) passCheckSignpost();
    return problem;
  }

  [[nodiscard]] std::string startTrace(Course& course, std::set<std::string> signposts) {
    std::error_code error;
    const std::string name = "tonewerk-" + std::to_string(::getpid()) + "-" + std::to_string(++count_);
    course.directory = TraceDirectory::make(parts_.directory, name, error);
    if (course.directory == nullptr) return "no directory for the trace: " + error.message();
    std::string problem = ensureDaemon();
    if (problem.empty()) problem = LttngTrace::checkThisProcessIsSeen(daemon_, parts_.timers);
    if (problem.empty()) {
      signposts.insert(kCheckSignpost);
      course.trace.emplace(name, course.directory->path(), daemon_, parts_.timers);
      problem = course.trace->start(signposts);
    }
    if (problem.empty()) {
      ++running_;
    } else {
      course.trace.reset();
      course.directory.reset();
    }
    return problem;
  }

  [[nodiscard]] std::string ensureDaemon() {
    const CallLimit limit(daemon_, parts_.timers);
    return daemon_.ensureRunning();
  }

  void complete(Course& course, const std::string& problem) {
    --running_;
    course.isValid = false;
    course.trace.reset();
    const std::shared_ptr<TraceDirectory> directory = std::move(course.directory);
    course.tell([&](RuntraceSessionDelegate& delegate) {
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
  int running_ = 0;  // traces
};

class LttngRuntrace::Session final : public RuntraceSession {
 public:
  Session(std::shared_ptr<Control> control, std::shared_ptr<AbandonableThread::Queue> queue,
          const RuntraceConfiguration& configuration)
      : control_(std::move(control)),
        queue_(std::move(queue)),
        course_(std::make_shared<Course>(configuration)) {}
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  // After a stop that was asked for: the trace has then ended.
  ~Session() override {
    post([](Control& control, Course& course) { control.giveUp(course); });
  }

  void setDelegate(std::weak_ptr<RuntraceSessionDelegate> delegate) override {
    course_->setDelegate(std::move(delegate));
  }
  void startRuntrace() override {
    if (queue_->busyFor() < kMaxBusy) {
      post([](Control& control, Course& course) { control.start(course); });
      return;
    }
    course_->isValid = false;
    course_->tell([](RuntraceSessionDelegate& delegate) {
      delegate.runtraceDidStart("the session daemon does not answer");
    });
  }
  void stopRuntrace() override {
    post([](Control& control, Course& course) { control.stop(course); });
  }
  bool isValid() const override { return course_->isValid; }

 private:
  template <typename Work>
  void post(Work work) {
    queue_->post([control = control_, course = course_, work] { work(*control, *course); });
  }

  const std::shared_ptr<Control> control_;
  const std::shared_ptr<AbandonableThread::Queue> queue_;
  const std::shared_ptr<Course> course_;
};

LttngRuntrace::LttngRuntrace(const TracingParts& parts)
    : control_(std::make_shared<Control>(parts)), thread_(kPatienceAtTheEnd) {
  thread_.queue()->post([control = control_] { control->prepare(); });
}

// On the thread that started it, because it ends with that.
LttngRuntrace::~LttngRuntrace() {
  thread_.queue()->post([control = control_] { control->end(); });
}

std::shared_ptr<RuntraceSession> LttngRuntrace::makeSession(const RuntraceConfiguration& configuration) {
  return std::make_shared<Session>(control_, thread_.queue(), configuration);
}

}  // namespace tonewerk
