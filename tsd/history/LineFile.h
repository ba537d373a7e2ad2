#pragma once

#include <cstdio>
#include <memory>
#include <string>
#include <string_view>

namespace tsd {

/// A text file that is written line by line. The system has a line when `write` returns, so that it survives the death
/// of the process. One thread at a time.
class LineFile {
 public:
  /// Replaces an older file. Throws a `CommandError` that names it.
  explicit LineFile(const std::string& path);
  /// Line ends inside become spaces. A failure is only remembered: a full disk must not stop what is being recorded.
  void write(std::string line);
  /// Whether a line could not be written.
  bool failed() const { return _failed; }

 private:
  struct Close {
    void operator()(std::FILE* file) const { std::fclose(file); }
  };
  std::unique_ptr<std::FILE, Close> _file;
  bool _failed = false;
};

/// Now, as "2024-02-29T12:34:56.789Z".
std::string currentTimeText();

}  // namespace tsd
