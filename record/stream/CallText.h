#pragma once

#include <cstdint>
#include <deque>
#include <string>
#include <string_view>

#include "record/Operation.h"
#include "record/stream/Event.h"

namespace record {

/// One line for people of a call's arguments: the service, the operation, and each argument with its name.
std::string callLine(const OperationName& operation, std::string_view arguments);
/// ... of what it returned ...
std::string resultLine(const OperationName& operation, std::string_view result);
/// ... and of what it threw.
std::string throwLine(const OperationName& operation, std::string_view thrown);
/// That one of these that the event is.
std::string eventLine(EventKind kind, const OperationName& operation, std::string_view items);
/// One item as text. Long ones are cut; bytes that are no text are counted.
std::string itemText(std::string_view item);

OperationClass classOf(const OperationName& operation);
/// The numbers of the objects that are mentioned for the first time, in their order.
std::deque<std::uint64_t> newObjectsOf(const Event& event);

}  // namespace record
