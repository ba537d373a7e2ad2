#pragma once

#include <string>

namespace bench {

/// The rows of how much memory it takes to edit a large list, each edit in a process of its own.
void printPeakMemoryRows();

/// What such a process does: the edit, on the files in the folder, after which it prints the bytes that it took at most
/// beyond what it had before. False when it is not one of the edits.
bool runEdit(const std::string& edit, const std::string& folder);

}  // namespace bench
