#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "core/Say.h"
#include "platform/Error.h"
#include "platform/Platform.h"
#include "platform/PropertyListSerialization.h"
#include "platform/Value.h"

namespace appsync {

/// The dictionary in the property list at the path; absent when there is no path, the file cannot be read, or it holds
/// anything else.
platform::Value readDictionary(const platform::Platform& platform, const std::optional<std::string>& path);

/// What the list files at the path hold: a value of the kind; absent without a message when there is no byte to read.
/// `unparsable` and `ofAnotherKind` are the messages about what cannot be used. The error is the file layer's or the
/// reader's.
platform::Value readList(const platform::Platform& platform, std::string_view path, platform::Value::Kind kind,
                         platform::MessageFormat<> unparsable, platform::MessageFormat<> ofAnotherKind,
                         platform::ErrorRef* error);

/// Serialises the value and replaces the file. False when either fails; the old file is then as it was.
bool writePropertyList(const platform::Platform& platform, const platform::Value& value,
                       platform::PropertyListFormat format, std::string_view path);
/// The same in XML. What XML cannot carry, such as a control character, is written in binary rather than not at all;
/// whoever reads such a file takes either.
bool writePropertyListAsXML(const platform::Platform& platform, const platform::Value& value, std::string_view path);

/// The entry of a dictionary value; absent when there is none, or the value is of any other kind.
const platform::Value& entryOf(const platform::Value& value, std::string_view key);

/// An owned copy of a string value; nothing for any other kind.
std::optional<std::string> stringOf(const platform::Value& value);

}  // namespace appsync
