// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreBatch.h"

#include <utility>

#include "platform/linux/store/StoreSchema.h"
#include "values/CompactJson.h"

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

void StoreBatch::add(const AnalyticsRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  analytics_.push_back({row.recordedAt, indexOf(row.names), owner.user, append(text.view()), {}});
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
  indexOf(row.session, owner.user);
  count(bytesOf(row, text), owner);
}

void StoreBatch::add(const RtcMessageRow& row, const StoreRowText& text, const StoreRowOwner& owner) {
  rtcMessages_.push_back({row.sentAt, indexOf(row.session, owner.user), row.category, row.type, owner.user,
                          append(text.view()), analytics_.size()});
  shareable_ = {};
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
  event.rtc = Shared{indexOf(row.session, user), row.category, row.type, *cut};
  shareable_ = {};
  return true;
}

void StoreBatch::clear() {
  analytics_.clear();
  metrics_.clear();
  power_.clear();
  rtcMessages_.clear();
  names_.clear();
  nameSlots_.fill(0);
  sessions_.clear();
  sessionUsers_.clear();
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

std::uint32_t StoreBatch::indexOf(const EventNames& names) {
  std::uint32_t& slot = nameSlots_[EventNamesHash{}(names) % kNameSlots];
  if (slot == 0 || names_[slot - 1] != names) {
    names_.push_back(names);
    slot = static_cast<std::uint32_t>(names_.size());
  }
  return slot - 1;
}

std::size_t StoreBatch::indexOf(const std::shared_ptr<RtcSessionRecord>& session, std::uint32_t user) {
  // Messages of few sessions take turns.
  constexpr std::size_t kCompared = 16;
  const std::size_t end = sessions_.size() > kCompared ? sessions_.size() - kCompared : 0;
  for (std::size_t at = sessions_.size(); at > end; --at) {
    if (sessions_[at - 1] == session) return at - 1;
  }
  sessions_.push_back(session);
  sessionUsers_.push_back(user);
  return sessions_.size() - 1;
}

}  // namespace tonewerk
