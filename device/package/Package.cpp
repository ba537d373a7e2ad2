#include "device/package/Package.h"

#include <archive.h>
#include <archive_entry.h>

#include <exception>
#include <memory>

#include "device/DeviceErrors.h"
#include "device/package/PackageSource.h"
#include "device/package/UTF8Locale.h"
#include "platform/TextTable.h"
#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr std::uint64_t maximumManifestBytes = std::uint64_t{16} << 20;

platform::ErrorRef packageError(std::string description, platform::ErrorRef underlying = nullptr) {
  return platform::makeError("Package", 1, std::move(description), std::move(underlying));
}

/// For messages: the name with everything unprintable, and all beyond a line's length, left out.
std::string shown(std::string_view name) {
  std::string text;
  for (char c : name.substr(0, 120)) text += static_cast<unsigned char>(c) < 0x20 || c == 0x7f ? '?' : c;
  return '"' + text + (name.size() > 120 ? "…\"" : "\"");
}

std::string folded(std::string_view name) {
  std::string result(name);
  for (char& c : result) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return result;
}

bool endsWith(std::string_view text, std::string_view end) {
  return text.size() >= end.size() && text.substr(text.size() - end.size()) == end;
}

/// One package on its way into a directory.
class Unpacking {
 public:
  Unpacking(FileTree& files, std::string_view packagePath, const std::string& directory, const PackageLimits& limits)
      : _files(files), _source(files), _packagePath(packagePath), _directory(directory), _limits(limits) {}

  std::optional<UnpackedPackage> run(platform::ErrorRef* error) {
    if (!_source.open(_packagePath, &_reason) || !unpackEntries() || !readManifest()) {
      platform::setError(error, packageError("package " + shown(_packagePath) + ": " +
                                                 (_reason ? _reason->description() : std::string("unreadable")),
                                             _reason));
      return std::nullopt;
    }
    platform::setError(error, nullptr);
    return std::move(_result);
  }

 private:
  bool refuse(std::string_view name, const std::string& why) {
    return device::fail(&_reason, packageError("entry " + shown(name) + ": " + why));
  }

  bool unpackEntries() {
    std::size_t count = 0;
    struct archive_entry* entry = nullptr;
    for (;;) {
      int status = _source.next(&entry);
      if (status == ARCHIVE_EOF) break;
      if (status != ARCHIVE_OK)
        return device::fail(&_reason, packageError("damaged after entry " + shown(_last) + ": " + _source.reason()));
      if (++count > _limits.entries)
        return device::fail(&_reason, packageError("more than " + std::to_string(_limits.entries) + " entries"));
      if (!unpack(entry)) return false;
    }
    return count > 0 || device::fail(&_reason, packageError("no entries"));
  }

  bool unpack(struct archive_entry* entry) {
    const char* text = archive_entry_pathname_utf8(entry);
    if (!text) text = archive_entry_pathname(entry);
    if (!text) return refuse(_last, "the entry after it has a name that cannot be read");
    std::string name = text;
    _last = name;
    if (archive_entry_is_encrypted(entry)) return refuse(name, "encrypted");
    if (archive_entry_hardlink(entry)) return refuse(name, "a link");
    auto type = archive_entry_filetype(entry);
    bool isDirectory = type == AE_IFDIR;
    if (type == AE_IFLNK) return refuse(name, "a link");
    if (!isDirectory && type != AE_IFREG) return refuse(name, "neither a file nor a folder");
    if (isDirectory && endsWith(name, "/")) name.pop_back();
    if (!checkName(name) || !enterParents(name)) return false;
    if (isDirectory) return enterDirectory(name);
    return writeFile(entry, name);
  }

