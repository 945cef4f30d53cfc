#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace droxa::keld {

// A SHA-256 in the making. Thread contract: used by one thread at a time.
class ContentsDigest {
 public:
  ContentsDigest();
  ~ContentsDigest();
  ContentsDigest(const ContentsDigest &) = delete;
  ContentsDigest &operator=(const ContentsDigest &) = delete;

  void add(std::string_view bytes);
  std::string finish();  // 64 small hexadecimal digits; nothing may be added any more

  static std::string of(std::string_view bytes);

 private:
  struct Context;
  std::unique_ptr<Context> context_;
};

}  // namespace droxa::keld
