#pragma once

#include <cstdint>
#include <string>
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
  std::uint64_t accountNumber;  // the same, as the store counts
  bool isAutoDownload = false;
  platform::Bytes icon;  // PNG

  /// "Info.plist" of its bundle.
  platform::Value manifest() const;
  /// "HarluneMetadata.plist".
  platform::Value storeMetadata() const;
};

/// `count` apps with names, identifiers and icons of their own.
std::vector<SampleApp> makeSampleApps(std::size_t count, SampleNumbers& numbers);

/// The name of the icon file in a sample app's bundle.
constexpr const char* sampleIconName = "AppIcon.png";

}  // namespace tsd
