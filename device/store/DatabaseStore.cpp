#include <sqlite3.h>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

#include "device/files/DevicePath.h"
#include "device/files/StepWatch.h"
#include "device/store/DatabaseImage.h"
#include "device/store/Store.h"
#include "platform/Mutex.h"
#include "platform/ThreadSafety.h"
#include "plist/PropertyList.h"

namespace device {

using platform::Bytes;
using platform::ErrorRef;

namespace {

/// In the header of every store's file, so that no other database is mistaken for one.
constexpr int applicationID = 0x41507353;
constexpr int formatVersion = 1;

constexpr char schema[] =
    "CREATE TABLE records("
    "place INTEGER PRIMARY KEY AUTOINCREMENT, kind TEXT NOT NULL, key TEXT NOT NULL, value BLOB NOT NULL,"
    "UNIQUE(kind, key))";

struct CloseDatabase {
  void operator()(sqlite3* database) const { sqlite3_close_v2(database); }
};
struct FinalizeStatement {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

void bindText(sqlite3_stmt* statement, int index, std::string_view text) {
  sqlite3_bind_text64(statement, index, text.data(), text.size(), SQLITE_STATIC, SQLITE_UTF8);
}
std::string_view bytesOfColumn(sqlite3_stmt* statement, int column) {
  // The bytes first: asking for them may convert the value, and with it its size.
  const void* bytes = sqlite3_column_blob(statement, column);
  return {static_cast<const char*>(bytes), static_cast<std::size_t>(sqlite3_column_bytes(statement, column))};
}

/// The path with the links on the way to its last name resolved; as it is when that fails.
std::string withoutLinks(const std::string& path) {
  namespace fs = std::filesystem;
  std::error_code failure;
  const fs::path file(path);
  const fs::path folder = fs::canonical(file.has_parent_path() ? file.parent_path() : ".", failure);
  return failure ? path : (folder / file.filename()).string();
}

/// A transaction that is rolled back unless it was committed.
class Transaction {
 public:
  explicit Transaction(sqlite3* database) : _database(database) {
    _open = sqlite3_exec(_database, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr) == SQLITE_OK;
  }
  ~Transaction() {
    if (_open) sqlite3_exec(_database, "ROLLBACK", nullptr, nullptr, nullptr);
  }
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  bool isOpen() const { return _open; }
  bool commit() {
    if (sqlite3_exec(_database, "COMMIT", nullptr, nullptr, nullptr) != SQLITE_OK) return false;
    _open = false;
    return true;
  }

 private:
  sqlite3* const _database;
  bool _open;
};

class DatabaseStore final : public Store {
 public:
  DatabaseStore(std::string path, std::shared_ptr<StepWatch> watch)
      : _path(std::move(path)), _watch(std::move(watch)) {}

  bool open(ErrorRef* error) {
    platform::Mutex::Lock lock(_mutex);
    sqlite3* opened = nullptr;
    // The folder may be reached through links; the file itself is none, nor becomes one meanwhile.
    int status = sqlite3_open_v2(
        withoutLinks(_path).c_str(), &opened,
        SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_NOFOLLOW, nullptr);
    _database.reset(opened);
    if (status != SQLITE_OK) return fail(error);
    sqlite3_extended_result_codes(_database.get(), 1);
    // Only one process at a time has a device, so nothing needs to be shared.
    bool isEmpty = false;
    if (!execute("PRAGMA locking_mode=EXCLUSIVE", error) || !checkFormat(isEmpty, error)) return false;
    if (isEmpty && !makeFormat(error)) return false;
    if (!execute("PRAGMA journal_mode=WAL", error) || !execute("PRAGMA synchronous=FULL", error)) return false;
    return prepareAndRead(error);
  }

  /// The records of a database in memory.
  std::optional<std::list<StoreRecord>> readImage(Bytes& image, ErrorRef* error) {
    platform::Mutex::Lock lock(_mutex);
    sqlite3* opened = nullptr;
    int status = sqlite3_open_v2(":memory:", &opened, SQLITE_OPEN_READWRITE | SQLITE_OPEN_NOMUTEX, nullptr);
    _database.reset(opened);
    auto size = static_cast<sqlite3_int64>(image.size());
    std::list<StoreRecord> records;
    bool isRead =
        status == SQLITE_OK && sqlite3_deserialize(opened, "main", reinterpret_cast<unsigned char*>(image.data()), size,
                                                   size, SQLITE_DESERIALIZE_READONLY) == SQLITE_OK;
    if (!isRead) fail(error);
    bool isEmpty = false;
    isRead = isRead && checkFormat(isEmpty, error) && (isEmpty || readRecords(records, error));
    _database.reset();  // it reads the image's own bytes
    return isRead ? std::optional(std::move(records)) : std::nullopt;
  }

