#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace droxa {

// A URL behind a cheap handle; a default-constructed handle is nil. A file URL holds its path as the raw
// bytes that the file system uses (any byte but NUL, valid UTF-8 or not); only absoluteString() encodes.
// Equality is of scheme and path: "/a/b" and "/a/b/" are the same file URL, and the physical property
// doesn't count.
// Thread contract: a value; handles to the same URL may be used on any threads.
class NSURL {
 public:
  NSURL() = default;  // nil

  // `path` is made absolute against "/" and normalised: repeated, trailing and "." components are dropped,
  // ".." is resolved by text. nil for an empty path or one with a NUL byte.
  static NSURL fileURLWithPath(std::string_view path);
  // Parses "file:///a%20b" (percent-decoded) or any other "scheme:…", whose text and path stay as written;
  // nil when it is neither, and for a file URL of another host, with a query or with a broken escape.
  static NSURL URLWithString(std::string_view text);

  explicit operator bool() const { return payload_ != nullptr; }
  bool isFileURL() const;
  const std::string &path() const;     // "" for nil
  std::string absoluteString() const;  // "file:///a%20b"; "" for nil
  std::string lastPathComponent() const;
  NSURL URLByAppendingPathComponent(std::string_view component) const;
  NSURL URLByDeletingLastPathComponent() const;
  // True when this URL is `folder` itself or lies below it, by path components.
  bool isEqualToOrBelow(const NSURL &folder) const;

  // The physical property: later file operations use the physical, not the logical, file. URLs made from this
  // one don't inherit it.
  bool hasPhysicalProperty() const;
  NSURL URLWithPhysicalProperty() const;

  bool operator==(const NSURL &other) const;

  std::string description() const;  // the absolute string; "(null)" for nil

 private:
  struct Payload;
  explicit NSURL(std::shared_ptr<const Payload> payload);
  std::shared_ptr<const Payload> payload_;
};

}  // namespace droxa
