#include <gtest/gtest.h>

#include "fileproviderd/RelayedThumbnails.h"
#include "platform/fileprovider/FPDThumbnailStream.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "tests/fileproviderd/ScriptedExtension.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa::testing {
namespace {

using Thumbnails = std::vector<FPDThumbnail>;
using Next = Once<Thumbnails, bool, NSError>;

// Those of an extension, which come when the test says.
class ScriptedThumbnails final : public FPDThumbnails {
 public:
  void nextWithReply(FPDThumbnailsReply reply) override { stream.next(std::move(reply)); }
  void getProgress(FPDProgressCompletion completion) override { completion(0, -1); }
  void cancel() override { stream.abandon(NSError(NSCocoaErrorDomain, NSUserCancelledError)); }
  void tell(const std::string &identifier, const NSError &error = {}) {
    stream.add(
        {identifier, error ? NSData() : NSData::dataWithString("of " + identifier), std::nullopt, error});
  }
  FPDThumbnailStream stream;
};

class RelayedThumbnailsTest : public ::testing::Test {
 protected:
  RelayedThumbnailsTest() { extension->thumbnails = scripted; }

  std::shared_ptr<FPDThumbnails> open(const std::vector<std::string> &identifiers) const {
    const Once<std::shared_ptr<FPDThumbnails>, NSError> opened("opened");
    RelayedThumbnails::open(calls, identifiers, {64, 64}, opened.completion());
    return opened.value<0>();
  }
  // All that comes until the last ones; the outcome.
  static NSError takeAll(const std::shared_ptr<FPDThumbnails> &from, Thumbnails *all) {
    for (;;) {
      const Next next("next");
      from->nextWithReply(next.completion());
      for (const FPDThumbnail &thumbnail : next.value<0>()) all->push_back(thumbnail);
      if (next.value<1>()) return next.value<2>();
    }
  }

