// SPDX-License-Identifier: Apache-2.0
#include "client/ClientThread.h"

#include <csignal>

namespace tonewerk {
namespace {

thread_local bool isClientThread = false;

}  // namespace

bool ClientThread::start(const char* name, Function function, void* argument) {
  function_ = function;
  argument_ = argument;
  sigset_t all;
  sigset_t before;
  ::sigfillset(&all);
  // The new thread inherits the mask, so signals are blocked from its first instruction on.
  ::pthread_sigmask(SIG_SETMASK, &all, &before);
  isRunning_ = ::pthread_create(&thread_, nullptr, run, this) == 0;
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  if (isRunning_) ::pthread_setname_np(thread_, name);
  return isRunning_;
}

bool ClientThread::isCurrent() { return isClientThread; }

void ClientThread::becomeForked() { isClientThread = false; }

void* ClientThread::run(void* self) {
  isClientThread = true;
  const ClientThread& thread = *static_cast<ClientThread*>(self);
  thread.function_(thread.argument_);
  return nullptr;
}

}  // namespace tonewerk
