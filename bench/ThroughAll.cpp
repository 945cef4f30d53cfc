// What a person's actions cost through client, fileproviderd, extension and keld, beside the system calls
// that do the same to files on the same disk: what bench/bench_through_all is made of.
//
// bench_through_all_calls HOME FOLDER each COUNT: every kind of action, COUNT times, each when the cloud has
// the one before.
//
// bench_through_all_calls HOME FOLDER row COUNT: the same without a pause.
//
// bench_through_all_calls HOME FOLDER import COUNT: a folder of COUNT small files, beside cp -r.
//
// bench_through_all_calls HOME FOLDER move NAME…: folders of the drive to another folder and back.
//
// The plain calls work in FOLDER, which is made if it isn't there. Plain call and action take turns.

#include <cstdio>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <sys/xattr.h>
#include <unistd.h>
#include <vector>

#include "bench/Acting.h"
#include "platform/fileprovider/FPTags.h"
#include "platform/foundation/Paths.h"

namespace droxa::bench {
namespace {

namespace fs = std::filesystem;
using Kind = FPDActionRequest::Kind;
using Item = Acting::Item;
constexpr int kRepetitions = 5;
constexpr int kMoves = 100;

// A few bytes as a copy makes them.
void copyFile(const std::string &source, const std::string &target) {
  const int from = open(source.c_str(), O_RDONLY | O_CLOEXEC);
  const int to = open(target.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0644);
  char bytes[4096];
  check(read(from, bytes, sizeof bytes) == sizeof bytes, source);
  check(write(to, bytes, sizeof bytes) == sizeof bytes, target);
  close(to);
  close(from);
}

void rename(const std::string &from, const std::string &to) {
  check(::rename(from.c_str(), to.c_str()) == 0, "rename " + from);
}

void note(const std::string &file, const char *attribute, const std::string &value) {
  check(setxattr(file.c_str(), attribute, value.data(), value.size(), 0) == 0, "setxattr " + file);
}

// Every action of a person on a row of documents, one kind after the other.
class Each {
 public:
  Each(Acting &bench, bool rests, int count)
      : bench_(bench), rests_(rests), identifiers_(static_cast<std::size_t>(count)) {}

  void run() {
    prepare();
    creating();
    calls();
    placing();
    noting();
    trashing();
  }

 private:
  using Plain = std::function<void(const std::string &number)>;
  using Fill = std::function<void(FPDActionRequest &request, const std::string &number)>;

  // What an action is made of, beside a system call without any work.
  void measureCall(const std::string &what, const std::function<void()> &call) {
    Times times;
    for (std::size_t i = 0; i < identifiers_.size(); ++i) {
      if (rests_) bench_.settle();
      times.plain.push_back(microseconds([] { getppid(); }));
      times.through.push_back(microseconds(call));
    }
    print(what, times);
  }

  void calls() {
    RunningDrive &drive = bench_.drive();
    const std::string &identifier = identifiers_.front();
    const auto checked = [](const auto &, const NSError &error) { check(!error, error.description()); };
    NSURL url;
    drive.keld().getURLForItemIdentifier(identifier,
                                         [&](const NSURL &found, const NSError &) { url = found; });
    check(!url.path().empty(), "keld doesn't know what was imported");
    measureCall("empty call, fileproviderd", [&] { drive.emptyCall(); });
    measureCall("empty call, keld", [&] { drive.emptyKeldCall(); });
    measureCall("keld: where an item is", [&] { drive.keld().getURLForItemIdentifier(identifier, checked); });
    measureCall("keld: what is known of it", [&] { drive.keld().getQueryItemForURL(url, false, checked); });
    measureCall("keld: a look at it", [&] { drive.keld().getQueryItemForURL(url, true, checked); });
    int changes = 0;
    measureCall("keld: of what changed", [&] {
      note(url.path(), "user.xdg.tags", std::to_string(++changes));
      drive.keld().getQueryItemForURL(url, true, checked);
    });
    measureCall("the item, through all", [&] { drive.itemForIdentifier(identifier); });
  }