  void read(const Take& take) override {
    platform::Mutex::Lock lock(_mutex);
    ErrorRef error;
    if (!_asRead && !readRecords(_asRead.emplace(), &error)) {
      _asRead.reset();
      throw std::runtime_error(error->description());
    }
    for (const auto& record : *_asRead) {
      if (!take(record)) return;
    }
  }

  bool commit(const std::vector<StoreRecord>& changes, ErrorRef* error) override { return apply(changes, true, error); }
  bool write(const std::vector<StoreRecord>& changes, ErrorRef* error) override { return apply(changes, false, error); }

 private:
  bool prepareAndRead(ErrorRef* error) REQUIRES(_mutex) {
    return prepare(_put,
                   "INSERT INTO records(kind, key, value) VALUES(?1, ?2, ?3) "
                   "ON CONFLICT(kind, key) DO UPDATE SET value = excluded.value",
                   error) &&
           prepare(_remove, "DELETE FROM records WHERE kind = ?1 AND key = ?2", error) &&
           readRecords(_asRead.emplace(), error);
  }

  bool apply(const std::vector<StoreRecord>& changes, bool flushes, ErrorRef* error) EXCLUDES(_mutex) {
    std::vector<Bytes> values;
    values.reserve(changes.size());
    for (const auto& change : changes) {
      auto bytes = change.value.isAbsent() ? Bytes() : plist::writeBinary(change.value, error);
      if (!bytes) return false;
      values.push_back(std::move(*bytes));
    }
    platform::Mutex::Lock lock(_mutex);
    _asRead.reset();
    Step step{flushes ? Step::Kind::storeCommit : Step::Kind::storeWrite, {}};
    if (int forbidden = _watch ? _watch->before(step) : 0) {
      platform::setError(error, platform::makeError("Store", forbidden, _path + ": " + textOfErrorNumber(forbidden)));
      return false;
    }
    if (!applyLocked(changes, values, flushes, error)) return false;
    if (_watch) _watch->after(step);
    platform::setError(error, nullptr);
    return true;
  }

  bool applyLocked(const std::vector<StoreRecord>& changes, const std::vector<Bytes>& values, bool flushes,
                   ErrorRef* error) REQUIRES(_mutex) {
    // A flush writes out the whole log, and with it what was written before without one.
    if (flushes != _flushes && !execute(flushes ? "PRAGMA synchronous=FULL" : "PRAGMA synchronous=NORMAL", error))
      return false;
    _flushes = flushes;
    Transaction transaction(_database.get());
    if (!transaction.isOpen()) return fail(error);
    for (std::size_t i = 0; i < changes.size(); ++i) {
      if (!put(changes[i], values[i])) return fail(error);
    }
    return transaction.commit() || fail(error);
  }

  bool fail(ErrorRef* error, std::string_view text = {}) const REQUIRES(_mutex) {
    if (error) {
      int code = _database ? sqlite3_extended_errcode(_database.get()) : SQLITE_NOMEM;
      std::string reason(text.empty() && _database ? sqlite3_errmsg(_database.get()) : text);
      if (text.empty() && _database && (code & 0xff) == SQLITE_CANTOPEN) {
        if (int number = sqlite3_system_errno(_database.get())) reason += ": " + textOfErrorNumber(number);
      }
      *error = platform::makeError("Store", text.empty() ? code : SQLITE_NOTADB, _path + ": " + reason);
    }
    return false;
  }

