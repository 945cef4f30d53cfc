#pragma once

#include <atomic>
#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "keld/FolderReading.h"
#include "keld/contents/ContentsCapabilities.h"
#include "keld/contents/ContentsResult.h"
#include "keld/contents/DocumentClass.h"
#include "keld/contents/DocumentMarker.h"
#include "keld/contents/PartFile.h"

namespace droxa::keld {

// The storage's folder in the replica's. No container has such a name.
inline constexpr char kContentsStorageName[] = ".droxa-private";

// Called on the thread of the operation, at the moments that a race needs. For tests.
struct ContentsHooks {
  std::function<void()> beforeExchange;  // everything is checked, the names are not swapped yet
  std::function<void()> afterExchange;   // swapped, what came out is not looked at yet
  std::function<void()> beforePunch;     // marked as evicting, the contents are still there
  std::function<void()> afterPunch;      // punched (or the document removed), not marked as dataless yet
};

struct ContentsSettings {
  std::uint64_t spaceToLeave = 64ULL << 20;    // bytes that a download leaves free
  std::chrono::hours partLifetime{24 * 7};     // after which recover() removes what nobody resumed
  std::optional<ContentsCapabilities> assume;  // instead of probing
  ContentsHooks hooks;
};

enum class PartUse {
  consume,  // the part itself becomes the document
  keep,     // the document is a copy: other documents want the same contents
};

struct DocumentDates {
  std::int64_t birth = 0;  // nanoseconds since 1970; 0 when not known
  std::int64_t modified = 0;
};

// Something of the user's that an interrupted exchange left in the storage.
struct RescuedFile {
  std::string id;
  std::string folderPath;         // where it was, relative to the replica ("" for the replica itself)
  std::uint64_t folderInode = 0;  // of the same
  std::string name;
  FileFacts facts;
  std::optional<DocumentMarker> marker;
};

class ContentsStorage;
class OutgoingDocument;
struct ExchangeNote;
enum class TemporaryKind : char;

// Something made in the storage and not yet at its place: durable, removed with this object unless it was
// published (contents made of a part go back to being that part). Thread contract: a value that moves; it
// must not outlive its storage.
class PreparedFile {
 public:
  PreparedFile() = default;
  PreparedFile(PreparedFile &&other) noexcept { *this = std::move(other); }
  PreparedFile &operator=(PreparedFile &&other) noexcept;
  ~PreparedFile() { drop(); }

  explicit operator bool() const { return storage_ != nullptr; }
  std::uint64_t inode() const { return facts_.inode; }

 private:
  friend class ContentsStorage;
  enum class Kind { placeholder, promise, contents, folder };
  void drop();

  const ContentsStorage *storage_ = nullptr;
  Kind kind_ = Kind::placeholder;
  std::string temporary_;  // its name in the storage's folder of temporaries
  std::string digest_;     // of a consumed part
  DocumentMarker marker_;
  std::uint32_t mode_ = 0644;
  FileFacts facts_;
  OwnedDescriptor file_;  // of a consumed part, whose lock goes with it
};

struct PreparedResult {
  ContentsResult result;
  PreparedFile file;
};

struct PartResult {
  ContentsResult result;
  std::unique_ptr<PartFile> part;
};

// The files' side of the documents of one replica: everything that makes, fills, replaces or empties a
// document goes through it. Owns the folder `.droxa-private` on the replica's file system. Each operation
// survives a kill and a power cut at any moment: contents are durable before a name shows them, readers see
// the old or the new whole, and nothing of the user's is removed, only put back or kept for rescuedFiles().
//
// Folders are given open, as a path alone or not. Thread contract: immutable but for a counter; any thread,
// any number at once, but for one document one operation at a time. recover() runs before all others.
class ContentsStorage {
 public:
  // Opens the storage in the replica's folder, and makes it where it isn't there. Null with `error` set to an
  // errno: EACCES, EROFS, ENOSPC, …
  static std::unique_ptr<ContentsStorage> open(const std::string &replicaPath, ContentsSettings settings,
                                               int *error);
  ~ContentsStorage();
  ContentsStorage(const ContentsStorage &) = delete;
  ContentsStorage &operator=(const ContentsStorage &) = delete;

