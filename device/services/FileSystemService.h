#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "device/files/FileTree.h"
#include "platform/FileSystem.h"

namespace device {

/// The device's files as the plug-in reaches them: a file tree behind the boundary, as the service "FileSystem".
class FileSystemService final : public platform::FileSystem {
 public:
  /// Told of every operation that failed, since callers may ignore failures silently: the operation, the path and the
  /// reason in one line. Not told of a failure that merely answers a question: that there is nothing to be looked at,
  /// read or removed. From any thread. May be null.
  using Failed = std::function<void(std::string_view operation, std::string_view path, std::string_view reason)>;

  FileSystemService(Boundary& boundary, FileTree& files, Failed failed)
      : _boundary(boundary), _files(files), _failed(std::move(failed)) {}

  bool removeItem(std::string_view path, platform::ErrorRef* error) override;
  bool createDirectory(std::string_view path, bool withIntermediateDirectories, const platform::Value& attributes,
                       platform::ErrorRef* error) override;
  bool moveItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool copyItem(std::string_view from, std::string_view to, platform::ErrorRef* error) override;
  bool fileExists(std::string_view path, bool* isDirectory) override;
  std::optional<platform::FileAttributes> attributesOfItem(std::string_view path, platform::ErrorRef* error) override;
  bool createFile(std::string_view path, platform::BytesView contents, const platform::Value& attributes) override;
  std::optional<platform::Bytes> readFile(std::string_view path, platform::ErrorRef* error) override;
  bool writeAtomically(std::string_view path, platform::BytesView contents, platform::ErrorRef* error,
                       platform::Durability durability) override;
  int utimes(std::string_view path, int& errorNumber) override;

 private:
  /// Runs one operation. `body` takes the error out-parameter of the file tree.
  template <class Body>
  auto run(const InjectionPoint& point, std::string_view path, platform::ErrorRef* error, CallArguments arguments,
           Body&& body);
  void tell(const char* operation, std::string_view path, const platform::ErrorRef& error, bool mayBeMissing) const;

  Boundary& _boundary;
  FileTree& _files;
  const Failed _failed;
};

}  // namespace device
