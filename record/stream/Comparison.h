#pragma once

#include <string>

#include "record/stream/Event.h"
#include "record/stream/Item.h"

namespace record {

/// Whether an event's items are the ones that came. What is beside them and what was lent is compared where it is.
bool isSame(const Event& event, const ItemWriter& came);

/// An event's items, those that are beside them too.
std::string wholePayload(const Event& event);

}  // namespace record
