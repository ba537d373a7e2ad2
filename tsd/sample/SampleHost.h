#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/Value.h"
#include "tsd/host/RestoreLists.h"
#include "tsd/sample/SampleApp.h"

namespace tsd {

struct SampleOptions {
  std::string host;
  std::size_t apps = 8;
  std::uint64_t packageSize = 262144;  // bytes of one package, about
  std::size_t restored = 5;            // apps in the restore list, as far as there are so many
  std::size_t files = 0;               // in one package, from 3 on; 0: drawn for each
  std::uint64_t seed = 1;
  bool demo = false;
};
/// What an entry of a sample's todo list is meant to show.
enum class SampleRole : std::uint8_t { install, older, damaged, badIdentifier, remove };
const char* nameOfRole(SampleRole role);

/// A host folder made up from a seed.
///
/// With `demo` the last entries of the todo list are special: a package that is damaged, an identifier that leaves its
/// folder, an app to be removed. The first app and the one to be removed then have packages of an older version in
/// "Packages/older", to be put on the device beforehand.
class SampleHost {
 public:
  struct Entry {
    SampleApp app;
    SampleRole role;
  };

  explicit SampleHost(const SampleOptions& options);

  /// Makes the folder and writes everything into it. Throws a `CommandError` that names the file.
  void write() const;

  const std::vector<Entry>& entries() const { return _entries; }
  /// The apps of the restore list: of each five two plain ones, one demoted by hand, one automatically, one in both
  /// lists.
  std::vector<const SampleApp*> restored() const;
  /// How the demoted-apps list has the app at that place of `restored()`.
  static Demotion demotionAt(std::size_t place) {
    return {place % 5 == 2 || place % 5 == 4, place % 5 == 3 || place % 5 == 4};
  }

 private:
  void writeTodoList() const;
  void writeIconLayout() const;
  void writeAppFolder(const SampleApp& app, bool binary) const;
  void writePackages() const;
  void writeRestoreLists() const;

  SampleOptions _options;
  std::vector<Entry> _entries;
  std::vector<std::string> _layout;  // identifiers in home-screen order
  platform::Bytes _rights;           // what rights data are cut from
};

}  // namespace tsd
