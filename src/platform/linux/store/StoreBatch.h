// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/JournalPosition.h"
#include "platform/linux/store/JsonCut.h"
#include "platform/linux/store/StoreCharges.h"
#include "platform/linux/store/StoreMarks.h"
#include "platform/linux/store/StoreRow.h"
#include "protocol/RequestSet.h"

namespace tonewerk {

// Whose row it is. kNoUser stands for the daemon itself, and for users that are not known.
struct StoreRowOwner {
  std::uint32_t user = kNoUser;
  // Who bears how many bytes for the row; null when nobody does.
  Account* account = nullptr;
  std::size_t charge = 0;
  // The row's place in the journal.
  JournalPosition::Row position = {};
};

// The text that a batch keeps of one row: its payload as JSON, after a name that is the row's own. It is made
// before the row is added, so that no lock is held meanwhile and its size is known.
class StoreRowText {
 public:
  // Writes into a buffer of the calling thread, which must not make another one while this one lives.
  explicit StoreRowText(const AnalyticsRow& row);
  explicit StoreRowText(const MetricRow& row);
  explicit StoreRowText(const PowerRow& row);
  explicit StoreRowText(const RtcSessionRow& row);
  explicit StoreRowText(const RtcMessageRow& row);
  explicit StoreRowText(const LifeRow& row);
  explicit StoreRowText(const SendingRow& row);
  StoreRowText(const StoreRowText&) = delete;
  StoreRowText& operator=(const StoreRowText&) = delete;
  // Keeps the buffer for the next row, unless it is large.
  ~StoreRowText();

  std::string_view view() const { return text_; }
  // The size of the buffer.
  std::size_t capacity() const { return text_.capacity(); }

  static constexpr std::size_t kKeptBytes = 64 << 10;

 private:
  std::string& text_;
};

// The rows of one transaction: small rows for each table, and one text that holds all their payloads. The
// rows of a table are in the order of recording. A batch is cleared and used again, so that adding a row
// seldom allocates. Used by one thread at a time.
//
// A message is usually recorded as an analytics event and directly after it as a real-time-communication
// message. Both have the same payload and become one row: share().
//
// No values are kept but one, because freeing memory on another thread than it was allocated on is slow.
class StoreBatch {
 public:
  // What clear() keeps at most of the text's buffer. Batches of usual rows are smaller.
  static constexpr std::size_t kKeptBytes = 1 << 20;

  // A part of the text.
  struct Part {
    std::size_t begin = 0;
    std::size_t size = 0;
  };
  static constexpr std::uint32_t kNone = 0xFFFFFFFF;
  // What makes an analytics row a real-time-communication message, too.
  struct Shared {
    std::size_t session = 0;  // index in sessions()
    std::uint16_t category = 0;
    std::uint16_t type = 0;
    JsonCut hidden;  // the message's payload lacks this part of the event's
  };
  struct Analytics {
    double recordedAt = 0.0;
    std::uint32_t kind = 0;  // index in kinds()
    std::uint32_t user = kNoUser;
    Part payload;
    std::uint32_t life = kNone;     // index in lives()
    std::uint32_t stretch = kNone;  // index in stretches()
    std::optional<Shared> rtc;
  };
  struct Metric {
    double postedAt = 0.0;
    std::uint32_t identifier = 0;
    std::uint32_t user = kNoUser;
    Part record;
  };
  struct Power {
    double recordedAt = 0.0;
    std::int64_t group = 0;
    Part name;
    Part payload;
    std::uint32_t user = kNoUser;
  };
  struct RtcMessage {
    double sentAt = 0.0;
    std::size_t session = 0;  // index in sessions()
    std::uint16_t category = 0;
    std::uint16_t type = 0;
    std::uint32_t user = kNoUser;
    Part payload;
    std::size_t eventsBefore = 0;  // the number of analytics rows that were added before it
  };

  // What became of a session's life.
  struct Session {
    std::uint32_t life = 0;  // index in lives()
    Part application;        // empty when it is not known
    Part process;
    std::optional<SessionEnd> end;
  };
  // Longer names of applications and processes are cut.
  static constexpr std::size_t kMaxNameBytes = 128;
  struct Sending {
    SendingFacts facts;
    Part endpoint;
    Part problem;  // empty when there is none
    std::uint32_t user = kNoUser;
  };
  // Longer addresses of endpoints, and longer problems, are cut.
  static constexpr std::size_t kMaxSendingTextBytes = 256;

  // The bytes that a row takes in a batch.
  static std::size_t bytesOf(const AnalyticsRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const MetricRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const PowerRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const RtcSessionRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const RtcMessageRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const LifeRow& row, const StoreRowText& text);
  static std::size_t bytesOf(const SendingRow& row, const StoreRowText& text);

