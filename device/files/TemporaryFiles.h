#pragma once

#include <cstddef>

#include "device/files/FileTree.h"

namespace device {

/// Removes what an atomic write or the removal of a directory that never came to its end left behind, in every
/// directory of the tree. Answers how many files and directories went; one that cannot be removed stays until the next
/// time.
std::size_t removeTemporaryFiles(FileTree& files);

}  // namespace device