  void prepare() {
    for (const char *name : {"source", "in", "out", "trash"}) fs::create_directory(bench_.plain(name));
    for (std::size_t i = 0; i < identifiers_.size(); ++i)
      std::ofstream(source(std::to_string(i))) << std::string(4096, 'x');
    in_ = bench_.makeFolder("in");
    out_ = bench_.makeFolder("out");
  }

  std::string source(const std::string &number) const { return bench_.plain("source/" + number + ".txt"); }
  std::string in(const std::string &name) const { return bench_.plain("in/" + name + ".txt"); }
  std::string out(const std::string &name) const { return bench_.plain("out/" + name + ".txt"); }
  std::string trashed(const std::string &name) const { return bench_.plain("trash/" + name + ".txt"); }

  void measure(const std::string &what, Kind kind, const Plain &plain, const Fill &fill) {
    bench_.settle();
    Times times;
    for (std::size_t i = 0; i < identifiers_.size(); ++i) {
      const std::string number = std::to_string(i);
      if (rests_) bench_.settle();
      FPDActionRequest request;
      request.kind = kind;
      request.identifier = identifiers_[i];
      fill(request, number);
      times.plain.push_back(microseconds([&] { plain(number); }));
      Item item;
      times.through.push_back(microseconds([&] { item = bench_.act(request); }));
      if (item && kind != Kind::createDirectory) identifiers_[i] = item->itemIdentifier();
    }
    print(what, times);
  }

  void creating() {
    measure(
        "mkdir", Kind::createDirectory,
        [&](const std::string &number) { check(mkdir(out(number).c_str(), 0777) == 0, "mkdir"); },
        [&](FPDActionRequest &request, const std::string &number) {
          request.parentIdentifier = bench_.root();
          request.name = "folder " + number;
        });
    for (std::size_t i = 0; i < identifiers_.size(); ++i) rmdir(out(std::to_string(i)).c_str());
    measure(
        "import of 4 KiB", Kind::importDocument,
        [&](const std::string &number) { copyFile(source(number), in(number)); },
        [&](FPDActionRequest &request, const std::string &number) {
          request.url = NSURL::fileURLWithPath(source(number));
          request.parentIdentifier = in_;
        });
  }

  void placing() {
    measure(
        "rename", Kind::rename, [&](const std::string &number) { rename(in(number), in("new " + number)); },
        [](FPDActionRequest &request, const std::string &number) {
          request.name = "new " + number + ".txt";
        });
    measure(
        "move", Kind::reparent, [&](const std::string &number) { rename(in("new " + number), out(number)); },
        [&](FPDActionRequest &request, const std::string &) { request.parentIdentifier = out_; });
  }

  void noting() {
    measure(
        "tag", Kind::setTagData,
        [&](const std::string &number) { note(out(number), "user.xdg.tags", "urgent"); },
        [](FPDActionRequest &request, const std::string &) {
          request.tagData = FPGetTagsDataFromTags({{"urgent", 0}});
        });
    measure(
        "favourite", Kind::setFavoriteRank,
        [&](const std::string &number) { note(out(number), "user.rank", "7"); },
        [](FPDActionRequest &request, const std::string &) { request.favoriteRank = 7; });
    measure(
        "used", Kind::setLastUsedDate,
        [&](const std::string &number) { note(out(number), "user.used", "1790000000000000000"); },
        [](FPDActionRequest &request, const std::string &) { request.date = NSDate::now(); });
  }

  void trashing() {
    const Fill nothing = [](FPDActionRequest &, const std::string &) {};
    measure(
        "trash", Kind::trash, [&](const std::string &number) { rename(out(number), trashed(number)); },
        nothing);
    measure(
        "restore", Kind::untrash, [&](const std::string &number) { rename(trashed(number), out(number)); },
        nothing);
    measure(
        "delete", Kind::deleteItem,
        [&](const std::string &number) { check(unlink(out(number).c_str()) == 0, "unlink"); }, nothing);
  }

