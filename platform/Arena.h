#pragma once

#include <array>
#include <cstddef>
#include <memory>
#include <vector>

#include "platform/Value.h"

namespace platform {

/// Memory for the containers and texts of one document. All of it is freed at once, with the arena.
///
/// Blocks given back are handed out again for the same size, so that a document which is edited for a long time
/// does not grow. The bytes a document was read from are kept, and texts that several values may point to are
/// never handed out again.
class Arena {
 public:
  Arena() noexcept = default;
  explicit Arena(Bytes input) noexcept : _input(std::move(input)) {}
  /// Values of this arena may also point into what `lent` keeps, which nobody changes. What is given back here is not
  /// handed out again: it may be of there.
  explicit Arena(std::shared_ptr<const void> lent) noexcept : _lent(std::move(lent)) {}
  Arena(const Arena&) = delete;
  Arena& operator=(const Arena&) = delete;

  BytesView input() const noexcept { return _input; }

  /// `size` bytes, aligned to 8.
  void* allocate(std::size_t size);
  /// Grows the block in place, if it is the one allocated last and there is room behind it.
  bool extend(void* block, std::size_t size, std::size_t newSize) noexcept;
  /// `size` as it was given to allocate() or extend(). Shared bytes are left alone.
  void recycle(const void* block, std::size_t size) noexcept;

  /// Bytes that several values may point to.
  char* allocateShared(std::size_t size);
  /// The last so many of the shared bytes that were allocated last are not needed after all.
  void giveBackShared(std::size_t size) noexcept;
  std::string_view copy(std::string_view bytes);

 private:
  static constexpr std::size_t firstChunk = 256;
  static constexpr std::size_t largestChunk = 64 * 1024;
  static constexpr std::size_t sizeClasses = 192;

  struct FreeBlock {
    FreeBlock* next;
  };
  struct SharedChunk {
    std::unique_ptr<char[]> bytes;
    std::size_t size;
  };

  bool isShared(const char* block) const noexcept;
  void* allocateChunk(std::size_t size);

  char* _next = _first;
  char* _end = _first + firstChunk;
  std::size_t _chunkSize = 4 * firstChunk;
  std::vector<std::unique_ptr<char[]>> _chunks;
  std::unique_ptr<std::array<FreeBlock*, sizeClasses>> _free;
  std::vector<SharedChunk> _shared;
  char* _sharedNext = nullptr;
  std::size_t _sharedLeft = 0;
  Bytes _input;
  std::shared_ptr<const void> _lent;
  alignas(8) char _first[firstChunk];
};

}  // namespace platform
