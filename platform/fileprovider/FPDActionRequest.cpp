#include "platform/fileprovider/FPDActionRequest.h"

#include <array>
#include <cerrno>

namespace droxa {
namespace {

using Kind = FPDActionRequest::Kind;

struct Needs {
  const char *action;
  bool identifier, parentIdentifier, name, url;
};

// In the order of the kinds.
constexpr std::array<Needs, 10> kNeeds{{
    {"import", false, true, false, true},
    {"create folder", false, true, true, false},
    {"rename", true, false, true, false},
    {"move", true, true, false, false},
    {"trash", true, false, false, false},
    {"restore", true, false, false, false},
    {"delete", true, false, false, false},
    {"set last-used date", true, false, false, false},
    {"set tags", true, false, false, false},
    {"set favourite rank", true, false, false, false},
}};

const Needs *NeedsOf(Kind kind) {
  const auto index = static_cast<std::size_t>(kind);
  return index < kNeeds.size() ? &kNeeds[index] : nullptr;
}

NSError Missing(const Needs &needs, const char *what) {
  return NSError::errorWithPOSIXCode(EINVAL, std::string(needs.action) + ": the request names no " + what);
}

}  // namespace

std::string FPDActionName(Kind kind) {
  const Needs *needs = NeedsOf(kind);
  return needs ? needs->action : "unknown action " + std::to_string(static_cast<unsigned>(kind));
}

NSError FPDActionRequestError(const FPDActionRequest &request) {
  const Needs *needs = NeedsOf(request.kind);
  if (!needs) return NSError::errorWithPOSIXCode(EINVAL, FPDActionName(request.kind));
  if (needs->identifier && request.identifier.empty()) return Missing(*needs, "item");
  if (needs->parentIdentifier && !request.parentIdentifier) return Missing(*needs, "folder");
  if (needs->name && !request.name) return Missing(*needs, "name");
  if (needs->url && !request.url) return Missing(*needs, "file");
  if (needs->url && !request.url.isFileURL()) {
    return NSError::errorWithPOSIXCode(EINVAL, "import: not a file: " + request.url.description());
  }
  if (request.name && request.name->find('\0') != std::string::npos) {
    return NSError(NSCocoaErrorDomain, NSFileWriteInvalidFileNameError,
                   NSUserInfo{{NSLocalizedDescriptionKey, "a name can't have a NUL byte in it"},
                              {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(EINVAL)}});
  }
  return {};
}

}  // namespace droxa