  const ContentsCapabilities &capabilities() const { return capabilities_; }
  DatalessForm form() const { return capabilities_.form(); }
  DocumentLook classify(int folder, const std::string &name) const {
    return ClassifyDocument(folder, name, form(), device_);
  }

  // ---- new documents and folders ----

  // A dataless document for publishNew or replaceContents. The marker's state is made `dataless`, its birth
  // `dates.birth`; its `modified` belongs to the contents and should be `dates.modified`. (A document of no
  // bytes is made `present` straight away.)
  PreparedResult preparePlaceholder(DocumentMarker marker, std::uint32_t mode,
                                    const DocumentDates &dates) const;
  // A document made of a finished part. The marker's state is made `present`; its digest and size must be
  // the part's, and its `modified` becomes the file's date.
  PreparedResult prepareContents(PartFile &part, PartUse use, DocumentMarker marker,
                                 std::uint32_t mode) const;
  PreparedResult prepareFolder(const DocumentMarker &marker, std::uint32_t mode = 0755) const;
  // Puts it at the name if that is free: done, nameTaken, folderGone, noSpace or error. Consumed when done,
  // and can be tried again otherwise.
  ContentsResult publishNew(PreparedFile &prepared, int folder, const std::string &name) const;

  // ---- downloads ----

  // The part for these contents, as long as it was left. busy, noSpace or error when there is none.
  PartResult openPart(const std::string &digest, std::uint64_t size) const;
  // Removes the part, unless somebody writes it: busy.
  ContentsResult forgetPart(const std::string &digest) const;

  // ---- documents in the replica ----

  // Fills a dataless document: done; gone (the part stays), changedMeanwhile, inUse (somebody has the
  // placeholder open for writing), noSpace or error. Unless done, the part stays as it was (when something
  // was rescued it may have to be opened again). `expected` are the facts of the placeholder that is to be
  // filled (of the promise in the promise form); its inode counts.
  ContentsResult materialise(int folder, const std::string &name, PartFile &part, PartUse use,
                             const DocumentMarker &marker, std::uint32_t mode,
                             const FileFacts &expected) const;
  // Puts a newer version (contents or a placeholder) where an unchanged document is, whether it is present or
  // dataless: done, gone, changedMeanwhile, inUse, noSpace or error. `expected`: inode, size, modification
  // time and (unless 0) time of change as last known. `prepared` is consumed when done.
  ContentsResult replaceContents(int folder, const std::string &name, PreparedFile &prepared,
                                 const FileFacts &expected) const;
  // Lets go of the contents of a document that the cloud has as `marker` tells: done; gone; changedMeanwhile
  // (inode, size or dates aren't the expected or the marker's, or it has several links); inUse (anybody has
  // it open); error. Where the file system has no leases, only processes that may be looked at are seen.
  ContentsResult evict(int folder, const std::string &name, const FileFacts &expected,
                       DocumentMarker marker) const;
  // Ends an eviction that was cut short; the document must classify as evicting (else changedMeanwhile).
  ContentsResult finishEviction(int folder, const std::string &name) const;
  // Removes a promise that is no longer needed because its document is there (isPromised). Done also when
  // there is none.
  ContentsResult removePromise(int folder, const std::string &name) const;

  // ---- after a crash ----

  // Ends what was cut short, removes leftovers and stale parts, and returns rescuedFiles().
  std::vector<RescuedFile> recover() const;
  // What waits to be put where the user finds it, e.g. as a conflict copy beside its old place.
  std::vector<RescuedFile> rescuedFiles() const;
  // Moves one out of the storage, to a free name: done, nameTaken, folderGone, gone or error.
  ContentsResult placeRescued(const std::string &id, int folder, const std::string &name) const;

