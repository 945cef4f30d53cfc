#include "platform/xpc/capnp/Descriptors.h"

#include <fcntl.h>
#include <kj/debug.h>
#include <kj/io.h>

namespace droxa {
namespace {

class DescriptorServer final : public schema::Descriptor::Server {
 public:
  explicit DescriptorServer(kj::AutoCloseFd descriptor) : descriptor_(kj::mv(descriptor)) {}
  kj::Maybe<int> getFd() override { return descriptor_.get(); }

 private:
  const kj::AutoCloseFd descriptor_;
};

}  // namespace

schema::Descriptor::Client exportDescriptor(int descriptor) {
  const int duplicate = fcntl(descriptor, F_DUPFD_CLOEXEC, 0);
  if (duplicate < 0) KJ_FAIL_SYSCALL("dup", errno, "a descriptor can't be sent");
  return kj::heap<DescriptorServer>(kj::AutoCloseFd(duplicate));
}

// The object that brings a descriptor is the sender's own, never a promise of one, so it is here at once.
int receivedDescriptor(capnp::Capability::Client client) {
  auto hook = capnp::ClientHook::from(kj::mv(client));
  KJ_IF_MAYBE (descriptor, hook->getFd()) {
    return fcntl(*descriptor, F_DUPFD_CLOEXEC, 0);
  }
  return -1;
}

}  // namespace droxa
