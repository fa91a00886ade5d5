// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as what several clients of several users do to the service core, on the platform in memory:
// they connect, create, start, configure, send, stop, destroy, ask and disconnect in any order, while the
// clocks move. Whatever they do:
//
//   - each request has one answer; a start, a long poll and a kill request have at most one; only the two
//     requests that docs/protocol.md names have two
//   - the answers of a connection's requests come in the order of the requests; what the connection's role
//     does not permit is refused at once, and the refusals come in their own order
//   - a session holds only messages of its own user and of trusted users
//   - no session counts more redundant messages than messages
//   - when all clients are gone, nothing is left: no client, no session, no amount in any account, and no
//     record of the journal that is still needed
#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "FuzzInput.h"
#include "protocol/Requests.h"
#include "service/TWReportingClientServerInstance.h"
#include "service/TWReportingService.h"
#include "session/TWReportingContext.h"
#include "session/TWReportingSession.h"
#include "support/TestPlatform.h"
#include "support/memory/MemoryJournal.h"
#include "support/memory/MemoryMessaging.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

constexpr std::array<std::uint32_t, 4> kUsers = {TestPlatform::kOwner, 0, 1001, 1002};
constexpr std::string_view kSender = "sender";  // the key of the sender's user in each message
constexpr std::size_t kMaxClients = 8;

// Keys that workers look for, and some that they do not.
constexpr std::array<std::string_view, 32> kKeys = {"volume",
                                                    "ringerstate",
                                                    "device_name",
                                                    "wait_time",
                                                    "issue_type",
                                                    "twreporting_timestamp",
                                                    "session_duration",
                                                    "running",
                                                    "session_input_running",
                                                    "session_output_running",
                                                    "session_selected_format",
                                                    "vp_config_primary_vocoder",
                                                    "vp_config_operation_mode",
                                                    "vocoders",
                                                    "playingTime",
                                                    "HostApplicationDisplayID",
                                                    "QMHostApplicationDisplayID",
                                                    "io_buffer_size",
                                                    "active_devices",
                                                    "thermal_state",
                                                    "rtaid_client",
                                                    "QMSessionVolume",
                                                    "gather_session",
                                                    "mFormatID",
                                                    "mChannelsPerFrame",
                                                    "any_channel_silence_seconds",
                                                    "overload_count",
                                                    "node",
                                                    "io_cycle",
                                                    "a key",
                                                    "other",
                                                    ""};

bool isTrusted(std::uint32_t user) { return user == 0 || user == TestPlatform::kOwner; }

// What a client has asked for, and how often it was answered.
struct Asked {
  std::string_view method;
  std::size_t mostAnswers = 1;
  std::size_t answers = 0;
};

struct Client {
  std::uint32_t user = 0;
  std::unique_ptr<MemoryClient> connection;
  std::map<std::uint32_t, Asked> asked;  // by the request's identifier
  std::size_t notifiedPolls = 0;         // long polls sent as notifications, which have no answer
};

// Whether the work queue answers this request as soon as its turn comes.
bool isAnsweredInTurn(std::string_view method) {
  return method != requests::kStartReportingSessionForID.name && method != requests::kObserve.name &&
         method != requests::kKillService.name && !method.starts_with("watch.");
}

// Such a request is refused when the service gets it. Over this platform, as over D-Bus, earlier requests may
// still wait for their turn then.
bool isNotPermitted(const MemoryResponse& response) {
  return response.error && response.error->domain == kMessagingErrorDomain &&
         response.error->code == kNotPermitted;
}

class Script {
 public:
  explicit Script(FuzzInput& input) : input_(input) {
    test_.deviceFacts.set("InternalBuild", isInternal_);
    if (hasJournal_) test_.journal = &journal_;
    test_.accounts.totals().setTotal(Resource::kKeptBytes, input_.below(2) == 0 ? 512 * kMiB : 64 << 10);
    context_.emplace(test_.platform(), allWorkerClasses());
    service_ = TWReportingService::make([] {});
    messaging_.setDelegate(*service_);
    messaging_.resume();
  }

