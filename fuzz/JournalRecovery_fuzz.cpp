// SPDX-License-Identifier: Apache-2.0
//
// Reads the input as the journal of a daemon that was killed, and recovers from it: a script of records, of
// which the first byte of each says what it is, and then of damage to the files. The next journal reads what
// was written, or less after damage, and never anything else. The service core plays it, and no session and
// no amount in an account is left afterwards. Records that are added then have new numbers and are found by
// the journal after it.
#include <algorithm>
#include <array>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "FuzzInput.h"
#include "platform/JournalProcess.h"
#include "platform/Log.h"
#include "platform/linux/journal/JournalDirectory.h"
#include "platform/linux/journal/JournalPlayer.h"
#include "platform/linux/journal/PlayedClock.h"
#include "platform/linux/journal/SegmentJournal.h"
#include "platform/linux/messagepack/RpcWriter.h"
#include "protocol/Requests.h"
#include "service/TWReportingService.h"
#include "session/TWReportingContext.h"
#include "support/TemporaryDirectory.h"
#include "support/TestPlatform.h"
#include "workers/TWReportingWorkerClasses.h"

namespace tonewerk {
namespace {

using Kind = Journal::Kind;

constexpr std::array<std::uint32_t, 4> kUsers = {TestPlatform::kOwner, 0, 1001, kNoUser};

// The files of a journal, with small segments.
class Files {
 public:
  Files() = default;

  void clear() const {
    for (const auto& entry : std::filesystem::directory_iterator(directory_.path())) {
      std::filesystem::remove_all(entry.path());
    }
  }

  std::unique_ptr<SegmentJournal> open(const PreferenceStore& preferences, const LogCategory& log) const {
    SegmentJournal::Limits limits;
    limits.segmentBytes = 1024;
    return std::make_unique<SegmentJournal>(std::make_unique<LinuxJournalDirectory>(directory_.path()),
                                            preferences, log, limits);
  }

  // Changes one file as the input says. False when there is none.
  bool damage(FuzzInput& input) const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory_.path())) {
      if (entry.is_regular_file()) names.push_back(entry.path().string());
    }
    if (names.empty()) return false;
    std::sort(names.begin(), names.end());
    const std::string& name = names[input.below(std::min<std::size_t>(names.size(), 256))];
    std::string bytes = contentsOf(name);
    const std::size_t place = bytes.empty() ? 0 : input.number<std::uint16_t>() % bytes.size();
    switch (input.below(5)) {
      case 0:
        std::filesystem::remove(name);
        return true;
      case 1:
        bytes.resize(place);
        break;
      case 2:
        bytes.erase(place, input.byte());
        break;
      case 3: {
        const std::string_view other = input.shortText().substr(0, bytes.size() - place);
        bytes.replace(place, other.size(), other);
        break;
      }
      default:
        bytes.insert(place, input.shortText());
    }
    std::ofstream(name, std::ios::binary) << bytes;
    return true;
  }

 private:
  static std::string contentsOf(const std::string& path) {
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
  }

  const TemporaryDirectory directory_;
};

Value argumentFor(ParameterType type, FuzzInput& input) {
  switch (type) {
    case ParameterType::kMap: {
      ValueMap map;
      for (std::size_t count = input.below(4); count > 0; --count) {
        const std::string key(input.shortText());
        map.set(key, std::int64_t{input.byte()});
      }
      return map;
    }
    case ParameterType::kInt64ListOrNone:
      return ValueArray{std::int64_t{input.byte() % 4}};
    default:
      return std::int64_t{input.byte() % 24};
  }
}

// A record's bytes: a request as a client sends it, or any bytes.
std::string bytesOf(Kind kind, FuzzInput& input) {
  if (kind == Kind::kConnected && input.below(4) != 0) {
    return encoded(JournalProcess{input.byte(), std::string(input.shortText())});
  }
  if (kind != Kind::kRequest || input.below(8) == 0) return std::string(input.shortText());
  const Method& method = requests::kAll[input.below(requests::kAll.size())];
  Arguments arguments;
  for (const Parameter& parameter : method.parameters)
    arguments.emplace_back(argumentFor(parameter.type, input));
  std::string frame;
  RpcWriter(frame).request(input.byte(), method.name, arguments);
  return frame;
}

class Recovery {
 public:
  Recovery(FuzzInput& input, const Files& files) : input_(input), files_(files) {}

  void run() {
    files_.clear();
    writeRecords();
    isDamaged_ = !input_.empty();
    while (!input_.empty() && files_.damage(input_)) {
    }
    const std::uint64_t last = recover();
    addAfter(last);
  }

