// What a process that ended in the middle had made here, and not written down.
//
// Its transaction never ended, so the cloud tells of those records again, as far as they are there still:
// whatever was made for them can go. Left where it is, it would be taken for a person's document if its
// record has been deleted or renamed meanwhile.

#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <set>
#include <unistd.h>

#include "keld/contents/PromiseFile.h"
#include "keld/sync/CloudApplier.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr int kDeepest = 1000;

std::vector<std::string> namesIn(int folder) {
  std::vector<std::string> names;
  const int copy = ::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR *stream = copy < 0 ? nullptr : ::fdopendir(copy);
  if (!stream) {
    if (copy >= 0) ::close(copy);
    return names;
  }
  while (const dirent *entry = ::readdir(stream)) names.emplace_back(entry->d_name);
  ::closedir(stream);
  return names;
}

}  // namespace

void CloudApplier::beginUnfinished(const std::vector<DocumentRecord> &documents) {
  std::vector<UnfinishedRecord> records;
  for (const DocumentRecord &document : documents)
    // A link bears no marker that would tell whose it is.
    if (document.target.empty() && !context_.store.byRecord(document.record))
      records.push_back({document.record, document.parent, document.name, document.kind});
  context_.store.beginUnfinished(records);
}

void CloudApplier::undoUnfinished() {
  UnfinishedRecords records;
  std::set<std::string> folders;
  for (UnfinishedRecord &each : context_.store.unfinished()) {
    if (context_.store.byRecord(each.record)) continue;
    // Where the parent wasn't written down either, it is among them, and is looked into.
    if (const auto folder = context_.files.folderPath(each.parent)) folders.insert(*folder);
    records.emplace(each.record, std::move(each));
  }
  bool removedAny = false;
  for (const std::string &folder : folders) removedAny |= removeUnfinishedIn(folder, records, 0);
  if (removedAny) {
    syncReplica();
    finishBatch();
  }
  // A folder that was moved meanwhile is found when the whole replica was looked at.
  if (isReplicaSeen_) context_.store.forgetUnfinished();
}

bool CloudApplier::removeUnfinishedIn(const std::string &folderPath, const UnfinishedRecords &records,
                                      int depth) {
  FileLocation location;
  int code = 0;
  location.folder = context_.files.openFolder(folderPath, &code);
  if (!location || depth > kDeepest) return false;
  bool removedAny = false;
  for (const std::string &name : namesIn(location.folder.get())) {
    if (name == "." || name == "..") continue;
    const auto promise = IsPromiseName(name) ? ReadPromise(location.folder.get(), name) : std::nullopt;
    const auto marker = promise ? promise->marker : ReadMarker(location.folder.get(), name);
    const auto record = marker ? records.find(marker->recordName) : records.end();
    if (record == records.end()) continue;
    location.name = promise ? promise->name : name;
    location.path = folderPath + "/" + location.name;
    const bool isFolder = record->second.kind == NSFileProviderItemKind::folder;
    if (isFolder) removedAny |= removeUnfinishedIn(location.path, records, depth + 1);
    removedAny |= removeUnfinished(location, record->first);
  }
  return removedAny;
}

// Only as it was made: what somebody has written into it since, or put into the folder, is theirs.
bool CloudApplier::removeUnfinished(const FileLocation &location, const std::string &record) {
  const int folder = location.folder.get();
  const DocumentLook look = context_.storage.classify(folder, location.name);
  bool isRemoved = false;
  if (look.kind == DocumentClass::notADocument) {
    isRemoved = ::unlinkat(folder, location.name.c_str(), AT_REMOVEDIR) == 0;
  } else {
    // A person's own document that was found to be the record's has contents.
    const bool isAsMade =
        look.kind == DocumentClass::dataless || (look.kind == DocumentClass::present && look.facts.size == 0);
    if (!isAsMade || look.marker->recordName != record) return false;
    isRemoved = look.isPromised ? context_.storage.removePromise(folder, location.name).isDone()
                                : ::unlinkat(folder, location.name.c_str(), 0) == 0;
  }
  if (isRemoved) touch(location.path);
  return isRemoved;
}

}  // namespace droxa::keld
