#pragma once

#include <string>

namespace tsd {

/// A file or folder of the host that is being made: under a name of its own beside the one that it is to have, until
/// it is put in its place whole. What is never put there is removed.
class NewItem {
 public:
  enum class Kind { file, folder };

  /// Makes it, empty. Throws a `CommandError` when that fails, and when something has that name already, unless it is
  /// to be replaced.
  NewItem(std::string path, Kind kind, bool replaces);
  ~NewItem();
  NewItem(const NewItem&) = delete;
  NewItem& operator=(const NewItem&) = delete;

  const std::string& path() const { return _path; }
  /// Where it lies until it is put in its place.
  const std::string& temporary() const { return _temporary; }
  /// Throws a `CommandError`, also when something has got that name meanwhile and is not to be replaced. Once.
  void putInPlace();

 private:
  void replaceWhatIsThere();

  const std::string _path;
  const Kind _kind;
  const bool _replaces;
  std::string _temporary;
};

}  // namespace tsd
