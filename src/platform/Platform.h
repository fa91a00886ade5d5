// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>

namespace tonewerk {

class Accounts;
class Benchfile;
class Capsa;
class Chanmeter;
class Clock;
class CommandRunner;
struct DaemonStatus;
class DetachedThreads;
class DeviceFacts;
class Diagwire;
class Energybook;
class FileSystem;
class IssueDraftService;
class Journal;
class JsonService;
class Kolvi;
class LinkReport;
class Log;
class Metricon;
class NotificationService;
class PreferenceStore;
class ProcessInformation;
class Runtrace;
class SemaphoreFactory;
class SerialQueueFactory;
class SessionBook;
class SystemInformation;
class TimerService;
class TracePoints;
class WhirlcapRequest;

// The operating system's services, as the core uses them. All of them outlive the core.
struct Platform {
  Log& log;
  Accounts& accounts;
  TracePoints& tracePoints;
  Clock& clock;
  SerialQueueFactory& queues;
  TimerService& timers;
  SemaphoreFactory& semaphores;
  ProcessInformation& processes;
  SystemInformation& system;
  DeviceFacts& deviceFacts;
  PreferenceStore& preferences;
  NotificationService& notifications;
  FileSystem& files;
  JsonService& json;
  Metricon& metricon;
  Energybook& energybook;
  Diagwire& diagwire;
  LinkReport& linkReport;
  Capsa& capsa;
  Runtrace& runtrace;
  Kolvi& kolvi;
  Benchfile& benchfile;
  IssueDraftService& issueDrafts;
  WhirlcapRequest& whirlcaps;
  Chanmeter& chanmeter;
  CommandRunner& commands;
  DetachedThreads& threads;
  // Where requests are kept until their sessions have been reported; null to keep none.
  Journal* journal = nullptr;
  // Where the lives of sessions are entered; null for nowhere.
  SessionBook* sessionBook = nullptr;
  // What the daemon says of itself; null when it says nothing.
  const DaemonStatus* status = nullptr;
  // The directory for reports that people read; absolute.
  std::string logsDirectory = {};
  // The directory for files that are soon moved elsewhere; absolute.
  std::string temporaryDirectory = {};
};

}  // namespace tonewerk
