/// Loaded before a program: the threads and the memory that it cannot have. `SCARCE_THREADS=3` lets the third thread
/// fail to start, and all after it; `SCARCE_MEMORY=3` does the same with allocations, `SCARCE_MEMORY=3!` with the third
/// alone; `SCARCE_LARGEST=3` lets every allocation of more than three bytes fail. `SCARCE_COUNT=FILE` writes the number
/// of allocations when the program ends. What libraries allocate before `main` does not count: some of them end the
/// process then. `SCARCE_TIME=3` sets the clock to two and a half seconds before 1970.

#include <dlfcn.h>
#include <fcntl.h>
#include <pthread.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>

extern "C" {

// The C library's own names.
// NOLINTBEGIN(bugprone-reserved-identifier)
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* block, std::size_t size);
// NOLINTEND(bugprone-reserved-identifier)

static std::atomic<bool> begun{false};
static std::atomic<unsigned long> threads{0};
static std::atomic<unsigned long> allocations{0};

/// What an environment's number says; 0 for none.
static unsigned long numberIn(const char* name, bool* once) {
  const char* text = getenv(name);
  if (!text) return 0;
  char* end = nullptr;
  unsigned long number = strtoul(text, &end, 10);
  *once = *end == '!';
  return number;
}

static bool failsAllocation(std::size_t size) {
  if (!begun) return false;
  static bool once = false, ignored = false;
  static const unsigned long limit = numberIn("SCARCE_MEMORY", &once);
  static const unsigned long largest = numberIn("SCARCE_LARGEST", &ignored);
  unsigned long number = ++allocations;
  bool isTooLarge = largest != 0 && size > largest;
  if (!isTooLarge && (limit == 0 || number < limit || (once && number > limit))) return false;
  errno = ENOMEM;
  return true;
}

void* malloc(std::size_t size) { return failsAllocation(size) ? nullptr : __libc_malloc(size); }
void* calloc(std::size_t count, std::size_t size) {
  return failsAllocation(count * size) ? nullptr : __libc_calloc(count, size);
}
void* realloc(void* block, std::size_t size) { return failsAllocation(size) ? nullptr : __libc_realloc(block, size); }

using Main = int (*)(int, char**, char**);
using Start = int (*)(Main, int, char**, void (*)(), void (*)(), void (*)(), void*);
static Main programsMain;

static int beginning(int count, char** arguments, char** environment) {
  begun = true;
  int code = programsMain(count, arguments, environment);
  begun = false;
  return code;
}

// NOLINTNEXTLINE(bugprone-reserved-identifier)
int __libc_start_main(Main program, int count, char** arguments, void (*init)(), void (*fini)(), void (*end)(),
                      void* stack) {
  programsMain = program;
  auto start = reinterpret_cast<Start>(dlsym(RTLD_NEXT, "__libc_start_main"));
  return start(beginning, count, arguments, init, fini, end, stack);
}

using Clock = int (*)(clockid_t, timespec*);

int clock_gettime(clockid_t clock, timespec* time) {
  static bool ignored = false;
  static const unsigned long before = numberIn("SCARCE_TIME", &ignored);
  static const auto read = reinterpret_cast<Clock>(dlsym(RTLD_NEXT, "clock_gettime"));
  int status = read(clock, time);
  if (before == 0 || clock != CLOCK_REALTIME || status != 0) return status;
  // Half a second, so that a second that is rounded the wrong way shows.
  *time = {-static_cast<time_t>(before), 500'000'000};
  return status;
}

using Create = int (*)(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);

int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*body)(void*), void* argument) {
  static bool once = false;
  static const unsigned long limit = numberIn("SCARCE_THREADS", &once);
  static const auto create = reinterpret_cast<Create>(dlsym(RTLD_NEXT, "pthread_create"));
  if (limit != 0 && ++threads >= limit) return EAGAIN;
  return create(thread, attributes, body, argument);
}

__attribute__((destructor)) static void writeCount() {
  const char* path = getenv("SCARCE_COUNT");
  int file = path ? open(path, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600) : -1;
  if (file < 0) return;
  dprintf(file, "%lu", allocations.load());
  close(file);
}

}  // extern "C"
