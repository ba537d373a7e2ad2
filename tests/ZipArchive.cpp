#include "tests/ZipArchive.h"

namespace tests {

namespace {

void put(std::string& out, std::uint64_t number, int bytes) {
  for (int i = 0; i < bytes; ++i) out += static_cast<char>(number >> (8 * i) & 0xff);
}

std::uint32_t checksum(const std::string& bytes) {
  std::uint32_t sum = 0xffffffff;
  for (unsigned char byte : bytes) {
    sum ^= byte;
    for (int bit = 0; bit < 8; ++bit) sum = sum >> 1 ^ (sum & 1 ? 0xedb88320 : 0);
  }
  return ~sum;
}

/// What the local header and the table at the end have in common.
std::string facts(const ZipArchive::Entry& entry) {
  std::string out;
  put(out, 20, 2);  // version needed
  put(out, entry.flags, 2);
  put(out, 0, 2);  // stored
  put(out, 0, 4);  // time and date
  put(out, checksum(entry.content) ^ (entry.wrongChecksum ? 1 : 0), 4);
  put(out, entry.content.size(), 4);
  put(out, entry.claimedSize < 0 ? entry.content.size() : static_cast<std::uint64_t>(entry.claimedSize), 4);
  put(out, entry.name.size(), 2);
  put(out, 0, 2);  // extra field
  return out;
}

}  // namespace

std::string ZipArchive::of(const std::vector<Entry>& entries) {
  std::string files, table;
  for (const auto& entry : entries) {
    auto offset = files.size();
    files += "PK\x03\x04" + facts(entry) + entry.name + entry.content;
    table += "PK\x01\x02";
    put(table, 3 << 8 | 20, 2);  // made on Unix
    table += facts(entry);
    put(table, 0, 2);  // comment
    put(table, 0, 2);  // disk
    put(table, 0, 2);  // internal attributes
    put(table, std::uint64_t{entry.mode} << 16, 4);
    put(table, offset, 4);
    table += entry.name;
  }
  std::string end = "PK\x05\x06";
  put(end, 0, 4);
  put(end, entries.size(), 2);
  put(end, entries.size(), 2);
  put(end, table.size(), 4);
  put(end, files.size(), 4);
  put(end, 0, 2);
  return files + table + end;
}

}  // namespace tests
