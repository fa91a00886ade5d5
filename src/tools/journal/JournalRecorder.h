// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "platform/Journal.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "tools/journal/SessionChoice.h"
#include "tools/recording/RecordingWriter.h"

namespace tonewerk {

// Writes the records of a journal as a recording, in their order.
//
//   connected   known from then on; connects with its first request that is chosen
//   request     a call, when it is chosen
//   the end of a user's single messages
//               nothing but the time, because it follows from the times of the messages
//   the end of a process
//               its connections and sessions end, at the time of its last record
class JournalRecorder {
 public:
  // `writer` outlives the object.
  JournalRecorder(RecordingWriter& writer, SessionChoice choice)
      : writer_(writer), choice_(std::move(choice)) {}

  void take(const Journal::Record& record);
  // The process that wrote the records has ended, and another one follows.
  void endProcess();
  // There are no more records.
  void end();

  std::uint64_t requests() const { return requests_; }
  std::uint64_t sessions() const { return choice_.sessions(); }
  // The requests that were left out because the records that say who their client is are missing.
  std::uint64_t withoutClient() const { return withoutClient_; }

 private:
  void takeRequest(const Journal::Record& record);

  RecordingWriter& writer_;
  SessionChoice choice_;
  RpcFrameDecoder decoder_;
  std::map<std::uint64_t, RecordedClient> clients_;  // that are connected, by number
  double last_ = 0.0;                                // the time of the last record
  std::uint64_t requests_ = 0;
  std::uint64_t withoutClient_ = 0;
};

}  // namespace tonewerk
