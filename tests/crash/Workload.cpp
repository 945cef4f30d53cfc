#include "tests/crash/Workload.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/crash/RenamingEdit.h"

namespace droxa::crash {

namespace {

constexpr std::size_t kMostDocuments = 60;
constexpr std::size_t kMostFolders = 8;
constexpr std::uint64_t kNames = 40;  // few enough that both devices use the same ones

std::string lastName(const std::string &path) {
  return path.substr(path.rfind('/') == std::string::npos ? 0 : path.rfind('/') + 1);
}

// What another device's editor is about to rename. A person who writes into it meanwhile keeps it.
bool isTemporary(const std::string &path) {
  const std::string name = lastName(path);
  return name.compare(0, 7, "saving ") == 0 && name.find("conflict") == std::string::npos;
}

std::vector<std::string> pathsOf(const Tree &tree, bool folders) {
  std::vector<std::string> paths;
  for (const auto &[path, entry] : tree)
    if (entry.isFolder == folders && !isTemporary(path)) paths.push_back(path);
  return paths;
}

std::string below(const std::string &folder, const std::string &name) {
  return folder.empty() ? name : folder + "/" + name;
}

// One of the folders, or the root.
std::string pickFolder(const Tree &tree, std::uint64_t pick) {
  const auto folders = pathsOf(tree, true);
  const std::uint64_t index = pick % (folders.size() + 1);
  return index == folders.size() ? "" : folders[index];
}

std::string documentName(std::uint64_t pick) {
  return "document " + std::to_string(pick % kNames) + ".txt";
}

}  // namespace

Workload::Open::~Open() {
  if (file >= 0) ::close(file);
}

std::unique_ptr<Workload::Open> Workload::open(const std::string &path, int flags) const {
  return read(::open(path.c_str(), flags | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
}

std::unique_ptr<Workload::Open> Workload::read(int file) const {
  auto opened = std::make_unique<Open>();
  opened->file = file;
  struct stat status = {};
  if (opened->file < 0 || ::fstat(opened->file, &status) != 0 || !S_ISREG(status.st_mode)) return nullptr;
  opened->inode = status.st_ino;
  const auto mark = ReadMark(opened->file);
  // What was written since the mark was set counts, and not what the mark says.
  const auto text = ReadAll(opened->file);
  opened->version = text ? ReadDocumentText(*text) : std::nullopt;
  opened->hasContents = opened->version && !(mark && mark->state == 'e');
  const bool isAway =
      mark && (mark->state == 'e' || (mark->state == 'd' && ::lseek(opened->file, 0, SEEK_DATA) < 0));
  if (!opened->version && isAway && status.st_size > 0) opened->version = model_.byDigest(mark->digest);
  return opened;
}

void Workload::perform(const Step &step) {
  CrashDevice &device = *devices_[step.device];
  const Tree tree = ReadTree(device.documents());
  const auto documents = pathsOf(tree, false);
  const auto folders = pathsOf(tree, true);
  switch (step.action) {
    case Action::create:
      if (documents.size() < kMostDocuments) create(device, tree, step);
      return;
    case Action::makeFolder:
      if (folders.size() < kMostFolders)
        ::mkdir(device.at(below(pickFolder(tree, step.pick), "folder " + std::to_string(step.otherPick % 6)))
                    .c_str(),
                0755);
      return;
    case Action::waitForUpload:
      return waitForUpload(device);
    case Action::editOnBoth:
      return editOnBoth(step);
    case Action::renameFolder:
    case Action::moveFolder:
    case Action::deleteFolder:
      if (!folders.empty()) performOnFolder(step, device, folders[step.pick % folders.size()], tree);
      return;
    default:
      if (!documents.empty()) performOnDocument(step, device, documents[step.pick % documents.size()], tree);
      return;
  }
}

void Workload::performOnDocument(const Step &step, CrashDevice &device, const std::string &path,
                                 const Tree &tree) {
  switch (step.action) {
    case Action::editInPlace:
      editInPlace(device, path, step);
      return;
    case Action::editByTruncating:
      editByTruncating(device, path, step);
      return;
    case Action::editByRenamingOver:
      editByRenamingOver(device, path, step);
      return;
    case Action::renameDocument: {
      const std::size_t slash = path.rfind('/');
      return move(device, path, slash == std::string::npos ? "" : path.substr(0, slash),
                  documentName(step.otherPick));
    }
    case Action::moveDocument:
      return move(device, path, pickFolder(tree, step.otherPick), lastName(path));
    case Action::deleteDocument:
      return deleteDocument(device, path);
    case Action::download:
      return download(device, path);
    case Action::evict:
      return evict(device, path);
    default:
      return;
  }
}

void Workload::performOnFolder(const Step &step, CrashDevice &device, const std::string &path,
                               const Tree &tree) {
  const std::size_t slash = path.rfind('/');
  const std::string parent = slash == std::string::npos ? "" : path.substr(0, slash);
  if (step.action == Action::renameFolder)
    move(device, path, parent, "folder " + std::to_string(step.otherPick % 6));
  if (step.action == Action::moveFolder) move(device, path, pickFolder(tree, step.otherPick), lastName(path));
  if (step.action == Action::deleteFolder) deleteFolder(device, path);
}

// --- Writing.

bool Workload::writeWhole(int file, const std::string &text) const {
  std::size_t done = 0;
  while (done < text.size()) {
    const ssize_t count = ::pwrite(file, text.data() + done, text.size() - done, static_cast<off_t>(done));
    if (count <= 0) return false;
    done += static_cast<std::size_t>(count);
  }
  return ::fsync(file) == 0;
}

void Workload::noteWriting(const Open &document, const std::string &path, const VersionName &name) {
  struct stat own = {}, there = {};
  ::fstat(document.file, &own);
  ::stat(path.c_str(), &there);
  model_.note("wrote " + name.description() + " into inode " + std::to_string(own.st_ino) + " with " +
              std::to_string(own.st_nlink) + " names, which " + (document.hasContents ? "had" : "had no") +
              " contents; " + path + " is inode " + std::to_string(there.st_ino));
}

void Workload::create(CrashDevice &device, const Tree &tree, const Step &step) {
  const std::string path = below(pickFolder(tree, step.pick), documentName(step.otherPick));
  const int file = ::open(device.at(path).c_str(), O_CREAT | O_EXCL | O_RDWR | O_CLOEXEC | O_NOFOLLOW, 0644);
  if (file < 0) return;
  const VersionName name = model_.begin(std::nullopt, step.length, device.name() + " made " + path);
  if (writeWhole(file, DocumentText(name, step.length))) model_.acknowledge(name);
  ::close(file);
  model_.count("created");
}

// The text keeps its length, so that one call writes all of it.
bool Workload::editInPlace(CrashDevice &device, const std::string &path, const Step &) {
  const auto document = open(device.at(path), O_RDWR);
  if (!document || !document->version || !document->hasContents) return false;
  struct stat status = {};
  ::fstat(document->file, &status);
  const auto size = static_cast<std::uint64_t>(status.st_size);
  if (size < 200) return false;
  const VersionName name = model_.begin(document->version, size - 100, device.name() + " wrote into " + path);
  // The first line takes less than 100 bytes: what is left is cut off.
  const std::string text = DocumentText(name, size - 100);
  const bool written = writeWhole(document->file, text) &&
                       ::ftruncate(document->file, static_cast<off_t>(text.size())) == 0 &&
                       ::fsync(document->file) == 0;
  if (written) model_.acknowledge(name);
  noteWriting(*document, device.at(path), name);
  model_.count("edited in place");
  return true;
}

bool Workload::editByTruncating(CrashDevice &device, const std::string &path, const Step &step) {
  const auto document = open(device.at(path), O_RDWR);
  if (!document || !document->version) return false;
  const VersionName name =
      model_.begin(document->version, step.length, device.name() + " truncated and wrote " + path);
  const bool written =
      ::ftruncate(document->file, 0) == 0 && writeWhole(document->file, DocumentText(name, step.length));
  if (written) model_.acknowledge(name);
  noteWriting(*document, device.at(path), name);
  model_.count("edited by truncating");
  return true;
}

// The temporary lies beside the document for one half, and where the drive doesn't see it for the other. The
// daemon may move the document's folder meanwhile.
bool Workload::editByRenamingOver(CrashDevice &device, const std::string &path, const Step &step) {
  const bool isBeside = step.otherPick % 2 == 0;
  const std::string name = "saving " + std::to_string(++temporaries_);
  RenamingEdit edit(device.at(path), isBeside ? "" : device.outside(), name);
  const auto document = read(edit.openDocument());
  if (!document || !document->version || !edit.makeTemporary()) return false;
  const VersionName version =
      model_.begin(document->version, step.length, device.name() + " renamed a new file over " + path);
  bool done = writeWhole(edit.temporary(), DocumentText(version, step.length));
  // What is replaced has to be what was read; the daemon may have brought something newer meanwhile.
  const auto now = read(edit.openDocument());
  done = done && now && now->version == document->version && edit.renameOver();
  model_.note(device.name() + (done ? " renamed " : " gave up ") + name + ", which was for " + path + " as " +
              version.description());
  if (!done) return false;
  model_.acknowledge(version);
  model_.count("edited by renaming over");
  return true;
}

void Workload::editOnBoth(const Step &step) {
  const Tree tree = ReadTree(devices_[0]->documents());
  const Tree other = ReadTree(devices_[1]->documents());
  std::vector<std::string> shared;
  for (const auto &[path, entry] : tree)
    if (!entry.isFolder && !isTemporary(path) && other.count(path) > 0) shared.push_back(path);
  if (shared.empty()) return;
  const std::string path = shared[step.pick % shared.size()];
  Step second = step;
  second.length = step.length / 2;
  const bool first = step.otherPick % 3 == 0 ? editByRenamingOver(*devices_[step.device], path, step)
                                             : editByTruncating(*devices_[step.device], path, step);
  if (first && editByTruncating(*devices_[1 - step.device], path, second)) model_.count("edited on both");
}

void Workload::move(CrashDevice &device, const std::string &from, const std::string &folder,
                    const std::string &name) {
  const std::string to = below(folder, name);
  if (to == from || to.compare(0, from.size() + 1, from + "/") == 0) return;
  if (::renameat2(AT_FDCWD, device.at(from).c_str(), AT_FDCWD, device.at(to).c_str(), RENAME_NOREPLACE) != 0)
    return;
  model_.note(device.name() + " moved " + from + " to " + to);
  model_.count("moved");
}

// --- Deleting. What is deleted leaves the drive in one step, so that what was deleted is known exactly.

void Workload::countAsDeleted(const std::string &path, const std::string &where) {
  const auto document = open(path, O_RDONLY);
  if (document && document->version) model_.deleted(*document->version, where);
}

void Workload::deleteDocument(CrashDevice &device, const std::string &path) {
  const std::string out = device.outside() + "/deleted " + std::to_string(++temporaries_);
  if (::rename(device.at(path).c_str(), out.c_str()) != 0) return;
  countAsDeleted(out, device.name() + " deleted " + path);
  ::unlink(out.c_str());
  model_.count("deleted");
}

void Workload::deleteFolder(CrashDevice &device, const std::string &path) {
  const std::string out = device.outside() + "/deleted " + std::to_string(++temporaries_);
  if (::rename(device.at(path).c_str(), out.c_str()) != 0) return;
  for (const auto &[inside, entry] : ReadTree(out))
    if (!entry.isFolder)
      countAsDeleted(out + "/" + inside, device.name() + " deleted " + path + "/" + inside);
  deletedFolders_.push_back(out);
  model_.count("folders deleted");
}

void Workload::lookAtDeletedFolders() {
  for (const std::string &out : deletedFolders_) {
    for (const auto &[inside, entry] : ReadTree(out))
      if (!entry.isFolder) countAsDeleted(out + "/" + inside, "in a deleted folder");
    std::error_code ignored;
    std::filesystem::remove_all(out, ignored);
  }
  deletedFolders_.clear();
}

// --- The daemon's word.

bool Workload::cloudHas(const std::string &digest, std::uint64_t size) const {
  const CKCallContext context = CKCallContext::withTimeout(std::chrono::seconds(60));
  return size == 0 || cloud_->hasAsset({size, digest}, context).isPresent;
}

void Workload::download(CrashDevice &device, const std::string &path) {
  const NSError error = device.download(path);
  model_.note(device.name() + " downloaded " + path + ": " + error.description());
  if (error) return;
  model_.count("downloads acknowledged");
  const int file = ::open(device.at(path).c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) return;  // moved or deleted from elsewhere
  const auto mark = ReadMark(file);
  const auto text = ReadAll(file);
  ::close(file);
  const std::string what = device.name() + ": the download of " + path + " was acknowledged, ";
  if (!text || (mark && mark->state == 'e')) model_.finding(what + "but its contents can't be read");
  // Another device's document that was being written may be fetched as it was in the middle; its contents
  // are those that the mark names all the same.
  if (text && mark && mark->state == 'p' && !ReadDocumentText(*text) && TextDigest(*text) != mark->digest)
    model_.finding(what + "but its contents are neither a version nor what its mark says");
}

void Workload::evict(CrashDevice &device, const std::string &path) {
  const NSError error = device.evict(path);
  model_.note(device.name() + " evicted " + path + ": " + error.description());
  if (error) return;
  model_.count("evictions acknowledged");
  const int file = ::open(device.at(path).c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) return;
  const auto mark = ReadMark(file);
  ::close(file);
  if (mark && mark->state == 'd' && !cloudHas(mark->digest, mark->size))
    model_.finding(device.name() + ": " + path + " was evicted, and the cloud doesn't have it");
}

void Workload::waitForUpload(CrashDevice &device) {
  // What is here before the question is asked has to be in the cloud when it is answered.
  std::vector<std::pair<std::string, std::string>> texts;
  for (const auto &[path, entry] : ReadTree(device.documents())) {
    if (entry.isFolder || entry.isDataless()) continue;
    auto text = ReadAll(device.at(path));
    if (text && ReadDocumentText(*text)) texts.emplace_back(path, std::move(*text));
  }
  if (device.waitForUpload()) return;
  model_.count("waits for upload acknowledged");
  for (const auto &[path, text] : texts)
    if (!cloudHas(TextDigest(text), text.size()))
      model_.finding(device.name() + ": " + path + " should be in the cloud, but isn't");
}

}  // namespace droxa::crash
