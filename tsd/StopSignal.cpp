#include "tsd/StopSignal.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdint>

#include "tsd/CommandError.h"

namespace tsd {
namespace {

sigset_t stopSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGTERM);
  return signals;
}

}  // namespace

StopSignal::StopSignal() {
  sigset_t signals = stopSignals();
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  _signals = signalfd(-1, &signals, SFD_CLOEXEC);
  _end = eventfd(0, EFD_CLOEXEC);
  if (_signals < 0 || _end < 0) throw CommandError("the system has no descriptor left for signals");
  _watcher = std::thread([this] { watch(); });
}

StopSignal::~StopSignal() {
  std::uint64_t one = 1;
  while (::write(_end, &one, sizeof one) < 0 && errno == EINTR) {
  }
  _watcher.join();
  ::close(_signals);
  ::close(_end);
}

void StopSignal::watch() {
  while (true) {
    pollfd sources[] = {{_signals, POLLIN, 0}, {_end, POLLIN, 0}};
    if (::poll(sources, 2, -1) < 0) continue;
    if (sources[1].revents) return;
    signalfd_siginfo received{};
    if (::read(_signals, &received, sizeof received) != sizeof received) continue;
    std::lock_guard lock(_mutex);
    if (_finishes) continue;
    if (_requested.exchange(true)) _exit(static_cast<int>(ExitCode::cancelled));
    for (auto& told : _subscribers) told();
  }
}

void StopSignal::letFinish() {
  std::lock_guard lock(_mutex);
  _finishes = true;
}

StopSignal::Subscription::Subscription(StopSignal& signal, std::function<void()> told) : _signal(signal) {
  std::lock_guard lock(_signal._mutex);
  _place = _signal._subscribers.insert(_signal._subscribers.end(), std::move(told));
}

StopSignal::Subscription::~Subscription() {
  std::lock_guard lock(_signal._mutex);
  _signal._subscribers.erase(_place);
}

}  // namespace tsd
