// SPDX-License-Identifier: Apache-2.0
#include "platform/JournalPosition.h"

#include <utility>

namespace tonewerk {
namespace {

thread_local JournalPosition* innermost = nullptr;

}  // namespace

JournalPosition::Scope::Scope(JournalPosition& position) : outer_(std::exchange(innermost, &position)) {}

JournalPosition::Scope::~Scope() { innermost = outer_; }

JournalPosition JournalPosition::current() { return innermost == nullptr ? JournalPosition() : *innermost; }

JournalPosition::Row JournalPosition::nextRow() {
  if (innermost == nullptr || innermost->sequence_ == 0) return {};
  return {innermost->sequence_, ++innermost->rows_};
}

}  // namespace tonewerk