  const std::shared_ptr<ScriptedThumbnails> scripted = std::make_shared<ScriptedThumbnails>();
  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  const std::shared_ptr<ExtensionCalls> calls = std::make_shared<ExtensionCalls>(connecting);
};

TEST_F(RelayedThumbnailsTest, theExtensionIsAskedForEachItemOnce) {
  const auto relayed = open({"d1", "d2", "d1"});
  ASSERT_TRUE(relayed);
  EXPECT_EQ(extension->asked.take(), "thumbnails of d1 d2, 64 x 64");
}

TEST_F(RelayedThumbnailsTest, whatIsToldTwiceOrUnaskedIsDropped) {
  const auto relayed = open({"d1", "d2"});
  for (const char *identifier : {"d1", "d1", "d7", "d2"}) scripted->tell(identifier);
  scripted->stream.end({});
  Thumbnails all;
  EXPECT_EQ(takeAll(relayed, &all), NSError());
  ASSERT_EQ(all.size(), 2U);
  EXPECT_EQ(all[0].identifier, "d1");
  EXPECT_EQ(all[0].imageData, NSData::dataWithString("of d1"));
  EXPECT_EQ(all[1].identifier, "d2");
}

TEST_F(RelayedThumbnailsTest, whatIsLeftOutIsAnsweredWithTheErrorOfTheWhole) {
  const auto relayed = open({"d1", "d2", "d3"});
  scripted->tell("d2");
  const NSError failed(NSPOSIXErrorDomain, EIO);
  scripted->stream.end(failed);
  Thumbnails all;
  EXPECT_EQ(takeAll(relayed, &all), failed);
  ASSERT_EQ(all.size(), 3U);
  EXPECT_EQ(all[1].identifier, "d1");
  EXPECT_EQ(all[1].error, failed);
  EXPECT_EQ(all[2].identifier, "d3");
  EXPECT_EQ(all[2].error, failed);
}

TEST_F(RelayedThumbnailsTest, whatIsLeftOutWithoutAnErrorHasOneAllTheSame) {
  const auto relayed = open({"d1"});
  scripted->stream.end({});
  Thumbnails all;
  EXPECT_EQ(takeAll(relayed, &all), NSError());
  ASSERT_EQ(all.size(), 1U);
  EXPECT_TRUE(all[0].error);
}

TEST_F(RelayedThumbnailsTest, askingAgainAfterTheEndTellsTheOutcome) {
  const auto relayed = open({"d1"});
  const NSError failed(NSPOSIXErrorDomain, EIO);
  scripted->stream.end(failed);
  Thumbnails all;
  takeAll(relayed, &all);
  EXPECT_EQ(takeAll(relayed, &all), failed);
  EXPECT_EQ(all.size(), 1U);
}

TEST_F(RelayedThumbnailsTest, tooManyAreRefused) {
  const Once<std::shared_ptr<FPDThumbnails>, NSError> opened("opened");
  RelayedThumbnails::open(calls, std::vector<std::string>(FPDMostThumbnailsAtOnce + 1, "d1"), {64, 64},
                          opened.completion());
  EXPECT_FALSE(opened.value<0>());
  EXPECT_TRUE(opened.value<1>().is(NSPOSIXErrorDomain, E2BIG));
}

TEST_F(RelayedThumbnailsTest, cancellingEndsIt) {
  const auto relayed = open({"d1"});
  const Next next("next");
  relayed->nextWithReply(next.completion());
  relayed->cancel();
  EXPECT_TRUE(next.value<1>());
  EXPECT_TRUE(next.value<2>().is(NSCocoaErrorDomain, NSUserCancelledError));
  EXPECT_EQ(next.value<0>().size(), 1U);
}

TEST_F(RelayedThumbnailsTest, lettingGoOfItCancelsTheExtensions) {
  open({"d1"});
  EXPECT_TRUE(scripted->stream.hasEnded());
}

TEST_F(RelayedThumbnailsTest, anExtensionThatCannotBeReachedIsAnError) {
  extension->thumbnails = nullptr;
  extension->failure = NSError(NSPOSIXErrorDomain, EIO);
  const Once<std::shared_ptr<FPDThumbnails>, NSError> opened("opened");
  RelayedThumbnails::open(calls, {"d1"}, {64, 64}, opened.completion());
  EXPECT_FALSE(opened.value<0>());
  EXPECT_EQ(opened.value<1>(), extension->failure);
}

// An extension at the other end of a connection.
class ConnectedExtension final : public ExtensionConnecting {
 public:
  explicit ConnectedExtension(std::shared_ptr<NSXPCConnection> connection)
      : connection_(std::move(connection)) {}
  std::shared_ptr<NSFileProviderExtensionProtocol> extension(NSXPCErrorHandler handler, NSError *) override {
    return connection_->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
        std::move(handler));
  }
  void noteAnswer() override {}
  std::string describeEnd() override { return "as the test wants it"; }

 private:
  const std::shared_ptr<NSXPCConnection> connection_;
};

// Over a connection, as the extension's come.
class RelayedThumbnailsOverConnection : public RelayedThumbnailsTest {};

TEST_F(RelayedThumbnailsOverConnection, picturesCrossAndADeathInTheMiddleAnswersTheRest) {
  ConnectedPair pair;
  pair.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(), extension);
  const Once<std::shared_ptr<FPDThumbnails>, NSError> opened("opened");
  RelayedThumbnails::open(std::make_shared<ExtensionCalls>(std::make_shared<ConnectedExtension>(pair.client)),
                          {"d1", "d2", "d3"}, {64, 64}, opened.completion());
  const auto relayed = opened.value<0>();
  ASSERT_TRUE(relayed);
  const Next first("first"), second("second");
  relayed->nextWithReply(first.completion());
  scripted->stream.add({"d1", NSData::dataWithString(std::string(3 << 20, 'x')), "a type", {}});
  ASSERT_EQ(first.value<0>().size(), 1U);
  EXPECT_EQ(first.value<0>()[0].imageData.length(), std::size_t{3} << 20);
  EXPECT_EQ(first.value<0>()[0].contentType, "a type");
  relayed->nextWithReply(second.completion());
  pair.server->invalidate();
  ASSERT_EQ(second.value<0>().size(), 2U);
  EXPECT_TRUE(second.value<1>());
  EXPECT_TRUE(second.value<2>());
  for (const FPDThumbnail &thumbnail : second.value<0>()) EXPECT_EQ(thumbnail.error, second.value<2>());
}

}  // namespace
}  // namespace droxa::testing
