#include "tsd/stopping/LastWords.h"

#include <malloc.h>
#include <unistd.h>

#include <csignal>
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

/// One heap for all threads, and large blocks by themselves: what one thread has given back the next one takes, so that
/// a list costs what it holds and not what it ever held.
static void shareOneHeap() {
#ifdef M_ARENA_MAX
  ::mallopt(M_ARENA_MAX, 1);
  ::mallopt(M_MMAP_THRESHOLD, 1 << 20);
  ::mallopt(M_TRIM_THRESHOLD, 4 << 20);  // an icon takes several hundred kilobytes, and the next one as much
#endif
}

/// Otherwise the C library looks whether the file has been exchanged whenever it is asked for a local time, which the
/// archive library does for each entry of a package.
static void readTimeZoneOnce() { ::setenv("TZ", ":/etc/localtime", 0); }

void prepareProcess() {
  // A reader that goes away must not end a sync in the middle, nor a file that may not grow: that is a full disk.
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  endWithMessageWithoutMemory();
  shareOneHeap();
  readTimeZoneOnce();
}

}  // namespace tsd
