#pragma once

#include "platform/Value.h"
#include "platform/ValueBuilder.h"
#include "record/stream/HeardTexts.h"
#include "record/stream/Item.h"

namespace record {

/// The value of a list that is told again and again with changes: what did not change is made once, and all the values
/// share it. `list` has to be one.
platform::Value sharedValue(const LargeText& list);

/// Reads one value into a document; its texts and bytes stay where they are.
platform::Value containedValue(platform::ValueBuilder& builder, ItemReader& items);

/// Whether two values are written as the same items: in their order, to the bit.
bool sameItems(const platform::Value& one, const platform::Value& other);

}  // namespace record
