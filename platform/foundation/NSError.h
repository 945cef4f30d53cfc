#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <variant>

#include "platform/foundation/NSObject.h"
#include "platform/foundation/NSURL.h"

namespace droxa {

inline constexpr char NSCocoaErrorDomain[] = "NSCocoaErrorDomain";
inline constexpr char NSPOSIXErrorDomain[] = "NSPOSIXErrorDomain";
inline constexpr char NSUnderlyingErrorKey[] = "NSUnderlyingError";
inline constexpr char NSLocalizedDescriptionKey[] = "NSLocalizedDescription";

inline constexpr std::int64_t NSFileNoSuchFileError = 4;
inline constexpr std::int64_t NSFileReadNoSuchFileError = 260;
inline constexpr std::int64_t NSFileWriteUnknownError = 512;
inline constexpr std::int64_t NSFileWriteNoPermissionError = 513;
inline constexpr std::int64_t NSFileWriteInvalidFileNameError = 514;
inline constexpr std::int64_t NSFileWriteFileExistsError = 516;
inline constexpr std::int64_t NSFileWriteOutOfSpaceError = 640;
inline constexpr std::int64_t NSFileWriteVolumeReadOnlyError = 642;
inline constexpr std::int64_t NSUserCancelledError = 3072;
// Transport errors, all in NSCocoaErrorDomain.
inline constexpr std::int64_t NSXPCConnectionInterrupted = 4097;  // the peer went away in the middle
inline constexpr std::int64_t NSXPCConnectionInvalid = 4099;      // the connection can't be used (any more)
inline constexpr std::int64_t NSXPCConnectionReplyInvalid =
    4101;  // the reply made no sense, or the deadline passed

class NSError;
struct NSUserInfo;

// An error as a value behind a cheap handle; a default-constructed handle is nil ("no error").
// Equality is of domain, code and user info; isSameObject() tells whether two handles are one object.
// Thread contract: a value; handles to the same error may be used on any threads.
class NSError {
 public:
  NSError() = default;  // nil
  NSError(std::string domain, std::int64_t code);
  NSError(std::string domain, std::int64_t code, NSUserInfo userInfo);
  static NSError errorWithPOSIXCode(int code, std::string description = {});

  explicit operator bool() const { return payload_ != nullptr; }
  const std::string &domain() const;         // "" for nil
  std::int64_t code() const;                 // 0 for nil
  const NSUserInfo &userInfo() const;        // empty for nil
  NSError underlyingError() const;           // user info's NSUnderlyingErrorKey, or nil
  std::string localizedDescription() const;  // user info's text, or one made from domain and code

  bool is(const char *domain, std::int64_t code) const;
  bool isSameObject(const NSError &other) const { return payload_ == other.payload_; }
  bool operator==(const NSError &other) const;

  // `Error Domain=NSPOSIXErrorDomain Code=22 "…" UserInfo={…}`; "(null)" for nil.
  std::string description() const;

 private:
  struct Payload;
  std::shared_ptr<const Payload> payload_;
};

// What an error may carry along.
using NSUserInfoValue =
    std::variant<std::string, std::int64_t, NSError, NSURL, std::shared_ptr<const NSObject>>;

struct NSUserInfo : std::map<std::string, NSUserInfoValue> {
  using std::map<std::string, NSUserInfoValue>::map;
};

}  // namespace droxa
