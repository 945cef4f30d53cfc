#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace droxa {

// A file of groups with keys, as desktop entries and icon themes are written. What doesn't read so is left
// out; the first value of a key counts. Thread contract: immutable.
class KeyFile {
 public:
  // nullopt when there is no such file, or it can't be read.
  static std::optional<KeyFile> read(const std::string &path);
  explicit KeyFile(std::string_view text);

  // The value with its escapes resolved (\s, \n, \t, \r, \\); nullptr when there is none.
  const std::string *value(const std::string &group, const std::string &key) const;
  // "" and no number where there is none.
  std::string text(const std::string &group, const std::string &key) const;
  std::optional<int> number(const std::string &group, const std::string &key) const;
  bool isTrue(const std::string &group, const std::string &key) const;
  // The elements of a list, which `separator` parts; empty ones are left out.
  std::vector<std::string> list(const std::string &group, const std::string &key, char separator) const;

 private:
  std::map<std::string, std::map<std::string, std::string>> groups_;
};

}  // namespace droxa
