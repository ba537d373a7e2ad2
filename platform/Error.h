#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>

namespace platform {

class Error;
/// Absent (null) means: no error. Shared freely between threads, as errors never change.
using ErrorRef = std::shared_ptr<const Error>;

/// Why an operation failed.
///
/// An operation that can fail takes `ErrorRef* error = nullptr` last, sets it absent on success and to the
/// reason on failure, and tells failure by a false or absent result. Nothing throws across an interface.
class Error {
 public:
  Error(std::string domain, std::int64_t code, std::string description = {}, ErrorRef underlying = nullptr)
      : _domain(std::move(domain)),
        _code(code),
        _description(std::move(description)),
        _underlying(std::move(underlying)) {}

  const std::string& domain() const noexcept { return _domain; }
  std::int64_t code() const noexcept { return _code; }
  /// One line for people; may be empty.
  const std::string& description() const noexcept { return _description; }
  const ErrorRef& underlying() const noexcept { return _underlying; }

  /// "domain code", with ": description" where there is one.
  std::string describe() const {
    std::string text = _domain + " " + std::to_string(_code);
    return _description.empty() ? text : text + ": " + _description;
  }

 private:
  std::string _domain;
  std::int64_t _code;
  std::string _description;
  ErrorRef _underlying;
};

inline ErrorRef makeError(std::string domain, std::int64_t code, std::string description = {},
                          ErrorRef underlying = nullptr) {
  return std::make_shared<const Error>(std::move(domain), code, std::move(description), std::move(underlying));
}

/// Stores into an error out-parameter that may not have been given.
inline void setError(ErrorRef* out, ErrorRef error) {
  if (out) *out = std::move(error);
}

}  // namespace platform
