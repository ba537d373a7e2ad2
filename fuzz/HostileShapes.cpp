#include "fuzz/HostileShapes.h"

#include <cstdint>
#include <initializer_list>
#include <utility>

namespace fuzz {

using platform::Bytes;

namespace {

Bytes bigEndian(std::uint64_t number, int bytes) {
  Bytes result;
  for (int shift = (bytes - 1) * 8; shift >= 0; shift -= 8) result += static_cast<char>(number >> shift & 0xff);
  return result;
}

Bytes littleEndian(std::uint64_t number, int bytes) {
  const Bytes big = bigEndian(number, bytes);
  return {big.rbegin(), big.rend()};
}

Bytes headed(int kind, std::size_t count, const Bytes& content) {
  if (count < 15) return static_cast<char>(kind | static_cast<int>(count)) + content;
  return Bytes{static_cast<char>(kind | 15), 0x12} + bigEndian(count, 4) + content;
}

Bytes text(const Bytes& content) { return headed(0x50, content.size(), content); }
Bytes data(const Bytes& content) { return headed(0x40, content.size(), content); }

/// So many references to one object.
Bytes array(std::size_t object, std::size_t count) {
  Bytes references;
  for (std::size_t place = 0; place < count; ++place) references += bigEndian(object, 4);
  return headed(0xa0, count, references);
}

using Entries = std::vector<std::pair<std::size_t, std::size_t>>;
Bytes dictionary(const Entries& entries) {
  Bytes keys, values;
  for (const auto& [key, value] : entries) {
    keys += bigEndian(key, 4);
    values += bigEndian(value, 4);
  }
  return headed(0xd0, entries.size(), keys + values);
}

/// A binary list of these objects, the last of which is its outermost.
class Document {
 public:
  std::size_t add(const Bytes& object) {
    _offsets += bigEndian(_bytes.size(), 4);
    _bytes += object;
    return _count++;
  }
  Bytes whole() const {
    return _bytes + _offsets + Bytes(6, '\0') + "\4\4" + bigEndian(_count, 8) + bigEndian(_count - 1, 8) +
           bigEndian(_bytes.size(), 8);
  }

 private:
  Bytes _bytes = "bplist00";
  Bytes _offsets;
  std::size_t _count = 0;
};

void wrap(Document& document, Place place, std::size_t odd) {
  auto entries = [&](const std::initializer_list<std::pair<const char*, const char*>>& ordinary) {
    Entries result{{document.add(text("x")), odd}};
    for (const auto& [key, value] : ordinary) {
      const std::size_t at = document.add(text(key));
      result.emplace_back(at, document.add(text(value)));
    }
    return result;
  };
  if (place == Place::todoList) {
    const auto entry =
        document.add(dictionary(entries({{"identifier", "com.example.maps"}, {"operation", "install"}})));
    document.add(array(entry, 1));
  } else if (place == Place::restoreList) {
    auto app = entries({});
    const std::size_t key = document.add(text("HarluneMetadata"));
    app.emplace_back(key, document.add(data("<plist><dict/></plist>")));
    const std::size_t name = document.add(text("com.example.maps"));
    document.add(dictionary({{name, document.add(dictionary(app))}}));
  }
}

Bytes repeated(const Bytes& piece, std::size_t size) {
  Bytes result;
  while (result.size() + piece.size() <= size) result += piece;
  return result;
}

}  // namespace

std::vector<Shape> binaryShapes(Place place, std::size_t size) {
  const std::pair<const char*, Bytes> shared[] = {
      {"shared-text", text(Bytes(size / 2, 'x'))},
      {"shared-data", data(Bytes(size / 2, 'x'))},
      {"shared-nothing", array(0, 0)},
      {"shared-entries", dictionary({})},
  };
  std::vector<Shape> shapes;
  for (const auto& [name, object] : shared) {
    Document document;
    const std::size_t only = document.add(object);
    const std::size_t left = size > object.size() ? size - object.size() : 0;
    wrap(document, place, document.add(array(only, left / 4)));
    shapes.push_back({name, document.whole()});
  }
  Document levels;
  std::size_t inner = levels.add(text(Bytes(60, 'x')));
  for (std::size_t level = 0; level < 64 && (level + 1) * 4 * 60 < size; ++level) inner = levels.add(array(inner, 60));
  wrap(levels, place, inner);
  shapes.push_back({"shared-levels", levels.whole()});
  return shapes;
}

std::vector<Shape> xmlShapes(std::size_t size) {
  auto list = [](const Bytes& before, const Bytes& body) {
    return before + "<plist><dict><key>x</key>" + body + "</dict></plist>";
  };
  Bytes declared, attributes;
  for (int number = 0; attributes.size() < size; ++number) {
    attributes += " a" + std::to_string(number) + "=\"\"";
    if (declared.size() < size) declared += "a" + std::to_string(number) + " CDATA \"\" ";
  }
  Bytes entities = "<!ENTITY e0 'xxxxxxxxxx'>";
  for (int number = 1; number < 10; ++number) {
    entities +=
        "<!ENTITY e" + std::to_string(number) + " '" + repeated("&e" + std::to_string(number - 1) + ";", 40) + "'>";
  }
  return {
      {"attributes", list("", "<string" + attributes + "/>")},
      {"attributes-declared", list("<!DOCTYPE plist [<!ATTLIST plist " + declared + ">]>", "<true/>")},
      {"entities-of-entities", list("<!DOCTYPE plist [" + entities + "]>", "<string>&e9;</string>")},
      {"many-dictionaries", list("", "<array>" + repeated("<dict/>", size) + "</array>")},
      {"many-at-the-bottom",
       list("", repeated("<array>", 490 * 7) + repeated("<true/>", size) + repeated("</array>", 490 * 8))},
  };
}

Shape longTable(const Bytes& archive, std::size_t size) {
  const std::size_t begin = archive.find("PK\1\2"), last = archive.rfind("PK\1\2"), end = archive.rfind("PK\5\6");
  const Bytes first = archive.substr(begin, last - begin), again = archive.substr(last, end - last);
  const Bytes table = first + repeated(again, size > end ? size - begin : again.size());
  const std::size_t count = (table.size() - first.size()) / again.size() + (first.empty() ? 0 : 1);
  const Bytes entries = littleEndian(count < 65535 ? count : 65535, 2);
  return {"long-table", archive.substr(0, begin) + table + archive.substr(end, 8) + entries + entries +
                            littleEndian(table.size(), 4) + littleEndian(begin, 4) + Bytes(2, '\0')};
}

}  // namespace fuzz
