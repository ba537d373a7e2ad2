#include "platform/Message.h"

#include <algorithm>
#include <cstdio>

namespace platform {

void appendText(std::string& out, const StringSet& set) {
  auto members = set.members();
  std::sort(members.begin(), members.end());
  out += '{';
  appendText(out, members);
  out += '}';
}

static void appendArgument(std::string& out, ConversionKind kind, const MessageArgument& argument) {
  switch (kind) {
    case ConversionKind::string:
    case ConversionKind::character:
      out += argument.text;
      break;
    case ConversionKind::integer:
      out += argument.negative ? std::to_string(static_cast<std::int64_t>(argument.number))
                               : std::to_string(argument.number);
      break;
    case ConversionKind::real:
      out += std::to_string(argument.real);
      break;
    case ConversionKind::object:
      argument.append(out, argument.object);
      break;
  }
}

std::string formatMessage(std::string_view prefix, std::string_view format, const MessageArgument* arguments) {
  std::string out(prefix);
  for (std::size_t at = 0; at < format.size();) {
    std::size_t percent = std::min(format.find('%', at), format.size());
    out += format.substr(at, percent - at);
    at = percent;
    if (at == format.size()) break;
    std::size_t length = 0;
    ConversionKind kind = conversionAt(format, at, length);
    appendArgument(out, kind, *arguments++);
    at += length;
  }
  return out;
}

}  // namespace platform
