#include "platform/Arena.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <functional>
#include <new>

namespace platform {
namespace {

constexpr std::size_t fineLimit = 256;

struct SizeClass {
  std::size_t number;
  std::size_t size;
};

/// Multiples of 8 up to 256, then four steps per doubling: a block is at most a quarter larger than asked for.
SizeClass sizeClass(std::size_t size) {
  if (size <= fineLimit) {
    std::size_t units = std::max<std::size_t>(1, (size + 7) / 8);
    return {units - 1, units * 8};
  }
  int doubling = static_cast<int>(std::bit_width(size - 1)) - 9;
  std::size_t step = std::size_t{64} << doubling;
  std::size_t steps = (size + step - 1) / step;  // 5 to 8 of them
  return {32 + static_cast<std::size_t>(doubling) * 4 + steps - 5, steps * step};
}

}  // namespace

void* Arena::allocate(std::size_t size) {
  SizeClass wanted = sizeClass(size);
  if (_free && wanted.number < sizeClasses) {
    if (FreeBlock* block = (*_free)[wanted.number]) {
      (*_free)[wanted.number] = block->next;
      return block;
    }
  }
  if (wanted.size > static_cast<std::size_t>(_end - _next)) return allocateChunk(wanted.size);
  void* block = _next;
  _next += wanted.size;
  return block;
}

void* Arena::allocateChunk(std::size_t size) {
  // A large block gets a chunk of its own, so that the rest of the present one is not lost.
  bool large = size > _chunkSize / 2;
  auto chunk = std::make_unique_for_overwrite<char[]>(large ? size : _chunkSize);
  char* block = chunk.get();
  _chunks.push_back(std::move(chunk));
  if (large) return block;
  _next = block + size;
  _end = block + _chunkSize;
  _chunkSize = std::min(_chunkSize * 2, largestChunk);
  return block;
}

bool Arena::extend(void* block, std::size_t size, std::size_t newSize) noexcept {
  if (!block) return false;
  char* start = static_cast<char*>(block);
  std::size_t wanted = sizeClass(newSize).size;
  if (start + sizeClass(size).size != _next || wanted > static_cast<std::size_t>(_end - start)) return false;
  _next = start + wanted;
  return true;
}

void Arena::recycle(const void* block, std::size_t size) noexcept {
  const char* start = static_cast<const char*>(block);
  if (size == 0 || _lent || isShared(start)) return;
  SizeClass given = sizeClass(size);
  if (start + given.size == _next) {
    _next -= given.size;
    return;
  }
  if (given.number >= sizeClasses) return;
  if (!_free) _free.reset(new (std::nothrow) std::array<FreeBlock*, sizeClasses>{});
  if (!_free) return;
  FreeBlock*& head = (*_free)[given.number];
  head = ::new (const_cast<char*>(start)) FreeBlock{head};
}

bool Arena::isShared(const char* block) const noexcept {
  auto within = [block](const char* start, std::size_t size) {
    return !std::less<>()(block, start) && std::less<>()(block, start + size);
  };
  if (within(_input.data(), _input.size())) return true;
  return std::any_of(_shared.begin(), _shared.end(),
                     [&](const SharedChunk& chunk) { return within(chunk.bytes.get(), chunk.size); });
}

char* Arena::allocateShared(std::size_t size) {
  if (size > _sharedLeft || !_sharedNext) {
    // Doubling keeps the number of chunks, which isShared() goes through, small.
    std::size_t chunk = std::max(size, _shared.empty() ? firstChunk : _shared.back().size * 2);
    _shared.push_back({std::make_unique_for_overwrite<char[]>(chunk), chunk});
    _sharedNext = _shared.back().bytes.get();
    _sharedLeft = chunk;
  }
  char* bytes = _sharedNext;
  _sharedNext += size;
  _sharedLeft -= size;
  return bytes;
}

void Arena::giveBackShared(std::size_t size) noexcept {
  _sharedNext -= size;
  _sharedLeft += size;
}

std::string_view Arena::copy(std::string_view bytes) {
  if (bytes.empty()) return {"", 0};
  char* block = static_cast<char*>(allocate(bytes.size()));
  std::memcpy(block, bytes.data(), bytes.size());
  return {block, bytes.size()};
}

}  // namespace platform
