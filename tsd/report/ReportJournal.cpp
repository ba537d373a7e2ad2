#include "tsd/report/ReportJournal.h"

#include <algorithm>

#include "device/boundary/Journal.h"

namespace tsd {

using platform::Value;

namespace {

constexpr std::size_t mostText = 400;  // bytes of a row's text
constexpr int wrongMark = 4;           // added to the kind of what failed

int kindOf(const device::CallRecord& record) {
  if (record.service == "log") return 3;
  if (record.service == "FileSystem") return 2;
  return record.service == "AppsClient" ? 1 : 0;
}

/// At most that many bytes, in whole characters.
std::string shortened(std::string text) {
  if (text.size() <= mostText) return text;
  std::size_t end = mostText;
  while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xc0) == 0x80) --end;
  return text.substr(0, end) + "…";
}

std::string endOf(const device::CallRecord& record) {
  std::string text;
  if (!record.result.isAbsent()) text += " → " + device::jsonText(record.result);
  if (record.error) text += " ✗ " + record.error->describe();
  return text;
}

std::string textOfRow(const device::CallRecord& record) {
  const auto* arguments = record.arguments.dictionary();
  if (record.service == "log" && arguments) return shortened(std::string((*arguments)["text"].string().value_or("")));
  std::string text;
  if (arguments && arguments->size() > 0) text = device::jsonText(record.arguments);
  return shortened(text + endOf(record));
}

/// An error may also be the result itself, or among a callback's arguments.
bool isWrong(const device::CallRecord& record) {
  if (record.error) return true;
  if (record.operation == "error") return record.service == "log" || !record.result.isAbsent();
  const auto* arguments = record.service == "AppsClient" ? record.arguments.dictionary() : nullptr;
  return arguments && !(*arguments)["error"].isAbsent();
}

template <class... Items>
Value arrayOf(const Items&... items) {
  Value array = Value::makeArray();
  (array.array()->append(items), ...);
  return array;
}

}  // namespace

std::size_t ReportJournal::Words::placeOf(const std::string& word) {
  auto [place, isNew] = places.try_emplace(word, list.size());
  if (isNew) list.push_back(word);
  return place->second;
}

void ReportJournal::hear(const device::CallRecord& record) {
  _end = std::max(_end, record.time);
  if (record.end) return hearEnd(record);
  int kind = kindOf(record);
  Row row{record.number,
          record.time.count(),
          0,
          _threads.placeOf(record.thread),
          _services.placeOf(record.service),
          _operations.placeOf(record.operation),
          record.app.empty() ? -1 : static_cast<std::int64_t>(_apps.placeOf(record.app)),
          kind + (isWrong(record) ? wrongMark : 0),
          worthOf(record),
          textOfRow(record)};
  if (kind == 1) _open[record.thread].push_back(_rows.size());
  _rows.push_back(std::move(row));
}

void ReportJournal::hearEnd(const device::CallRecord& record) {
  auto& open = _open[record.thread];
  if (open.empty()) return;
  Row& row = _rows[open.back()];
  open.pop_back();
  row.duration = record.time.count() - row.time;
  row.text = shortened(row.text + endOf(record));
  if (record.error && row.kind < wrongMark) row.kind += wrongMark;
}

ReportJournal::Worth ReportJournal::worthOf(const device::CallRecord& record) const {
  if (isWrong(record)) return Worth::message;
  // The progress of a package causes thousands of records that say the same.
  if (record.operation == "assetTransferUpdatedProgress") return Worth::progress;
  auto open = _open.find(record.thread);
  if (open != _open.end() && !open->second.empty() && _rows[open->second.back()].worth == Worth::progress)
    return Worth::progress;
  switch (kindOf(record)) {
    case 3:
      return Worth::message;
    case 2:
      return Worth::file;
    case 1:
      return Worth::pluginCall;
    default:
      return Worth::deviceCall;
  }
}

Value ReportJournal::document() const {
  constexpr const char* names[worths] = {"message", "call into the plug-in", "call to the device", "file operation",
                                         "record of a package's progress"};
  std::array<std::size_t, worths> counts{};
  for (const auto& row : _rows) ++counts[static_cast<std::size_t>(row.worth)];
  std::array<std::size_t, worths> room{};
  std::size_t left = mostRows;
  for (std::size_t i = 0; i < worths; ++i) left -= room[i] = std::min(counts[i], left);
  Value document = Value::makeDictionary();
  auto& entries = *document.dictionary();
  entries.set("total", _rows.size());
  Value leftOut = Value::makeArray();
  for (std::size_t i = 0; i < worths; ++i) {
    if (counts[i] != room[i]) leftOut.array()->append(arrayOf(names[i], counts[i] - room[i]));
  }
  entries.set("left", leftOut);
  auto put = [&](const char* key, const Words& words) {
    Value list = Value::makeArray();
    for (const auto& word : words.list) list.array()->append(word);
    entries.set(key, list);
  };
  put("threads", _threads);
  put("services", _services);
  put("operations", _operations);
  put("texts", _apps);
  Value rows = Value::makeArray();
  for (const auto& row : _rows) {
    auto& share = room[static_cast<std::size_t>(row.worth)];
    if (share == 0) continue;
    --share;
    rows.array()->append(arrayOf(row.number, row.time, row.duration, row.thread, row.service, row.operation, row.app,
                                 row.kind, row.text));
  }
  entries.set("rows", rows);
  return document;
}

}  // namespace tsd
