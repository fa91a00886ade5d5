// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/tracing/lttng/LttngTrace.h"

#include <chrono>
#include <cstdlib>
#include <lttng/destruction-handle.h>
#include <lttng/lttng.h>
#include <lttng/session-descriptor.h>
#include <string_view>
#include <thread>
#include <unistd.h>
#include <utility>

#include "platform/linux/tracing/lttng/CallLimit.h"

namespace tonewerk {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using Clock = std::chrono::steady_clock;

constexpr char kChannel[] = "signposts";
constexpr char kEvents[] = "tonewerk:signpost_*";
constexpr char kBeginEvent[] = "tonewerk:signpost_begin";
// The buffers of each processor hold about 60,000 events until the writer process reads them.
constexpr std::uint64_t kSubBufferBytes = std::uint64_t{1} << 20;
constexpr std::uint64_t kSubBuffers = 4;
// The compiled form of a filter must stay below 64 KiB.
constexpr std::size_t kMaxFilterBytes = 8192;
constexpr seconds kDataTimeout{60};
// After a session daemon has died, programs connect to a new one only after a delay.
constexpr seconds kSeenTimeout{8};
constexpr milliseconds kPause{5};

lttng_domain userSpace() {
  lttng_domain domain{};
  domain.type = LTTNG_DOMAIN_UST;
  domain.buf_type = LTTNG_BUFFER_PER_UID;
  return domain;
}

std::string failure(const char* what, int code) {
  return std::string(what) + ": " + lttng_strerror(code < 0 ? code : -code);
}

void copyName(char* field, std::size_t size, const char* name) {
  const std::size_t length = std::string_view(name).copy(field, size - 1);
  field[length] = '\0';
}

using Channel = std::unique_ptr<lttng_channel, decltype(&lttng_channel_destroy)>;
using Event = std::unique_ptr<lttng_event, decltype(&lttng_event_destroy)>;
using Descriptor = std::unique_ptr<lttng_session_descriptor, decltype(&lttng_session_descriptor_destroy)>;
using Destruction = std::unique_ptr<lttng_destruction_handle, decltype(&lttng_destruction_handle_destroy)>;
template <typename T>
using Listed = std::unique_ptr<T, decltype(&std::free)>;

bool hasTracepoint(pid_t process) {
  lttng_domain domain = userSpace();
  const std::unique_ptr<lttng_handle, decltype(&lttng_destroy_handle)> handle(
      lttng_create_handle(nullptr, &domain), &lttng_destroy_handle);
  if (handle == nullptr) return false;
  lttng_event* events = nullptr;
  const int count = lttng_list_tracepoints(handle.get(), &events);
  const Listed<lttng_event> owner(events, &std::free);
  for (int i = 0; i < count; ++i) {
    if (events[i].pid == process && std::string_view(events[i].name) == kBeginEvent) return true;
  }
  return false;
}

}  // namespace

struct LttngTrace::Handle {
  explicit Handle(const std::string& name) {
    lttng_domain domain = userSpace();
    handle.reset(lttng_create_handle(name.c_str(), &domain));
  }
  std::unique_ptr<lttng_handle, decltype(&lttng_destroy_handle)> handle{nullptr, &lttng_destroy_handle};
};

std::vector<std::string> filtersFor(const std::set<std::string>& signposts) {
  std::vector<std::string> filters;
  for (const std::string& signpost : signposts) {
    std::string condition = "name == \"";
    for (const char c : signpost) {
      // An asterisk that is not escaped matches any text.
      if (c == '\\' || c == '*') condition += '\\';
      condition += c;
    }
    condition += '"';
    if (filters.empty() || filters.back().size() + condition.size() > kMaxFilterBytes) {
      filters.push_back(condition);
    } else {
      filters.back() += " || " + condition;
    }
  }
  return filters;
}

LttngTrace::LttngTrace(std::string name, std::string directory, SessionDaemon& daemon, TimerService& timers)
    : name_(std::move(name)), directory_(std::move(directory)), daemon_(daemon), timers_(timers) {}

LttngTrace::~LttngTrace() { static_cast<void>(destroy()); }

template <typename Call>
int LttngTrace::limited(Call call) {
  const CallLimit limit(daemon_, timers_);
  return call();
}

std::string LttngTrace::start(const std::set<std::string>& signposts) {
  std::string problem = createSession();
  if (problem.empty()) problem = configure(signposts);
  if (problem.empty()) {
    const int code = limited([this] { return lttng_start_tracing(name_.c_str()); });
    if (code < 0) problem = failure("the trace cannot be started", code);
  }
  if (!problem.empty()) static_cast<void>(destroy());
  return problem;
}

std::string LttngTrace::createSession() {
  const Descriptor descriptor(lttng_session_descriptor_local_create(name_.c_str(), directory_.c_str()),
                              &lttng_session_descriptor_destroy);
  if (descriptor == nullptr) return "out of memory";
  const int code = limited([&] { return static_cast<int>(lttng_create_session_ext(descriptor.get())); });
  if (code != LTTNG_OK) return failure("the tracing session cannot be made", code);
  handle_ = std::make_unique<Handle>(name_);
  return {};
}

