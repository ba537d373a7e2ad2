#include "plist/ElementLines.h"

#include <expat.h>

#include <algorithm>
#include <memory>
#include <string_view>
#include <type_traits>

#include "plist/PropertyList.h"

namespace plist {

namespace {

struct Scan {
  XML_Parser parser;
  std::size_t depth = 0;
  bool isDictionary = false;
  std::vector<std::size_t> lines{};
};

void begin(void* data, const XML_Char* name, const XML_Char**) {
  auto& scan = *static_cast<Scan*>(data);
  ++scan.depth;
  if (scan.depth == 2) scan.isDictionary = std::string_view(name) == "dict";
  if (scan.depth == 3 && (!scan.isDictionary || std::string_view(name) == "key"))
    scan.lines.push_back(XML_GetCurrentLineNumber(scan.parser));
}

void end(void* data, const XML_Char*) { --static_cast<Scan*>(data)->depth; }

}  // namespace

std::vector<std::size_t> elementLines(platform::BytesView document) {
  // What the reader refuses, declarations of entities among it, is not parsed here either.
  if (document.substr(0, 6) == "bplist" || read(platform::Bytes(document)).isAbsent()) return {};
  std::unique_ptr<std::remove_pointer_t<XML_Parser>, decltype(&XML_ParserFree)> parser(XML_ParserCreate(nullptr),
                                                                                       &XML_ParserFree);
  if (!parser) return {};
  Scan scan{parser.get()};
  XML_SetUserData(parser.get(), &scan);
  XML_SetElementHandler(parser.get(), begin, end);
  constexpr std::size_t pieceSize = std::size_t{1} << 20;
  for (std::size_t at = 0; at < document.size(); at += pieceSize) {
    auto piece = document.substr(at, pieceSize);
    bool isLast = at + pieceSize >= document.size();
    if (XML_Parse(parser.get(), piece.data(), static_cast<int>(piece.size()), isLast) != XML_STATUS_OK) return {};
  }
  return std::move(scan.lines);
}

}  // namespace plist
