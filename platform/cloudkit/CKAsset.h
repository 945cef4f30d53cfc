#pragma once

#include <compare>
#include <cstdint>
#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

// Contents that a cloud holds, told by what they are: equal references mean equal bytes.
// Thread contract: a value.
struct CKAssetReference {
  std::uint64_t size = 0;  // bytes
  std::string sha256;      // of the whole contents, 64 lower-case hex digits

  bool isWellFormed() const;
  std::string description() const;  // "sha256 (size bytes)"
  bool operator==(const CKAssetReference &) const = default;
  auto operator<=>(const CKAssetReference &) const = default;
};

// The bulk contents of a record's field: either a file that is to be uploaded when the record is saved, or a
// reference to contents that the cloud has. A default-constructed asset is nil. What a cloud answers holds
// references only. Two file assets are equal when they name the same path or are copies of one handle.
// Thread contract: a value; owns its duplicate of a descriptor, which the last copy closes.
class CKAsset {
 public:
  CKAsset() = default;  // nil
  static CKAsset assetWithReference(CKAssetReference reference);
  // The file is opened when it is uploaded, at its path then; without following a symbolic link.
  static CKAsset assetWithFileAtPath(std::string path);
  // Keeps a duplicate of the descriptor, which must be open for reading and allow pread(2); its position is
  // neither used nor moved. nil, with an NSPOSIXErrorDomain error, when it can't be duplicated.
  static CKAsset assetWithDescriptor(int descriptor, NSError *error);

  explicit operator bool() const { return kind_ != Kind::nil; }
  bool isReference() const { return kind_ == Kind::reference; }
  bool isFile() const { return kind_ == Kind::path || kind_ == Kind::descriptor; }
  const CKAssetReference &reference() const { return reference_; }  // empty unless isReference()
  const std::string &path() const { return path_; }                 // empty unless made with a path
  int descriptor() const;                                           // -1 unless made with a descriptor
  // Where this process can read the file; nil unless isFile(). That of a descriptor is good for as long as a
  // copy of the asset lives.
  NSURL fileURL() const;

  std::string description() const;
  bool operator==(const CKAsset &) const = default;

 private:
  enum class Kind : std::uint8_t { nil, reference, path, descriptor };
  Kind kind_ = Kind::nil;
  CKAssetReference reference_;
  std::string path_;
  std::shared_ptr<const int> descriptor_;
};

}  // namespace droxa
