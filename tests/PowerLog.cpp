#include "tests/PowerLog.h"

#include <set>
#include <utility>

namespace tests {

using device::FileTree;
using device::Step;
using device::Store;
using device::StoreRecord;
using platform::Bytes;

namespace {

/// The files as the process saw them, and how much of that is on the disk.
class Replay {
 public:
  Replay() { makeNode(true); }

  void take(Step::Kind kind, const std::string& path, const std::string& target, const Bytes& bytes) {
    switch (kind) {
      case Step::Kind::createDirectory:
      case Step::Kind::createFile:
        if (find(path) < 0) change({{placeOf(path), makeNode(kind == Step::Kind::createDirectory)}});
        return;
      case Step::Kind::move:
        return change({{placeOf(path), none}, {placeOf(target), find(path)}});
      case Step::Kind::remove:
        if (find(path) >= 0) change({{placeOf(path), none}});
        return;
      case Step::Kind::write:
        return _nodes[at(path)].pieces.push_back({bytes, false});
      case Step::Kind::syncFile:
        for (auto& piece : _nodes[at(path)].pieces) piece.synced = true;
        return;
      case Step::Kind::syncDirectory:
        for (auto& each : _changes) {
          for (const auto& entry : each.entries) each.synced |= entry.place.first == find(path);
        }
        return;
      case Step::Kind::syncTree:
        take(Step::Kind::syncDirectory, path.substr(0, path.rfind('/')), {}, {});
        return syncAllOf(path);
      default:
        return;
    }
  }

  std::unique_ptr<FileTree> left(PowerLog::Rest rest, const PowerLog::Dice& dice) const {
    std::set<Place> needed;  // places whose later change is on the disk, and with it every one before
    std::vector<bool> kept(_changes.size());
    for (std::size_t i = _changes.size(); i-- > 0;) {
      const auto& each = _changes[i];
      kept[i] = each.synced || (rest == PowerLog::Rest::anything ? dice(2) == 1 : rest != PowerLog::Rest::lost);
      for (const auto& entry : each.entries) kept[i] = kept[i] || needed.count(entry.place);
      if (!kept[i]) continue;
      for (const auto& entry : each.entries) needed.insert(entry.place);
    }
    std::map<int, std::map<std::string, int>> directories;
    for (std::size_t i = 0; i < kept.size(); ++i) {
      if (!kept[i]) continue;
      for (const auto& entry : _changes[i].entries) directories[entry.place.first][entry.place.second] = entry.node;
    }
    auto files = device::makeMemoryFileTree();
    build(*files, "", 0, directories, rest, dice);
    return files;
  }

 private:
  static constexpr int none = -1;
  using Place = std::pair<int, std::string>;  // a directory, and a name in it
  struct Piece {
    Bytes bytes;
    bool synced;
  };
  struct Node {
    bool isDirectory;
    std::map<std::string, int> items;
    std::vector<Piece> pieces;
  };
  struct Entry {
    Place place;
    int node;
  };
  struct Change {
    std::vector<Entry> entries;
    bool synced = false;
  };

  void syncAllOf(const std::string& path) {
    const Node& node = _nodes[at(path)];
    take(node.isDirectory ? Step::Kind::syncDirectory : Step::Kind::syncFile, path, {}, {});
    for (const auto& item : node.items) syncAllOf(path + '/' + item.first);
  }

  int makeNode(bool isDirectory) {
    _nodes.push_back({isDirectory, {}, {}});
    return static_cast<int>(_nodes.size()) - 1;
  }
  std::size_t at(const std::string& path) const { return static_cast<std::size_t>(find(path)); }
  int find(const std::string& path) const {
    int node = 0;
    for (std::size_t begin = 1; node >= 0 && begin < path.size();) {
      auto end = std::min(path.find('/', begin), path.size());
      const auto& items = _nodes[static_cast<std::size_t>(node)].items;
      auto found = items.find(path.substr(begin, end - begin));
      node = found == items.end() ? none : found->second;
      begin = end + 1;
    }
    return node;
  }
  Place placeOf(const std::string& path) const {
    auto slash = path.rfind('/');
    return {find(path.substr(0, slash)), path.substr(slash + 1)};
  }
  void change(std::vector<Entry> entries) {
    for (const auto& entry : entries) {
      auto& items = _nodes[static_cast<std::size_t>(entry.place.first)].items;
      if (entry.node == none)
        items.erase(entry.place.second);
      else
        items[entry.place.second] = entry.node;
    }
    _changes.push_back({std::move(entries)});
  }

