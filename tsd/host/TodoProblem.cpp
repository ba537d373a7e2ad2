#include "tsd/host/TodoProblem.h"

namespace tsd {

std::string problemOfTodoEntry(const platform::Value& entry) {
  const auto* fields = entry.dictionary();
  if (!fields) return "it is not a dictionary";
  for (const char* key : {"identifier", "operation"}) {
    if ((*fields)[key].isAbsent()) return std::string("it has no \"") + key + "\"";
    if (!(*fields)[key].string()) return std::string("its \"") + key + "\" is not a text";
  }
  return {};
}

}  // namespace tsd
