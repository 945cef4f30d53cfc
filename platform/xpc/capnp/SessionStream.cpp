#include "platform/xpc/capnp/SessionStream.h"

#include <kj/debug.h>
#include <utility>

namespace droxa {

SessionStream::SessionStream(kj::Own<kj::AsyncCapabilityStream> inner, std::size_t maximumDescriptors,
                             kj::Function<void(const std::string &why)> gaveUp)
    : inner_(kj::mv(inner)), maximumDescriptors_(maximumDescriptors), gaveUp_(kj::mv(gaveUp)) {}

kj::Promise<std::size_t> SessionStream::tryRead(void *buffer, std::size_t minBytes, std::size_t maxBytes) {
  return tryReadWithFds(buffer, minBytes, maxBytes, nullptr, 0).then([](ReadResult result) {
    return result.byteCount;
  });
}

kj::Promise<kj::AsyncCapabilityStream::ReadResult> SessionStream::tryReadWithFds(
    void *buffer, std::size_t minBytes, std::size_t maxBytes, kj::AutoCloseFd *fdBuffer, std::size_t maxFds) {
  return inner_->tryReadWithFds(buffer, minBytes, maxBytes, fdBuffer, maxFds)
      .then([this, minBytes](ReadResult result) { return noted(result, minBytes); },
            [this](kj::Exception &&problem) -> ReadResult {
              ended_ = true;
              kj::throwFatalException(kj::mv(problem));
            });
}

kj::AsyncCapabilityStream::ReadResult SessionStream::noted(ReadResult result, std::size_t minBytes) {
  if (result.byteCount < minBytes) ended_ = true;
  descriptors_ += result.capCount;
  if (descriptors_ > maximumDescriptors_) {
    why_ = "it sent more than " + std::to_string(maximumDescriptors_) + " descriptors";
    KJ_FAIL_REQUIRE("too many descriptors");
  }
  return result;
}

kj::Promise<void> SessionStream::noted(kj::Promise<void> writing) {
  return writing.catch_([this](kj::Exception &&problem) {
    ended_ = true;
    kj::throwFatalException(kj::mv(problem));
  });
}

// Once this side has ended the connection, the library's answers to the calls that it never gave are nobody's
// business: the peer is to see an end, not an answer.
kj::Promise<void> SessionStream::write(const void *buffer, std::size_t size) {
  if (isClosing_) return kj::READY_NOW;
  return noted(inner_->write(buffer, size));
}

kj::Promise<void> SessionStream::write(kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>> pieces) {
  if (isClosing_) return kj::READY_NOW;
  return noted(inner_->write(pieces));
}

kj::Promise<void> SessionStream::writeWithFds(kj::ArrayPtr<const kj::byte> data,
                                              kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>> moreData,
                                              kj::ArrayPtr<const int> fds) {
  if (isClosing_) return kj::READY_NOW;
  return noted(inner_->writeWithFds(data, moreData, fds));
}

// Streams are passed as descriptors, never as streams.
kj::Promise<kj::AsyncCapabilityStream::ReadResult> SessionStream::tryReadWithStreams(
    void *, std::size_t, std::size_t, kj::Own<kj::AsyncCapabilityStream> *, std::size_t) {
  KJ_UNIMPLEMENTED("streams don't cross this connection");
}

kj::Promise<void> SessionStream::writeWithStreams(kj::ArrayPtr<const kj::byte>,
                                                  kj::ArrayPtr<const kj::ArrayPtr<const kj::byte>>,
                                                  kj::Array<kj::Own<kj::AsyncCapabilityStream>>) {
  KJ_UNIMPLEMENTED("streams don't cross this connection");
}

kj::Promise<void> SessionStream::whenWriteDisconnected() {
  return inner_->whenWriteDisconnected();
}

void SessionStream::shutdownWrite() {
  if (!std::exchange(ended_, true)) gaveUp_(why_);
  inner_->shutdownWrite();
}

void SessionStream::abortRead() {
  inner_->abortRead();
}

void SessionStream::getsockopt(int level, int option, void *value, uint *length) {
  inner_->getsockopt(level, option, value, length);
}

}  // namespace droxa
