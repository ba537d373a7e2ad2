#include <archive.h>
#include <archive_entry.h>
#include <gtest/gtest.h>

#include "device/package/Package.h"
#include "plist/PropertyList.h"
#include "tests/DeviceRig.h"
#include "tests/ZipArchive.h"

namespace tests {
namespace {

const std::string target = "/target";
const std::string source = "/package.pkg";

Bytes manifest(const std::string& identifier = maps) {
  return *plist::writeXML(dictionaryOf({{"KBBundleIdentifier", identifier}}));
}

/// A package that is refused, and how its refusal ends; behind a star another library's words follow.
struct Hostile {
  const char* name;
  std::vector<ZipArchive::Entry> entries;
  std::string says;
  bool hasManifest = true;  // in front of the entries
};

const Hostile hostiles[] = {
    {"an absolute name", {{"/etc/passwd", "x"}}, "\"/etc/passwd\": an absolute name"},
    {"a way out", {{"Maps.app/../../../escaped", "x"}}, "\"Maps.app/../../../escaped\": not a plain name"},
    {"a way out at the end", {{"Maps.app/data/..", "x"}}, "\"Maps.app/data/..\": not a plain name"},
    {"a dot", {{"Maps.app/./x", "x"}}, "\"Maps.app/./x\": not a plain name"},
    {"an empty component", {{"Maps.app//x", "x"}}, "\"Maps.app//x\": not a plain name"},
    {"a way out in backslashes", {{"..\\..\\x", "x"}}, "\"../../x\": not a plain name"},
    {"a backslash", {{"Maps.app/..\\..\\x", "x"}}, "\"Maps.app/..\\..\\x\": a backslash in the name"},
    {"a control character", {{"Maps.app/a\nb", "x"}}, "\"Maps.app/a?b\": a control character in the name"},
    {"a symbolic link", {{"Maps.app/link", "/etc", 0120777}}, "\"Maps.app/link\": a link"},
    {"a device", {{"Maps.app/null", "", 0020666}}, "\"Maps.app/null\": neither a file nor a folder"},
    {"a socket", {{"Maps.app/socket", "", 0140777}}, "\"Maps.app/socket\": neither a file nor a folder"},
    {"encrypted", {{"Maps.app/secret", "0123456789abc", 0100644, 1}}, "\"Maps.app/secret\": encrypted"},
    {"a twin in another case",
     {{"Maps.app/A", "x"}, {"Maps.app/a", "y"}},
     "\"Maps.app/a\": differs from \"Maps.app/A\" in case only"},
    {"a folder's twin",
     {{"Maps.app/A/x", "x"}, {"Maps.app/a/y", "y"}},
     "\"Maps.app/a\": differs from \"Maps.app/A\" in case only"},
    {"the same twice", {{"Maps.app/a", "x"}, {"Maps.app/a", "y"}}, "listed twice"},
    {"below a file", {{"Maps.app/a", "x"}, {"Maps.app/a/b", "y"}}, "a file and a folder of that name"},
    {"a folder in place of a file", {{"Maps.app/a/b", "x"}, {"Maps.app/a", "y"}}, "listed twice"},
    {"another folder", {{"Other.app/x", "x"}}, "outside the folder \"Maps.app\""},
    {"beside the folder", {{"readme", "x"}}, "\"readme\": outside the folder \"Maps.app\""},
    {"a name too long", {{"Maps.app/" + std::string(256, 'n'), "x"}}, "name too long"},
    {"a path too long", {{"Maps.app/" + std::string(200, 'n') + '/' + std::string(200, 'n'), "x"}}, "name too long"},
    {"too deep", {{"Maps.app/1/2/3/4/5/6/7", "x"}}, "too deep"},
    {"too many entries",
     {{"Maps.app/1"}, {"Maps.app/2"}, {"Maps.app/3"}, {"Maps.app/4"}, {"Maps.app/5"}, {"Maps.app/6"}},
     "more than 6 files and folders"},
    {"too many folders that are not listed",
     {{"Maps.app/a/b/c/d"}, {"Maps.app/e/f/g/h"}},
     "more than 6 files and folders"},
    {"too many entries of one folder",
     {{"Maps.app/"}, {"Maps.app/"}, {"Maps.app/"}, {"Maps.app/"}, {"Maps.app/"}, {"Maps.app/"}},
     "more than 6 entries"},
    {"too much",
     {{"Maps.app/1", std::string(3000, 'x')}, {"Maps.app/2", std::string(3000, 'x')}},
     "\"Maps.app/2\": more than 5000 bytes in all"},
    {"more than it says",
     {{"Maps.app/1", std::string(6000, 'x'), 0100644, 0, 10}},
     "\"Maps.app/1\": more than 5000 bytes in all"},
    {"other than it says", {{"Maps.app/1", "xxxx", 0100644, 0, 2}}, "\"Maps.app/1\": damaged: *"},
    {"a wrong checksum", {{"Maps.app/1", "xxxx", 0100644, 0, -1, true}}, "\"Maps.app/1\": damaged: *"},
    {"no \".app\" folder", {{"Maps/Info.plist", manifest()}}, "\"Maps/Info.plist\": not in an \".app\" folder", false},
    {"a folder without a name",
     {{".app/Info.plist", manifest()}},
     "\".app/Info.plist\": not in an \".app\" folder",
     false},
    {"a file for a folder", {{"Maps.app", "x"}}, "\"Maps.app\": a file where the folder should be", false},
    {"no manifest", {{"Maps.app/x", "x"}}, "no manifest \"Maps.app/Info.plist\"", false},
    {"a folder for a manifest", {{"Maps.app/Info.plist/", ""}}, "no manifest \"Maps.app/Info.plist\"", false},
    {"a manifest that is not a list",
     {{"Maps.app/Info.plist", "x"}},
     "\"Maps.app/Info.plist\": not a property list: neither an XML nor a binary property list",
     false},
    {"a manifest without an identifier",
     {{"Maps.app/Info.plist", "<plist><dict/></plist>"}},
     "no \"KBBundleIdentifier\"",
     false},
    {"no entries", {}, "not a zip archive: *", false},
};

TEST(DevicePackages, RefusesWhatIsNoPlainAppAndNamesTheEntry) {
  for (const auto& each : hostiles) {
    SCOPED_TRACE(each.name);
    auto files = device::makeMemoryFileTree();
    ASSERT_TRUE(files->createDirectory(target, false, {}));
    std::vector<ZipArchive::Entry> entries;
    if (each.hasManifest) entries.push_back({"Maps.app/Info.plist", manifest()});
    entries.insert(entries.end(), each.entries.begin(), each.entries.end());
    ASSERT_TRUE(files->createFile(source, ZipArchive::of(entries), {}));
    device::PackageLimits limits;
    limits.entries = 6;
    limits.totalBytes = 5000;
    limits.nameLength = 400;
    limits.depth = 6;
    ErrorRef error;
    EXPECT_FALSE(device::unpackPackage(*files, source, target, limits, &error));
    ASSERT_TRUE(error);
    const std::string text = error->description();
    const bool isWhole = !each.says.ends_with('*');
    EXPECT_TRUE(isWhole ? text.ends_with(each.says) : text.find(each.says.substr(0, each.says.size() - 1)) != text.npos)
        << text;
    EXPECT_TRUE(text.starts_with("package \"" + source + "\": ")) << text;
    EXPECT_EQ(files->list("/")->size(), 2u) << "something was written beside the target";
  }
}

TEST(DevicePackages, TakesWhatKeepsEveryLimit) {
  auto files = device::makeMemoryFileTree();
  std::string name = "Maps.app/a/b/" + std::string(20, 'c');
  ASSERT_TRUE(files->createDirectory(target, false, {}));
  auto package = ZipArchive::of({{"Maps.app/Info.plist", manifest()}, {name, std::string(500, 'x')}});
  ASSERT_TRUE(files->createFile(source, package, {}));
  ErrorRef error;
  EXPECT_TRUE(device::unpackPackage(*files, source, target, {5, manifest().size() + 500, name.size(), 20, 4}, &error));
  EXPECT_FALSE(error) << error->describe();
}

TEST(DevicePackages, RefusesEveryCutAndSurvivesEveryFlippedByte) {
  auto whole = packageOf(maps, "1", {.manifestKeys = 9, .files = 1, .fileSize = 10});
  auto files = device::makeMemoryFileTree();
  auto accepts = [&](const Bytes& package) {
    EXPECT_TRUE(files->createDirectory(target, false, {}));
    EXPECT_TRUE(files->createFile(source, package, {}));
    ErrorRef error;
    auto unpacked = device::unpackPackage(*files, source, target, {}, &error);
    EXPECT_NE(unpacked.has_value(), error != nullptr);
    EXPECT_EQ(files->list("/")->size(), 2u);
    EXPECT_TRUE(files->removeItem(target));
    return unpacked.has_value();
  };
  ASSERT_TRUE(accepts(whole));
  for (std::size_t length = 0; length < whole.size(); ++length)
    EXPECT_FALSE(accepts(whole.substr(0, length))) << length;
  for (std::size_t at = 0; at < whole.size(); ++at) {
    auto flipped = whole;
    flipped[at] = static_cast<char>(flipped[at] ^ 0x55);
    accepts(flipped);
  }
}

TEST(DevicePackages, UnpacksACompressedAppWithNothingButItsContentAndExecute) {
  std::string longText;
  for (int i = 0; i < 200000; ++i) longText += std::to_string(i);
  Bytes bytes(4 << 20, '\0');
  std::size_t used = 0;
  auto* zip = archive_write_new();
  archive_write_set_format_zip(zip);
  archive_write_open_memory(zip, bytes.data(), bytes.size(), &used);
  auto add = [&](const char* name, unsigned mode, const Bytes& content) {
    auto* entry = archive_entry_new();
    archive_entry_set_pathname(entry, name);
    archive_entry_set_mode(entry, mode);
    archive_entry_set_size(entry, static_cast<la_int64_t>(content.size()));
    ASSERT_EQ(archive_write_header(zip, entry), ARCHIVE_OK) << archive_error_string(zip);
    archive_write_data(zip, content.data(), content.size());
    archive_entry_free(entry);
  };
  add("Maps.app/", AE_IFDIR | 0755, "");
  add("Maps.app/Info.plist", AE_IFREG | 0600, manifest());
  add("Maps.app/Maps", AE_IFREG | 06755, longText);
  add("Maps.app/K\xc3\xbc\x63he.txt", AE_IFREG | 0644, "names are bytes");
  archive_write_close(zip);
  archive_write_free(zip);
  bytes.resize(used);

  auto files = device::makeMemoryFileTree();
  ASSERT_TRUE(files->createDirectory(target, false, {}));
  ASSERT_TRUE(files->createFile(source, bytes, {}));
  ErrorRef error;
  auto package = device::unpackPackage(*files, source, target, {}, &error);
  ASSERT_TRUE(package) << error->describe();
  EXPECT_EQ(package->bundle, "Maps.app");
  EXPECT_EQ(package->identifier, maps);
  EXPECT_EQ(package->bytes, longText.size() + manifest().size() + 15);
  EXPECT_EQ(files->readFile("/target/Maps.app/Maps"), longText);
  EXPECT_EQ(files->readFile("/target/Maps.app/K\xc3\xbc\x63he.txt"), "names are bytes");
}

}  // namespace
}  // namespace tests