std::string LttngTrace::configure(const std::set<std::string>& signposts) {
  std::string problem = enableChannel();
  if (problem.empty()) problem = enableSignposts(signposts);
  if (problem.empty()) problem = addContexts();
  return problem;
}

std::string LttngTrace::enableChannel() {
  lttng_domain domain = userSpace();
  const Channel channel(lttng_channel_create(&domain), &lttng_channel_destroy);
  if (channel == nullptr) return "out of memory";
  copyName(channel->name, sizeof(channel->name), kChannel);
  channel->attr.overwrite = 0;
  channel->attr.subbuf_size = kSubBufferBytes;
  channel->attr.num_subbuf = kSubBuffers;
  const int code = limited([&] { return lttng_enable_channel(handle_->handle.get(), channel.get()); });
  return code < 0 ? failure("the trace's buffers cannot be made", code) : "";
}

std::string LttngTrace::addContexts() {
  for (const lttng_event_context_type type : {LTTNG_EVENT_CONTEXT_VPID, LTTNG_EVENT_CONTEXT_VTID}) {
    lttng_event_context context{};
    context.ctx = type;
    const int code =
        limited([&] { return lttng_add_context(handle_->handle.get(), &context, nullptr, kChannel); });
    if (code < 0) return failure("the trace cannot tell processes apart", code);
  }
  return {};
}

std::string LttngTrace::enableSignposts(const std::set<std::string>& signposts) {
  const Event event(lttng_event_create(), &lttng_event_destroy);
  if (event == nullptr) return "out of memory";
  copyName(event->name, sizeof(event->name), kEvents);
  event->type = LTTNG_EVENT_TRACEPOINT;
  event->loglevel_type = LTTNG_EVENT_LOGLEVEL_ALL;
  event->loglevel = -1;
  for (const std::string& filter : filtersFor(signposts)) {
    const int code = limited([&] {
      return lttng_enable_event_with_exclusions(handle_->handle.get(), event.get(), kChannel, filter.c_str(),
                                                0, nullptr);
    });
    if (code < 0) return failure("the signposts cannot be traced", code);
  }
  return {};
}

std::string LttngTrace::stop() {
  const int code = limited([this] { return lttng_stop_tracing_no_wait(name_.c_str()); });
  if (code < 0) return failure("the trace cannot be stopped", code);
  std::string problem = waitForData();
  if (problem.empty()) problem = countLosses();
  return problem;
}

std::string LttngTrace::waitForData() {
  const auto end = Clock::now() + kDataTimeout;
  for (;;) {
    const int pending = limited([this] { return lttng_data_pending(name_.c_str()); });
    if (pending == 0) return {};
    if (pending < 0) return failure("the trace's data do not arrive", pending);
    if (Clock::now() >= end) return "the trace's data do not arrive";
    std::this_thread::sleep_for(kPause);
  }
}

std::string LttngTrace::countLosses() {
  lttng_channel* channels = nullptr;
  const int count = limited([&] { return lttng_list_channels(handle_->handle.get(), &channels); });
  const Listed<lttng_channel> owner(channels, &std::free);
  if (count < 0) return failure("the trace's losses cannot be counted", count);
  for (int i = 0; i < count; ++i) {
    std::uint64_t lost = 0;
    const int code = lttng_channel_get_discarded_event_count(&channels[i], &lost);
    if (code < 0) return failure("the trace's losses cannot be counted", code);
    lostEvents_ += lost;
  }
  return {};
}

std::string LttngTrace::destroy() {
  if (handle_ == nullptr) return {};
  handle_.reset();
  lttng_destruction_handle* made = nullptr;
  const int code = limited([&] { return static_cast<int>(lttng_destroy_session_ext(name_.c_str(), &made)); });
  const Destruction destruction(made, &lttng_destruction_handle_destroy);
  if (code != LTTNG_OK) return failure("the tracing session cannot be ended", code);
  constexpr int kTimeoutMilliseconds = 1000 * static_cast<int>(kDataTimeout.count());
  if (lttng_destruction_handle_wait_for_completion(made, kTimeoutMilliseconds) !=
      LTTNG_DESTRUCTION_HANDLE_STATUS_COMPLETED) {
    return "the tracing session does not end";
  }
  lttng_error_code result = LTTNG_OK;
  if (lttng_destruction_handle_get_result(made, &result) != LTTNG_DESTRUCTION_HANDLE_STATUS_OK) {
    return "the tracing session's end is unknown";
  }
  if (result != LTTNG_OK) return failure("the trace is not whole", static_cast<int>(result));
  return lostEvents_ == 0 ? "" : "the trace has lost " + std::to_string(lostEvents_) + " events";
}

std::string LttngTrace::checkThisProcessIsSeen(SessionDaemon& daemon, TimerService& timers) {
  const auto end = Clock::now() + kSeenTimeout;
  for (;;) {
    {
      const CallLimit limit(daemon, timers);
      if (hasTracepoint(::getpid())) return {};
    }
    if (Clock::now() >= end) break;
    std::this_thread::sleep_for(kPause);
  }
  return std::string("this process's signposts do not reach the session daemon ") +
         (daemon.isPrivate() ? "(another HOME or LTTNG_HOME?)" : "(which somebody else has started)");
}

}  // namespace tonewerk
