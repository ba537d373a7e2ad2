#pragma once

#include <exception>

#include "record/stream/Item.h"

namespace record {

/// Writes what is being handled: of an exception of the standard library what it says, of a lack of memory nothing, of
/// any other that it is one.
void putThrown(ItemWriter& items);
/// The same for a service that lets through what the plug-in threw inside of its call.
void putThrownByPlugin(ItemWriter& items);

/// Reads it. `own`: what the plug-in has thrown inside of the call, if it has.
std::exception_ptr takeThrown(ItemReader& items, const std::exception_ptr& own);

}  // namespace record
