#include "tsd/stopping/StopSignal.h"

#include <poll.h>
#include <pthread.h>
#include <sys/eventfd.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <utility>

#include "tsd/CommandError.h"
#include "tsd/StartThread.h"

namespace tsd {

using Lock = platform::Mutex::Lock;

namespace {

sigset_t stopSignals() {
  sigset_t signals;
  sigemptyset(&signals);
  sigaddset(&signals, SIGINT);
  sigaddset(&signals, SIGTERM);
  return signals;
}

void setAction(void (*action)(int)) {
  struct sigaction what {};
  what.sa_handler = action;
  ::sigaction(SIGINT, &what, nullptr);
  ::sigaction(SIGTERM, &what, nullptr);
}

}  // namespace

StopSignal::StopSignal() {
  sigset_t signals = stopSignals();
  pthread_sigmask(SIG_BLOCK, &signals, nullptr);
  _signals = device::FileDescriptor(::signalfd(-1, &signals, SFD_CLOEXEC));
  _end = device::FileDescriptor(::eventfd(0, EFD_CLOEXEC));
  if (!_signals.isOpen() || !_end.isOpen()) throw CommandError("the system has no descriptor left for signals");
  _watcher = startThread([this] { watch(); });
}

StopSignal::~StopSignal() {
  std::uint64_t one = 1;
  while (::write(_end.get(), &one, sizeof one) < 0 && errno == EINTR) {
  }
  _watcher.join();
}

void StopSignal::watch() {
  while (true) {
    pollfd sources[] = {{_end.get(), POLLIN, 0}, {_signals.get(), POLLIN, 0}};
    if (::poll(sources, _requested ? 1 : 2, -1) < 0) continue;
    if (sources[0].revents) return;
    if (!takeRequest()) continue;
    // From here on this thread takes the next signal, also while it waits for a terminal that takes no more.
    sigset_t signals = stopSignals();
    pthread_sigmask(SIG_UNBLOCK, &signals, nullptr);
    Lock lock(_mutex);
    _requested = true;
    for (auto& told : _subscribers) told();
  }
}

bool StopSignal::takeRequest() {
  signalfd_siginfo received{};
  if (::read(_signals.get(), &received, sizeof received) != sizeof received) return false;
  Lock lock(_mutex);
  if (_finishes) return false;
  setAction([](int) { _exit(static_cast<int>(ExitCode::cancelled)); });
  return true;
}

void StopSignal::letFinish() {
  Lock lock(_mutex);
  _finishes = true;
  setAction(SIG_IGN);
}

StopSignal::Subscription::Subscription(StopSignal& signal, std::function<void()> told) : _signal(signal) {
  Lock lock(_signal._mutex);
  _place = _signal._subscribers.insert(_signal._subscribers.end(), std::move(told));
  if (_signal._requested) (*_place)();
}

StopSignal::Subscription::~Subscription() {
  Lock lock(_signal._mutex);
  _signal._subscribers.erase(_place);
}

}  // namespace tsd