  Acting &bench_;
  const bool rests_;  // until the cloud has the action before
  std::vector<std::string> identifiers_;
  std::string in_, out_;
};

void runCommand(const std::vector<std::string> &words) {
  std::vector<char *> arguments;
  for (const std::string &word : words) arguments.push_back(const_cast<char *>(word.c_str()));
  arguments.push_back(nullptr);
  const pid_t child = vfork();
  if (child == 0) {
    execvp(arguments[0], arguments.data());
    _exit(127);
  }
  int status = 0;
  check(child > 0 && waitpid(child, &status, 0) == child && status == 0, words[0] + " failed");
}

// The fastest of each: a folder that is imported again and again, under names of its own.
void importFolder(Acting &bench, int count) {
  Times times;
  for (int round = 0; round < kRepetitions; ++round) {
    const std::string name = "imported " + std::to_string(round);
    const std::string source = bench.plain(name);
    fs::create_directory(source);
    for (int i = 0; i < count; ++i) std::ofstream(source + "/" + std::to_string(i)) << std::string(512, 'x');
    bench.settle();
    times.plain.push_back(microseconds([&] { runCommand({"cp", "-r", source, source + " copy"}); }));
    FPDActionRequest request;
    request.kind = Kind::importDocument;
    request.url = NSURL::fileURLWithPath(source);
    request.parentIdentifier = Acting::root();
    times.through.push_back(microseconds([&] { bench.act(request); }));
  }
  const double plain = share(times.plain, 0), through = share(times.through, 0);
  std::printf("a folder of %d files: import %.1f ms, cp -r %.1f ms, ratio %.2f (fastest of %d)\n", count,
              through / 1000, plain / 1000, through / plain, kRepetitions);
}

// To another folder and back, the folders by turns. The plain ones are beside the drive, under the same
// names.
void moveFolders(Acting &bench, const std::vector<std::string> &names) {
  const std::string to = bench.makeFolder("moved");
  fs::create_directory(bench.plain("moved"));
  std::vector<Times> times(names.size());
  std::vector<std::string> identifiers;
  for (const std::string &name : names) identifiers.push_back(bench.drive().itemAtPath(name).itemIdentifier);
  for (int move = 0; move < kMoves; ++move) {
    const bool isThere = move % 2 == 1;
    for (std::size_t i = 0; i < names.size(); ++i) {
      const std::string here = bench.plain(names[i]), there = bench.plain("moved/" + names[i]);
      times[i].plain.push_back(microseconds([&] { isThere ? rename(there, here) : rename(here, there); }));
      FPDActionRequest request;
      request.kind = Kind::reparent;
      request.identifier = identifiers[i];
      request.parentIdentifier = isThere ? Acting::root() : to;
      times[i].through.push_back(microseconds([&] { bench.act(request); }));
    }
  }
  for (std::size_t i = 0; i < names.size(); ++i) print("move of " + names[i], times[i]);
  const double first = share(times.front().through, 0.5), last = share(times.back().through, 0.5);
  std::printf("a move of %s takes %.2f times that of %s\n", names.back().c_str(), last / first,
              names.front().c_str());
}

int run(const std::vector<std::string> &words) {
  if (words.size() < 4) fail("HOME, FOLDER, a command and its argument are needed");
  Acting bench(DroxaHome(words[0]).root(), words[1]);
  const std::string &command = words[2];
  if (command != "import") printHead();
  if (command == "each" || command == "row")
    Each(bench, command == "each", std::atoi(words[3].c_str())).run();
  else if (command == "import")
    importFolder(bench, std::atoi(words[3].c_str()));
  else if (command == "move")
    moveFolders(bench, {words.begin() + 3, words.end()});
  else
    fail("no such command: " + command);
  return 0;
}

}  // namespace
}  // namespace droxa::bench

int main(int argc, char **argv) {
  return droxa::bench::run({argv + 1, argv + argc});
}
