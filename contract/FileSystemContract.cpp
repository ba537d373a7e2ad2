#include "contract/Fixture.h"
#include "platform/FileSystem.h"
#include "platform/Process.h"

namespace contract {
namespace {

using platform::FileSystem;

class FileSystemContract : public Fixture {};
INSTANTIATE_TEST_SUITE_P(Contract, FileSystemContract, testing::ValuesIn(hosts()), nameOfHost);

using Operation = std::function<bool(FileSystem& files, const std::string& root, ErrorRef* error)>;

struct Row {
  const char* name;
  Operation operation;
  bool succeeds = true;
  const char* after = nullptr;  // what is there afterwards; null: what was there before
};

constexpr const char* before = "/d /d/f=old /d/s /d/s/x=x /e ";

/// Everything that a row can have made or left.
std::string picture(FileSystem& files, const std::string& root) {
  std::string text;
  for (const char* path : {"/c", "/d", "/d/f", "/d/s", "/d/s/x", "/e", "/e/c", "/e/d", "/e/d/f", "/e/d/s", "/e/d/s/x",
                           "/e/n", "/n", "/n/m", "/n/f"}) {
    bool isDirectory = false;
    if (!files.fileExists(root + path, &isDirectory)) continue;
    text += path;
    if (!isDirectory) text += '=' + files.readFile(root + path).value_or("?");
    text += ' ';
  }
  return text;
}

Operation remove(const char* path) {
  return [path](FileSystem& files, const std::string& root, ErrorRef* e) { return files.removeItem(root + path, e); };
}
Operation make(const char* path, bool all) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.createDirectory(root + path, all, {}, e);
  };
}
Operation move(const char* from, const char* to) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.moveItem(root + from, root + to, e);
  };
}
Operation copy(const char* from, const char* to) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.copyItem(root + from, root + to, e);
  };
}
Operation write(const char* path) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.writeAtomically(root + path, "new", e);
  };
}
Operation read(const char* path) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.readFile(root + path, e).has_value();
  };
}
Operation look(const char* path) {
  return [=](FileSystem& files, const std::string& root, ErrorRef* e) {
    return files.attributesOfItem(root + path, e).has_value();
  };
}

std::vector<Row> rows() {
  return {
      {"remove a tree", remove("/d"), true, "/e "},
      {"remove a file", remove("/d/s/x"), true, "/d /d/f=old /d/s /e "},
      {"remove nothing", remove("/d/none"), false},
      {"make with all above", make("/n/m", true), true, "/d /d/f=old /d/s /d/s/x=x /e /n /n/m "},
      {"make what is there, allowed", make("/d/s", true)},
      {"make what is there", make("/d/s", false), false},
      {"make without the one above", make("/n/m", false), false},
      {"make over a file", make("/d/f", true), false},
      {"make below a file", make("/d/f/m", true), false},
      {"move a tree", move("/d", "/e/d"), true, "/e /e/d /e/d/f=old /e/d/s /e/d/s/x=x "},
      {"move onto a file", move("/d/s/x", "/d/f"), false},
      {"move onto an empty directory", move("/d", "/e"), false},
      {"move nothing", move("/none", "/n"), false},
      {"move to nowhere", move("/d", "/n/d"), false},
      {"copy", copy("/d/f", "/e/c"), true, "/d /d/f=old /d/s /d/s/x=x /e /e/c=old "},
      {"copy onto a file", copy("/d/s/x", "/d/f"), true, "/d /d/f=x /d/s /d/s/x=x /e "},
      {"copy onto a directory", copy("/d/f", "/e"), false},
      {"copy nothing", copy("/none", "/c"), false},
      {"write a new file", write("/e/n"), true, "/d /d/f=old /d/s /d/s/x=x /e /e/n=new "},
      {"write over a file", write("/d/f"), true, "/d /d/f=new /d/s /d/s/x=x /e "},
      {"write over a directory", write("/e"), false},
      {"write to nowhere", write("/n/f"), false},
      {"write below a file", write("/d/f/x"), false},
      {"read", read("/d/f")},
      {"read a directory", read("/d"), false},
      {"read nothing", read("/d/none"), false},
      {"look at a directory", look("/d")},
      {"look at nothing", look("/none"), false},
  };
}

TEST_P(FileSystemContract, EveryOperationDoesAllOfItsWorkOrNoneAndSaysWhich) {
  auto& files = platform().fileSystem;
  const std::string root = host().scratchDirectory() + "/root";
  for (const auto& row : rows()) {
    SCOPED_TRACE(row.name);
    files.removeItem(root);
    ASSERT_TRUE(files.createDirectory(root + "/d/s", true, {}) && files.createDirectory(root + "/e", true, {}));
    ASSERT_TRUE(files.writeAtomically(root + "/d/f", "old") && files.writeAtomically(root + "/d/s/x", "x"));
    ErrorRef error = row.succeeds ? platform::makeError("Stale", 1) : nullptr;
    EXPECT_EQ(row.operation(files, root, &error), row.succeeds);
    EXPECT_EQ(error == nullptr, row.succeeds) << (error ? error->describe() : "failed without an error");
    EXPECT_EQ(picture(files, root), row.after ? row.after : before);
    // Nobody has to ask for the error.
    row.operation(files, root, nullptr);
  }
}

TEST_P(FileSystemContract, TheQuestionsAboutWhatIsThere) {
  auto& files = platform().fileSystem;
  const std::string root = host().scratchDirectory();
  EXPECT_TRUE(files.createFile(root + "/f", "old", {}));
  auto attributes = Value::makeDictionary();
  attributes.dictionary()->set(platform::FXFileOwnerAccountName, "nobody-of-this-name");
  EXPECT_TRUE(files.createFile(root + "/f", std::string(5000, '\0'), attributes))
      << "attributes are applied if allowed";
  EXPECT_FALSE(files.createFile(root + "/none/f", "b", {}));
  EXPECT_EQ(files.attributesOfItem(root + "/f")->size, 5000u);
  EXPECT_FALSE(files.attributesOfItem(root + "/f")->isDirectory);
  EXPECT_TRUE(files.attributesOfItem(root)->isDirectory);
  EXPECT_EQ(files.readFile(root + "/f"), std::string(5000, '\0'));
  EXPECT_FALSE(files.fileExists(root + "/none"));
  int number = 0;
  EXPECT_EQ(files.utimes(root, number), 0);
  EXPECT_EQ(files.utimes(root + "/none", number), -1);
  EXPECT_NE(number, 0);
  EXPECT_FALSE(platform().process.textOfErrorNumber(number).empty());
}

}  // namespace
}  // namespace contract
