// bench_listing HOME FOLDER [benchmark options]: a folder's listing, its first page, a stat and an empty call
// through all processes of the drive that runs at HOME, beside the same rows read from the same database in
// this process.

#include <benchmark/benchmark.h>
#include <sqlite3.h>
#include <string>
#include <vector>

#include "bench/RunningDrive.h"
#include "tessaly/QVFileObjectID.h"

namespace {

using droxa::bench::RunningDrive;

RunningDrive *drive = nullptr;
std::string folderIdentifier;
std::int64_t folderNumber = 0;
std::string someIdentifier;

class Database {
 public:
  explicit Database(const std::string &path) {
    if (sqlite3_open_v2(path.c_str(), &database_, SQLITE_OPEN_READONLY | SQLITE_OPEN_NOMUTEX, nullptr) !=
        SQLITE_OK)
      droxa::bench::fail("can't open " + path);
  }
  ~Database() {
    for (sqlite3_stmt *statement : statements_) sqlite3_finalize(statement);
    sqlite3_close(database_);
  }
  Database(const Database &) = delete;
  Database &operator=(const Database &) = delete;

  sqlite3_stmt *prepare(const char *sql) {
    sqlite3_stmt *statement = nullptr;
    if (sqlite3_prepare_v2(database_, sql, -1, &statement, nullptr) != SQLITE_OK)
      droxa::bench::fail(sqlite3_errmsg(database_));
    statements_.push_back(statement);
    return statement;
  }

 private:
  sqlite3 *database_ = nullptr;
  std::vector<sqlite3_stmt *> statements_;
};

constexpr char kColumns[] =
    "parent, name, id, kind, flags, rank, age, size, mode, inode, device, birth, changed";

// Takes every column of the row, as a reader of the rows must.
std::size_t readRow(sqlite3_stmt *row, std::string *name) {
  const auto *bytes = static_cast<const char *>(sqlite3_column_blob(row, 1));
  name->assign(bytes, static_cast<std::size_t>(sqlite3_column_bytes(row, 1)));
  sqlite3_int64 sum = 0;
  for (int column = 2; column < 13; ++column) sum += sqlite3_column_int64(row, column);
  benchmark::DoNotOptimize(sum);
  return 1;
}

void rowsByKey(benchmark::State &state) {
  Database database(drive->database());
  const std::string sql = std::string("SELECT ") + kColumns +
                          " FROM items WHERE parent = ?1 AND name > ?2 ORDER BY name LIMIT 200";
  sqlite3_stmt *page = database.prepare(sql.c_str());
  std::size_t rows = 0;
  for (auto _ : state) {
    std::string last;
    rows = 0;
    for (std::size_t read = 200; read == 200;) {
      read = 0;
      sqlite3_bind_int64(page, 1, folderNumber);
      sqlite3_bind_blob(page, 2, last.data(), static_cast<int>(last.size()), SQLITE_TRANSIENT);
      std::string name;
      while (sqlite3_step(page) == SQLITE_ROW) read += readRow(page, &name);
      sqlite3_reset(page);
      last = name;
      rows += read;
    }
  }
  state.counters["items"] = static_cast<double>(rows);
}

void listing(benchmark::State &state) {
  std::size_t items = 0;
  for (auto _ : state) {
    items = 0;
    const auto enumerator = drive->enumerator(folderIdentifier);
    droxa::NSData page = droxa::NSFileProviderInitialPageSortedByName();
    while (page) page = drive->page(*enumerator, page, &items);
    enumerator->invalidate();
  }
  state.counters["items"] = static_cast<double>(items);
}

void firstPage(benchmark::State &state) {
  for (auto _ : state) {
    std::size_t items = 0;
    const auto enumerator = drive->enumerator(folderIdentifier);
    drive->page(*enumerator, droxa::NSFileProviderInitialPageSortedByName(), &items);
    enumerator->invalidate();
  }
}

void rowByIdentifier(benchmark::State &state) {
  Database database(drive->database());
  const std::string sql = std::string("SELECT ") + kColumns + " FROM items WHERE id = ?1";
  sqlite3_stmt *statement = database.prepare(sql.c_str());
  const auto number = droxa::QVFileObjectID::fileObjectIDWithString(someIdentifier)->number();
  std::string name;
  for (auto _ : state) {
    sqlite3_bind_int64(statement, 1, static_cast<sqlite3_int64>(number));
    while (sqlite3_step(statement) == SQLITE_ROW) readRow(statement, &name);
    sqlite3_reset(statement);
  }
}

void statInKeld(benchmark::State &state) {
  droxa::NSURL url;
  drive->host().URLForItemIdentifier(someIdentifier, [&](const droxa::NSURL &received) { url = received; });
  for (auto _ : state) {
    drive->keld().getQueryItemForURL(
        url, false, [](const std::shared_ptr<const droxa::QVQueryItem> &, const droxa::NSError &error) {
          if (error) droxa::bench::fail(error.description());
        });
  }
}

void statThroughAll(benchmark::State &state) {
  for (auto _ : state) benchmark::DoNotOptimize(drive->itemForIdentifier(someIdentifier));
}

void emptyCallHost(benchmark::State &state) {
  for (auto _ : state) drive->emptyCall();
}

void emptyCallKeld(benchmark::State &state) {
  for (auto _ : state) drive->emptyKeldCall();
}

BENCHMARK(rowsByKey)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(listing)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(firstPage)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(rowByIdentifier)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(statInKeld)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(statThroughAll)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(emptyCallHost)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(emptyCallKeld)->Unit(benchmark::kMicrosecond)->UseRealTime();

}  // namespace

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv);
  if (argc < 3) droxa::bench::fail(std::string("usage: ") + argv[0] + " HOME FOLDER [benchmark options]");
  RunningDrive running(argv[1]);
  drive = &running;
  folderIdentifier = running.itemAtPath(argv[2]).itemIdentifier;
  const auto folder = droxa::QVFileObjectID::fileObjectIDWithString(folderIdentifier);
  if (!folder) droxa::bench::fail(std::string(argv[2]) + " is not a folder below the root");
  folderNumber = static_cast<std::int64_t>(folder->number());

  someIdentifier = running.firstChild(folderIdentifier);
  benchmark::RunSpecifiedBenchmarks();
}
