#pragma once

#include <concepts>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "platform/Error.h"
#include "platform/FileSystem.h"
#include "platform/IconRenderer.h"
#include "platform/StringSet.h"
#include "record/calls/Arguments.h"
#include "record/stream/Item.h"
#include "record/stream/Names.h"

namespace record {

/// How what the plug-in sees of an argument or an answer is written, by its type: the same while it is recorded and
/// while it is replayed.

inline void put(ItemWriter& items, Names&, bool value) { items.boolean(value); }
template <std::integral Integer>
requires(!std::is_same_v<Integer, bool>) void put(ItemWriter& items, Names&, Integer value) {
  if constexpr (std::is_signed_v<Integer>)
    items.signedNumber(value);
  else
    items.number(value);
}
template <class Enumeration>
requires std::is_enum_v<Enumeration>
void put(ItemWriter& items, Names&, Enumeration value) { items.number(static_cast<std::uint64_t>(value)); }
inline void put(ItemWriter& items, Names&, double value) { items.real(value); }
inline void put(ItemWriter& items, Names&, std::string_view text) { items.text(text); }
inline void put(ItemWriter& items, Names&, const std::string& text) { items.text(text); }
inline void put(ItemWriter& items, Names&, const platform::Value& value) { items.value(value); }
inline void put(ItemWriter& items, Names&, Deadline deadline) { items.signedNumber(deadline.nanoseconds); }
inline void put(ItemWriter& items, Names& names, const platform::TSAssetRef& asset) { names.put(items, asset); }
inline void put(ItemWriter& items, Names& names, const platform::OBBundleProxyRef& proxy) { names.put(items, proxy); }
inline void put(ItemWriter& items, Names& names, const platform::OBApplicationProxyRef& proxy) {
  names.put(items, platform::OBBundleProxyRef(proxy));
}

void put(ItemWriter& items, Names& names, const platform::ErrorRef& error);
void put(ItemWriter& items, Names& names, const platform::FileAttributes& attributes);
void put(ItemWriter& items, Names& names, const platform::StringSet& set);

/// Objects that nobody has operations on.
inline ObjectKind kindOf(const platform::KBURL*) { return ObjectKind::url; }
inline ObjectKind kindOf(const platform::KBBundle*) { return ObjectKind::bundle; }
inline ObjectKind kindOf(const platform::GYImage*) { return ObjectKind::image; }
template <class T>
requires requires(const T* object) { kindOf(object); }
void put(ItemWriter& items, Names& names, const std::shared_ptr<T>& object) {
  if (!object) return items.absent();
  items.object(names.mention(kindOf(object.get()), object.get(), object));
}

/// Objects of services. One that is not of this recording is written as what it is: unknown.
template <class T>
void putNumbered(ItemWriter& items, const T* object) {
  if (!object) return items.absent();
  if (const auto* numbered = dynamic_cast<const Numbered*>(object)) return items.object(numbered->mention());
  items.text("unknown");
}
template <class T>
requires(!requires(const T* object) { kindOf(object); } && std::is_polymorphic_v<T> &&
         !std::is_base_of_v<platform::OBBundleProxy, T>) void put(ItemWriter& items, Names&,
                                                                  const std::shared_ptr<T>& object) {
  putNumbered(items, object.get());
}
template <class T>
void put(ItemWriter& items, Names&, const std::unique_ptr<T>& object) {
  putNumbered(items, object.get());
}

template <class T>
void put(ItemWriter& items, Names& names, const std::optional<T>& value) {
  if (value)
    put(items, names, *value);
  else
    items.absent();
}
template <class T>
void put(ItemWriter& items, Names& names, const std::vector<T>& values) {
  const std::size_t begin = items.bytes().size();
  items.list(values.size());
  for (const auto& value : values) put(items, names, value);
  if (values.size() >= 16) items.packFrom(begin);
}

/// The plug-in's object when it has just been made; 0: it could not be.
struct NewClient {
  std::uint64_t number;
};
inline void put(ItemWriter& items, Names&, NewClient made) {
  if (made.number == 0) return items.absent();
  items.object({ObjectKind::client, made.number, ObjectMention::isNew});
}

/// Bytes, where a text would do as well but is none.
struct BytesArgument {
  platform::BytesView bytes;
  operator platform::BytesView() const { return bytes; }
};
inline void put(ItemWriter& items, Names&, BytesArgument argument) { items.data(argument.bytes); }

}  // namespace record
