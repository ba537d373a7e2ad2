#pragma once

#include <cstddef>

#include "device/files/FileTree.h"

namespace device {

/// Removes what interrupted atomic writes and interrupted removals of directories left behind, in every directory of
/// the tree. Answers how many files and directories were removed; one that cannot be removed stays until the next
/// time.
std::size_t removeTemporaryFiles(FileTree& files);

}  // namespace device
