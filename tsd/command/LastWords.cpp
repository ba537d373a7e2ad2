#include "tsd/command/LastWords.h"

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <exception>
#include <new>

#include "tsd/ExitCode.h"

namespace tsd {
namespace {

std::terminate_handler usualEnd;

/// There may not even have been the memory for the exception that says so.
bool isMemoryGone() {
  auto problem = std::current_exception();
  if (!problem) {
    void* block = std::malloc(std::size_t{64} << 10);
    std::free(block);
    return !block;
  }
  try {
    std::rethrow_exception(problem);
  } catch (const std::bad_alloc&) {
    return true;
  } catch (...) {
    return false;
  }
}

[[noreturn]] void end() {
  if (!isMemoryGone()) usualEnd();
  sayWithoutMemory("out of memory");
  ::_exit(static_cast<int>(ExitCode::failed));
}

}  // namespace

void sayWithoutMemory(const char* text) {
  std::fputs("tsd: ", stderr);
  std::fputs(text, stderr);
  std::fputs("\n", stderr);
}

void endWithMessageWithoutMemory() { usualEnd = std::set_terminate(end); }

}  // namespace tsd
