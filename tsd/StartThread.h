#pragma once

#include <system_error>
#include <thread>
#include <utility>

#include "tsd/CommandError.h"

namespace tsd {

/// What `start` answers, which starts threads. Throws a `CommandError` when the system has none left.
template <class Start>
auto startThreads(Start&& start) {
  try {
    return start();
  } catch (const std::system_error& problem) {
    throw CommandError(std::string("a thread cannot be started: ") + problem.code().message());
  }
}

/// A thread that runs `body`. Throws the same.
template <class Body>
std::thread startThread(Body&& body) {
  return startThreads([&] { return std::thread(std::forward<Body>(body)); });
}

}  // namespace tsd