  Bytes contentOf(const Node& file, PowerLog::Rest rest, const PowerLog::Dice& dice) const {
    Bytes content;
    for (const auto& piece : file.pieces) {
      std::size_t fate = rest == PowerLog::Rest::anything ? dice(4) : rest == PowerLog::Rest::zeroed ? 1 : 0;
      if (piece.synced || fate == 2)
        content += piece.bytes;
      else if (fate == 1)
        content += Bytes(piece.bytes.size(), '\0');
      else
        return fate == 3 ? content + piece.bytes.substr(0, piece.bytes.size() / 2) : content;
    }
    return content;
  }

  void build(FileTree& files, const std::string& path, int directory,
             const std::map<int, std::map<std::string, int>>& directories, PowerLog::Rest rest,
             const PowerLog::Dice& dice) const {
    auto found = directories.find(directory);
    if (found == directories.end()) return;
    for (const auto& [name, number] : found->second) {
      if (number == none) continue;
      const Node& node = _nodes[static_cast<std::size_t>(number)];
      std::string below = path + '/' + name;
      if (node.isDirectory) {
        files.createDirectory(below, false, {}, nullptr);
        build(files, below, number, directories, rest, dice);
      } else {
        files.createNew(below, false)->write(contentOf(node, rest, dice));
      }
    }
  }

  std::vector<Node> _nodes;
  std::vector<Change> _changes;
};

}  // namespace

class PowerLog::LoggedStore final : public Store {
 public:
  explicit LoggedStore(PowerLog& log) : _log(log) {}
  void read(const Take& take) override { _store->read(take); }
  bool commit(const std::vector<StoreRecord>& changes, platform::ErrorRef* error) override {
    _log._steps.push_back({Step::Kind::storeCommit, {}, {}, {}, changes});
    return _store->commit(changes, error);
  }
  bool write(const std::vector<StoreRecord>& changes, platform::ErrorRef* error) override {
    _log._steps.push_back({Step::Kind::storeWrite, {}, {}, {}, changes});
    return _store->commit(changes, error);
  }

 private:
  PowerLog& _log;
  const std::unique_ptr<Store> _store = device::makeMemoryStore();
};

int PowerLog::after(const Step& step) {
  _steps.push_back({step.kind, std::string(step.path), std::string(step.target), Bytes(step.bytes), {}});
  return 0;
}

std::unique_ptr<Store> PowerLog::makeStore() { return std::make_unique<LoggedStore>(*this); }

std::unique_ptr<FileTree> PowerLog::filesAfter(std::size_t count, Rest rest, const Dice& dice) const {
  Replay replay;
  for (std::size_t i = 0; i < count; ++i) {
    replay.take(_steps[i].kind, _steps[i].path, _steps[i].target, _steps[i].bytes);
  }
  return replay.left(rest, dice);
}

std::unique_ptr<Store> PowerLog::storeAfter(std::size_t count, Rest rest, const Dice& dice) const {
  std::size_t durable = count;
  while (durable > 0 && _steps[durable - 1].kind != Step::Kind::storeCommit) --durable;
  auto store = device::makeMemoryStore();
  for (std::size_t i = 0; i < count; ++i) {
    // Writes stand in the store's own log one behind the other: each needs all before it.
    if (i >= durable && !_steps[i].changes.empty()) {
      if (rest == Rest::lost || (rest == Rest::anything && dice(4) == 0)) break;
    }
    store->commit(_steps[i].changes);
  }
  return store;
}

std::string PowerLog::describe(std::size_t step) const {
  static constexpr const char* names[] = {"createDirectory", "createFile", "write",      "syncFile",
                                          "syncDirectory",   "syncTree",   "move",       "remove",
                                          "touch",           "storeWrite", "storeCommit"};
  const auto& logged = _steps[step];
  std::string text = names[static_cast<std::size_t>(logged.kind)] + (' ' + logged.path) + ' ' + logged.target;
  for (const auto& change : logged.changes) text += change.kind + ' ' + change.key + "; ";
  return text;
}

}  // namespace tests
