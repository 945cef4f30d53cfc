#include "tests/platform/StormOperation.h"

#include <array>
#include <chrono>
#include <sstream>

#include "platform/fileprovider/operations/FPOperations.h"

namespace droxa {
namespace {

std::int64_t now() {
  return std::chrono::steady_clock::now().time_since_epoch().count();
}

NSURL below(const std::string &root, const std::string &path) {
  return NSURL::fileURLWithPath(root + "/" + path);
}

// An empty word would be lost in a line.
std::string word(const std::string &text) {
  return "/" + text;
}

}  // namespace

void StormOperation::run(const std::string &root) {
  const std::string drive = root + "/drive";
  began = now();
  FPOutcome outcome;
  switch (kind) {
    case Kind::create:
      outcome = FPCreateSubFolder(below(drive, folder), name, nullptr);
      break;
    case Kind::import:
      outcome = FPImport(below(root + "/outside", name), below(drive, folder), nullptr);
      break;
    case Kind::rename:
      outcome = FPRename(below(drive, item), name, nullptr);
      break;
    case Kind::move:
      outcome = FPReparent(below(drive, item), below(drive, folder), name, false, nullptr);
      break;
    case Kind::remove:
      outcome = FPDelete(below(drive, item), nullptr);
      break;
  }
  ended = now();
  code = outcome.error.code();
}

std::string StormOperation::line() const {
  std::ostringstream text;
  text << began << " " << ended << " " << static_cast<int>(kind) << " " << word(item) << " " << word(folder)
       << " " << word(name) << " " << code;
  return text.str();
}

StormOperation StormOperation::fromLine(const std::string &line) {
  StormOperation operation;
  int number = 0;
  std::istringstream text(line);
  text >> operation.began >> operation.ended >> number >> operation.item >> operation.folder >>
      operation.name >> operation.code;
  operation.kind = static_cast<Kind>(number);
  for (std::string *part : {&operation.item, &operation.folder, &operation.name}) part->erase(0, 1);
  return operation;
}

std::string StormSchedule::folder() {
  static constexpr std::array<const char *, 5> kFolders = {"", "a", "b", "a/b", "b/a"};
  return kFolders.at(random_() % kFolders.size());
}

std::string StormSchedule::name() {
  static constexpr std::array<const char *, 4> kNames = {"a", "b", "x", "y"};
  return kNames.at(random_() % kNames.size());
}

StormOperation StormSchedule::next() {
  StormOperation operation;
  operation.kind = static_cast<StormOperation::Kind>(random_() % 5);
  operation.folder = folder();
  operation.name = name();
  const std::string where = folder();
  operation.item = where.empty() ? name() : where + "/" + name();
  using Kind = StormOperation::Kind;
  // Documents come in under their own names, folders are made under the folders' names.
  if (operation.kind == Kind::import) operation.name = random_() % 2 == 0 ? "x" : "y";
  if (operation.kind == Kind::create) operation.name = random_() % 2 == 0 ? "a" : "b";
  if (operation.kind == Kind::rename) operation.folder.clear();
  return operation;
}

}  // namespace droxa
