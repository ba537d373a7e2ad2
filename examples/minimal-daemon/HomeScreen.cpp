#include "HomeScreen.h"

#include <cstdlib>
#include <cstring>

#include "plist/PropertyList.h"

namespace tiny {

using platform::Value;

namespace {

/// False for what is neither an identifier nor a page of them.
bool flatten(const Value& item, Value& order, bool mayBePage) {
  if (auto identifier = item.string()) {
    order.array()->append(*identifier);
    return true;
  }
  if (!mayBePage || !item.array()) return false;
  for (const Value& each : *item.array()) {
    if (!flatten(each, order, false)) return false;
  }
  return true;
}

}  // namespace

int HomeScreen::PNGetFlattenedIconState(Port, int, void** buffer, std::size_t* length) {
  *buffer = nullptr;
  *length = 0;
  platform::Mutex::Lock lock(_mutex);
  if (_order.array()->empty()) return 0;
  auto bytes = plist::writeXML(_order);
  if (!bytes) return 1;
  *buffer = std::malloc(bytes->size());
  if (!*buffer) return 1;
  *length = bytes->size();
  std::memcpy(*buffer, bytes->data(), bytes->size());
  return 0;
}

int HomeScreen::PNSetIconState(Port, platform::BytesView layout) {
  Value pages = plist::read(platform::Bytes(layout));
  Value order = Value::makeArray();
  if (!pages.array()) return 1;
  for (const Value& page : *pages.array()) {
    if (!flatten(page, order, true)) return 1;
  }
  platform::Mutex::Lock lock(_mutex);
  _order = std::move(order);
  return 0;
}

}  // namespace tiny
