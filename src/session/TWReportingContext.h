// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cassert>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "platform/Log.h"
#include "platform/Platform.h"
#include "platform/SerialQueue.h"
#include "platform/SinkStatus.h"
#include "protocol/AudioEvent.h"
#include "session/RequestJournal.h"
#include "session/SingletonRegistry.h"
#include "session/SinkQueue.h"
#include "session/StrandPool.h"
#include "session/TWReportingNameTable.h"
#include "session/TWReportingSessionWorkerRegistry.h"

namespace tonewerk {

class TurnQueue;
class WeakQueueRef;

// Holds what the process has one of: the platform's services, the work queue, the log categories, the worker
// registry, the lookup tables, and whether this is an internal build. main() makes one context, and each test
// makes its own. The free functions without arguments find it through current().
//
// Any thread, unless a member says otherwise.
class TWReportingContext {
 public:
  // `workerClasses`: all worker classes, in the registry's order. The new object becomes current().
  TWReportingContext(const Platform& platform,
                     std::vector<const TWReportingSessionWorkerClass*> workerClasses);
  TWReportingContext(const TWReportingContext&) = delete;
  TWReportingContext& operator=(const TWReportingContext&) = delete;
  // Runs what is still queued on the context's queues.
  ~TWReportingContext();

  // The context that was made. There must be one.
  static TWReportingContext& current();

  const Platform& platform() const { return platform_; }

  // The one serial queue that carries every request body, session and worker call. Made on first use.
  SerialQueue& reportingServerQueue();

  // Where requests queue: the users' work, which takes turns on the work queue. Made with the work queue.
  TurnQueue& turns();

  // True where clients, sessions and workers may be used: on the work queue
  // (SerialQueue::ownsThisThread()), and on any thread while there is no work queue. For assertions.
  bool isOnReportingServerQueue() const;

  // A reference to the work queue for handlers that may be called when the queue is gone. It is closed
  // before the queue ends.
  std::shared_ptr<WeakQueueRef> reportingServerQueueRef();

  // The queue on which sinks write files, so that the work queue does not wait for a disk. Made on first use.
  SinkQueue& fileSinkQueue();

  // The strands on which sessions' workers use the real-time-communication reporting service. Made on first
  // use.
  StrandPool& linkReportQueues();

  // The sinks whose state people may ask for. The context adds its own queues when it makes them.
  SinkList& sinks() { return sinks_; }

  // Whether the device says that this is an internal build. Asks it once.
  bool isInternalBuild();

  // Filled on first use.
  const TWReportingSessionWorkerRegistry& workerRegistry();

  // The process-wide objects of the rooms above session/. They end after the context's queues.
  SingletonRegistry& singletons() { return singletons_; }

  // On the work queue.
  TWReportingNameTable& names() {
    assert(isOnReportingServerQueue());
    return names_;
  }

  // On the work queue.
  RequestJournal& journal() { return journal_; }

  // The numbers of the base categories and of the types, by their texts.
  using Lookup = std::unordered_map<std::string, std::uint32_t>;
  const Lookup& categoryLookup();
  const Lookup& typeLookup();

  struct LogCategories {
    explicit LogCategories(Log& log);
    LogCategory client;
    LogCategory serviceDelegate;
    LogCategory session;
    LogCategory linkReport;
    LogCategory driverUtility;
    LogCategory trace;
    LogCategory energybook;
    LogCategory diagwire;
    LogCategory capsa;
    LogCategory summary;
    LogCategory dp;
  };
  LogCategories logCategories;

 private:
  const Platform platform_;
  RequestJournal journal_;
  TWReportingNameTable names_;
  SingletonRegistry singletons_;
  SinkList sinks_;

  std::once_flag internalBuildOnce_;
  bool isInternalBuild_ = false;

  std::once_flag categoryLookupOnce_;
  Lookup categoryLookup_;
  std::once_flag typeLookupOnce_;
  Lookup typeLookup_;

  const std::vector<const TWReportingSessionWorkerClass*> workerClasses_;
  std::once_flag workerRegistryOnce_;
  std::optional<TWReportingSessionWorkerRegistry> workerRegistry_;

  void endReportingServerQueue();
  void endLinkReportQueues();

  // The queues are the last members, so that they end first: their work may use every member above. Among
  // them the work queue is last, because its work submits to the sinks' queues.
  std::once_flag fileSinkQueueOnce_;
  std::unique_ptr<SinkQueue> fileSinkQueue_;
  std::once_flag linkReportQueuesOnce_;
  std::unique_ptr<StrandPool> linkReportQueues_;
  std::once_flag reportingServerQueueOnce_;
  std::unique_ptr<SerialQueue> reportingServerQueue_;
  std::atomic<SerialQueue*> livingReportingServerQueue_ = nullptr;  // until the queue's last work has run
  std::shared_ptr<WeakQueueRef> reportingServerQueueRef_;           // made with the work queue
  std::shared_ptr<TurnQueue> turns_;                                // made with the work queue
};

}  // namespace tonewerk
