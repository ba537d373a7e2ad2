#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "device/files/FileDescriptor.h"
#include "device/files/KeptFolders.h"
#include "device/files/StepWatch.h"

struct stat;

namespace device {

/// A file that is open for writing. The path is borrowed; `watch`, which may be null, is told of the steps.
struct FileInWriting {
  int descriptor;
  std::string_view path;
  StepWatch* watch;
};

/// A name in an open directory: where the resolver's walk from a root ended. No step of the walk, and nothing done at
/// the place, follows a link. The functions answer 0 or the system's error number: ELOOP for a link, EOPNOTSUPP for
/// what is neither a regular file nor a directory nor a link. Every change is a step that `watch` is told of.
class DiskPlace {
 public:
  /// The place of a path of the device below the root. All but the last name must be directories; with
  /// `makeDirectories` missing ones are made. The path is borrowed. `kept`, which may be null, has folders below the
  /// root that need not be looked for.
  static int find(const FileDescriptor& root, std::string_view path, bool makeDirectories, StepWatch* watch,
                  KeptFolders* kept, DiskPlace& place);

  bool isRoot() const { return _isRoot; }
  int directory() const { return _directory->get(); }
  const char* name() const { return _name.c_str(); }

  /// What is there: a regular file or a directory.
  int status(struct stat& status) const;
  /// 0 when a regular file may be put there: there is nothing now, or another regular file.
  int mayHoldFile() const;
  /// `status` is that of the file.
  int openFile(FileDescriptor& file, struct stat& status) const;
  int openDirectory(FileDescriptor& directory) const;
  /// Makes the entry's presence or absence durable.
  int syncDirectory() const;

  /// Makes the directory that the entry is in durable itself. Does nothing in the root.
  int syncDirectoryAbove() const;

  int makeDirectory() const;
  /// Makes a new file, open for writing; EEXIST if something is there.
  int createFile(bool executable, FileDescriptor& file) const;
  /// The target must be free.
  int moveTo(const DiskPlace& target) const;
  /// Sets its times to now.
  int touch() const;

  /// Puts a new file there, in place of an older one: filled under a temporary name in the same directory, then
  /// renamed. `fill` flushes what must be durable before that. On failure nothing has changed and the temporary
  /// file is gone.
  int replaceFile(const std::function<int(const FileInWriting& file)>& fill) const;
  /// With everything in it. Of a link, or anything else, the entry itself is removed.
  int remove() const;

 private:
  /// The path of the directory that the place is in.
  std::string_view directoryPath() const;
  /// Name by name.
  int walk(const FileDescriptor& root, const std::vector<std::string_view>& names, bool makeDirectories,
           FileDescriptor& directory) const;

  KeptFolders::Handle _directory;
  std::string _name;
  std::string_view _path;
  StepWatch* _watch = nullptr;
  bool _isRoot = false;
};

/// The names in a directory that is open for reading, from where it was read to; in no order.
int namesInDirectory(int directory, std::vector<std::string>& names);
/// Writes all of the bytes.
int writeWhole(const FileInWriting& file, std::string_view bytes);
int syncFile(const FileInWriting& file);
/// Makes an open directory's entries durable.
int syncDirectory(int directory, std::string_view path, StepWatch* watch);

}  // namespace device
