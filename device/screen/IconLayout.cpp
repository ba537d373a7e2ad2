#include "device/screen/IconLayout.h"

#include <algorithm>

namespace device {

LayoutProblem problemOfLayout(const platform::Value& layout) {
  const auto* entries = layout.array();
  if (!entries) return {0, "it is not an array"};
  auto isIdentifier = [](const platform::Value& value) { return !value.string().value_or("").empty(); };
  const bool isPaged = !entries->empty() && (*entries)[0].array();
  for (std::size_t place = 0; place < entries->size(); ++place) {
    const platform::Value& entry = (*entries)[place];
    const auto* page = entry.array();
    const bool isTaken = isPaged ? page && std::all_of(page->begin(), page->end(), isIdentifier) : isIdentifier(entry);
    if (isTaken) continue;
    return {place,
            "entry " + std::to_string(place + 1) + (isPaged ? " is no page of identifiers" : " is no identifier")};
  }
  return {};
}

}  // namespace device
