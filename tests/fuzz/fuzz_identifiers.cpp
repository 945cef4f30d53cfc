// Identifiers and URLs come from clients: whatever parses must print as what was parsed.

#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "platform/foundation/NSURL.h"
#include "tessaly/QVFileObjectID.h"

namespace {

using namespace droxa;

void require(bool condition) {
  if (!condition) std::abort();
}

void identifiersReadBack(std::string_view text) {
  const auto identifier = QVFileObjectID::fileObjectIDWithString(text);
  if (!identifier) return;
  require(identifier->asString() == text);
  require(identifier->isDocumentID() != identifier->isFolderOrAliasID());
  require(identifier->number() != 0);
}

void pathsAreNormalised(std::string_view text) {
  const NSURL url = NSURL::fileURLWithPath(text);
  if (!url) return;
  require(url.isFileURL());
  require(!url.path().empty() && url.path()[0] == '/');
  require(url.path().find('\0') == std::string::npos);
  require(NSURL::fileURLWithPath(url.path()) == url);
  require(NSURL::URLWithString(url.absoluteString()) == url);
  require(url.isEqualToOrBelow(url.URLByDeletingLastPathComponent()));
}

void parsedURLsReadBack(std::string_view text) {
  const NSURL url = NSURL::URLWithString(text);
  if (!url) return;
  require(NSURL::URLWithString(url.absoluteString()) == url);
  (void)url.lastPathComponent();
  (void)url.description();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t length) {
  const std::string_view text(reinterpret_cast<const char *>(bytes), length);
  identifiersReadBack(text);
  pathsAreNormalised(text);
  parsedURLsReadBack(text);
  return 0;
}
