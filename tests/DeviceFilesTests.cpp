#include <fcntl.h>
#include <gtest/gtest.h>
#include <sqlite3.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <random>
#include <thread>
#include <utility>

#include "device/files/DiskFileTree.h"
#include "device/files/FileTree.h"
#include "device/files/OverlayFileTree.h"
#include "device/files/StepWatch.h"
#include "device/files/TemporaryFiles.h"
#include "device/store/Store.h"

namespace {

using namespace device;
using platform::ErrorRef;
using platform::Value;

/// A folder of the host that goes with the object.
class Folder {
 public:
  Folder() {
    std::string pattern = testing::TempDir() + "device-files-XXXXXX";
    if (::mkdtemp(pattern.data())) _path = pattern;
  }
  ~Folder() { std::filesystem::remove_all(_path); }
  Folder(const Folder&) = delete;
  Folder& operator=(const Folder&) = delete;
  const std::string& path() const { return _path; }
  std::string operator/(const std::string& name) const { return _path + "/" + name; }

 private:
  std::string _path;
};

/// Lowers a limit of the process for a scope.
class LoweredLimit {
 public:
  LoweredLimit(__rlimit_resource resource, rlim_t value) : _resource(resource) {
    ::getrlimit(resource, &_before);
    rlimit lowered{value, _before.rlim_max};
    ::setrlimit(resource, &lowered);
  }
  ~LoweredLimit() { ::setrlimit(_resource, &_before); }
  LoweredLimit(const LoweredLimit&) = delete;
  LoweredLimit& operator=(const LoweredLimit&) = delete;

