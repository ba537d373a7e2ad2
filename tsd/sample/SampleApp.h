#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Value.h"

namespace tsd {

/// A reproducible stream of numbers: the same for the same seed on every machine.
class SampleNumbers {
 public:
  explicit SampleNumbers(std::uint64_t seed) : _state(seed * 0x9e3779b97f4a7c15u + 0x2545f4914f6cdd1du) {}
  std::uint64_t next();
  /// Below `count`, which is not 0.
  std::size_t below(std::size_t count) { return static_cast<std::size_t>(next() % count); }
  platform::Bytes bytes(std::size_t count);
  /// A date in this century, in whole seconds.
  platform::Date date();

 private:
  std::uint64_t _state;
};

/// An app that nobody ever wrote.
struct SampleApp {
  std::string id;
  std::string name;
  std::string version;
  std::string maker;
  std::string account;          // the store account under which it was obtained
  std::uint64_t accountNumber;  // the same account as the store numbers it
  bool isAutoDownload = false;
  platform::Bytes icon;  // PNG
  std::size_t files;     // of its package
  std::uint64_t seed;    // of the other values in its lists

  /// "Info.plist" of its bundle: 40 keys, most of which nobody reads, as with any app.
  platform::Value manifest() const;
  /// "HarluneMetadata.plist": 25 keys.
  platform::Value storeMetadata() const;
  /// Its entry in the todo list: 14 keys.
  platform::Value todoEntry(std::string_view operation) const;
};

/// `count` apps with names in several scripts, identifiers and icons of their own.
std::vector<SampleApp> makeSampleApps(std::size_t count, SampleNumbers& numbers);

/// The name of the icon file in a sample app's bundle.
constexpr const char* sampleIconName = "AppIcon.png";

}  // namespace tsd
