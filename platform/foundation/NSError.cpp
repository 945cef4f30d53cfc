#include "platform/foundation/NSError.h"

#include <cstring>

namespace droxa {

struct NSError::Payload {
  std::string domain;
  std::int64_t code;
  NSUserInfo userInfo;
};

namespace {

const std::string &emptyText() {
  static const auto *text = new std::string;
  return *text;
}

const NSUserInfo &emptyUserInfo() {
  static const auto *info = new NSUserInfo;
  return *info;
}

struct ValueDescription {
  std::string operator()(const std::string &text) const { return text; }
  std::string operator()(std::int64_t number) const { return std::to_string(number); }
  std::string operator()(const NSError &error) const { return error.description(); }
  std::string operator()(const NSURL &url) const { return url.description(); }
  std::string operator()(const std::shared_ptr<const NSObject> &object) const {
    return object ? object->description() : "(null)";
  }
};

}  // namespace

NSError::NSError(std::string domain, std::int64_t code) : NSError(std::move(domain), code, NSUserInfo()) {}

NSError::NSError(std::string domain, std::int64_t code, NSUserInfo userInfo)
    : payload_(std::make_shared<const Payload>(Payload{std::move(domain), code, std::move(userInfo)})) {}

NSError NSError::errorWithPOSIXCode(int code, std::string description) {
  NSUserInfo userInfo;
  if (!description.empty()) userInfo[NSLocalizedDescriptionKey] = std::move(description);
  return {NSPOSIXErrorDomain, code, std::move(userInfo)};
}

const std::string &NSError::domain() const {
  return payload_ ? payload_->domain : emptyText();
}

std::int64_t NSError::code() const {
  return payload_ ? payload_->code : 0;
}

const NSUserInfo &NSError::userInfo() const {
  return payload_ ? payload_->userInfo : emptyUserInfo();
}

NSError NSError::underlyingError() const {
  const auto found = userInfo().find(NSUnderlyingErrorKey);
  if (found == userInfo().end()) return {};
  const auto *error = std::get_if<NSError>(&found->second);
  return error ? *error : NSError();
}

std::string NSError::localizedDescription() const {
  if (!payload_) return {};
  const auto found = userInfo().find(NSLocalizedDescriptionKey);
  if (found != userInfo().end()) {
    if (const auto *text = std::get_if<std::string>(&found->second)) return *text;
  }
  if (domain() == NSPOSIXErrorDomain) {
    char buffer[128];
    return strerror_r(static_cast<int>(code()), buffer, sizeof buffer);
  }
  return "The operation couldn't be completed (" + domain() + " error " + std::to_string(code()) + ").";
}

bool NSError::is(const char *otherDomain, std::int64_t otherCode) const {
  return payload_ && code() == otherCode && domain() == otherDomain;
}

bool NSError::operator==(const NSError &other) const {
  if (payload_ == other.payload_) return true;
  if (!payload_ || !other.payload_) return false;
  return code() == other.code() && domain() == other.domain() && userInfo() == other.userInfo();
}

std::string NSError::description() const {
  if (!payload_) return "(null)";
  std::string text =
      "Error Domain=" + domain() + " Code=" + std::to_string(code()) + " \"" + localizedDescription() + "\"";
  if (userInfo().empty()) return text;
  text += " UserInfo={";
  const char *separator = "";
  for (const auto &entry : userInfo()) {
    text += separator + entry.first + "=" + std::visit(ValueDescription(), entry.second);
    separator = ", ";
  }
  return text + "}";
}

}  // namespace droxa
