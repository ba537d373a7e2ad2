// What the codec takes and refuses, form by form.

#include <gtest/gtest.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <limits>
#include <set>
#include <string>
#include <vector>

#include "platform/Describe.h"
#include "plist/BigEndian.h"
#include "plist/ElementLines.h"
#include "plist/PropertyList.h"

namespace plist {
namespace {

using platform::Bytes;
using platform::Date;
using platform::ErrorRef;
using platform::Value;

std::string bigEndian(std::uint64_t number, unsigned size) {
  std::string bytes(8, '\0');
  writeBigEndian(bytes.data(), number, 8);
  return bytes.substr(8 - size);
}

/// A binary document of objects that stand as they are in the format.
Bytes binary(const std::vector<std::string>& objects, unsigned referenceSize = 1, std::size_t top = 0) {
  Bytes bytes = "bplist00", table;
  for (const std::string& object : objects) {
    table += bigEndian(bytes.size(), 3);
    bytes += object;
  }
  std::size_t tableAt = bytes.size();
  bytes += table + std::string(6, '\0') + '\3' + static_cast<char>(referenceSize);
  return bytes + bigEndian(objects.size(), 8) + bigEndian(top, 8) + bigEndian(tableAt, 8);
}

std::string date(double seconds) { return '\x33' + bigEndian(std::bit_cast<std::uint64_t>(seconds), 8); }

Bytes xml(const std::string& value) { return "<plist version=\"1.0\">" + value + "</plist>"; }

std::string printable(const Bytes& bytes) { return testing::PrintToString(bytes.substr(0, 400)); }

struct Accepted {
  Bytes input;
  std::string text;  // described
};

struct Rejected {
  Bytes input;
  ErrorCode code = ErrorCode::malformed;
  std::string text = {};  // part of the description
};

void expectAccepted(const std::vector<Accepted>& rows) {
  for (const Accepted& row : rows) {
    ErrorRef error;
    EXPECT_EQ(platform::describe(read(row.input, &error)), row.text) << printable(row.input);
    EXPECT_FALSE(error) << printable(row.input) << ": " << error->describe();
  }
}

/// What was said, without the places.
std::set<std::string> expectRejected(const std::vector<Rejected>& rows) {
  std::set<std::string> said;
  for (const Rejected& row : rows) {
    ErrorRef error;
    EXPECT_TRUE(read(row.input, &error).isAbsent()) << printable(row.input);
    EXPECT_TRUE(error) << printable(row.input);
    if (!error) continue;
    EXPECT_EQ(error->domain(), errorDomain);
    EXPECT_EQ(error->code(), static_cast<std::int64_t>(row.code)) << printable(row.input) << error->describe();
    EXPECT_NE(error->description().find(row.text), std::string::npos) << printable(row.input) << error->describe();
    const auto colon = error->description().find(": ");
    said.insert(error->description().substr(colon == std::string::npos ? 0 : colon + 2));
  }
  return said;
}

using namespace std::string_literals;

TEST(PropertyList, TakesXML) {
  expectAccepted({
      {xml("<string/>"), ""},
      {xml("<string> a\n&lt;&amp;&#x1F600;<![CDATA[<b>]]> </string>"), " a\n<&\U0001F600<b> "},
      {xml("<string>a\r\nb&#13;</string>"), "a\nb\r"},
      {xml("<integer> -0 </integer>"), "0"},
      {xml("<integer>+18446744073709551615</integer>"), "18446744073709551615"},
      {xml("<integer>-9223372036854775808</integer>"), "-9223372036854775808"},
      {xml("<integer>0xFFFFffffFFFFffff</integer>"), "18446744073709551615"},
      {xml("<real>\n1e3 </real>"), "1000"},
      {xml("<array><real>inf</real><real>-Infinity</real><real>nan</real></array>"), "(inf, -inf, nan)"},
      {xml("<array><true/> <false></false> <true> </true></array>"), "(1, 0, 1)"},
      {xml("<date>2000-02-29T23:59:59Z</date>"), "2000-02-29T23:59:59Z"},
      {xml("<date>0001-01-01T00:00:00Z</date>"), "0001-01-01T00:00:00Z"},
      {xml("<data>\n\tAAEC\n\tAw==\n</data>"), "<4 bytes>"},
      {xml("<dict><key>b</key><integer>1</integer><key/><array/><key>a</key><dict/></dict>"), "{b = 1;  = (); a = {}}"},
      {"\xef\xbb\xbf<?xml version='1.0'?>\n<!-- list --><plist><true/></plist>\n", "1"},
      {"<?xml version='1.0' encoding='ISO-8859-1'?><plist><string>\xe9</string></plist>", "é"},
      {"\xff\xfe<\0p\0l\0i\0s\0t\0>\0<\0s\0t\0r\0i\0n\0g\0>\0\x3d\xd8\0\xde<\0/\0s\0t\0r\0i\0n\0g\0>\0<\0/\0p\0l\0i\0s\0t\0>\0"s,
       "\U0001F600"},
      // A document-type line is passed over, whatever it points to.
      {"<!DOCTYPE plist SYSTEM \"file:///nowhere.dtd\" ><plist><true/></plist>", "1"},
  });
  EXPECT_EQ(read(xml("<data>AAEC Aw==</data>")).data(), "\0\1\2\3"s);
}

TEST(PropertyList, RefusesXML) {
  using enum ErrorCode;
  expectRejected({
      {"", notAPropertyList, "empty"},
      {" \n", notAPropertyList},
      {"{ a = b; }", notAPropertyList, "neither"},
      {"<plist>", malformed, "line 1"},
      {"<plist/>", malformed, "without a value"},
      {"<true/>", malformed, "outermost"},
      {"\n\n<plist><true/><true/></plist>", malformed, "line 3: <plist> with a second value"},
      {"<plist><true/></plist><plist/>"},
      {xml("<plist><true/></plist>")},
      {xml("<key>a</key>")},
      {xml("<null/>"), malformed, "\"null\""},
      {xml("<array>x</array>"), malformed, "\"x\""},
      {xml("<array><true/>x</array>"), malformed, "\"x\""},
      {xml("<true>x</true>")},
      {xml("<string><true/></string>")},
      {xml("<dict><true/></dict>"), malformed, "without a key"},
      {xml("<dict><key>lost key</key></dict>"), malformed, "the key \"lost key\" without a value"},
      {xml("<dict><key>a</key><key>b</key><true/></dict>")},
      {xml("<dict><key>\n</key><true/>\n<key>\n</key><true/></dict>"), duplicateKey, "\"?\""},
      {xml("<integer/>"), malformed, "integer"},
      {xml("<integer>1 2</integer>")},
      {xml("<integer>+-1</integer>")},
      {xml("<integer>0x</integer>")},
      {xml("<integer>-0x1</integer>")},
      {xml("<integer>1.0</integer>")},
      {xml("<integer>18446744073709551616</integer>"), outOfRange, "line 1"},
      {xml("<integer>-9223372036854775809</integer>"), outOfRange},
      {xml("<integer>0x10000000000000000</integer>"), outOfRange},
      {xml("<real/>")},
      {xml("<real>1,5</real>")},
      {xml("<real>1e999</real>"), outOfRange},
      {xml("<real>nan(1)</real>")},
      {xml("<date>2001-02-29T00:00:00Z</date>"), malformed, "2001-02-29"},
      {xml("<date>2001-01-01T24:00:00Z</date>")},
      {xml("<date>2001-01-01T00:00:60Z</date>")},
      {xml("<date>0000-01-01T00:00:00Z</date>")},
      {xml("<date>2001-01-01</date>")},
      {xml("<date>2001-01-01T00:00:0 Z</date>")},
      {xml("<data>A</data>"), malformed, "base64"},
      {xml("<data>AA=A</data>")},
      {xml("<data>A===</data>")},
      {xml("<data>AA-_</data>")},
      {xml("<string>&nbsp;</string>")},
      {xml("<string>&#0;</string>")},
      {xml("<string>&#xD800;</string>")},
      {xml("<string>\xed\xa0\x80</string>")},
      {xml("<string>\xc0\x80</string>")},
      {xml("<string>\x01</string>")},
      {"<!DOCTYPE plist [<!ENTITY a \"aa\">]>" + xml("<string>&a;</string>"), unsupported, "declarations"},
      {"<!DOCTYPE plist [<!ENTITY a SYSTEM \"/etc/hostname\">]>" + xml("<string>&a;</string>"), unsupported},
      {"<!DOCTYPE plist [<!ENTITY % a \"aa\">%a;]>" + xml("<true/>"), unsupported},
      {"<!DOCTYPE plist SYSTEM \"a\">" + xml("<string>&a;</string>"), unsupported, "entity"},
      // Not even a comment in there, of which the parser would have to find the end.
      {"<!DOCTYPE plist [\n<!ATTLIST plist a CDATA \"\">", unsupported, "line 1: a document type with declarations"},
      {"<!DOCTYPE plist [<!--", unsupported},
      {"\xff\xfe<\0p\0\x3d\xd8>\0"s, malformed, "UTF-16"},
      {"\0<\0p\0l"s},
  });
}

// Which the parser does not see: what comes behind has to be the same text on the same line.
TEST(PropertyList, ReadsLongData) {
  std::string line(76, 'x'), lines, raw;
  for (const char* end : {"\n", "\r\n", "\r", " \t\n"}) {
    for (int count = 0; count < 10; ++count) lines += line + end;
  }
  for (int count = 0; count < 40 * 76 / 4; ++count) raw += "\xc7\x1c\x71";
  auto sized = [](std::size_t size) { return "<" + std::to_string(size) + " bytes>"; };
  using enum ErrorCode;
  const std::string data = "<data>" + lines + "</data>", all = sized(raw.size());
  const std::string oneLine = "<data>" + std::string(1000, 'x') + "</data>";
  EXPECT_EQ(read(xml(data)).data(), raw);
  expectAccepted({
      {xml("<array><string>a\n b</string>" + data + "<string>c\n d</string>" + data +
           "<string>e&amp;f</string></array>"),
       "(a\n b, " + all + ", c\n d, " + all + ", e&f)"},
      {xml("<data>" + lines + "AA==\n</data>"), sized(raw.size() + 1)},
      {xml("<data>" + lines + "&#65;AA<!-- -->=</data>"), sized(raw.size() + 2)},
      {"<?xml version='1.0' encoding='ISO-8859-1'?>" + xml("<array>" + data + "<string>\xe9</string></array>"),
       "(" + all + ", é)"},
      // Tags that are none, and what follows them.
      {xml("<array><!--" + data + "-->" + data + "<true/></array>"), "(" + all + ", 1)"},
      {xml("<data>AAAA<!--" + data + "--></data>"), "<3 bytes>"},
      {xml("<array><string><![CDATA[" + oneLine + "]]></string>" + data + "</array>"),
       "(" + oneLine + ", " + all + ")"},
  });
  expectRejected({
      {xml("<data>" + lines + "A</data>"), malformed, "line 41: <data> that is not base64"},
      {xml("<data>" + lines + "=AAA</data>"), malformed, "line 41: <data> that is not base64"},
      {xml("<data>" + lines + "\x80</data>"), malformed, "line 41: not well-formed"},
      {xml("<data>" + lines + "</array>"), malformed, "line 41: mismatched tag"},
      {xml("<data>" + lines + "</data"), malformed, "line 41: not well-formed"},
      {"<plist><data>" + lines, malformed, "line 41: no element found"},
      {xml("<array>" + data + "\n" + data + "x</array>"), malformed, "line 82: text \"x\" between values"},
      {xml("<array><![CDATA[" + oneLine + "]]></array>"), malformed, "text \"<data>xx"},
      {xml("<array>" + data + "<data>\n" + lines + "</data><null/></array>"), malformed,
       "line 82: no element is named"},
  });
}

// However it is found out: keys of every length, in dictionaries of every width at which that changes.
TEST(PropertyList, FindsAKeyThatAppearsTwice) {
  for (unsigned width : {2u, 8u, 9u, 40u, 64u, 65u, 200u}) {
    for (std::size_t length : {3, 4, 7, 8, 9, 14, 15, 40}) {
      auto key = [length](unsigned number) {
        std::string digits = std::to_string(1000 + number);
        std::string text = length < 4 ? digits.substr(1) : std::string(length - 4, 'k') + digits;
        return (length < 15 ? std::string(1, static_cast<char>(0x50 + length)) : "\x5f\x10" + bigEndian(length, 1)) +
               text;
      };
      std::string dictionary = "\xdf\x10" + bigEndian(width, 1);
      for (unsigned number = 0; number < width; ++number) dictionary += bigEndian(number + 1, 2);
      for (unsigned number = 0; number < width; ++number) dictionary += bigEndian(width + 1, 2);
      std::vector<std::string> objects = {dictionary};
      for (unsigned number = 0; number < width; ++number) objects.push_back(key(number));
      objects.emplace_back("\x09");
      Value value = read(binary(objects, 2));
      ASSERT_TRUE(value.dictionary()) << width << " keys of " << length;
      for (const auto& entry : *value.dictionary()) ASSERT_EQ(&(*value.dictionary())[entry.key], &entry.value);
      EXPECT_FALSE(value.dictionary()->contains("kkk"));
      objects[width] = key(width / 2 - 1);
      ErrorRef error;
      EXPECT_TRUE(read(binary(objects, 2), &error).isAbsent()) << width << " keys of " << length;
      EXPECT_NE(error->description().find("appears twice"), std::string::npos) << error->describe();
    }
  }
}

TEST(PropertyList, TakesBinary) {
  expectAccepted({
      {binary({"\x08"}), "0"},
      {binary({"\x10\xff"}), "255"},
      {binary({"\x11\xff\xff"}), "65535"},
      {binary({"\x12\xff\xff\xff\xff"}), "4294967295"},
      {binary({"\x13" + bigEndian(~0ull, 8)}), "-1"},
      {binary({"\x14" + bigEndian(0, 8) + bigEndian(~0ull, 8)}), "18446744073709551615"},
      {binary({"\x14" + bigEndian(~0ull, 8) + bigEndian(1ull << 63, 8)}), "-9223372036854775808"},
      {binary({"\x22\x3f\x80\0\0"s}), "1"},
      {binary({"\x23\x7f\xf0\0\0\0\0\0\0"s}), "inf"},
      {binary({date(-0.5)}), "2000-12-31T23:59:59Z"},
      {binary({date(252423993599.5)}), "9999-12-31T23:59:59Z"},
      {binary({"\x50"}), ""},
      {binary({"\x5f\x10\x02hi"}), "hi"},
      {binary({"\x5f\x13" + bigEndian(2, 8) + "hi"}), "hi"},
      {binary({"\x64\x00\x41\x00\xe9\xd8\x3d\xde\x00"s}), "Aé\U0001F600"},
      {binary({"\x42\0\1"s}), "<2 bytes>"},
      {binary({"\xa3\0\1\0\1\0\1"s, "\xd1\0\2\0\3"s, "\x51k", "\x09"}, 2), "({k = 1}, {k = 1}, {k = 1})"},
      {binary({"\x51x", "\xa2\0\0\0\0\0\0"s}, 3, 1), "(x, x)"},
      {binary({"\xd1\1\2", "\x61\0k"s, "\xd0"}), "{k = {}}"},
  });
}

TEST(PropertyList, RefusesBinary) {
  using enum ErrorCode;
  std::vector<std::string> nineKeys = {"\xd9\1\2\3\4\5\6\7\x08\1\x09\x09\x09\x09\x09\x09\x09\x09\x09"};
  for (char key : "abcdefgh"s) nineKeys.push_back("\x51"s + key);
  nineKeys.push_back("\x09");
  double infinity = std::numeric_limits<double>::infinity();
  std::vector<Rejected> rows = {
      {"bplist00", malformed, "byte 8"},
      {"bplist01" + binary({"\x09"}).substr(8), unsupported, "version"},
      {binary({}), malformed, "object 0 of 0"},
      {binary({"\x00"s}), unsupported, "null"},
      {binary({"\x80\1"}), unsupported, "byte 8: a UID"},
      {binary({"\xc0"}), unsupported, "set"},
      {binary({"\x0f"})},
      {binary({"\x70"})},
      {binary({"\xe0"})},
      {binary({"\x13\0\0"s}), malformed, "integer runs past"},
      {binary({"\x15" + std::string(32, '\0')})},
      {binary({"\x14" + bigEndian(1, 8) + bigEndian(0, 8)}), outOfRange},
      {binary({"\x14" + bigEndian(~0ull, 8) + bigEndian(0, 8)}), outOfRange},
      {binary({"\x21\0\0"s})},
      {binary({"\x23\0\0"s}), malformed, "real runs past"},
      {binary({"\x33\0\0"s}), malformed, "date runs past"},
      {binary({date(NAN)}), outOfRange},
      {binary({date(infinity)}), outOfRange},
      {binary({date(-63113904001)}), outOfRange},
      {binary({date(252423993600)}), outOfRange},
      {binary({"\x32\0\0\0\0"s})},
      {binary({"\x52x"}), malformed, "string runs past"},
      {binary({"\x51\x80"}), malformed, "ASCII"},
      {binary({"\x61\xd8\0"s}), malformed, "surrogate"},
      {binary({"\x62\xd8\0\0A"s})},
      {binary({"\x61\xdc\0"s})},
      {binary({"\x5f"}), malformed, "without a count"},
      {binary({"\x5f\x14" + std::string(16, '\0')})},
      {binary({"\x5f\x13\0"s}), malformed, "string runs past"},
      {binary({"\xaf\x13" + bigEndian(~0ull, 8)}), malformed, "array runs past"},
      {binary({"\xdf\x13" + bigEndian(1ull << 63, 8)}), malformed, "dictionary runs past"},
      {binary({"\xa1\0"s}), malformed, "contains itself"},
      {binary({"\xd1\1\2", "\x51k", "\xa1\0"s}), malformed, "contains itself"},
      {binary({"\xa1\5"}), malformed, "byte 9: a reference to object 5 of 1"},
      {binary({"\xd1\1\1", "\x09"}), malformed, "not a string"},
      {binary({"\xd2\1\1\2\2", "\x51k", "\x09"}), duplicateKey, "\"k\""},
      {binary({"\xd2\1\2\3\3", "\x51k", "\x61\0k"s, "\x09"}), duplicateKey, "\"k\""},
      {binary(nineKeys), duplicateKey, "\"a\""},
      {binary({"\x09"}, 0)},
      {binary({"\x09"}, 9)},
      {binary({"\x09"}, 1, 1), malformed, "object 1 of 1"},
  };
  // The trailer's fields, from its end: top object, object count, offset size, place of the table.
  for (auto [fromEnd, byte] : {std::pair(26, 0), {26, 9}, {24, 1}, {17, 2}, {1, 7}, {1, 200}, {8, 1}}) {
    Bytes bytes = binary({"\x09"});
    bytes[bytes.size() - static_cast<std::size_t>(fromEnd)] = static_cast<char>(byte);
    rows.push_back({bytes});
  }
  EXPECT_EQ(expectRejected(rows), (std::set<std::string>{"a UID, which a property list cannot hold",
                                                         "a UTF-16 string with half a surrogate pair",
                                                         "a binary property list of an unknown version",
                                                         "a container that contains itself",
                                                         "a date cannot have this size",
                                                         "a date outside the years 1 to 9999",
                                                         "a date runs past the objects",
                                                         "a dictionary key that is not a string",
                                                         "a dictionary runs past the objects",
                                                         "a real cannot have this size",
                                                         "a real runs past the objects",
                                                         "a reference to object 0 of 0",
                                                         "a reference to object 1 of 1",
                                                         "a reference to object 5 of 1",
                                                         "a set, which a property list cannot hold",
                                                         "a string runs past the objects",
                                                         "a string without a count",
                                                         "an ASCII string with other characters",
                                                         "an array runs past the objects",
                                                         "an integer beyond 64 bits",
                                                         "an integer cannot have this size",
                                                         "an integer runs past the objects",
                                                         "more objects than the offset table has room for",
                                                         "no object has the marker 112",
                                                         "no object has the marker 15",
                                                         "no object has the marker 224",
                                                         "null, which a property list cannot hold",
                                                         "offsets cannot have this size",
                                                         "references cannot have this size",
                                                         "the document ends before its trailer",
                                                         "the key \"a\" appears twice",
                                                         "the key \"k\" appears twice",
                                                         "the offset table lies outside"}));
}

/// So many arrays, one in the other.
Bytes nestedXML(int depth) {
  std::string starts, ends;
  for (int level = 0; level < depth; ++level) starts += "<array>", ends += "</array>";
  return xml(starts + ends);
}
Bytes nestedBinary(int depth) {
  std::vector<std::string> objects;
  for (int level = 1; level < depth; ++level) objects.push_back("\xa1" + bigEndian(static_cast<unsigned>(level), 2));
  objects.push_back("\xa0");
  return binary(objects, 2);
}

TEST(PropertyList, LimitsDepth) {
  for (const Bytes& tooDeep : {nestedXML(513), nestedBinary(513)}) {
    expectRejected({{tooDeep, ErrorCode::tooDeep, "containers more than 512 deep"}});
  }
  expectRejected({{nestedXML(100000), ErrorCode::tooDeep}, {nestedBinary(60000), ErrorCode::tooDeep}});
  Value deepest = read(nestedXML(512));
  EXPECT_EQ(deepest, read(nestedBinary(512)));
  for (auto write : {writeBinary, writeXML}) {
    ErrorRef error;
    EXPECT_EQ(read(write(deepest, &error).value()), deepest);
    EXPECT_FALSE(error);
    Value deeper = Value::makeArray();
    deeper.array()->append(deepest);
    EXPECT_FALSE(write(deeper, &error));
    EXPECT_EQ(error->code(), static_cast<std::int64_t>(ErrorCode::tooDeep));
  }
}

TEST(PropertyList, LimitsWhatSharingExpandsTo) {
  std::vector<std::string> doubling;
  for (char level = 1; level < 60; ++level) doubling.push_back("\xa2"s + level + level);
  doubling.push_back("\xa0");
  std::string references(40000, '\1');
  std::string many = "\xaf\x12" + bigEndian(references.size(), 4) + references;
  std::string longText = "\x11" + bigEndian(40000, 2) + std::string(40000, 'x');
  std::string longUnits = "\x11" + bigEndian(20000, 2);
  for (int unit = 0; unit < 20000; ++unit) longUnits += "\x20\xac";
  expectRejected({
      {binary(doubling), ErrorCode::tooLarge, "containers"},
      {binary({many, "\x5f" + longText}), ErrorCode::tooLarge, "strings"},
      {binary({many, "\x4f" + longText}), ErrorCode::tooLarge, "data"},
      {binary({many, "\x6f" + longUnits}), ErrorCode::tooLarge, "strings"},
      {binary({many, "\xd1\2\3", "\x5f" + longText, "\x09"}), ErrorCode::tooLarge, "strings"},
  });
  // What a list's entries share in earnest is taken.
  Value list = read(binary({many, "\xd1\2\3", "\x5f\x10\x20" + std::string(32, 'k'), "\x09"}));
  ASSERT_TRUE(list.array());
  EXPECT_EQ(list.array()->size(), references.size());
}

std::string counted(char kind, std::string_view items) {
  return std::string{kind, '\x12'} + bigEndian(items.size(), 4) + std::string(items);
}

/// The size of a document decides what it may expand to; what it refers to varies, and padding makes up for that.
TEST(PropertyList, ExpandsToItsBudgetAndNotBeyond) {
  auto ofNodes = [](std::size_t shared, std::size_t alone) {
    std::string inner(1000, '\3'), outer = std::string(shared, '\1') + '\2', rest(alone, '\3');
    return binary({counted('\xaf', outer), counted('\xaf', inner), counted('\xaf', rest), "\x09",
                   counted('\x4f', std::string(4000 - shared - alone, 'p'))});
  };
  std::size_t nodes = maximumNodes(ofNodes(0, 0).size()), shared = (nodes - 1) / 1001 - 1;
  std::size_t alone = nodes - 1 - 1001 * shared;
  EXPECT_EQ(read(ofNodes(shared, alone)).array()->size(), shared + 1);
  expectRejected({{ofNodes(shared, alone + 1), ErrorCode::tooLarge, "containers"}});

  auto ofText = [](std::size_t places, std::size_t more) {
    return binary({counted('\xaf', std::string(places, '\1') + '\2'), counted('\x4f', std::string(40000, 't')),
                   counted('\x4f', std::string(more, 't')), counted('\x4f', std::string(50000 - places - more, 'p'))});
  };
  std::size_t text = maximumText(ofText(0, 0).size()), places = text / 40000;
  EXPECT_EQ(read(ofText(places, text % 40000)).array()->size(), places + 1);
  expectRejected({{ofText(places, text % 40000 + 1), ErrorCode::tooLarge, "data"}});
}

TEST(PropertyList, WritesEqualTextOnceAsLongAsItCanBeReadAgain) {
  auto equals = [](const Value& element, std::size_t count) {
    Value list = Value::makeArray();
    for (std::size_t i = 0; i < count; ++i) list.array()->append(element);
    return list;
  };
  const std::string text(1000, 'x');
  Value mixed = Value::makeArray();
  for (const Value& each : {Value(text), Value::makeData(text)}) {
    EXPECT_LT(writeBinary(equals(each, 10))->size(), 1200U);
    mixed.array()->append(equals(each, 10));
    // More of it, and more values, than a document that short may hold.
    for (const Value& list : {equals(each, 20000), equals(each.string() ? Value("x") : Value::makeData("x"), 300000)}) {
      auto bytes = writeBinary(list);
      ASSERT_TRUE(bytes);
      EXPECT_EQ(read(std::move(*bytes)), list);
    }
  }
  EXPECT_EQ(read(*writeBinary(mixed)), mixed);
}

TEST(PropertyList, RefusesToWriteWhatAFormCannotCarry) {
  struct Row {
    Value value;
    bool binary;
    bool xml;
    ErrorCode code = ErrorCode::notRepresentable;
  };
  std::set<std::string> said;
  Value badKey = Value::makeDictionary();
  badKey.dictionary()->set("\x01", 1);
  for (const Row& row : std::vector<Row>{
           {Value(), false, false},
           {"a\0b"s, true, false},
           {"\x1f", true, false},
           {"\uffff", true, false},
           {"\ufffd\x7f\t\r\n", true, true},
           {badKey, true, false},
           {"\x80", false, false},
           {"\xed\xa0\x80", false, false},
           {"\xf4\x90\x80\x80", false, false},
           {"eight or more \xe2\x82", false, false},
           {Date{NAN}, false, false, ErrorCode::outOfRange},
           {Date{1e300}, false, false, ErrorCode::outOfRange},
           {Date{252423993599}, true, true},
       }) {
    for (bool isBinary : {true, false}) {
      ErrorRef error;
      std::optional<Bytes> bytes = isBinary ? writeBinary(row.value, &error) : writeXML(row.value, &error);
      EXPECT_EQ(bytes.has_value(), isBinary ? row.binary : row.xml) << platform::describe(row.value);
      EXPECT_EQ(error == nullptr, bytes.has_value()) << platform::describe(row.value);
      if (bytes) {
        EXPECT_EQ(read(*bytes), row.value);
      } else {
        EXPECT_EQ(error->code(), static_cast<std::int64_t>(row.code)) << error->describe();
        said.insert((isBinary ? "binary: " : "XML: ") + error->description());
      }
    }
  }
  for (const char* text :
       {"binary: an absent value", "XML: an absent value", "binary: the string \"\x80\" is not valid UTF-8",
        "XML: XML cannot carry the string \"a?b\""})
    EXPECT_EQ(said.count(text), 1u) << text;
}

TEST(PropertyList, TellsOnWhichLineEachElementStands) {
  using Numbers = std::vector<std::size_t>;
  EXPECT_EQ(elementLines(xml("<dict>\n<key>a</key>\n<true/>\n<key>b</key><array>\n<true/></array></dict>")),
            (Numbers{2, 4}));
  EXPECT_EQ(elementLines(xml("<array>\n<true/>\n<dict><key>a</key><true/></dict></array>")), (Numbers{2, 3}));
}

TEST(PropertyList, WritesCompactly) {
  Value list = Value::makeArray();
  for (int entry = 0; entry < 3; ++entry) list.array()->appendDictionary().set("key", "key");
  EXPECT_EQ(writeXML(list.array()->begin()[0]),
            "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n\t<key>key</key>\n"
            "\t<string>key</string>\n</dict>\n</plist>\n");
  Value nested = Value::makeArray();
  nested.array()->append(list.array()->begin()[0]);
  Value whole = Value::makeDictionary();
  whole.dictionary()->set("list", nested);
  EXPECT_NE(writeXML(whole)->find("\t<array>\n\t\t<dict>\n\t\t\t<key>key</key>\n\t\t\t<string>key</string>\n"
                                  "\t\t</dict>\n\t</array>\n</dict>\n"),
            Bytes::npos);
  // One string, three dictionaries, the array; one byte for each reference and offset.
  Bytes bytes = writeBinary(list).value();
  EXPECT_EQ(bytes.size(), 8 + 4 + 3 * 3 + 4 + 5 + 32u);
  EXPECT_EQ(bytes.substr(8, 4), "\x53key");
}

TEST(PropertyList, SurvivesEveryDamage) {
  Value sample = Value::makeDictionary();
  sample.dictionary()->set("text", "größer \U0001F600");
  sample.dictionary()->set("numbers", Value::makeArray());
  platform::Array& numbers = *sample.dictionary()->array("numbers");
  for (const Value& value : {Value(true), Value(~0ull), Value(-1), Value(0.5), Value(Date{0})}) numbers.append(value);
  numbers.appendDictionary().set("data", Value::makeData("\1\2\3"));
  numbers.append(std::string(300, 'x'));
  for (auto write : {writeBinary, writeXML}) {
    const Bytes whole = write(sample, nullptr).value();
    for (std::size_t size = 0; size < whole.size(); ++size) {
      // Nothing but the last line end can be missing.
      ErrorRef error;
      EXPECT_EQ(read(whole.substr(0, size), &error).isAbsent(), size + 1 < whole.size() || whole[0] == 'b') << size;
      EXPECT_EQ(error == nullptr, size + 1 == whole.size() && whole[0] == '<') << size;
    }
    for (std::size_t at = 0; at < whole.size(); ++at) {
      for (int byte = 0; byte < 256; ++byte) {
        Bytes damaged = whole;
        damaged[at] = static_cast<char>(byte);
        ErrorRef error;
        Value value = read(std::move(damaged), &error);
        // Whatever is taken can be written again.
        ASSERT_EQ(value.isAbsent(), error != nullptr) << at << " " << byte;
        if (value.isAbsent()) continue;
        ASSERT_EQ(read(writeBinary(value).value()), value) << at << " " << byte;
      }
    }
  }
}

}  // namespace
}  // namespace plist
