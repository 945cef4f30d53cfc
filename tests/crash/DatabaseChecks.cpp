// Rows and files: none without the other.

#include <memory>
#include <sqlite3.h>

#include "tests/crash/Checker.h"

namespace droxa::crash {

namespace {

// A database, open for reading alone while its daemon goes on.
class Reading {
 public:
  explicit Reading(const std::string &path) {
    ::sqlite3_open_v2(path.c_str(), &database_, SQLITE_OPEN_READONLY, nullptr);
    ::sqlite3_busy_timeout(database_, 10'000);
  }
  ~Reading() { ::sqlite3_close(database_); }
  Reading(const Reading &) = delete;
  Reading &operator=(const Reading &) = delete;

  // Each row's values as text; false, with the library's words in `problem`, when it can't be read.
  bool rows(const std::string &sql, std::vector<std::vector<std::string>> *rows, std::string *problem) {
    sqlite3_stmt *statement = nullptr;
    int result = ::sqlite3_prepare_v2(database_, sql.c_str(), -1, &statement, nullptr);
    while (result == SQLITE_OK || result == SQLITE_ROW) {
      result = ::sqlite3_step(statement);
      if (result != SQLITE_ROW) break;
      std::vector<std::string> &row = rows->emplace_back();
      for (int column = 0; column < ::sqlite3_column_count(statement); ++column) {
        const void *bytes = ::sqlite3_column_blob(statement, column);
        const auto size = static_cast<std::size_t>(::sqlite3_column_bytes(statement, column));
        row.emplace_back(bytes ? std::string(static_cast<const char *>(bytes), size) : std::string());
      }
    }
    if (result != SQLITE_DONE) *problem = ::sqlite3_errmsg(database_);
    ::sqlite3_finalize(statement);
    return result == SQLITE_DONE;
  }

 private:
  sqlite3 *database_ = nullptr;
};

struct ItemRow {
  std::string parent, name, kind, size, inode;
};

// The items by their numbers.
std::map<std::string, ItemRow> readItems(const std::string &home, std::string *problem) {
  Reading database(home + "/state/keld.sqlite");
  std::vector<std::vector<std::string>> rows;
  database.rows("SELECT id, parent, name, kind, size, inode FROM items", &rows, problem);
  std::map<std::string, ItemRow> items;
  for (const auto &row : rows) items[row[0]] = {row[1], row[2], row[3], row[4], row[5]};
  return items;
}

std::string pathOf(const std::map<std::string, ItemRow> &items, const std::string &id) {
  std::string path;
  std::string at = id;
  for (int depth = 0; depth < 100; ++depth) {
    const auto item = items.find(at);
    if (item == items.end()) return at == "0" ? path : "?" + at + "/" + path;
    path = item->second.name + (path.empty() ? "" : "/" + path);
    at = item->second.parent;
  }
  return "?loop/" + path;
}

constexpr char kDocuments[] = "com.quorva.Tessaly.default/Documents/";

// The path below the documents folder; "" for what isn't there.
std::string shownPath(const std::string &path) {
  const std::string prefix = kDocuments;
  return path.compare(0, prefix.size(), prefix) == 0 ? path.substr(prefix.size()) : "";
}

}  // namespace

void Checker::checkItemDatabase(CrashDevice &device, const Tree &tree) {
  std::string problem;
  const auto items = readItems(device.home(), &problem);
  if (!problem.empty()) return found_.push_back("the item database can't be read: " + problem);
  std::set<std::string> seen;
  for (const auto &[id, item] : items) {
    const std::string path = pathOf(items, id);
    if (path.compare(0, 1, "?") == 0) found_.push_back("item " + id + " is below nothing: " + path);
    const std::string shown = shownPath(path);
    if (shown.empty()) continue;
    seen.insert(shown);
    const auto file = tree.find(shown);
    if (file == tree.end()) {
      found_.push_back("item " + id + " has no file: " + shown);
      continue;
    }
    if (std::to_string(file->second.inode) != item.inode)
      found_.push_back("item " + id + " is another file than " + shown);
    if (!file->second.isFolder && std::to_string(file->second.size) != item.size)
      found_.push_back("item " + id + " has another size than " + shown);
  }
  for (const auto &[path, entry] : tree)
    if (seen.count(path) == 0) found_.push_back("no item stands for " + path);
}

void Checker::checkSyncDatabase(CrashDevice &device, const Tree &tree) {
  std::string problem;
  const auto items = readItems(device.home(), &problem);
  Reading database(device.home() + "/state/sync.sqlite");
  std::vector<std::vector<std::string>> rows, uploads, orphans;
  const bool isRead = database.rows("SELECT record, item, tag, name, digest, newerTag, dataless FROM rows",
                                    &rows, &problem) &&
                      database.rows("SELECT item, errorText FROM uploads", &uploads, &problem) &&
                      database.rows("SELECT record, parent FROM orphans", &orphans, &problem);
  if (!isRead) return found_.push_back("the sync's database can't be read: " + problem);
  std::set<std::string> seen;
  for (const auto &row : rows) {
    const std::string what = "the sync's row " + row[0] + " (" + row[3] + ")";
    const std::string path = items.count(row[1]) > 0 ? shownPath(pathOf(items, row[1])) : "";
    const auto file = tree.find(path);
    if (file == tree.end()) {
      found_.push_back(what + " has no file; its item is " + row[1]);
      continue;
    }
    if (!seen.insert(path).second) found_.push_back("two rows of the sync's stand for " + path);
    if (row[2].empty()) found_.push_back(what + " was never agreed with the cloud");
    if (!row[5].empty()) found_.push_back(what + " still waits for a newer version");
    if (!file->second.isFolder && file->second.mark && row[4] != file->second.mark->digest)
      found_.push_back(what + " has other contents than the file's mark says");
    if (row[6] != "0") found_.push_back(what + " says that the file is dataless");
  }
  for (const auto &[path, entry] : tree)
    if (seen.count(path) == 0) found_.push_back("the sync has no row for " + path);
  for (const auto &upload : uploads)
    found_.push_back("item " + upload[0] + " still waits to be sent: " + upload[1]);
  for (const auto &orphan : orphans)
    found_.push_back("record " + orphan[0] + " waits for its parent " + orphan[1]);
}

}  // namespace droxa::crash