  void run() {
    while (!input_.empty()) step();
    test_.queues.runAll();
    checkSessions();
    for (Client& client : clients_) checkAnswers(client);
    for (Client& client : clients_) client.connection->disconnect();
    test_.queues.runAll();
    test_.clock.advance(2 * TWReportingService::kSingleMessageSessionTimeoutSeconds);
    test_.queues.runAll();
    checkNothingIsLeft();
  }

 private:
  void step() {
    switch (input_.below(16)) {
      case 0:
        return connect();
      case 1:
        return disconnect();
      case 2:
        test_.queues.runAll();
        return checkSessions();
      case 3:
        return test_.clock.advance(input_.byte() * 0.1);
      case 4:
        // A jump of the wall clock of up to nine hours, in both directions.
        return test_.clock.setNow(test_.clock.now() + input_.number<std::int16_t>());
      case 5:
        return service_->setReportingEnabled(input_.below(2) == 0);
      default:
        return request();
    }
  }

  void connect() {
    const std::uint32_t user = kUsers[input_.below(kUsers.size())];
    if (clients_.size() == kMaxClients) return;
    auto connection = messaging_.connect(static_cast<std::int32_t>(2000 + clients_.size()), user);
    expect(connection != nullptr);
    clients_.push_back({user, std::move(connection), {}, 0});
  }

  void disconnect() {
    const std::size_t place = input_.byte();
    if (clients_.empty()) return;
    const auto client = clients_.begin() + static_cast<std::ptrdiff_t>(place % clients_.size());
    client->connection->disconnect();
    countAnswers(*client);
    clients_.erase(client);
  }

  void request() {
    const std::size_t place = input_.byte();
    const Method& method = requests::kAll[input_.below(requests::kAll.size())];
    if (clients_.empty()) return;
    Client& client = clients_[place % clients_.size()];
    Arguments arguments;
    for (const Parameter& parameter : method.parameters) {
      arguments.push_back(argument(parameter.type, client.user));
    }
    if (input_.below(8) == 0) {
      if (method.name == requests::kWatchNextMessages.name) ++client.notifiedPolls;
      return client.connection->notify(method.name, std::move(arguments));
    }
    const std::size_t most = mayBeAnsweredTwice(method, arguments) ? 2 : 1;
    const std::uint32_t identifier = client.connection->request(method.name, std::move(arguments));
    client.asked[identifier] = {method.name, most};
  }

  bool mayBeAnsweredTwice(const Method& method, const Arguments& arguments) const {
    if (method.name == requests::kStartReportingSessionForID.name) return isInternal_;
    return method.name == requests::kGetServiceNameForReporterID.name && arguments[0]->integer() == 0;
  }

  Argument argument(ParameterType type, std::uint32_t user) {
    switch (type) {
      case ParameterType::kInt64:
        return Value(std::int64_t{input_.number<std::int8_t>() % 8});
      case ParameterType::kUInt32:
        return Value(category());
      case ParameterType::kUInt16:
        return Value(std::int64_t{input_.byte() % 24});
      case ParameterType::kMap:
        return Value(map(user));
      case ParameterType::kInt64ListOrNone:
        return list();
    }
    return std::nullopt;
  }

  std::int64_t category() {
    const std::int64_t base = input_.byte() % 20;
    return input_.below(4) == 0 ? base | std::int64_t{0x10000} << input_.below(16) : base;
  }

  Argument list() {
    const std::size_t size = input_.below(5);
    if (size == 4) return std::nullopt;
    ValueArray list;
    for (std::size_t at = 0; at < size; ++at) list.append(std::int64_t{input_.number<std::int8_t>() % 8});
    return Value(std::move(list));
  }