 private:
  friend class PreparedFile;
  explicit ContentsStorage(ContentsSettings settings) : settings_(std::move(settings)) {}
  int openFolders(const std::string &replicaPath);
  int hasNoRoomFor(std::uint64_t bytes) const;

  // Making things (ContentsStorage.cpp, PreparedFiles.cpp).
  std::string newTemporary(TemporaryKind kind, const std::string &digest = {}) const;
  PreparedResult prepareEmptyFile(const DocumentMarker &marker, std::uint32_t mode,
                                  std::int64_t modified) const;
  PreparedResult preparePromise(const DocumentMarker &marker, std::uint32_t mode,
                                const DocumentDates &dates) const;
  int completeFile(int file, const DocumentMarker &marker, std::uint32_t mode) const;
  int takePart(PartFile &part, PreparedFile *prepared) const;
  int copyPart(PartFile &part, PreparedFile *prepared) const;
  void giveBack(PreparedFile &prepared, PartFile &part) const;
  void discardTemporary(const std::string &temporary) const;
  int writePromise(const std::string &temporary, const PreparedFile &prepared, const std::string &name) const;
  int putPromise(int folder, const std::string &name, const PreparedFile &prepared) const;

  // Replacing (Replacement.cpp). The file at the name comes out under the prepared file's temporary name.
  ContentsResult replaceOpened(int folder, const std::string &name, PreparedFile &prepared,
                               OutgoingDocument &outgoing) const;
  int takeOverAttributes(const OutgoingDocument &outgoing, const PreparedFile &prepared) const;
  ContentsResult exchange(int folder, const std::string &name, PreparedFile &prepared,
                          OutgoingDocument &outgoing) const;
  ContentsResult undoExchange(int folder, const std::string &name, PreparedFile &prepared,
                              const OutgoingDocument &outgoing) const;
  ContentsResult fulfilPromise(int folder, const std::string &name, PreparedFile &prepared,
                               const FileFacts &expected) const;
  // Without exchanging: the name is free for a moment.
  ContentsResult replaceByTakingOut(int folder, const std::string &name, PreparedFile &prepared,
                                    OutgoingDocument &outgoing) const;
  ContentsResult publishAtFreeName(PreparedFile &prepared, int folder, const std::string &name) const;
  ContentsResult takeOut(int folder, const std::string &name, const OutgoingDocument &outgoing,
                         std::string *temporary) const;
  ContentsResult putBack(const std::string &temporary, int folder, const std::string &name) const;
  ContentsResult succeeded(int folder, const std::string &name) const;

  // Letting go (Eviction.cpp).
  ContentsResult letGo(OutgoingDocument &document, DocumentMarker marker) const;
  ContentsResult evictToPromise(int folder, const std::string &name, const FileFacts &expected,
                                const DocumentMarker &marker) const;

  // Notes and recovery (Recovery.cpp).
  int writeNote(const std::string &temporary, int folder, const std::string &name,
                const OutgoingDocument &outgoing, const FileFacts &incoming) const;
  void removeNote(const std::string &temporary) const;
  void dispose(const std::string &temporary) const;
  bool rescue(const std::string &temporary) const;
  bool isAsPrepared(const PreparedFile &prepared) const;
  void recoverNote(const std::string &noteName) const;
  void recoverTemporary(const std::string &temporary) const;
  void recoverOutgoing(const std::string &temporary, const ExchangeNote &note) const;
  void removeStaleParts() const;
  OwnedDescriptor openNoted(const ExchangeNote &note) const;

  const ContentsSettings settings_;
  ContentsCapabilities capabilities_;
  std::uint64_t device_ = 0;
  OwnedDescriptor replica_;
  OwnedDescriptor parts_;
  OwnedDescriptor temporaries_;
  OwnedDescriptor rescued_;
  mutable std::atomic<std::uint64_t> nextID_{0};
};

}  // namespace droxa::keld
