#include "record/stream/Thrown.h"

#include <new>
#include <stdexcept>
#include <string>

#include "record/RecordingError.h"

namespace record {

void putThrown(ItemWriter& items) {
  try {
    throw;
  } catch (const std::bad_alloc&) {
    items.absent();
  } catch (const std::exception& exception) {
    items.text(exception.what());
  } catch (...) {
    items.boolean(false);
  }
}

void putThrownByPlugin(ItemWriter& items) { items.boolean(true); }

std::exception_ptr takeThrown(ItemReader& items, const std::exception_ptr& own) {
  // The first version wrote nothing at all of a lack of memory.
  if (items.atEnd() || items.takeAbsent()) return std::make_exception_ptr(std::bad_alloc());
  if (items.peek() == Tag::text) return std::make_exception_ptr(std::runtime_error(items.ownText()));
  if (!items.boolean()) return std::make_exception_ptr(0);
  if (!own) throw RecordingError("a service lets through what the plug-in has not thrown");
  return own;
}

}  // namespace record
