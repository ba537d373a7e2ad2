#pragma once

#include <string>
#include <string_view>

#include "platform/Value.h"

namespace device {

/// What is being done where a list is used without one of its entries.
constexpr std::string_view readingAnEntry = "reading an entry";

/// What whoever reads this file of the device's passes over in silence, because it is not what the file is to hold;
/// empty when there is nothing.
std::string problemOfList(std::string_view path, const platform::Value& list);

/// The same of an entry, where the list is used without it.
std::string problemOfEntry(std::string_view path, const platform::Value& list);

/// What is passed over in silence in an app's store metadata: the first of the entries with a meaning that is of
/// another kind than it is to be; empty when there is none.
std::string problemOfStoreMetadata(const platform::Value& metadata);

/// Whether an empty file counts as none there.
bool maySeemMissing(std::string_view path);

}  // namespace device
