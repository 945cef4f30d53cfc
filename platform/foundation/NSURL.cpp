#include "platform/foundation/NSURL.h"

#include <algorithm>
#include <vector>

#include "platform/foundation/PercentEncoding.h"

namespace droxa {

struct NSURL::Payload {
  std::string scheme;  // in lower case; "file" for a file URL
  std::string path;  // of a file URL its normalised path; else all that follows "scheme:", as it was written
  std::string text;  // of a URL that isn't a file URL: as it was written
  bool isPhysical = false;
};

namespace {

constexpr std::string_view kFileScheme = "file";

// "/a/b" for any way of writing it; "/" is left of a path that climbs above the root.
std::string normalisedPath(std::string_view path) {
  std::vector<std::string_view> components;
  for (std::size_t start = 0; start < path.size();) {
    const std::size_t end = std::min(path.find('/', start), path.size());
    const std::string_view component = path.substr(start, end - start);
    start = end + 1;
    if (component.empty() || component == ".") continue;
    if (component != "..") {
      components.push_back(component);
    } else if (!components.empty()) {
      components.pop_back();
    }
  }
  std::string text;
  for (const std::string_view component : components) {
    text += '/';
    text += component;
  }
  return text.empty() ? "/" : text;
}

bool isLetter(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}

// The scheme in lower case; "" when the text doesn't start with one.
std::string schemeOf(std::string_view text) {
  const std::size_t colon = text.find(':');
  if (colon == std::string_view::npos || colon == 0 || !isLetter(text[0])) return {};
  std::string scheme;
  for (const char c : text.substr(0, colon)) {
    const bool isAllowed = isLetter(c) || (c >= '0' && c <= '9') || c == '+' || c == '-' || c == '.';
    if (!isAllowed) return {};
    scheme += (c >= 'A' && c <= 'Z') ? static_cast<char>(c - 'A' + 'a') : c;
  }
  return scheme;
}

// What follows "file:": an absolute path, alone or after an empty or local authority, without query or
// fragment.
NSURL fileURLWithReference(std::string_view reference) {
  if (reference.starts_with("//")) {
    const std::size_t slash = reference.find('/', 2);
    if (slash == std::string_view::npos) return {};
    const std::string_view host = reference.substr(2, slash - 2);
    if (!host.empty() && host != "localhost") return {};
    reference.remove_prefix(slash);
  }
  if (!reference.starts_with('/') || reference.find_first_of("?#") != std::string_view::npos) return {};
  const auto path = PercentDecoded(reference);
  return path ? NSURL::fileURLWithPath(*path) : NSURL();
}

}  // namespace

NSURL::NSURL(std::shared_ptr<const Payload> payload) : payload_(std::move(payload)) {}

NSURL NSURL::fileURLWithPath(std::string_view path) {
  if (path.empty() || path.find('\0') != std::string_view::npos) return {};
  return NSURL(
      std::make_shared<const Payload>(Payload{std::string(kFileScheme), normalisedPath(path), {}, false}));
}

NSURL NSURL::URLWithString(std::string_view text) {
  const std::string scheme = schemeOf(text);
  if (scheme.empty() || text.find('\0') != std::string_view::npos) return {};
  const std::string_view reference = text.substr(scheme.size() + 1);
  if (scheme == kFileScheme) return fileURLWithReference(reference);
  return NSURL(
      std::make_shared<const Payload>(Payload{scheme, std::string(reference), std::string(text), false}));
}

bool NSURL::isFileURL() const {
  return payload_ && payload_->scheme == kFileScheme;
}

const std::string &NSURL::path() const {
  static const auto *none = new std::string;
  return payload_ ? payload_->path : *none;
}

std::string NSURL::absoluteString() const {
  if (!payload_) return {};
  return isFileURL() ? "file://" + PercentEncodedPath(payload_->path) : payload_->text;
}

std::string NSURL::lastPathComponent() const {
  if (!payload_) return {};
  if (payload_->path == "/") return "/";
  return payload_->path.substr(payload_->path.rfind('/') + 1);
}

NSURL NSURL::URLByAppendingPathComponent(std::string_view component) const {
  if (!payload_) return {};
  if (isFileURL()) return fileURLWithPath(payload_->path + "/" + std::string(component));
  return URLWithString(payload_->text + "/" + PercentEncodedPath(component));
}

NSURL NSURL::URLByDeletingLastPathComponent() const {
  if (!payload_) return {};
  if (isFileURL()) return fileURLWithPath(payload_->path + "/..");
  const std::size_t slash = payload_->text.rfind('/');
  return slash == std::string::npos ? *this : URLWithString(payload_->text.substr(0, slash));
}

bool NSURL::isEqualToOrBelow(const NSURL &folder) const {
  if (!payload_ || !folder.payload_ || payload_->scheme != folder.payload_->scheme) return false;
  const std::string &base = folder.payload_->path;
  if (payload_->path == base) return true;
  return payload_->path.starts_with(base.ends_with('/') ? base : base + "/");
}

bool NSURL::hasPhysicalProperty() const {
  return payload_ && payload_->isPhysical;
}

NSURL NSURL::URLWithPhysicalProperty() const {
  if (!payload_ || payload_->isPhysical) return *this;
  auto copy = std::make_shared<Payload>(*payload_);
  copy->isPhysical = true;
  return NSURL(std::move(copy));
}

bool NSURL::operator==(const NSURL &other) const {
  if (payload_ == other.payload_) return true;
  if (!payload_ || !other.payload_) return false;
  return payload_->scheme == other.payload_->scheme && payload_->path == other.payload_->path;
}

std::string NSURL::description() const {
  return payload_ ? absoluteString() : "(null)";
}

}  // namespace droxa
