#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>

#include "platform/OBApplicationProxy.h"
#include "platform/TSAsset.h"
#include "record/stream/Item.h"

namespace record {

/// What an object of a service is for the plug-in while it is recorded or replayed: it knows its own number.
class Numbered {
 public:
  explicit Numbered(ObjectKind kind, std::uint64_t number, bool isNew) : _kind(kind), _number(number), _isNew(isNew) {}
  virtual ~Numbered() = default;

  ObjectKind kind() const { return _kind; }
  std::uint64_t number() const { return _number; }
  bool isNew() const { return _isNew; }
  /// The first mention says that it is the first.
  ObjectMention mention() const {
    return {_kind, _number, std::exchange(_isNew, false) ? ObjectMention::isNew : std::uint8_t{0}};
  }

 private:
  const ObjectKind _kind;
  const std::uint64_t _number;
  mutable bool _isNew;
};

/// The numbers of objects that are known by their addresses: those that no service has operations on, and those that
/// the plug-in makes. An object that goes loses its number, so that another one at its place gets a new one. Not
/// synchronised.
class Names {
 public:
  Names() = default;
  virtual ~Names() = default;
  Names(const Names&) = delete;
  Names& operator=(const Names&) = delete;

  /// A number that no object has had.
  virtual std::uint64_t newNumber(ObjectKind kind) = 0;
  /// Told of each asset that got a number because it was written.
  virtual void named(std::uint64_t /*number*/, const platform::TSAssetRef& /*asset*/) {}

  ObjectMention mention(ObjectKind kind, const void* address, const std::weak_ptr<const void>& owner);
  /// Of an object that is known already, or was until it went.
  std::optional<std::uint64_t> find(ObjectKind kind, const void* address) const;
  void set(ObjectKind kind, const void* address, const std::weak_ptr<const void>& owner, std::uint64_t number);

  void put(ItemWriter& items, const platform::TSAssetRef& asset);
  void put(ItemWriter& items, const platform::OBBundleProxyRef& proxy);
  /// Facts that came from the other side are known.
  void setFacts(const platform::TSAssetRef& asset);

 private:
  struct Key {
    const void* address;
    ObjectKind kind;
    friend bool operator==(const Key&, const Key&) = default;
  };
  struct Hash {
    std::size_t operator()(const Key& key) const noexcept {
      return std::hash<const void*>()(key.address) * 31 + static_cast<std::size_t>(key.kind);
    }
  };
  struct Entry {
    std::uint64_t number = 0;
    std::weak_ptr<const void> owner;
    std::string facts{};
  };

  std::pair<Entry*, bool> entryOf(ObjectKind kind, const void* address, const std::weak_ptr<const void>& owner);
  void sweep();

  std::unordered_map<Key, Entry, Hash> _entries;
  std::size_t _sweptAt = 256;
  std::string _facts;
};

}  // namespace record