 private:
  void writeRecords() {
    const auto journal = files_.open(test_.preferences, log_);
    double at = test_.clock.now();
    for (std::size_t count = input_.below(64); count > 0; --count) {
      const auto kind = static_cast<Kind>(1 + input_.below(4));
      // Mostly a little later than the record before; sometimes at any time.
      at = input_.below(16) == 0 ? input_.number<double>() : at + 0.1 * input_.byte();
      const Journal::Origin origin{at, input_.below(5), kUsers[input_.below(kUsers.size())]};
      const std::string bytes = bytesOf(kind, input_);
      const std::uint64_t sequence = journal->append(kind, origin, bytes);
      if (std::abs(at) <= kLatestTime) written_[sequence] = {kind, origin.client, origin.user, bytes};
      if (input_.below(4) == 0) expect(journal->write());
    }
    expect(journal->write());
  }

  // What SegmentJournal::read() says must hold for each of its records.
  std::uint64_t recover() {
    const auto journal = files_.open(test_.preferences, log_);
    std::uint64_t last = 0;
    std::uint64_t count = 0;
    const Journal::Reading reading = journal->read([&](const Journal::Record& record) {
      expect(record.sequence > last && record.sequence <= journal->last());
      const auto found = written_.find(record.sequence);
      expect(found != written_.end() &&
             found->second ==
                 Written{record.kind, record.origin.client, record.origin.user, std::string(record.bytes)});
      last = record.sequence;
      ++count;
      return true;
    });
    expect(reading.records == count && (isDamaged_ || count == written_.size()));
    expect((reading.damagedPlaces == 0) == (reading.damagedBytes == 0));
    play(*journal);
    // The ends of the clients that were still there are in the journal, too.
    expect(journal->write());
    journal->drop(journal->last() + 1);
    return journal->last();
  }

  void play(Journal& journal) {
    PlayedClock clock(test_.clock);
    test_.journal = &journal;
    const Platform platform = test_.platformWith(test_.log, test_.tracePoints, clock, test_.queues,
                                                 test_.metricon, test_.linkReport);
    TWReportingContext context(platform, allWorkerClasses());
    const auto service = TWReportingService::make([] {});
    std::uint64_t records = 0;
    context.reportingServerQueue().async([&] {
      JournalPlayer player(
          journal, *service, test_.accounts,
          {.begins = [&](const Journal::Record& record) { context.journal().play(record); },
           .endSingleMessages = [&](std::uint32_t user) { service->stopSingleMessageSession(user); },
           .progress = [](std::uint64_t) {}});
      records = player.play().records;
      context.journal().endPlaying();
      player.endAll();
      expect(player.openClients() == 0);
      service->stopSingleMessageSessions();
      context.journal().endRecovery();
    });
    test_.queues.runAll();
    test_.journal = nullptr;
    expect(service->getAllClients().empty() && service->currentSingleMessageSessions().empty());
    for (const std::uint32_t user : kUsers) {
      for (const ResourceFacts& facts : kResources) {
        expect(test_.accounts.of(user)->held(facts.resource) == 0);
      }
    }
  }

  void addAfter(std::uint64_t last) {
    std::uint64_t added = 0;
    {
      const auto journal = files_.open(test_.preferences, log_);
      expect(journal->last() >= last);
      added = journal->append(Kind::kRequest, {test_.clock.now(), 1, 1001}, "added");
      expect(added > last && journal->write());
    }
    const auto journal = files_.open(test_.preferences, log_);
    std::string newest;
    (void)journal->read([&](const Journal::Record& record) {
      if (record.sequence == added) newest = record.bytes;
      return true;
    });
    expect(newest == "added" && journal->last() == added);
  }

  struct Written {
    Kind kind = Kind::kRequest;
    std::uint64_t client = 0;
    std::uint32_t user = 0;
    std::string bytes;

    friend bool operator==(const Written&, const Written&) = default;
  };

  FuzzInput& input_;
  const Files& files_;
  std::map<std::uint64_t, Written> written_;  // by number; without those whose time counts as damage
  bool isDamaged_ = false;
  TestPlatform test_;
  const LogCategory log_{test_.log, "com.orvane.tonewerk", "twrs"};
};

}  // namespace
}  // namespace tonewerk

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kMaxInput = 2048;  // longer scripts only take longer
  if (size > kMaxInput) return 0;
  static const tonewerk::Files files;
  tonewerk::FuzzInput input(data, size);
  tonewerk::Recovery(input, files).run();
  return 0;
}
