#include "core/PropertyListFile.h"

#include <utility>

#include "platform/FileSystem.h"

namespace appsync {

using platform::Value;

Value readDictionary(const platform::Platform& platform, const std::optional<std::string>& path) {
  if (!path) return {};
  auto bytes = platform.fileSystem.readFile(*path);
  if (!bytes) return {};
  Value root = platform.propertyLists.propertyListWithData(std::move(*bytes));
  return root.dictionary() ? std::move(root) : Value();
}

Value readList(const platform::Platform& platform, std::string_view path, Value::Kind kind,
               platform::MessageFormat<> unparsable, platform::MessageFormat<> ofAnotherKind,
               platform::ErrorRef* error) {
  auto bytes = platform.fileSystem.readFile(path, error);
  if (!bytes || bytes->empty()) return {};
  Value root = platform.propertyLists.propertyListWithData(std::move(*bytes), error);
  if (root.kind() == kind) return root;
  if (root.isAbsent()) {
    sayError(platform, unparsable);
  } else {
    sayError(platform, ofAnotherKind);
  }
  return {};
}

bool writePropertyList(const platform::Platform& platform, const Value& value, platform::PropertyListFormat format,
                       std::string_view path) {
  auto bytes = platform.propertyLists.dataWithPropertyList(value, format);
  return bytes && platform.fileSystem.writeAtomically(path, *bytes);
}

bool writePropertyListAsXML(const platform::Platform& platform, const Value& value, std::string_view path) {
  auto bytes = platform.propertyLists.dataWithPropertyList(value, platform::PropertyListFormat::xml);
  if (!bytes) return writePropertyList(platform, value, platform::PropertyListFormat::binary, path);
  return platform.fileSystem.writeAtomically(path, *bytes);
}

const Value& entryOf(const Value& value, std::string_view key) {
  static const Value absent{};
  return value.dictionary() ? (*value.dictionary())[key] : absent;
}

std::optional<std::string> stringOf(const Value& value) {
  auto text = value.string();
  return text ? std::optional<std::string>(*text) : std::nullopt;
}

}  // namespace appsync
