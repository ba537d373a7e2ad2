#include "tsd/sync/HostTodo.h"

#include "tsd/conduit/HostFolder.h"
#include "tsd/host/TodoProblem.h"

namespace tsd {

namespace {

constexpr std::size_t mostNamed = 5;

}  // namespace

std::vector<TodoEntry> readHostTodoList(const std::string& host, Console& console) {
  const std::string path = host + "/" + std::string(todoListName);
  const auto list = readHostList(path, platform::Value::Kind::array);
  std::size_t odd = 0;
  for (std::size_t place = 0; list.array() && place < list.array()->size(); ++place) {
    std::string problem = problemOfTodoEntry((*list.array())[place]);
    if (!problem.empty() && ++odd <= mostNamed)
      console.message(path + ": entry " + std::to_string(place + 1) + " is ignored: " + problem);
  }
  if (odd > mostNamed) console.message(path + ": " + std::to_string(odd - mostNamed) + " more entries are ignored");
  return todoEntriesOf(list);
}

}  // namespace tsd
