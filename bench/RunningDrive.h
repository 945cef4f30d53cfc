#pragma once

#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVProtocol.h"

namespace droxa::bench {

// The processes of a home that run already, reached through their sockets. Every call blocks; one that fails
// ends the benchmark with a message. Thread contract: one thread.
class RunningDrive {
 public:
  explicit RunningDrive(const std::string &home);

  FPDControlProtocol &host() { return *host_; }
  QVProtocol &keld() { return *keld_; }
  const std::string &home() const { return home_; }
  std::string database() const { return home_ + "/state/keld.sqlite"; }

  NSFileProviderItemFields itemAtPath(const std::string &path);
  NSFileProviderItemFields itemForIdentifier(const std::string &identifier);
  std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator(const std::string &identifier);
  // One page; returns the next page's token.
  NSData page(NSFileProviderRemoteEnumerator &enumerator, const NSData &page, std::size_t *items);
  std::string firstChild(const std::string &folderIdentifier);  // by name
  void emptyCall();                                             // the host's status
  void emptyKeldCall();                                         // the rank

 private:
  const std::string home_;
  std::shared_ptr<NSXPCConnection> hostConnection_;
  std::shared_ptr<NSXPCConnection> keldConnection_;
  std::shared_ptr<FPDControlProtocol> host_;
  std::shared_ptr<QVProtocol> keld_;
};

[[noreturn]] void fail(const std::string &what);

}  // namespace droxa::bench
