#include <cerrno>
#include <gtest/gtest.h>

#include "platform/fileprovider/FPDActionRequest.h"

namespace droxa {
namespace {

using Kind = FPDActionRequest::Kind;

FPDActionRequest fullRequest(Kind kind) {
  FPDActionRequest request;
  request.kind = kind;
  request.identifier = "d1";
  request.parentIdentifier = "i2";
  request.name = "b";
  request.url = NSURL::fileURLWithPath("/a");
  return request;
}

std::string problemOf(const FPDActionRequest &request) {
  const NSError error = FPDActionRequestError(request);
  return error ? error.localizedDescription() : "";
}

TEST(FPDActionRequest, withEverythingIsFineOfEveryKind) {
  for (std::uint8_t kind = 0; kind < 10; ++kind)
    EXPECT_EQ(problemOf(fullRequest(static_cast<Kind>(kind))), "") << int{kind};
}

TEST(FPDActionRequest, needsWhatItsKindNeedsAndNothingElse) {
  const struct {
    Kind kind;
    const char *identifier, *parent, *name, *url;
  } needs[] = {
      {Kind::importDocument, "", "import: the request names no folder", "",
       "import: the request names no file"},
      {Kind::createDirectory, "", "create folder: the request names no folder",
       "create folder: the request names no name", ""},
      {Kind::rename, "rename: the request names no item", "", "rename: the request names no name", ""},
      {Kind::reparent, "move: the request names no item", "move: the request names no folder", "", ""},
      {Kind::trash, "trash: the request names no item", "", "", ""},
      {Kind::untrash, "restore: the request names no item", "", "", ""},
      {Kind::deleteItem, "delete: the request names no item", "", "", ""},
      {Kind::setLastUsedDate, "set last-used date: the request names no item", "", "", ""},
      {Kind::setTagData, "set tags: the request names no item", "", "", ""},
      {Kind::setFavoriteRank, "set favourite rank: the request names no item", "", "", ""},
  };
  for (const auto &need : needs) {
    FPDActionRequest request = fullRequest(need.kind);
    request.identifier = "";
    EXPECT_EQ(problemOf(request), need.identifier);
    request = fullRequest(need.kind);
    request.parentIdentifier.reset();
    EXPECT_EQ(problemOf(request), need.parent);
    request = fullRequest(need.kind);
    request.name.reset();
    EXPECT_EQ(problemOf(request), need.name);
    request = fullRequest(need.kind);
    request.url = NSURL();
    EXPECT_EQ(problemOf(request), need.url);
  }
}

TEST(FPDActionRequest, ofAnUnknownKindSaysWhich) {
  const NSError error = FPDActionRequestError(fullRequest(static_cast<Kind>(10)));
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EINVAL));
  EXPECT_EQ(error.localizedDescription(), "unknown action 10");
}

TEST(FPDActionRequest, aNameWithANULByteIsNoName) {
  for (const Kind kind : {Kind::rename, Kind::createDirectory, Kind::reparent}) {
    FPDActionRequest request = fullRequest(kind);
    request.name = std::string("a\0b", 3);
    EXPECT_TRUE(FPDActionRequestError(request).is(NSCocoaErrorDomain, NSFileWriteInvalidFileNameError));
  }
}

TEST(FPDActionRequest, onlyAFileCanBeImported) {
  FPDActionRequest request = fullRequest(Kind::importDocument);
  request.url = NSURL::URLWithString("https://example.com/a");
  EXPECT_EQ(problemOf(request), "import: not a file: https://example.com/a");
}

}  // namespace
}  // namespace droxa