  ValueMap map(std::uint32_t user) {
    ValueMap map{{kSender, std::int64_t{user}}};
    for (std::size_t count = input_.below(6); count > 0; --count) {
      const std::string_view key = kKeys[input_.below(kKeys.size())];
      map.set(key, value());
    }
    return map;
  }

  Value value() {
    switch (input_.below(8)) {
      case 0:
        return input_.number<double>();
      case 1:
        return std::int64_t{input_.number<std::int8_t>()};
      case 2:
        return std::string(input_.byte(), 'x');
      case 3:
        return input_.below(2) == 0;
      case 4:
        return Date{test_.clock.now() + input_.number<std::int8_t>()};
      case 5:
        return ValueArray{input_.byte(), "text", ValueMap{{"inner", input_.byte()}}};
      case 6:
        return input_.number<std::uint64_t>();
      default:
        return test_.clock.now() + input_.number<std::int8_t>();
    }
  }

  // Counts the answers, and checks their order.
  static void countAnswers(Client& client) {
    std::uint32_t lastInTurn = 0;
    std::uint32_t lastRefused = 0;
    for (auto& [identifier, asked] : client.asked) asked.answers = 0;
    for (const MemoryResponse& response : client.connection->responses()) {
      const auto found = client.asked.find(response.identifier);
      expect(found != client.asked.end());
      Asked& asked = found->second;
      expect(++asked.answers <= asked.mostAnswers);
      if (!isAnsweredInTurn(asked.method)) continue;
      std::uint32_t& last = isNotPermitted(response) ? lastRefused : lastInTurn;
      expect(response.identifier > last || (response.identifier == last && asked.answers == 2));
      last = response.identifier;
    }
  }

  static void checkAnswers(Client& client) {
    countAnswers(client);
    std::size_t waiting = client.notifiedPolls;  // long polls, which may not have finished
    for (const auto& [identifier, asked] : client.asked) {
      expect(!isAnsweredInTurn(asked.method) || asked.answers == asked.mostAnswers);
      if (asked.method == requests::kWatchNextMessages.name && asked.answers == 0) ++waiting;
    }
    expect(client.connection->unfinishedRequests() <= waiting);
  }

  void checkSessions() const {
    for (const auto& client : service_->getAllClients()) {
      for (const auto& [identifier, session] : client->clientReportingSessionMap()) {
        check(*session, client->account()->user());
      }
    }
  }

  static void check(const TWReportingSession& session, std::uint32_t owner) {
    expect(session.redundantMessageCount() <= session.totalMessageCount());
    for (const TWReportingSessionMessage* stored : session.messages()) {
      const Value* sender = stored->message.find(kSender);
      if (sender == nullptr) continue;  // the session's own message
      const auto user = static_cast<std::uint32_t>(*sender->asInteger());
      expect(user == owner || isTrusted(user));
    }
  }

  void checkNothingIsLeft() {
    expect(service_->getAllClients().empty() && service_->currentSingleMessageSessions().empty());
    context_->reportingServerQueue().async(
        [this] { expect(context_->journal().neededFrom() == std::numeric_limits<std::uint64_t>::max()); });
    test_.queues.runAll();
    clients_.clear();
    for (const std::uint32_t user : kUsers) {
      for (const ResourceFacts& facts : kResources) {
        expect(test_.accounts.of(user)->held(facts.resource) == 0);
      }
    }
  }

  FuzzInput& input_;
  const std::uint8_t device_ = input_.byte();
  const bool isInternal_ = (device_ & 1U) != 0;
  const bool hasJournal_ = (device_ & 2U) != 0;
  MemoryJournal journal_;
  TestPlatform test_;
  std::optional<TWReportingContext> context_;
  MemoryMessaging messaging_{&test_.accounts};
  std::shared_ptr<TWReportingService> service_;
  std::vector<Client> clients_;
};

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kMaxInput = 2048;  // longer scripts only take longer
  if (size > kMaxInput) return 0;
  tonewerk::FuzzInput input(data, size);
  tonewerk::Script(input).run();
  return 0;
}
