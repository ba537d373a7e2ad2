#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "platform/Value.h"

namespace fuzz {

/// Inputs of about `size` bytes that would cost many times as much if anything were made whole for each place that
/// refers to it, or looked at again for each of its neighbours.
struct Shape {
  std::string name;
  platform::Bytes bytes;
};

/// Where a list's odd part stands: by itself, in an entry of a todo list, or in one of a restore list's apps.
enum class Place { bare, todoList, restoreList };
std::vector<Shape> binaryShapes(Place place, std::size_t size);
std::vector<Shape> xmlShapes(std::size_t size);
/// A zip archive with one file, that its table lists over and over.
Shape longTable(const platform::Bytes& archive, std::size_t size);

}  // namespace fuzz
