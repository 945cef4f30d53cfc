#include "tessaly/QVMoveCapability.h"

#include "tessaly/QVDaemonConnection.h"

namespace droxa {

namespace {

std::uint64_t needsOfDataless(const QVMove &move) {
  std::uint64_t needs = 0;
  const bool leaves = move.leavesDrive || move.leavesContainer;
  if (leaves && move.isOfFolder) needs |= QVMoveFolderAwayWithDataless;
  if (move.leavesDrive && !move.isOfFolder) needs |= QVMoveDatalessOutOfDrive;
  if (move.leavesContainer && !move.isOfFolder) needs |= QVMoveDatalessAcrossContainers;
  if (move.isIntoLocalPlace)
    needs |= move.isOfFolder ? QVMoveFolderIntoLocalPlaceWithDataless : QVMoveDatalessIntoLocalPlace;
  if (move.leavesShare) needs |= QVMoveDatalessOutOfShare;
  return needs;
}

}  // namespace

std::uint64_t QVCapabilityOfMove(const QVMove &move) {
  if (move.isOfContainer) return QVMoveOfContainer;
  if (move.isIntoItself) return QVMoveIntoItself;
  if (move.isToReadOnlyPlace) return QVMoveToReadOnlyPlace;
  // An alias has no contents, and the trash takes an item as it is.
  if (move.isOfAlias) return QVMoveOfAlias;
  if (move.isIntoTrash) return QVMoveIntoTrash;
  if (const std::uint64_t needs = move.isDataless ? needsOfDataless(move) : 0) return needs;
  if (move.leavesDrive) return QVMoveOutOfDrive;
  return move.leavesContainer ? QVMoveAcrossContainers : QVMoveWithinContainer;
}

std::uint64_t qv_capabilityToMoveToURL(const NSURL &source, const NSURL &destination, NSError *error) {
  const auto daemon = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*daemon)->getMoveCapability(source, destination, [&](std::uint64_t capability, const NSError &failure) {
    daemon->setObjResult(capability, failure);
  });
  const NSError failure = daemon->error();
  if (error && failure) *error = failure;
  return failure ? 0 : daemon->result<std::uint64_t>();
}

}  // namespace droxa