 private:
  __rlimit_resource _resource;
  rlimit _before;
};

enum class Medium { disk, memory, overlay };
std::string nameOf(const testing::TestParamInfo<Medium>& info) {
  return info.param == Medium::disk ? "disk" : info.param == Medium::memory ? "memory" : "overlay";
}

/// A tree that keeps folders open.
std::unique_ptr<FileTree> makeTreeAlone(const Folder& folder) {
  FileDescriptor root(::open(folder.path().c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  return std::make_unique<DiskFileTree>(std::move(root), nullptr, DiskFileTree::Use::alone);
}

std::unique_ptr<FileTree> makeTree(Medium medium, const Folder& folder) {
  return medium == Medium::memory ? makeMemoryFileTree() : openDiskFileTree(folder.path());
}

/// "/d/f" holds "old", "/d/s/x" holds "x", "/e" is empty.
void fill(FileTree& files) {
  files.createDirectory("/d/s", true, {});
  files.createDirectory("/e", false, {});
  files.writeAtomically("/d/f", "old");
  files.writeAtomically("/d/s/x", "x");
}

/// Everything in the tree, one line an item.
std::string picture(FileTree& files, const std::string& directory = "") {
  std::string text;
  auto entries = files.list(directory.empty() ? "/" : directory);
  if (!entries) return directory + " cannot be listed\n";
  for (const auto& entry : *entries) {
    std::string path = directory + "/" + entry.name;
    text += entry.isDirectory ? path + "/\n" + picture(files, path) : path + " " + *files.readFile(path) + "\n";
  }
  return text;
}

/// An overlay's files lie below it.
std::unique_ptr<FileTree> makeFilledTree(Medium medium, const Folder& folder) {
  auto files = makeTree(medium, folder);
  fill(*files);
  return medium == Medium::overlay ? std::make_unique<OverlayFileTree>(std::move(files)) : std::move(files);
}

class FileTrees : public testing::TestWithParam<Medium> {
 protected:
  Folder _folder;
  std::unique_ptr<FileTree> _files = makeFilledTree(GetParam(), _folder);
};
INSTANTIATE_TEST_SUITE_P(, FileTrees, testing::Values(Medium::disk, Medium::memory, Medium::overlay), nameOf);

struct FileRow {
  const char* name;
  std::function<bool(FileTree&, ErrorRef*)> operation;
  int code = 0;
  std::string path{};       // that the error names
  std::string after = "=";  // the picture afterwards; "=": unchanged
};

const std::string before = "/d/\n/d/f old\n/d/s/\n/d/s/x x\n/e/\n";

// NOLINTNEXTLINE(readability-function-size): a table
std::vector<FileRow> fileRows() {
  auto remove = [](const char* path) { return [=](FileTree& f, ErrorRef* e) { return f.removeItem(path, e); }; };
  auto make = [](const char* path, bool all) {
    return [=](FileTree& f, ErrorRef* e) { return f.createDirectory(path, all, {}, e); };
  };
  auto move = [](const char* from, const char* to) {
    return [=](FileTree& f, ErrorRef* e) { return f.moveItem(from, to, e); };
  };
  auto copy = [](const char* from, const char* to) {
    return [=](FileTree& f, ErrorRef* e) { return f.copyItem(from, to, e); };
  };
  auto write = [](const std::string& path) {
    return [=](FileTree& f, ErrorRef* e) { return f.writeAtomically(path, "new", e); };
  };
  auto read = [](const char* path) {
    return [=](FileTree& f, ErrorRef* e) { return f.readFile(path, e).has_value(); };
  };
  auto look = [](const char* path) {
    return [=](FileTree& f, ErrorRef* e) { return f.attributesOfItem(path, e).has_value(); };
  };
  auto list = [](const char* path) { return [=](FileTree& f, ErrorRef* e) { return f.list(path, e).has_value(); }; };
  auto begin = [](const char* path) {
    return [=](FileTree& f, ErrorRef* e) {
      auto writer = f.createNew(path, false, e);
      return writer && writer->write("n", e) && writer->write("ew", e) && writer->close(true, e);
    };
  };
  auto open = [](const char* path) {
    return [=](FileTree& f, ErrorRef* e) { return f.openForReading(path, e) != nullptr; };
  };
  auto sync = [](const char* path) { return [=](FileTree& f, ErrorRef* e) { return f.syncDirectory(path, e); }; };
  return {
      {"remove nothing", remove("/d/none"), ENOENT, "/d/none"},
      {"remove below a file", remove("/d/f/x"), ENOTDIR, "/d/f/x"},
      {"remove the root", remove("/"), EBUSY, "/"},
      {"make the root, allowed", make("/", true)},
      {"make what is there", make("/d/s", false), EEXIST, "/d/s"},
      {"make without the one above", make("/n/m", false), ENOENT, "/n/m"},
      {"make over a file", make("/d/f", true), EEXIST, "/d/f"},
      {"make below a file", make("/d/f/m", true), ENOTDIR, "/d/f/m"},
      {"move onto a file", move("/d/s/x", "/d/f"), EEXIST, "/d/f"},
      {"move onto an empty directory", move("/d", "/e"), EEXIST, "/e"},
      {"move onto itself", move("/d", "/d"), EEXIST, "/d"},
      {"move into itself", move("/d", "/d/s/d"), EINVAL, "/d/s/d"},
      {"move nothing", move("/none", "/n"), ENOENT, "/none"},
      {"move to nowhere", move("/d", "/n/d"), ENOENT, "/n/d"},
      {"move the root", move("/", "/e/r"), EBUSY, "/"},
      {"copy onto itself", copy("/d/f", "/d/f")},
      {"copy onto a directory", copy("/d/f", "/e"), EISDIR, "/e"},
      {"copy a directory", copy("/d", "/n"), EISDIR, "/d"},
      {"write over a directory", write("/e"), EISDIR, "/e"},
      {"write to nowhere", write("/n/f"), ENOENT, "/n/f"},
      {"write below a file", write("/d/f/x"), ENOTDIR, "/d/f/x"},
      {"write over the root", write("/"), EISDIR, "/"},
      {"a relative path", write("d/f"), EINVAL, "d/f"},
      {"no path", write(""), EINVAL, "(no path)"},
      {"dots", write("/d/../n"), EINVAL, "/d/../n"},
      {"a dot", write("/d/./n"), EINVAL, "/d/./n"},
      {"an empty name", write("/d//n"), EINVAL, "/d//n"},
      {"a slash at the end", write("/d/n/"), EINVAL, "/d/n/"},
      {"a zero byte", write(std::string("/d/n\0m", 6)), EINVAL, "/d/n?m"},
      {"a line end in a name that is not there", read("/d/\n"), ENOENT, "/d/?"},
      {"a long name", write("/" + std::string(256, 'n')), ENAMETOOLONG, "/" + std::string(256, 'n')},
      {"read a directory", read("/d"), EISDIR, "/d"},
      {"read nothing", read("/d/none"), ENOENT, "/d/none"},
      {"look at nothing", look("/none"), ENOENT, "/none"},
      {"list the root", list("/")},
      {"list a file", list("/d/f"), ENOTDIR, "/d/f"},
      {"list nothing", list("/none"), ENOENT, "/none"},
      {"begin a new file", begin("/e/n"), 0, "", before + "/e/n new\n"},
      {"begin a file that is there", begin("/d/f"), EEXIST, "/d/f"},
      {"begin a directory that is there", begin("/e"), EEXIST, "/e"},
      {"open a directory", open("/d"), EISDIR, "/d"},
      {"sync", sync("/d")},
      {"sync a file", sync("/d/f"), ENOTDIR, "/d/f"},
  };
}

TEST_P(FileTrees, answerEveryOperationWithItsErrorNumber) {
  for (const auto& row : fileRows()) {
    SCOPED_TRACE(row.name);
    Folder folder;
    auto files = makeFilledTree(GetParam(), folder);
    ErrorRef error = platform::makeError("stale", 1);
    EXPECT_EQ(row.operation(*files, &error), row.code == 0);
    ASSERT_EQ(error == nullptr, row.code == 0) << (error ? error->describe() : "");
    if (error) {
      EXPECT_EQ(error->domain(), "FileSystem");
      EXPECT_EQ(error->code(), row.code) << error->describe();
      EXPECT_EQ(error->description().compare(0, row.path.size() + 2, row.path + ": "), 0) << error->description();
      EXPECT_EQ(error->description().find('\n'), std::string::npos);
    }
    EXPECT_EQ(picture(*files), row.after == "=" ? before : row.after);
  }
}

TEST_P(FileTrees, keepAnOpenFileAsItWasOpened) {
  _files->writeAtomically("/f", "0123456789");
  auto reader = _files->openForReading("/f");
  _files->writeAtomically("/f", "new");
  EXPECT_EQ(reader->read(4), "0123");
  EXPECT_TRUE(reader->seek(8));
  EXPECT_EQ(reader->read(4), "89");
  EXPECT_EQ(reader->read(4), "");
  EXPECT_TRUE(reader->seek(20));
  EXPECT_EQ(reader->read(4), "");
}

TEST_P(FileTrees, loseWhatAnInterruptedOperationLeft) {
  auto whole = picture(*_files);
  for (std::string directory : {"", "/d", "/d/s"})
    _files->createFile(directory + "/" + std::string(temporaryFilePrefix) + "1-1", "half", {});
  _files->createDirectory("/d/" + std::string(temporaryFilePrefix) + "1-2/s", true, {});
  EXPECT_EQ(removeTemporaryFiles(*_files), 4u);
  EXPECT_EQ(picture(*_files), whole);
}

/// The trees through the same random operations: the same answers, the same trees. Half-way one goes on above itself.
TEST(FileTreesTogether, doTheSame) {
  for (unsigned seed = 0; seed < 8; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    std::mt19937 random(seed);
    Folder folder, below, alone;
    std::unique_ptr<FileTree> trees[] = {openDiskFileTree(folder.path()), makeMemoryFileTree(),
                                         openDiskFileTree(below.path()), makeTreeAlone(alone)};
    std::string left;
    auto path = [&] {
      std::string text;
      for (unsigned names = random() % 4 + 1; names > 0; --names) text += std::string("/") + "abc"[random() % 3];
      return random() % 16 ? text : "/";
    };
    for (int step = 0; step < 200; ++step) {
      unsigned operation = random() % 8;
      std::string one = path(), other = path(), answers[4];
      if (step == 100) {
        left = picture(*trees[2]);
        trees[2] = std::make_unique<OverlayFileTree>(std::move(trees[2]));
      }
      for (int i = 0; i < 4; ++i) {
        FileTree& files = *trees[i];
        ErrorRef error;
        switch (operation) {
          case 0:
            files.createDirectory(one, true, {}, &error);
            break;
          case 1:
            files.createDirectory(one, false, {}, &error);
            break;
          case 2:
            files.writeAtomically(one, other, &error);
            break;
          case 3:
            files.moveItem(one, other, &error);
            break;
          case 4:
            files.copyItem(one, other, &error);
            break;
          case 5:
            if (step % 4 == 0) files.removeItem(one, &error);
            break;
          case 6:
            files.createNew(one, true, &error);
            break;
          default:
            files.readFile(one, &error);
            break;
        }
        answers[i] = error ? error->describe() : "";
      }
      for (int i : {1, 2, 3})
        ASSERT_EQ(answers[0], answers[i])
            << "step " << step << " operation " << operation << " " << one << " " << other;
    }
    for (int i : {1, 2, 3}) EXPECT_EQ(picture(*trees[0]), picture(*trees[i]));
    EXPECT_EQ(picture(*openDiskFileTree(below.path())), left);
  }
}

TEST(DiskFileTree, followsNoLinkAndOpensNothingStrange) {
  Folder folder, outside;
  auto files = openDiskFileTree(folder.path());
  fill(*files);
  std::ofstream(outside / "secret") << "secret";
  ASSERT_EQ(::symlink(outside.path().c_str(), (folder / "out").c_str()), 0);
  ASSERT_EQ(::symlink((outside / "secret").c_str(), (folder / "d/link").c_str()), 0);
  ASSERT_EQ(::symlink("none", (folder / "dangling").c_str()), 0);
  ASSERT_EQ(::mkfifo((folder / "d/fifo").c_str(), 0600), 0);
  struct Row {
    const char* path;
    int code;
  };
  for (Row row : {Row{"/out/secret", ELOOP},
                  {"/out", ELOOP},
                  {"/d/link", ELOOP},
                  {"/dangling", ELOOP},
                  {"/d/fifo", EOPNOTSUPP},
                  {"/d/fifo/x", ENOTDIR}}) {
    SCOPED_TRACE(row.path);
    std::function<bool(ErrorRef*)> operations[] = {
        [&](ErrorRef* e) { return files->readFile(row.path, e).has_value(); },
        [&](ErrorRef* e) { return files->writeAtomically(row.path, "new", e); },
        [&](ErrorRef* e) { return files->copyItem("/d/f", row.path, e); },
        [&](ErrorRef* e) { return files->copyItem(row.path, "/copy", e); },
        [&](ErrorRef* e) { return files->moveItem(row.path, "/moved", e); },
        [&](ErrorRef* e) { return files->attributesOfItem(row.path, e).has_value(); },
        [&](ErrorRef* e) { return files->openForReading(row.path, e) != nullptr; },
    };
    for (const auto& operation : operations) {
      ErrorRef error;
      EXPECT_FALSE(operation(&error));
      EXPECT_EQ(error ? error->code() : 0, row.code);
    }
    EXPECT_FALSE(files->fileExists(row.path));
    EXPECT_FALSE(files->createDirectory(row.path, true, {}));
    EXPECT_FALSE(files->list(row.path).has_value());
    EXPECT_FALSE(files->createFile(row.path, "new", {}));
    EXPECT_EQ(files->createNew(row.path, false), nullptr);
  }
  EXPECT_EQ(picture(*files), before);
  // A link, and what else is there, goes itself; what it pointed to stays.
  EXPECT_TRUE(files->removeItem("/out"));
  EXPECT_TRUE(files->removeItem("/d"));
  std::string secret;
  std::ifstream(outside / "secret") >> secret;
  EXPECT_EQ(secret, "secret");
  EXPECT_FALSE(std::filesystem::exists(std::filesystem::symlink_status(folder / "d")));
}

TEST(DiskFileTree, keepsTheOldContentWhenAWriteFails) {
  Folder folder;
  auto files = openDiskFileTree(folder.path());
  fill(*files);
  files->writeAtomically("/big", std::string(100000, 'b'));
  auto whole = picture(*files);
  std::signal(SIGXFSZ, SIG_IGN);
  {
    LoweredLimit size(RLIMIT_FSIZE, 5000);
    ErrorRef error;
    EXPECT_FALSE(files->writeAtomically("/d/f", std::string(10000, 'n'), &error));
    EXPECT_EQ(error->code(), EFBIG);
    EXPECT_FALSE(files->createFile("/d/f", std::string(10000, 'n'), {}));
    EXPECT_FALSE(files->copyItem("/big", "/d/f"));
  }
  std::signal(SIGXFSZ, SIG_DFL);
  EXPECT_EQ(picture(*files), whole);
}

/// How many steps of each kind there were.
class CountedSteps final : public StepWatch {
 public:
  int before(Step& step) override {
    ++_counts[step.kind];
    return 0;
  }
  int after(const Step&) override { return 0; }
  std::map<Step::Kind, int> take() { return std::exchange(_counts, {}); }

 private:
  std::map<Step::Kind, int> _counts;
};

TEST(DiskFileTree, flushesManySmallItemsAtOnceAndLargeOnesByThemselves) {
  Folder folder;
  auto steps = std::make_shared<CountedSteps>();
  auto tree = openDiskFileTree(folder.path(), nullptr, steps);
  auto add = [&](const std::string& path, std::uintmax_t size) {
    std::ofstream(folder / path).put('x');
    std::filesystem::resize_file(folder / path, size);
  };
  using Kind = Step::Kind;
  ASSERT_TRUE(tree->createDirectory("/app/inner", true, {}));
  for (const char* name : {"/app/a", "/app/inner/b"}) add(name, 100);
  steps->take();
  ASSERT_TRUE(tree->syncItem("/app"));
  auto few = steps->take();
  EXPECT_EQ(few[Kind::syncTree], 0);
  EXPECT_EQ(few[Kind::syncFile], 2);
  EXPECT_EQ(few[Kind::syncDirectory], 3) << "its own name is in the directory above";
  add("/app/c", 100);
  ASSERT_TRUE(tree->syncItem("/app"));
  const bool flushesTrees = steps->take()[Kind::syncTree] == 1;  // not on every file system
  add("/app/c", std::uintmax_t{5 * 4} << 20);
  ASSERT_TRUE(tree->syncItem("/app"));
  auto large = steps->take();
  EXPECT_EQ(large[Kind::syncTree], 0);
  EXPECT_EQ(large[Kind::syncFile], 3);
  for (int i = 0; i < 60; ++i) add("/app/" + std::to_string(i), std::uintmax_t{4} << 20);
  ASSERT_TRUE(tree->syncItem("/app"));
  EXPECT_EQ(steps->take()[Kind::syncFile], flushesTrees ? 0 : 63) << "so many take too long by themselves";
}

TEST(DiskFileTree, removesAnyDepthWithFewFilesOpen) {
  Folder folder;
  auto files = openDiskFileTree(folder.path());
  std::string path = "/a";
  for (int i = 0; i < 300; ++i) path += "/a/b";
  ASSERT_TRUE(files->createDirectory(path, true, {}));
  files->writeAtomically(path + "/f", "f");
  LoweredLimit open(RLIMIT_NOFILE, 24);
  EXPECT_TRUE(files->removeItem("/a"));
  EXPECT_EQ(picture(*files), "");
}

class Stores : public testing::TestWithParam<Medium> {
 protected:
  std::unique_ptr<Store> open() {
    return GetParam() == Medium::disk ? openDatabaseStore(_folder / "device.db") : makeMemoryStore();
  }
  static std::string picture(Store& store) {
    std::string text;
    for (const auto& record : store.load())
      text += record.kind + "/" + record.key + "=" + std::to_string(record.value.integer().value_or(-1)) + " ";
    return text;
  }
  Folder _folder;
};
INSTANTIATE_TEST_SUITE_P(, Stores, testing::Values(Medium::disk, Medium::memory), nameOf);

TEST_P(Stores, keepRecordsInTheOrderOfInsertion) {
  auto store = open();
  ErrorRef error = platform::makeError("stale", 1);
  EXPECT_TRUE(store->commit({{"app", "b", 1}, {"app", "a", 2}, {"setting", "b", 3}}, &error));
  EXPECT_EQ(error, nullptr);
  EXPECT_TRUE(store->commit({{"app", "a", 4}, {"app", std::string("\0'", 2), 5}, {"setting", "", 6}}));
  EXPECT_TRUE(store->commit({{"app", "b", {}}, {"app", "none", {}}}));
  EXPECT_TRUE(store->commit({{"app", "b", 7}, {"app", "c", 8}, {"app", "c", {}}}));
  std::string expected = "app/a=4 setting/b=3 app/" + std::string("\0'", 2) + "=5 setting/=6 app/b=7 ";
  EXPECT_EQ(picture(*store), expected);
  if (GetParam() == Medium::memory) return;
  store = nullptr;
  EXPECT_EQ(picture(*open()), expected);
}

TEST(DatabaseStore, commitsAllOrNothing) {
  Folder folder;
  auto store = openDatabaseStore(folder / "device.db");
  auto deep = Value::makeDictionary();
  deep.dictionary()->set("data", Value::makeData(std::string("\0\xff", 2)));
  ASSERT_TRUE(store->commit({{"app", "a", deep}}));
  ErrorRef error;
  EXPECT_FALSE(store->commit({{"app", "a", 1}, {"app", "b", "\xff"}}, &error));
  ASSERT_NE(error, nullptr);
  EXPECT_EQ(openDatabaseStore(folder / "device.db", &error), nullptr) << "somebody else may not have it meanwhile";
  store = nullptr;
  store = openDatabaseStore(folder / "device.db", &error);
  ASSERT_NE(store, nullptr) << error->describe();
  ASSERT_EQ(store->load().size(), 1u);
  EXPECT_EQ(store->load()[0].value, deep);
}

TEST(DatabaseStore, keepsWhatItHadWhenThereIsNoRoom) {
  Folder folder;
  const std::string path = folder / "device.db";
  auto store = openDatabaseStore(path);
  ASSERT_TRUE(store && store->commit({{"app", "a", ""}}));
  std::signal(SIGXFSZ, SIG_IGN);
  std::string held;
  int refused = 0, taken = 0;
  // The log may grow by so much: from not at all to more than the commit takes, which is more than fits one call.
  for (std::uintmax_t more = 0; more < 120'000; more += 1500) {
    const std::string text(80'000, static_cast<char>('a' + more / 1500 % 26));
    const auto size = std::filesystem::file_size(path + "-wal");
    bool isKept = false;
    {
      LoweredLimit limit(RLIMIT_FSIZE, size + more);
      isKept = store->commit({{"app", "a", text}});
    }
    ++(isKept ? taken : refused);
    if (isKept) held = text;
    ASSERT_EQ(store->load().at(0).value.string().value_or("nothing"), held) << more;
    if (more % 4 == 0) store = nullptr, store = openDatabaseStore(path);
    ASSERT_TRUE(store) << more;
    ASSERT_EQ(store->load().at(0).value.string().value_or("nothing"), held) << "opened again, " << more;
  }
  std::signal(SIGXFSZ, SIG_DFL);
  EXPECT_GT(refused, 20);
  EXPECT_GT(taken, 5);
}

TEST(DatabaseStore, keepsWhatIsTooMuchForItsCache) {
  Folder folder;
  const std::string path = folder / "device.db";
  auto store = openDatabaseStore(path);
  auto text = [](char each) { return Value(std::string(3'000'000, each)); };
  for (char turn = 'a'; turn < 'e'; ++turn) {
    // Pages go into the log before the commit, and once more after they have changed again.
    ASSERT_TRUE(store->commit({{"app", "a", text('x')},
                               {"app", "b", text('y')},
                               {"app", "a", text(turn)},
                               {"app", "b", {}},
                               {"app", "b", text('z')}}));
    ASSERT_TRUE(store->write({{"app", "c", int(turn)}}));
    // As a process finds it whose predecessor was killed just now.
    for (const char* ending : {"", "-wal"})
      std::filesystem::copy_file(path + ending, folder / "killed" + ending,
                                 std::filesystem::copy_options::overwrite_existing);
    ErrorRef error;
    auto killed = openDatabaseStore(folder / "killed", &error);
    ASSERT_TRUE(killed) << error->describe();
    std::map<std::string, Value> values;
    for (const auto& record : killed->load()) values[record.key] = record.value;
    EXPECT_TRUE(values["a"] == text(turn) && values["b"] == text('z') && values["c"] == Value(int(turn))) << turn;
  }
}

TEST(DatabaseStore, isCopiedWholeWhileItIsWritten) {
  Folder folder;
  auto store = openDatabaseStore(folder / "device.db");
  ASSERT_TRUE(store);
  // Each commit changes both records, and enough pages for the log to be begun anew now and then.
  std::atomic<bool> over = false;
  std::jthread writer([&] {
    for (int turn = 1; turn <= 600; ++turn) {
      const Value value(std::string(30000, static_cast<char>('a' + turn % 26)) + std::to_string(turn));
      store->write({{"app", "one", value}, {"app", "other", value}});
    }
    over = true;
  });
  for (bool last = false; !last;) {
    last = over;
    ErrorRef error;
    auto copy = copyDatabaseStore(folder / "device.db", &error);
    ASSERT_TRUE(copy) << error->describe();
    auto records = copy->load();
    if (records.empty() && !last) continue;
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].value, records[1].value);
    if (last) {
      EXPECT_EQ(records[0].value.string()->substr(30000), "600");
    }
  }
  writer.join();
  EXPECT_TRUE(store->commit({{"app", "third", 3}})) << "a copy stands in nobody's way";
}

TEST(DatabaseStore, refusesWhatIsNoStore) {
  struct Row {
    const char* content;  // SQL, or text that begins with '!'
    const char* reason;
  };
  for (Row row :
       {Row{"!this is some text that is long enough to be looked at by a database, which it is not......",
            "not a database"},
        {"CREATE TABLE other(a)", "something else"},
        {"PRAGMA user_version=9", "something else"},
        {"PRAGMA application_id=1095791443;PRAGMA user_version=2", "format 2"},
        {"PRAGMA application_id=1095791443;PRAGMA user_version=1", "no such table"},
        {"CREATE TABLE records(place INTEGER PRIMARY KEY AUTOINCREMENT, kind TEXT NOT NULL, key TEXT NOT NULL,"
         "value BLOB NOT NULL, UNIQUE(kind, key));PRAGMA application_id=1095791443;PRAGMA user_version=1;"
         "INSERT INTO records(kind, key, value) VALUES('app', 'a', 'junk')",
         "app \"a\" cannot be read"}}) {
    SCOPED_TRACE(row.content);
    Folder folder;
    std::string path = folder / "device.db";
    if (row.content[0] == '!') {
      std::ofstream(path) << row.content;
    } else {
      sqlite3* database = nullptr;
      ASSERT_EQ(sqlite3_open(path.c_str(), &database), SQLITE_OK);
      EXPECT_EQ(sqlite3_exec(database, row.content, nullptr, nullptr, nullptr), SQLITE_OK);
      sqlite3_close(database);
    }
    ErrorRef error;
    EXPECT_EQ(openDatabaseStore(path, &error), nullptr);
    ASSERT_NE(error, nullptr);
    EXPECT_NE(error->description().find(row.reason), std::string::npos) << error->description();
    EXPECT_EQ(error->description().compare(0, path.size(), path), 0) << error->description();
  }
  ErrorRef error;
  EXPECT_EQ(openDatabaseStore("/none/device.db", &error), nullptr);
  EXPECT_NE(error, nullptr);
}

}  // namespace
