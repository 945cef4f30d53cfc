#include "tessaly/xpc/QVContentsValues.h"

#include <kj/debug.h>
#include <utility>

#include "platform/xpc/capnp/Values.h"

namespace droxa {

namespace {

void writeCounts(schema::QVTransferCounts::Builder builder, const QVTransferCounts &counts) {
  builder.setActive(counts.active);
  builder.setQueued(counts.queued);
  builder.setDone(counts.done);
  builder.setFailed(counts.failed);
  builder.setBytesDone(counts.bytesDone);
  builder.setBytesLeft(counts.bytesLeft);
  builder.setBytesPerSecond(counts.bytesPerSecond);
}

QVTransferCounts readCounts(schema::QVTransferCounts::Reader reader) {
  QVTransferCounts counts;
  counts.active = reader.getActive();
  counts.queued = reader.getQueued();
  counts.done = reader.getDone();
  counts.failed = reader.getFailed();
  counts.bytesDone = reader.getBytesDone();
  counts.bytesLeft = reader.getBytesLeft();
  counts.bytesPerSecond = reader.getBytesPerSecond();
  return counts;
}

}  // namespace

void writeContentsStatus(schema::QVContentsStatus::Builder builder, const QVContentsStatus &status) {
  builder.setContents(static_cast<std::uint8_t>(status.contents));
  builder.setUpload(static_cast<std::uint8_t>(status.upload));
  builder.setIsPinned(status.isPinned);
  builder.setSize(status.size);
  builder.setTransferred(status.transferred);
  builder.setChecksum(xpcBytes(status.checksum));
  setError(builder, status.error);
  builder.setDocuments(status.documents);
  builder.setDataless(status.dataless);
  builder.setUnsent(status.unsent);
  builder.setFailed(status.failed);
}

QVContentsStatus readContentsStatus(schema::QVContentsStatus::Reader reader) {
  KJ_REQUIRE(reader.getContents() <= static_cast<std::uint8_t>(QVContentsState::downloading),
             "contents in no known state", reader.getContents());
  KJ_REQUIRE(reader.getUpload() <= static_cast<std::uint8_t>(QVUploadState::failed),
             "an upload in no known state", reader.getUpload());
  QVContentsStatus status;
  status.contents = static_cast<QVContentsState>(reader.getContents());
  status.upload = static_cast<QVUploadState>(reader.getUpload());
  status.isPinned = reader.getIsPinned();
  status.size = reader.getSize();
  status.transferred = reader.getTransferred();
  status.checksum = xpcString(reader.getChecksum());
  status.error = getError(reader);
  status.documents = reader.getDocuments();
  status.dataless = reader.getDataless();
  status.unsent = reader.getUnsent();
  status.failed = reader.getFailed();
  return status;
}

void writeTransferStatus(schema::QVTransferStatus::Builder builder, const QVTransferStatus &status) {
  writeCounts(builder.initDownloads(), status.downloads);
  writeCounts(builder.initUploads(), status.uploads);
  builder.setCloud(xpcBytes(status.cloud));
  builder.setIsCloudReachable(status.isCloudReachable);
  builder.setCloudProblem(xpcBytes(status.cloudProblem));
  builder.setHeldDeletions(status.heldDeletions);
  builder.setConflicts(status.conflicts);
}

QVTransferStatus readTransferStatus(schema::QVTransferStatus::Reader reader) {
  QVTransferStatus status;
  status.downloads = readCounts(reader.getDownloads());
  status.uploads = readCounts(reader.getUploads());
  status.cloud = xpcString(reader.getCloud());
  status.isCloudReachable = reader.getIsCloudReachable();
  status.cloudProblem = xpcString(reader.getCloudProblem());
  status.heldDeletions = reader.getHeldDeletions();
  status.conflicts = reader.getConflicts();
  return status;
}

void writeContentsResult(schema::QVContentsResult::Builder builder, const QVContentsResult &result) {
  builder.setDocuments(result.documents);
  builder.setBytes(result.bytes);
  builder.setRefused(result.refused);
  auto failures = builder.initFailures(xpcCount(result.failures));
  for (unsigned index = 0; index < failures.size(); ++index) {
    auto failure = failures[index];
    failure.setPath(xpcBytes(result.failures[index].path));
    setError(failure, result.failures[index].error);
  }
}

QVContentsResult readContentsResult(schema::QVContentsResult::Reader reader) {
  QVContentsResult result;
  result.documents = reader.getDocuments();
  result.bytes = reader.getBytes();
  result.refused = reader.getRefused();
  result.failures.reserve(reader.getFailures().size());
  for (const auto failure : reader.getFailures()) {
    result.failures.push_back({xpcString(failure.getPath()), getError(failure)});
  }
  return result;
}

}  // namespace droxa