  bool execute(const char* sql, ErrorRef* error) REQUIRES(_mutex) {
    return sqlite3_exec(_database.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK || fail(error);
  }
  bool prepare(Statement& statement, const char* sql, ErrorRef* error) REQUIRES(_mutex) {
    sqlite3_stmt* prepared = nullptr;
    int status = sqlite3_prepare_v3(_database.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &prepared, nullptr);
    statement.reset(prepared);
    return status == SQLITE_OK || fail(error);
  }
  bool readNumber(const char* sql, int& number, ErrorRef* error) REQUIRES(_mutex) {
    Statement statement;
    if (!prepare(statement, sql, error)) return false;
    if (sqlite3_step(statement.get()) != SQLITE_ROW) return fail(error);
    number = sqlite3_column_int(statement.get(), 0);
    return true;
  }

  /// Ours, or nothing at all yet.
  bool checkFormat(bool& isEmpty, ErrorRef* error) REQUIRES(_mutex) {
    int id = 0, version = 0, tables = 0;
    if (!readNumber("PRAGMA application_id", id, error) || !readNumber("PRAGMA user_version", version, error) ||
        !readNumber("SELECT count(*) FROM sqlite_schema", tables, error))
      return false;
    isEmpty = id == 0 && version == 0 && tables == 0;
    if (isEmpty) return true;
    if (id != applicationID) return fail(error, "a database of something else, not a device's store");
    if (version != formatVersion)
      return fail(error,
                  "a device's store of format " + std::to_string(version) + ", which this program does not know");
    return true;
  }
  bool makeFormat(ErrorRef* error) REQUIRES(_mutex) {
    Transaction transaction(_database.get());
    if (!transaction.isOpen()) return fail(error);
    std::string marks = "PRAGMA application_id=" + std::to_string(applicationID) +
                        ";PRAGMA user_version=" + std::to_string(formatVersion);
    return execute(schema, error) && execute(marks.c_str(), error) && (transaction.commit() || fail(error));
  }

  bool readRecords(std::list<StoreRecord>& records, ErrorRef* error) REQUIRES(_mutex) {
    Statement all;
    if (!prepare(all, "SELECT kind, key, value FROM records ORDER BY place", error)) return false;
    int status;
    while ((status = sqlite3_step(all.get())) == SQLITE_ROW) {
      StoreRecord record{std::string(bytesOfColumn(all.get(), 0)), std::string(bytesOfColumn(all.get(), 1)), {}};
      ErrorRef reason;
      record.value = plist::read(Bytes(bytesOfColumn(all.get(), 2)), &reason);
      if (record.value.isAbsent()) {
        return fail(error, "the record " + record.kind + " \"" + record.key +
                               "\" cannot be read: " + (reason ? reason->description() : std::string("it is empty")));
      }
      records.push_back(std::move(record));
    }
    return status == SQLITE_DONE || fail(error);
  }

  bool put(const StoreRecord& change, const Bytes& value) REQUIRES(_mutex) {
    sqlite3_stmt* statement = change.value.isAbsent() ? _remove.get() : _put.get();
    bindText(statement, 1, change.kind);
    bindText(statement, 2, change.key);
    if (!change.value.isAbsent()) sqlite3_bind_blob64(statement, 3, value.data(), value.size(), SQLITE_STATIC);
    int status = sqlite3_step(statement);
    sqlite3_reset(statement);
    sqlite3_clear_bindings(statement);
    return status == SQLITE_DONE;
  }

  const std::string _path;
  const std::shared_ptr<StepWatch> _watch;
  platform::Mutex _mutex;
  // The statements go before the database.
  Database _database GUARDED_BY(_mutex);
  Statement _put GUARDED_BY(_mutex);
  Statement _remove GUARDED_BY(_mutex);
  bool _flushes GUARDED_BY(_mutex) = true;
  /// What the file holds, until it changes: whoever opens a device asks more than once.
  std::optional<std::list<StoreRecord>> _asRead GUARDED_BY(_mutex);
};

}  // namespace

std::unique_ptr<Store> openDatabaseStore(const std::string& path, ErrorRef* error, std::shared_ptr<StepWatch> watch) {
  platform::setError(error, nullptr);
  auto store = std::make_unique<DatabaseStore>(path, std::move(watch));
  if (!store->open(error)) return nullptr;
  return store;
}

std::unique_ptr<Store> copyDatabaseStore(const std::string& path, ErrorRef* error) {
  auto image = readDatabaseImage(path, error);
  auto records = image ? DatabaseStore(path, nullptr).readImage(*image, error) : std::nullopt;
  return records ? makeMemoryStore(std::move(*records)) : nullptr;
}

}  // namespace device
