#include "device/services/FileSystemService.h"

#include <cerrno>

#include "device/files/DevicePath.h"
#include "device/services/LastRead.h"
#include "device/services/ListProblem.h"

namespace device {

using platform::Bytes;
using platform::BytesView;
using platform::ErrorRef;
using platform::FileAttributes;
using platform::Value;

static constexpr const char* className = "FileSystem";

static bool isQuestion(std::string_view operation) {
  return operation == "removeItem" || operation == "readFile" || operation == "attributesOfItem";
}

void FileSystemService::tell(const char* operation, std::string_view path, const ErrorRef& error,
                             bool mayBeMissing) const {
  if (!_failed || Boundary::isDeclined(error)) return;
  if (mayBeMissing && error && error->domain() == "FileSystem" && error->code() == ENOENT) return;
  std::string_view reason = error ? std::string_view(error->description()) : "no reason given";
  // The path is passed already.
  if (reason.size() > path.size() + 2 && reason.substr(0, path.size()) == path && reason.substr(path.size(), 2) == ": ")
    reason.remove_prefix(path.size() + 2);
  _failed(operation, path, reason);
}

template <class Body>
auto FileSystemService::run(const InjectionPoint& point, std::string_view path, ErrorRef* error,
                            CallArguments arguments, Body&& body) {
  // The reason is needed here even if the caller does not want it.
  ErrorRef reason;
  Crossing crossing{point};
  crossing.answersBytes = true;
  auto result = _boundary.call(crossing, &reason, arguments, [&] { return body(&reason); });
  if (!result) tell(point.operation(), path, reason, isQuestion(point.operation()));
  platform::setError(error, std::move(reason));
  return result;
}

bool FileSystemService::removeItem(std::string_view path, ErrorRef* error) {
  return run({className, "removeItem"}, path, error, {{"path", path}},
             [&](ErrorRef* reason) { return _files.removeItem(path, reason); });
}

bool FileSystemService::createDirectory(std::string_view path, bool withIntermediateDirectories,
                                        const Value& attributes, ErrorRef* error) {
  return run(
      {className, "createDirectory"}, path, error,
      {{"path", path}, {"withIntermediateDirectories", withIntermediateDirectories}, {"attributes", attributes}},
      [&](ErrorRef* reason) { return _files.createDirectory(path, withIntermediateDirectories, attributes, reason); });
}

bool FileSystemService::moveItem(std::string_view from, std::string_view to, ErrorRef* error) {
  return run({className, "moveItem"}, from, error, {{"from", from}, {"to", to}},
             [&](ErrorRef* reason) { return _files.moveItem(from, to, reason); });
}

bool FileSystemService::copyItem(std::string_view from, std::string_view to, ErrorRef* error) {
  return run({className, "copyItem"}, from, error, {{"from", from}, {"to", to}},
             [&](ErrorRef* reason) { return _files.copyItem(from, to, reason); });
}

bool FileSystemService::fileExists(std::string_view path, bool* isDirectory) {
  if (isDirectory) *isDirectory = false;
  return _boundary.call({{className, "fileExists"}}, nullptr, {{"path", path}},
                        [&] { return _files.fileExists(path, isDirectory); });
}

std::optional<FileAttributes> FileSystemService::attributesOfItem(std::string_view path, ErrorRef* error) {
  return run({className, "attributesOfItem"}, path, error, {{"path", path}},
             [&](ErrorRef* reason) { return _files.attributesOfItem(path, reason); });
}

bool FileSystemService::createFile(std::string_view path, BytesView contents, const Value& attributes) {
  return run({className, "createFile"}, path, nullptr,
             {{"path", path}, {"contents", CallArgument::BytesCount{contents.size()}}, {"attributes", attributes}},
             [&](ErrorRef* reason) { return _files.putFile(path, contents, attributes, reason); });
}

std::optional<Bytes> FileSystemService::readFile(std::string_view path, ErrorRef* error) {
  auto bytes = run({className, "readFile"}, path, error, {{"path", path}},
                   [&](ErrorRef* reason) { return _files.readFile(path, reason); });
  if (bytes) LastRead::ofThisThread().set(path, bytes->size());
  if (bytes && bytes->empty() && maySeemMissing(path) && _failed)
    _failed("reading the property list", path, "an empty document");
  return bytes;
}

bool FileSystemService::writeAtomically(std::string_view path, BytesView contents, ErrorRef* error,
                                        platform::Durability durability) {
  return run({className, "writeAtomically"}, path, error,
             {{"path", path}, {"contents", CallArgument::BytesCount{contents.size()}}},
             [&](ErrorRef* reason) { return _files.writeAtomically(path, contents, reason, durability); });
}

int FileSystemService::utimes(std::string_view path, int& errorNumber) {
  int number = 0;
  int status = _boundary.call(
      {{className, "utimes"}}, nullptr, {{"path", path}}, [&] { return _files.utimes(path, number); }, -1);
  if (status == 0) return status;
  errorNumber = number ? number : EIO;
  tell("utimes", path, fileError(errorNumber, path), false);
  return status;
}

}  // namespace device
