#pragma once

#include <map>
#include <string>

#include "platform/FileSystem.h"
#include "platform/Mutex.h"

namespace tiny {

/// A file system that lives as long as the process. Nothing is ever lost halfway, so every write is atomic.
class MemoryFiles final : public platform::FileSystem {
 public:
  bool removeItem(std::string_view path, platform::ErrorRef* error = nullptr) override;
  bool createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value& attributes,
                       platform::ErrorRef* error = nullptr) override;
  bool moveItem(std::string_view from, std::string_view to, platform::ErrorRef* error = nullptr) override;
  bool copyItem(std::string_view from, std::string_view to, platform::ErrorRef* error = nullptr) override;
  bool fileExists(std::string_view path, bool* isDirectory = nullptr) override;
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path,
                                                           platform::ErrorRef* error = nullptr) override;
  bool createFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes) override;
  std::optional<platform::Bytes> readFile(std::string_view path, platform::ErrorRef* error = nullptr) override;
  bool writeAtomically(std::string_view path, platform::BytesView contents, platform::ErrorRef* error = nullptr,
                       platform::Durability durability = platform::Durability::lasting) override;
  int utimes(std::string_view path, int& errorNumber) override;

 private:
  struct Item {
    bool isDirectory = true;
    platform::Bytes contents{};
  };
  using Items = std::map<std::string, Item, std::less<>>;  // by path, without the root

  // All with _mutex held.
  const Item* find(std::string_view path) const;
  /// 0 when an item may be put there, otherwise the error number.
  int checkPlace(std::string_view path) const;
  int write(std::string_view path, platform::BytesView contents);

  platform::Mutex _mutex;
  Items _items;  // guarded by _mutex
};

}  // namespace tiny