  bool checkName(const std::string& name) {
    if (name.empty()) return refuse(name, "no name");
    if (name.size() > _limits.nameLength) return refuse(name, "name too long");
    if (name[0] == '/') return refuse(name, "an absolute name");
    if (name.find('\\') != std::string::npos) return refuse(name, "a backslash in the name");
    std::size_t depth = 0;
    for (std::size_t begin = 0; begin <= name.size();) {
      auto end = std::min(name.find('/', begin), name.size());
      auto component = std::string_view(name).substr(begin, end - begin);
      if (component.empty() || component == "." || component == "..") return refuse(name, "not a plain name");
      if (component.size() > _limits.componentLength) return refuse(name, "name too long");
      for (char c : component) {
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) return refuse(name, "a control character in the name");
      }
      if (++depth > _limits.depth) return refuse(name, "too deep");
      begin = end + 1;
    }
    return true;
  }

  /// The directories above an entry, the ".app" folder first, whether or not the archive lists them.
  bool enterParents(const std::string& name) {
    auto slash = name.find('/');
    std::string top = name.substr(0, slash);
    if (_result.bundle.empty()) {
      if (!endsWith(top, ".app") || top.size() == 4) return refuse(name, "not in an \".app\" folder");
      _result.bundle = top;
    } else if (top != _result.bundle) {
      return refuse(name, "outside the folder " + shown(_result.bundle));
    }
    for (; slash != std::string::npos; slash = name.find('/', slash + 1)) {
      if (!enterDirectory(name.substr(0, slash))) return false;
    }
    return true;
  }

  bool enterDirectory(const std::string& name) {
    auto [found, isNew] = _seen.try_emplace(folded(name), Seen{name, true});
    if (!isNew) {
      if (found->second.name != name)
        return refuse(name, "differs from " + shown(found->second.name) + " in case only");
      if (!found->second.isDirectory) return refuse(name, "a file and a folder of that name");
      return true;
    }
    if (!hasRoom()) return false;
    return _files.createDirectory(_directory + '/' + name, false, {}, &_reason);
  }

  /// Folders count even if the archive does not list them: one long name can bring many of them.
  bool hasRoom() {
    return _seen.size() <= _limits.entries ||
           device::fail(&_reason, packageError("more than " + std::to_string(_limits.entries) + " files and folders"));
  }

  bool writeFile(struct archive_entry* entry, const std::string& name) {
    auto [found, isNew] = _seen.try_emplace(folded(name), Seen{name, false});
    if (!isNew) {
      if (found->second.name != name)
        return refuse(name, "differs from " + shown(found->second.name) + " in case only");
      return refuse(name, "listed twice");
    }
    if (!hasRoom()) return false;
    if (name == _result.bundle) return refuse(name, "a file where the folder should be");
    bool executable = (archive_entry_mode(entry) & 0100) != 0;
    auto writer = _files.createNew(_directory + '/' + name, executable, &_reason);
    if (!writer) return false;
    for (;;) {
      const void* data = nullptr;
      std::size_t size = 0;
      la_int64_t offset = 0;
      int status = archive_read_data_block(_source.archive(), &data, &size, &offset);
      if (status == ARCHIVE_EOF) break;
      if (status != ARCHIVE_OK) return refuse(name, "damaged: " + _source.reason());
      if (size > _limits.totalBytes - _result.bytes)
        return refuse(name, "more than " + std::to_string(_limits.totalBytes) + " bytes in all");
      _result.bytes += size;
      if (!writer->write({static_cast<const char*>(data), size}, &_reason)) return false;
    }
    return writer->close(false, &_reason);
  }

  bool readManifest() {
    std::string name = _result.bundle + "/Info.plist";
    std::string path = _directory + '/' + name;
    auto attributes = _files.attributesOfItem(path);
    if (!attributes || attributes->isDirectory)
      return device::fail(&_reason, packageError("no manifest " + shown(name)));
    if (attributes->size > maximumManifestBytes) return refuse(name, "too large for a manifest");
    auto bytes = _files.readFile(path, &_reason);
    if (!bytes) return false;
    platform::ErrorRef why;
    _result.manifest = plist::read(std::move(*bytes), &why);
    if (!_result.manifest.dictionary())
      return refuse(name, why ? "not a property list: " + why->description() : "not a dictionary");
    auto identifier = (*_result.manifest.dictionary())["KBBundleIdentifier"].string();
    if (!identifier || identifier->empty()) return refuse(name, "no \"KBBundleIdentifier\"");
    _result.identifier = std::string(*identifier);
    return true;
  }

  struct Seen {
    std::string name;
    bool isDirectory;
  };

  FileTree& _files;
  PackageSource _source;
  std::string _packagePath;
  std::string _directory;
  PackageLimits _limits;
  platform::TextMap<Seen> _seen;  // by name without case
  std::string _last;              // name of the entry met last
  UnpackedPackage _result;
  platform::ErrorRef _reason;
};

}  // namespace

std::optional<UnpackedPackage> unpackPackage(FileTree& files, std::string_view packagePath,
                                             const std::string& directory, const PackageLimits& limits,
                                             platform::ErrorRef* error) {
  try {
    // libarchive cannot give a name that the thread's locale has no characters for.
    const UTF8Locale utf8;
    return Unpacking(files, packagePath, directory, limits).run(error);
  } catch (const std::exception& exception) {
    platform::setError(error, packageError("package " + shown(packagePath) + ": " + exception.what()));
    return std::nullopt;
  }
}

}  // namespace device
