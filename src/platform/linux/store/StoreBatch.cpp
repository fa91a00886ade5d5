// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreBatch.h"

#include <utility>

#include "platform/linux/store/StoreSchema.h"
#include "values/CompactJson.h"
#include "values/ShortenedText.h"

namespace tonewerk {

static_assert(StoreBatch::kMaxSharedTextBytes <= kMaxHiddenPlace, "every place in a shared text has room");

namespace {

// The text of the row that this thread records.
std::string& emptyText() {
  thread_local std::string text;
  text.clear();
  return text;
}

}  // namespace

StoreRowText::StoreRowText(const AnalyticsRow& row) : text_(emptyText()) {
  appendCompactJson(text_, row.payload);
}

StoreRowText::StoreRowText(const MetricRow& row) : text_(emptyText()) { text_ = row.record; }

StoreRowText::StoreRowText(const PowerRow& row) : text_(emptyText()) {
  text_ += row.name.view();
  appendCompactJson(text_, row.payload);
}

// The session's texts are made when they are written, because that may happen again in another file.
StoreRowText::StoreRowText(const RtcSessionRow& /*row*/) : text_(emptyText()) {}

StoreRowText::StoreRowText(const RtcMessageRow& row) : text_(emptyText()) {
  appendCompactJson(text_, row.payload, row.hidden);
}

// The names as they are stored.
StoreRowText::StoreRowText(const LifeRow& row) : text_(emptyText()) {
  text_ += shortened(row.application.view(), StoreBatch::kMaxNameBytes);
  text_ += shortened(row.process.view(), StoreBatch::kMaxNameBytes);
}

StoreRowText::StoreRowText(const SendingRow& row) : text_(emptyText()) {
  text_ += shortened(row.endpoint, StoreBatch::kMaxSendingTextBytes);
  text_ += shortened(row.problem, StoreBatch::kMaxSendingTextBytes);
}

StoreRowText::~StoreRowText() {
  if (text_.capacity() > kKeptBytes) std::string().swap(text_);  // an assignment may keep the buffer
}

std::size_t StoreBatch::bytesOf(const AnalyticsRow& /*row*/, const StoreRowText& text) {
  return sizeof(Analytics) + text.view().size();
}

std::size_t StoreBatch::bytesOf(const MetricRow& /*row*/, const StoreRowText& text) {
  return sizeof(Metric) + text.view().size();
}

std::size_t StoreBatch::bytesOf(const PowerRow& /*row*/, const StoreRowText& text) {
  return sizeof(Power) + text.view().size();
}

std::size_t StoreBatch::bytesOf(const RtcSessionRow& row, const StoreRowText& /*text*/) {
  return sizeof(RtcSessionRecord) + row.session->sessionInfo.bytes() + row.session->userInfo.bytes();
}

std::size_t StoreBatch::bytesOf(const RtcMessageRow& /*row*/, const StoreRowText& text) {
  return sizeof(RtcMessage) + text.view().size();
}

std::size_t StoreBatch::bytesOf(const LifeRow& /*row*/, const StoreRowText& text) {
  return sizeof(Session) + sizeof(SessionLife) + text.view().size();
}

std::size_t StoreBatch::bytesOf(const SendingRow& /*row*/, const StoreRowText& text) {
  return sizeof(Sending) + text.view().size();
}

void StoreBatch::add(const AnalyticsRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  Analytics& event = analytics_.emplace_back();
  event.recordedAt = row.recordedAt;
  event.kind = indexOf({row.names, row.subject});
  event.user = owner.user;
  event.payload = append(text.view());
  if (row.subject.life != nullptr) {
    event.life = static_cast<std::uint32_t>(lives_.indexOf(row.subject.life, owner.user));
  }
  if (row.subject.stretch) {
    event.stretch = static_cast<std::uint32_t>(stretches_.size());
    stretches_.push_back(*row.subject.stretch);
  }
  shareable_ = text.view().size() <= kMaxSharedTextBytes ? row.payload : ValueMap();
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const MetricRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  metrics_.push_back({row.postedAt, row.identifier, owner.user, append(text.view())});
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const PowerRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  const Part both = append(text.view());
  const std::size_t name = row.name.size();
  power_.push_back(
      {row.recordedAt, row.group, {both.begin, name}, {both.begin + name, both.size - name}, owner.user});
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const RtcSessionRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  sessions_.indexOf(row.session, owner.user);
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const RtcMessageRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  rtcMessages_.push_back({row.sentAt, sessions_.indexOf(row.session, owner.user), row.category, row.type,
                          owner.user, append(text.view()), analytics_.size()});
  shareable_ = {};
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const LifeRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  const std::size_t application = shortened(row.application.view(), kMaxNameBytes).size();
  const Part both = append(text.view());
  lifeRows_.push_back({static_cast<std::uint32_t>(lives_.indexOf(row.life, owner.user)),
                       {both.begin, application},
                       {both.begin + application, both.size - application},
                       row.end});
  shareable_ = {};
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const SendingRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  const std::size_t endpoint = shortened(row.endpoint, kMaxSendingTextBytes).size();
  const Part both = append(text.view());
  sendings_.push_back(
      {row.facts, {both.begin, endpoint}, {both.begin + endpoint, both.size - endpoint}, owner.user});
  count(bytesOf(row, text), owner);
}

bool StoreBatch::share(const RtcMessageRow& row, std::uint32_t user) {
  // All empty maps share their storage.
  if (shareable_.empty() || !shareable_.sharesStorageWith(row.payload)) return false;
  Analytics& event = analytics_.back();
  if (event.user != user) return false;
  const double later = row.sentAt - event.recordedAt;
  if (later < 0.0 || later > kSameMomentSeconds) return false;
  std::optional<JsonCut> cut(std::in_place);
  if (!row.hidden.empty()) cut = cutOfEntry(text(event.payload), row.payload, row.hidden);
  if (!cut || cut->size > kMaxHiddenBytes) return false;
  event.rtc = Shared{sessions_.indexOf(row.session, user), row.category, row.type, *cut};
  shareable_ = {};
  return true;
}

void StoreBatch::clear() {
  analytics_.clear();
  metrics_.clear();
  power_.clear();
  rtcMessages_.clear();
  lifeRows_.clear();
  sendings_.clear();
  kinds_.clear();
  kindSlots_.fill(0);
  stretches_.clear();
  lives_.clear();
  sessions_.clear();
  text_.clear();
  if (text_.capacity() > kKeptBytes) std::string().swap(text_);
  shareable_ = {};
  rows_ = 0;
  bytes_ = 0;
  charges_.clear();
  marks_.clear();
}

StoreBatch::Part StoreBatch::append(std::string_view text) {
  const std::size_t begin = text_.size();
  text_ += text;
  return {begin, text.size()};
}

void StoreBatch::count(std::size_t bytes, const StoreRowOwner& owner) {
  ++rows_;
  bytes_ += bytes;
  if (owner.account != nullptr) charges_.add(*owner.account, owner.charge);
  if (owner.position.sequence != 0) marks_[owner.user] = owner.position;
}

std::uint32_t StoreBatch::indexOf(EventKind kind) {
  std::uint32_t& slot = kindSlots_[EventKindHash{}(kind) % kKindSlots];
  if (slot == 0 || kinds_[slot - 1] != kind) {
    kinds_.push_back(std::move(kind));
    slot = static_cast<std::uint32_t>(kinds_.size());
  }
  return slot - 1;
}

template <typename Object>
std::size_t StoreBatch::SharedObjects<Object>::indexOf(const std::shared_ptr<Object>& object,
                                                       std::uint32_t user) {
  // Rows of few sessions take turns.
  constexpr std::size_t kCompared = 16;
  const std::size_t end = shared.size() > kCompared ? shared.size() - kCompared : 0;
  for (std::size_t at = shared.size(); at > end; --at) {
    if (shared[at - 1] == object) return at - 1;
  }
  shared.push_back(object);
  users.push_back(user);
  return shared.size() - 1;
}

template <typename Object>
void StoreBatch::SharedObjects<Object>::clear() {
  shared.clear();
  users.clear();
}

}  // namespace tonewerk
