// SPDX-License-Identifier: Apache-2.0
#include "tools/journal/JournalRecorder.h"

#include <optional>
#include <utility>

#include "platform/JournalProcess.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "protocol/Requests.h"

namespace tonewerk {

void JournalRecorder::take(const Journal::Record& record) {
  last_ = record.origin.at;
  switch (record.kind) {
    case Journal::Kind::kConnected: {
      // A client's number is that of its first record, which cannot know it.
      const std::uint64_t number = record.origin.client == 0 ? record.sequence : record.origin.client;
      const std::optional<JournalProcess> process = decodedJournalProcess(record.bytes);
      if (process) {
        clients_.try_emplace(number, RecordedClient{static_cast<std::int64_t>(number), record.origin.user,
                                                    process->name.value_or("")});
      }
      break;
    }
    case Journal::Kind::kRequest:
      takeRequest(record);
      break;
    case Journal::Kind::kDisconnected:
      writer_.disconnect(last_, static_cast<std::int64_t>(record.origin.client));
      choice_.disconnect(record.origin.client);
      clients_.erase(record.origin.client);
      break;
    case Journal::Kind::kSingleMessagesEnded:
      if (!choice_.isOfOneSession()) writer_.reach(last_);
      break;
  }
}

void JournalRecorder::takeRequest(const Journal::Record& record) {
  const auto client = clients_.find(record.origin.client);
  if (client == clients_.end()) {
    ++withoutClient_;
    return;
  }
  RpcFrameScanner scanner;
  if (scanner.scan(record.bytes) != RpcFrameScanner::Result::kFrame) return;
  RpcFrame& frame = decoder_.decode(record.bytes);
  const auto method = requests::all().find(frame.method);
  // The daemon keeps no other requests.
  if (!method || frame.refused || problemWith(requests::all().methods[*method], frame.arguments)) return;
  if (!choice_.takes(record.origin, requests::all().methods[*method], frame.arguments)) return;
  writer_.call(record.origin.at, client->second, frame.method, frame.arguments);
  ++requests_;
}

void JournalRecorder::endProcess() {
  writer_.restart(last_);
  clients_.clear();
  choice_.disconnectAll();
}

void JournalRecorder::end() { writer_.reach(last_); }

}  // namespace tonewerk
