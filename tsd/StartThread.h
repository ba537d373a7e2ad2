#pragma once

#include <system_error>
#include <thread>
#include <utility>

#include "tsd/CommandError.h"

namespace tsd {

/// A thread that runs `body`. Throws a `CommandError` when the system has none left.
template <class Body>
std::thread startThread(Body&& body) {
  try {
    return std::thread(std::forward<Body>(body));
  } catch (const std::system_error& problem) {
    throw CommandError(std::string("a thread cannot be started: ") + problem.code().message());
  }
}

}  // namespace tsd
