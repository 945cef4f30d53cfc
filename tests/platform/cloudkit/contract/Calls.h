#pragma once

#include <ctime>
#include <gtest/gtest.h>
#include <string>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/cloudkit/CKCloud.h"
#include "platform/cloudkit/CKDigest.h"
#include "tests/support/Eventually.h"

// The words in which the suite speaks: calls that must succeed, records and files.
namespace droxa::contract {

inline const CKRecordZoneID kZone{"documents"};

inline CKCallContext patiently() {
  return CKCallContext::withTimeout(kTestDeadline);
}

inline CKRecord item(const std::string &name, const std::string &title = "title") {
  CKRecord record;
  record.recordType = "Item";
  record.recordID = {name, kZone};
  record.fields["title"] = title;
  return record;
}

inline CKModifyReply modify(CKCloud &cloud, std::vector<CKRecord> saves,
                            CKRecordSavePolicy policy = CKRecordSavePolicy::ifServerRecordUnchanged,
                            bool isAtomic = true) {
  return cloud.modifyRecords({std::move(saves), {}, policy, isAtomic}, patiently());
}

// The record as saved; the test fails when it isn't.
inline CKRecord save(CKCloud &cloud, CKRecord record,
                     CKRecordSavePolicy policy = CKRecordSavePolicy::ifServerRecordUnchanged) {
  const CKModifyReply reply = modify(cloud, {std::move(record)}, policy);
  EXPECT_FALSE(reply.error) << reply.error.description()
                            << (reply.saved.empty() ? "" : reply.saved[0].error.description());
  return reply.saved.empty() ? CKRecord() : reply.saved[0].record;
}

inline NSError saveError(CKCloud &cloud, CKRecord record,
                         CKRecordSavePolicy policy = CKRecordSavePolicy::ifServerRecordUnchanged) {
  const CKModifyReply reply = modify(cloud, {std::move(record)}, policy);
  return reply.saved.empty() ? reply.error : reply.saved[0].error;
}

inline NSError removeError(CKCloud &cloud, const CKRecordID &id, const std::string &tag = {}) {
  const CKModifyReply reply = cloud.modifyRecords({{}, {{id, tag}}}, patiently());
  return reply.deleted.empty() ? reply.error : reply.deleted[0].error;
}

inline CKRecordResult fetch(CKCloud &cloud, const CKRecordID &id, const CKDesiredKeys &keys = {}) {
  CKFetchReply reply = cloud.fetchRecords({id}, keys, patiently());
  EXPECT_EQ(reply.results.size(), 1U) << reply.error.description();
  return reply.results.empty() ? CKRecordResult{id, reply.error, {}} : std::move(reply.results[0]);
}

inline CKZoneChanges changes(CKCloud &cloud, const CKServerChangeToken &token = {}, std::size_t limit = 100) {
  return cloud.fetchZoneChanges(kZone, token, {}, limit, patiently());
}

inline bool hasCode(const NSError &error, CKErrorCode code) {
  return CKErrorIs(error, code);
}

#define EXPECT_CODE(error, code)                                                                     \
  do {                                                                                               \
    const NSError outcome_ = (error);                                                                \
    EXPECT_TRUE(CKErrorIs(outcome_, CKErrorCode::code)) << #code ", not " << outcome_.description(); \
  } while (false)
#define EXPECT_OK(error)                              \
  do {                                                \
    const NSError outcome_ = (error);                 \
    EXPECT_FALSE(outcome_) << outcome_.description(); \
  } while (false)

// Bytes that no chunk repeats, always the same for a seed.
inline std::string noise(std::size_t size, std::uint64_t seed = 1) {
  std::string bytes(size, '\0');
  std::uint64_t state = seed * 0x9e3779b97f4a7c15U;
  for (std::size_t i = 0; i < size; ++i) {
    if (i % 8 == 0) {
      state ^= state << 13;
      state ^= state >> 7;
      state ^= state << 17;
    }
    bytes[i] = static_cast<char>((state >> (8 * (i % 8))) & 0xff);
  }
  return bytes;
}

inline std::string digestOf(const std::string &bytes) {
  CKDigest digest;
  digest.update({reinterpret_cast<const std::uint8_t *>(bytes.data()), bytes.size()});
  return digest.hex();
}

// A file without a name that holds the bytes.
class MemoryFile {
 public:
  explicit MemoryFile(const std::string &bytes) : descriptor_(memfd_create("contract", MFD_CLOEXEC)) {
    put(bytes, 0);
  }
  ~MemoryFile() { close(descriptor_); }
  MemoryFile(const MemoryFile &) = delete;
  MemoryFile &operator=(const MemoryFile &) = delete;
  int descriptor() const { return descriptor_; }
  void put(const std::string &bytes, std::size_t offset) const {
    EXPECT_EQ(pwrite(descriptor_, bytes.data(), bytes.size(), static_cast<off_t>(offset)),
              static_cast<ssize_t>(bytes.size()));
  }
  // And says that it did so at that time, in seconds since 1970.
  void putAt(const std::string &bytes, std::size_t offset, std::time_t time) const {
    put(bytes, offset);
    const timespec times[2] = {{time, 0}, {time, 0}};
    EXPECT_EQ(futimens(descriptor_, times), 0);
  }

 private:
  const int descriptor_;
};

inline CKUploadReply upload(CKCloud &cloud, const std::string &bytes) {
  const MemoryFile file(bytes);
  return cloud.uploadAsset(file.descriptor(), bytes.size(), {}, patiently());
}

// All bytes from an offset, or why they didn't come.
inline std::pair<std::string, NSError> read(CKCloud &cloud, const CKAssetReference &asset,
                                            std::uint64_t offset = 0) {
  std::string bytes;
  NSError error = cloud.readAsset(
      asset, offset,
      [&](std::span<const std::uint8_t> part) {
        bytes.append(reinterpret_cast<const char *>(part.data()), part.size());
        return NSError();
      },
      {}, patiently());
  return {bytes, error};
}

}  // namespace droxa::contract
