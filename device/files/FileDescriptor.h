#pragma once

#include <unistd.h>

#include <utility>

namespace device {

/// Owns an open file of the system; -1 for none.
class FileDescriptor {
 public:
  explicit FileDescriptor(int number = -1) noexcept : _number(number) {}
  FileDescriptor(FileDescriptor&& other) noexcept : _number(std::exchange(other._number, -1)) {}
  FileDescriptor& operator=(FileDescriptor&& other) noexcept {
    std::swap(_number, other._number);
    return *this;
  }
  ~FileDescriptor() {
    if (_number >= 0) ::close(_number);
  }

  int get() const noexcept { return _number; }
  bool isOpen() const noexcept { return _number >= 0; }

 private:
  int _number;
};

}  // namespace device
