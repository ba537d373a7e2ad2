#pragma once

#include <cstddef>
#include <cstdint>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/Value.h"

namespace tsd {

/// Something that a sync or a restore would stumble over.
struct Finding {
  enum class Weight : std::uint8_t {
    error,    // the sync, or the restore, fails as a whole
    problem,  // an app does not become as the host wants it
    note,     // all works, but not all of it as was probably meant
  };

  Weight weight;
  std::string file;
  std::size_t line = 0;  // 0: not known
  std::string app{};     // empty: no app's
  std::string text{};    // what is wrong, a sentence without its full stop
  std::string remedy{};  // what to do
};
const char* nameOf(Finding::Weight weight);

/// Everything that can be found in a host's folder without a device: its lists, its apps' folders, each package read to
/// its end. Nothing is written.
class HostCheck {
 public:
  explicit HostCheck(std::string host) : _host(std::move(host)) {}

  /// Never throws for what is wrong with the host.
  const std::vector<Finding>& run();
  std::size_t installs() const { return _installs.size(); }
  std::size_t removals() const { return _removals; }

 private:
  /// A list of the host, and where its elements begin.
  struct List;

  List readList(const std::string& path, platform::Value::Kind kind, Finding::Weight weight, const std::string& remedy);
  bool checkFolder();
  void checkTodoList();
  void checkTodoEntry(const List& list, std::size_t place);
  void checkPackage(const std::string& app, const std::string& version, const std::string& list, std::size_t line);
  void checkMetadata(const std::string& app, const std::string& folder);
  void checkAppFolder(const std::string& app);
  void checkLayout();
  void checkRestoreList();
  void checkDemotedList();
  void checkStrays();
  void checkPushed(const std::string& folder, std::size_t depth);

  std::string addAgain() const { return "tsd host add " + _host + " PACKAGE --replace"; }
  std::string addToRestore() const { return addAgain() + " --restore"; }
  void add(Finding finding) { _findings.push_back(std::move(finding)); }

  const std::string _host;
  std::vector<Finding> _findings;
  std::set<std::string> _named;     // by the todo list
  std::set<std::string> _installs;  // those of them that are to be installed
  std::set<std::string> _restored;  // by the restore list
  std::size_t _removals = 0;
  std::size_t _entries = 0;
  std::uint64_t _bytes = 0;
  bool _isTodoListKnown = false;  // it is there, and can be read
  bool _isFull = false;           // the limits have been passed, and told
};

}  // namespace tsd
