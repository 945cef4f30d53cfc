#pragma once

#include <kj/async-io.h>
#include <string>

namespace droxa {

// A connection's socket as the RPC library sees it: notices whether the peer closed it or whether the library
// gave up on what the peer sent, and how many descriptors came. Thread contract: the loop.
class SessionStream final : public kj::AsyncCapabilityStream {
 public:
  // `gaveUp` is called, at most once, when the library shuts the stream down although the peer is still
  // there.
  SessionStream(kj::Own<kj::AsyncCapabilityStream> inner, std::size_t maximumDescriptors,
                kj::Function<void(const std::string &why)> gaveUp);

  // This side has made a call: its reply may bring as many descriptors as a message can.
  void allowDescriptors(std::size_t count) { maximumDescriptors_ += count; }

  // What follows is this side's own doing: nothing more is written, and nobody is told.
  void closing() { ended_ = isClosing_ = true; }

  kj::Promise<std::size_t> tryRead(void *buffer, std::size_t minBytes, std::size_t maxBytes) override;
  kj::Promise<ReadResult> tryReadWithFds(void *buffer, std::size_t minBytes, std::size_t maxBytes,
                                         kj::AutoCloseFd *fdBuffer, std::size_t maxFds) override;
  kj::Promise<ReadResult> tryReadWithStreams(void *buffer, std::size_t minBytes, std::size_t maxBytes,
                                             kj::Own<kj::AsyncCapabilityStream> *streamBuffer,
                                             std::size_t maxStreams) override;
  kj::Promise<void> write(const void *buffer, std::size_t size) override;
  kj::Promise<void> write(kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>> pieces) override;
  kj::Promise<void> writeWithFds(kj::ArrayPtr<const kj::byte> data,
                                 kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>> moreData,
                                 kj::ArrayPtr<const int> fds) override;
  kj::Promise<void> writeWithStreams(kj::ArrayPtr<const kj::byte> data,
                                     kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>> moreData,
                                     kj::Array<kj::Own<kj::AsyncCapabilityStream>> streams) override;
  kj::Promise<void> whenWriteDisconnected() override;
  void shutdownWrite() override;
  void abortRead() override;
  void getsockopt(int level, int option, void *value, uint *length) override;

 private:
  ReadResult noted(ReadResult result, std::size_t minBytes);
  kj::Promise<void> noted(kj::Promise<void> writing);

  kj::Own<kj::AsyncCapabilityStream> inner_;
  std::size_t maximumDescriptors_;
  kj::Function<void(const std::string &)> gaveUp_;
  std::size_t descriptors_ = 0;
  bool ended_ = false;
  bool isClosing_ = false;
  std::string why_ = "it sent what makes no sense";
};

}  // namespace droxa
