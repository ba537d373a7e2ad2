#include "record/stream/Codec.h"

namespace record {

void put(ItemWriter& items, Names& names, const platform::ErrorRef& error) {
  if (!error) return items.absent();
  items.error();
  items.text(error->domain());
  items.signedNumber(error->code());
  items.text(error->description());
  put(items, names, error->underlying());
}

void put(ItemWriter& items, Names&, const platform::FileAttributes& attributes) {
  items.dictionary(2);
  items.text("isDirectory");
  items.boolean(attributes.isDirectory);
  items.text("size");
  items.number(attributes.size);
}

void put(ItemWriter& items, Names& names, const platform::StringSet& set) { put(items, names, set.members()); }

}  // namespace record
