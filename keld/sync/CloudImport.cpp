#include "keld/sync/CloudImport.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <set>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "keld/FolderReading.h"
#include "keld/TypeIdentifiers.h"
#include "keld/sync/AssetUploads.h"
#include "keld/sync/DocumentRecord.h"
#include "keld/sync/ReplicaFiles.h"
#include "keld/thumbnails/ThumbnailTypes.h"
#include "platform/cloudkit/CKDigest.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kRecordsAtATime = 200;
constexpr std::size_t kMostProblems = 1000;

// The same for the same path, so that an import that goes on doesn't make a document twice.
std::string recordFor(const std::string &path) {
  CKDigest digest;
  const std::string text = "import/" + path;
  digest.update({reinterpret_cast<const std::uint8_t *>(text.data()), text.size()});
  return digest.hex().substr(0, 32);
}

class Import {
 public:
  Import(CKCloud &cloud, const std::vector<std::string> &except,
         const std::function<void(const ImportReport &)> &progress, const ThumbnailsWanted &thumbnailsWanted)
      : cloud_(cloud), progress_(progress), thumbnailsWanted_(thumbnailsWanted) {
    for (const std::string &path : except) {
      struct stat status = {};
      if (::stat(path.c_str(), &status) == 0) except_.emplace(status.st_dev, status.st_ino);
    }
  }

  ImportReport run(const std::string &root) {
    OwnedDescriptor folder(::open(root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!folder) {
      report_.error = NSError::errorWithPOSIXCode(errno, root);
      return report_;
    }
    root_ = root;
    report_.error = cloud_.saveZone(DriveZone(), CKCallContext());
    if (!report_.error) readFolder(folder.get(), "", ContainerRecord(QVUbiquitousDefaultContainerID));
    if (!report_.error) flush();
    return report_;
  }

 private:
  void readFolder(int descriptor, const std::string &path, const std::string &parent) {
    NameList names;
    if (const int code = ReadFolderNames(descriptor, &names); code != 0) problem(path, code);
    for (std::size_t index = 0; index < names.size() && !report_.error; ++index)
      add(descriptor, path, std::string(names[index]), parent);
  }

  void add(int folder, const std::string &folderPath, const std::string &name, const std::string &parent) {
    const std::string path = folderPath.empty() ? name : folderPath + "/" + name;
    const auto facts = ReadFileFacts(folder, name, 0);
    if (!facts || qv_isNameExcludedFromSync(name)) {
      ++report_.skipped;
      return;
    }
    DocumentRecord document;
    document.record = recordFor(path);
    document.parent = parent;
    document.name = name;
    document.kind = facts->kind;
    document.content.mode = facts->mode & 07777U;
    if (facts->kind == NSFileProviderItemKind::folder) {
      const OwnedDescriptor child(
          ::openat(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
      struct stat status = {};
      if (!child || ::fstat(child.get(), &status) != 0) return problem(path, errno);
      if (except_.count({status.st_dev, status.st_ino}) != 0) return;
      ++report_.folders;
      save(MakeRecord(document));
      return readFolder(child.get(), path, document.record);
    }
    if (facts->kind != NSFileProviderItemKind::document) return addLink(folder, path, std::move(document));
    addDocument(folder, path, std::move(document), *facts);
  }

  void addLink(int folder, const std::string &path, DocumentRecord document) {
    char target[4096];
    const ssize_t length = ::readlinkat(folder, document.name.c_str(), target, sizeof target);
    if (length <= 0) return problem(path, errno);
    document.target.assign(target, static_cast<std::size_t>(length));
    ++report_.links;
    save(MakeRecord(document));
  }

  void addDocument(int folder, const std::string &path, DocumentRecord document, const FileFacts &facts) {
    const OwnedDescriptor file(
        ::openat(folder, document.name.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
    if (!file) return problem(path, errno);
    const AssetUploads::Finished sent =
        SendContents(cloud_, file.get(), LocalFileOf(facts), nullptr, CKCallContext());
    if (CKErrorIs(sent.error, CKErrorCode::assetFileModified))
      return problem(path, "it is being written; it was left out");
    if (CKErrorIs(sent.error, CKErrorCode::assetFileNotFound))
      return problem(path, sent.error.localizedDescription());
    if (sent.error) {
      report_.error = sent.error;
      return;
    }
    document.content.size = facts.size;
    document.content.modified = facts.modified;
    document.content.digest = sent.digest;
    ++report_.documents;
    report_.bytes += facts.size;
    if (thumbnailsWanted_ && facts.size > 0 && CanMakeThumbnailOfType(TypeIdentifierForName(document.name)))
      wanted_.push_back({document.record, sent.digest, root_ + "/" + path, LocalFileOf(facts)});
    save(MakeRecordWithContent(document));
  }

  void save(CKRecord record) {
    waiting_.push_back(std::move(record));
    if (waiting_.size() >= kRecordsAtATime) flush();
  }

  void flush() {
    CKModifyRequest request;
    request.isAtomic = false;
    request.recordsToSave.swap(waiting_);
    if (!request.recordsToSave.empty()) {
      const CKModifyReply reply = cloud_.modifyRecords(request, CKCallContext());
      if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) report_.error = reply.error;
      if (!report_.error && !wanted_.empty()) thumbnailsWanted_(wanted_);
      wanted_.clear();
      for (const CKRecordResult &result : reply.saved) {
        // What is there already came with an earlier run, and may have been changed since.
        const bool isThere = CKErrorIs(result.error, CKErrorCode::serverRecordChanged);
        if (result.error && !isThere && !report_.error) report_.error = result.error;
      }
    }
    if (progress_) progress_(report_);
  }

  void problem(const std::string &path, int code) { problem(path, std::strerror(code)); }
  void problem(const std::string &path, const std::string &why) {
    if (report_.problems.size() < kMostProblems) report_.problems.push_back(path + ": " + why);
  }

  CKCloud &cloud_;
  std::set<std::pair<dev_t, ino_t>> except_;
  const std::function<void(const ImportReport &)> &progress_;
  const ThumbnailsWanted &thumbnailsWanted_;
  std::string root_;
  ImportReport report_;
  std::vector<CKRecord> waiting_;
  std::vector<WantedThumbnail> wanted_;  // of the records that wait
};

}  // namespace

ImportReport ImportIntoCloud(CKCloud &cloud, const std::string &folder,
                             const std::vector<std::string> &except,
                             const std::function<void(const ImportReport &)> &progress,
                             const ThumbnailsWanted &thumbnailsWanted) {
  return Import(cloud, except, progress, thumbnailsWanted).run(folder);
}

}  // namespace droxa::keld
