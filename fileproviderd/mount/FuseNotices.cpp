#include "fileproviderd/mount/FuseNotices.h"

namespace droxa {

void FuseNotices::appeared(NodeId folder, const std::string &name, const struct stat & /*status*/) {
  fuse_lowlevel_notify_inval_entry(session_, folder, name.c_str(), name.size());
  listingChanged(folder);
}

void FuseNotices::disappeared(NodeId folder, const std::string &name, NodeId node, mode_t /*type*/) {
  fuse_lowlevel_notify_delete(session_, folder, node, name.c_str(), name.size());
  listingChanged(folder);
}

}  // namespace droxa
