// SPDX-License-Identifier: Apache-2.0
#include "JournalMessages.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <chrono>
#include <cstdint>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string_view>
#include <sys/socket.h>
#include <systemd/sd-journal.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/descriptors/UnixAddress.h"
#include "values/Value.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kTimeout{60};
constexpr std::uint64_t kWaitMicroseconds = 100'000;

// Names of fields have upper-case letters only.
std::string fieldName(std::string_view key) {
  std::string name(key);
  std::transform(name.begin(), name.end(), name.begin(),
                 [](unsigned char letter) { return static_cast<char>(std::toupper(letter)); });
  return name;
}

void appendField(std::string& datagram, std::string_view key, const Value& value) {
  datagram.append(fieldName(key)).append("=").append(value.text()).append("\n");
}

[[noreturn]] void fail(const char* what, int error) {
  throw std::runtime_error(std::string(what) + ": " + std::strerror(error));
}

struct CloseJournal {
  void operator()(sd_journal* journal) const { sd_journal_close(journal); }
};

// Reads every field of the current entry. True for an entry of the benchmark.
bool readEntry(sd_journal* journal) {
  const void* data = nullptr;
  std::size_t size = 0;
  bool isOurs = false;
  while (sd_journal_enumerate_data(journal, &data, &size) > 0) {
    isOurs =
        isOurs || std::string_view(static_cast<const char*>(data), size).starts_with(JournalMessages::kField);
  }
  return isOurs;
}

}  // namespace

JournalMessages::JournalMessages(const ClientMessagePlan& plan) {
  eachClientMessage(plan, [&](const IngestMessages::Address& address, const ValueMap& payload, bool) {
    std::string datagram;
    appendField(datagram, "session", Value(address.reporterID));
    appendField(datagram, "category", Value(address.category));
    appendField(datagram, "type", Value(address.type));
    for (const ValueMapEntry& entry : payload) appendField(datagram, entry.key.view(), entry.value);
    datagrams_.push_back(std::move(datagram));
  });
}

void JournalMessages::send(const std::string& socketPath, std::size_t count) const {
  const std::optional<sockaddr_un> address = unixAddressOf(socketPath);
  const FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!address || ::connect(socket.get(), generic(*address), sizeof(*address)) != 0) {
    fail("cannot connect to the journal", errno);
  }
  for (std::size_t at = 0; at < count; ++at) {
    const std::string& datagram = datagrams_[at % datagrams_.size()];
    if (::send(socket.get(), datagram.data(), datagram.size(), MSG_NOSIGNAL) < 0) fail("send", errno);
  }
}

void followJournal(const std::string& filesDirectory, std::size_t count) {
  sd_journal* opened = nullptr;
  const int error = sd_journal_open_directory(&opened, filesDirectory.c_str(), 0);
  if (error < 0) fail("cannot open the journal", -error);
  const std::unique_ptr<sd_journal, CloseJournal> journal(opened);
  const auto deadline = std::chrono::steady_clock::now() + kTimeout;
  for (std::size_t read = 0; read < count;) {
    if (sd_journal_next(opened) > 0) {
      if (readEntry(opened)) ++read;
    } else if (std::chrono::steady_clock::now() > deadline) {
      throw std::runtime_error("the journal has " + std::to_string(read) + " messages, not " +
                               std::to_string(count));
    } else {
      sd_journal_wait(opened, kWaitMicroseconds);
    }
  }
}

}  // namespace tonewerk
