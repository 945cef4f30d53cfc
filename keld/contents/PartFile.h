#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "keld/FolderReading.h"
#include "keld/contents/ContentsResult.h"

namespace droxa::keld {

class FollowingDigest;

// A download on its way: a file of the storage, named by the digest of what it shall be, locked against a
// second writer (in this process and in others) for as long as the object lives. What was appended before a
// crash is kept. Made by ContentsStorage::openPart. Thread contract: used by one thread at a time.
class PartFile {
 public:
  ~PartFile();
  PartFile(const PartFile &) = delete;
  PartFile &operator=(const PartFile &) = delete;

  const std::string &digest() const { return digest_; }
  std::uint64_t size() const { return size_; }      // what it shall be
  std::uint64_t length() const { return length_; }  // what is there: where the download goes on
  bool isFinished() const { return isFinished_; }

  // done; noSpace (what fitted is kept: see length()); wrongContents when it would get longer than size()
  // (the part is removed); error.
  ContentsResult append(std::string_view bytes);
  // Makes it durable and checks size and digest: done, and isFinished(); wrongContents, and the part is
  // removed; noSpace or error, and the part is kept.
  ContentsResult finish();
  // Removes the part from the disk; nothing else may be called then.
  void discard();

  int descriptor() const { return file_.get(); }

 private:
  friend class ContentsStorage;
  PartFile(int partsFolder, OwnedDescriptor file, std::string digest, std::uint64_t size, bool isFinished);
  int goOn();
  std::string fileName() const;

  const int partsFolder_;  // the storage's, which outlives it
  const std::string digest_;
  const std::uint64_t size_;
  OwnedDescriptor file_;
  std::unique_ptr<FollowingDigest> hash_;  // of the first length_ bytes; null when finished
  std::uint64_t length_ = 0;
  std::uint64_t handedToDisk_ = 0;  // so much of it the disk was asked to begin with
  bool isFinished_ = false;
  bool isTaken_ = false;  // removed, or moved to where a document is made of it
};

}  // namespace droxa::keld