  void add(const AnalyticsRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const MetricRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const PowerRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const RtcSessionRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const RtcMessageRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const LifeRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});
  void add(const SendingRow& row, const StoreRowText& text, const StoreRowOwner& owner = {});

  // Makes the newest row, of the analytics events and the real-time-communication messages, a row of both.
  // True when it is an event of the same user with the payload of `row`, recorded at most kSameMomentSeconds
  // before, and its text has at most kMaxSharedTextBytes. Otherwise nothing has changed, and `row` is to be
  // added. The batch counts no more rows and bytes than before.
  [[nodiscard]] bool share(const RtcMessageRow& row, std::uint32_t user = kNoUser);
  // From now on no row that is there is shared. Call it when the batch gets no more rows: a payload that is
  // kept for sharing takes memory of its client.
  void endSharing() { shareable_ = {}; }

  // A shared row has the event's time.
  static constexpr double kSameMomentSeconds = 0.001;
  // share() searches the event's text, while other threads wait to record.
  static constexpr std::size_t kMaxSharedTextBytes = 64 << 10;

  // Removes all rows. Keeps the memory, unless the text was exceptionally large.
  void clear();

  bool empty() const { return rows_ == 0; }
  // Of all tables.
  std::size_t rows() const { return rows_; }
  std::size_t bytes() const { return bytes_; }
  // What the owners of the rows bear for them.
  const StoreCharges& charges() const { return charges_; }
  // The last rows of each user's requests.
  const StoreMarks& marks() const { return marks_; }
  // The size of the buffer of the text.
  std::size_t textCapacity() const { return text_.capacity(); }

  std::span<const Analytics> analytics() const { return analytics_; }
  std::span<const Metric> metrics() const { return metrics_; }
  std::span<const Power> power() const { return power_; }
  std::span<const RtcMessage> rtcMessages() const { return rtcMessages_; }
  // Of the analytics rows. The same kind may be there more than once.
  std::span<const EventKind> kinds() const { return kinds_; }
  // Of the summaries among the analytics rows.
  std::span<const TimeStretch> stretches() const { return stretches_; }
  // The lives of the sessions that rows belong to, in the order of recording. One may be there more than
  // once.
  std::span<const std::shared_ptr<SessionLife>> lives() const { return lives_.shared; }
  // The user of each of them: that of the first row in the batch that named the life.
  std::span<const std::uint32_t> lifeUsers() const { return lives_.users; }
  std::span<const Session> lifeRows() const { return lifeRows_; }
  std::span<const Sending> sendings() const { return sendings_; }
  // The sessions of session rows and message rows, in the order of recording. One may be there more than
  // once.
  std::span<const std::shared_ptr<RtcSessionRecord>> sessions() const { return sessions_.shared; }
  // The user of each of them: that of the first row in the batch that named the session.
  std::span<const std::uint32_t> sessionUsers() const { return sessions_.users; }
  // Valid until the next add() or clear().
  std::string_view text(Part part) const { return std::string_view(text_).substr(part.begin, part.size); }

 private:
  // Where the newest kind with a hash is in kinds_: so the same kind is mostly there once.
  static constexpr std::size_t kKindSlots = 256;

  // What several rows share, and the user of the first row that named it.
  template <typename Object>
  struct SharedObjects {
    std::vector<std::shared_ptr<Object>> shared;
    std::vector<std::uint32_t> users;

    std::size_t indexOf(const std::shared_ptr<Object>& object, std::uint32_t user);
    void clear();
  };

  Part append(std::string_view text);
  void count(std::size_t bytes, const StoreRowOwner& owner);
  std::uint32_t indexOf(EventKind kind);

  std::vector<Analytics> analytics_;
  std::vector<Metric> metrics_;
  std::vector<Power> power_;
  std::vector<RtcMessage> rtcMessages_;
  std::vector<Session> lifeRows_;
  std::vector<Sending> sendings_;
  std::vector<EventKind> kinds_;
  std::array<std::uint32_t, kKindSlots> kindSlots_{};  // index in kinds_ plus 1, or 0
  std::vector<TimeStretch> stretches_;
  SharedObjects<SessionLife> lives_;
  SharedObjects<RtcSessionRecord> sessions_;
  std::string text_;
  // The payload of the last analytics row, while that row can be shared. Empty otherwise. Holding it keeps
  // its storage from being written, or used again for another message.
  ValueMap shareable_;
  std::size_t rows_ = 0;
  std::size_t bytes_ = 0;
  StoreCharges charges_;
  StoreMarks marks_;
};

}  // namespace tonewerk
