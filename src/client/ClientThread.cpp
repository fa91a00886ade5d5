// SPDX-License-Identifier: Apache-2.0
#include "client/ClientThread.h"

#include <csignal>

namespace tonewerk {

bool ClientThread::start(const char* name, Function function, void* argument) {
  function_ = function;
  argument_ = argument;
  sigset_t all;
  sigset_t before;
  ::sigfillset(&all);
  // The new thread has them blocked from its first instruction on.
  ::pthread_sigmask(SIG_SETMASK, &all, &before);
  isRunning_ = ::pthread_create(&thread_, nullptr, run, this) == 0;
  ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
  if (isRunning_) ::pthread_setname_np(thread_, name);
  return isRunning_;
}

void ClientThread::join() {
  if (!isRunning_) return;
  ::pthread_join(thread_, nullptr);
  isRunning_ = false;
}

void* ClientThread::run(void* self) {
  const ClientThread& thread = *static_cast<ClientThread*>(self);
  thread.function_(thread.argument_);
  return nullptr;
}

}  // namespace tonewerk
