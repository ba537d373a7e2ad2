#include "tests/FailingMemory.h"

#include <link.h>
#include <unwind.h>

#include <cstdint>
#include <cstdlib>
#include <new>
#include <stdexcept>
#include <string_view>

namespace tests {
namespace {

/// Where the code of a loaded file lies.
struct Code {
  std::uintptr_t begin = 0;
  std::uintptr_t end = 0;

  bool holds(std::uintptr_t address) const { return begin <= address && address < end; }
};

Code codeOf(const dl_phdr_info& file) {
  Code code;
  for (int i = 0; i < file.dlpi_phnum; ++i) {
    const auto& segment = file.dlpi_phdr[i];
    if (segment.p_type == PT_LOAD && (segment.p_flags & PF_X)) {
      code.begin = file.dlpi_addr + segment.p_vaddr;
      code.end = code.begin + segment.p_memsz;
    }
  }
  return code;
}

struct State {
  bool armed;
  bool onwards;
  std::size_t nth;
  std::size_t seen;
};
constinit thread_local State state{};
constinit Code plugin{};
constinit Code program{};

void findCode() {
  dl_iterate_phdr(
      [](dl_phdr_info* file, std::size_t, void*) {
        const std::string_view name = file->dlpi_name;
        if (name.empty() && program.end == 0) program = codeOf(*file);
        if (name == SHIPPED_PLUGIN) plugin = codeOf(*file);
        return 0;
      },
      nullptr);
  if (plugin.end == 0) throw std::logic_error("the plug-in is not loaded");
}

}  // namespace

// The frames of these functions are the first of every walk; they are known by their section.
#define IN_OWN_SECTION __attribute__((noinline, section("failing_memory")))
// The linker's names for where the section lies.
extern "C" const char sectionBegin[] __asm__("__start_failing_memory");
extern "C" const char sectionEnd[] __asm__("__stop_failing_memory");

/// Whether the innermost code that is the plug-in's or the program's, with the standard library between, is the
/// plug-in's.
IN_OWN_SECTION bool pluginAllocates() {
  bool found = false;
  _Unwind_Backtrace(
      [](_Unwind_Context* frame, void* answer) {
        const auto address = static_cast<std::uintptr_t>(_Unwind_GetIP(frame));
        const Code own{reinterpret_cast<std::uintptr_t>(sectionBegin), reinterpret_cast<std::uintptr_t>(sectionEnd)};
        if (own.holds(address)) return _URC_NO_REASON;
        *static_cast<bool*>(answer) = plugin.holds(address);
        return plugin.holds(address) || program.holds(address) ? _URC_END_OF_STACK : _URC_NO_REASON;
      },
      &found);
  return found;
}

IN_OWN_SECTION bool allocationFails() {
  if (!state.armed || !pluginAllocates()) return false;
  ++state.seen;
  return state.seen == state.nth || (state.onwards && state.seen > state.nth);
}

/// Null when it fails.
IN_OWN_SECTION void* tryToAllocate(std::size_t size) noexcept {
  return allocationFails() ? nullptr : std::malloc(size == 0 ? 1 : size);
}

IN_OWN_SECTION void* allocate(std::size_t size) {
  void* memory = tryToAllocate(size);
  if (!memory) throw std::bad_alloc();
  return memory;
}

FailingMemory::FailingMemory(std::size_t nth, Lasts lasts) {
  findCode();
  state = {true, lasts == Lasts::onwards, nth, 0};
}

FailingMemory::~FailingMemory() { state.armed = false; }

std::size_t FailingMemory::seen() const { return state.seen; }

}  // namespace tests

IN_OWN_SECTION void* operator new(std::size_t size) { return tests::allocate(size); }
IN_OWN_SECTION void* operator new[](std::size_t size) { return tests::allocate(size); }
IN_OWN_SECTION void* operator new(std::size_t size, const std::nothrow_t&) noexcept {
  return tests::tryToAllocate(size);
}
IN_OWN_SECTION void* operator new[](std::size_t size, const std::nothrow_t&) noexcept {
  return tests::tryToAllocate(size);
}
void operator delete(void* memory) noexcept { std::free(memory); }
void operator delete[](void* memory) noexcept { std::free(memory); }
void operator delete(void* memory, std::size_t) noexcept { std::free(memory); }
void operator delete[](void* memory, std::size_t) noexcept { std::free(memory); }
