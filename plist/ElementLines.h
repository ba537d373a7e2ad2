#pragma once

#include <cstddef>
#include <vector>

#include "platform/Value.h"

namespace plist {

/// The line, counted from 1, on which each element of the outermost array of an XML document begins, or each key of its
/// outermost dictionary. Nothing for a binary document, and for one that `read` does not take.
std::vector<std::size_t> elementLines(platform::BytesView document);

}  // namespace plist
