#pragma once

#include <compare>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace droxa {

// The identifier of a synced document, folder or alias: "d" and a number for a document, "i" and a number for
// a folder or an alias. The number is never 0 and never used again. Thread contract: a value.
class QVFileObjectID {
 public:
  static QVFileObjectID documentID(std::uint64_t number) { return QVFileObjectID('d', number); }
  static QVFileObjectID folderOrAliasID(std::uint64_t number) { return QVFileObjectID('i', number); }
  // nullopt unless `string` is exactly what asString() gives for some identifier (no sign, space, leading
  // zero).
  static std::optional<QVFileObjectID> fileObjectIDWithString(std::string_view string);

  std::string asString() const;
  std::string description() const { return asString(); }
  bool isFolderOrAliasID() const { return kind_ == 'i'; }
  bool isDocumentID() const { return kind_ == 'd'; }
  std::uint64_t number() const { return number_; }

  auto operator<=>(const QVFileObjectID &) const = default;

 private:
  QVFileObjectID(char kind, std::uint64_t number) : kind_(kind), number_(number) {}
  char kind_;
  std::uint64_t number_;
};

}  // namespace droxa

template <>
struct std::hash<droxa::QVFileObjectID> {
  std::size_t operator()(const droxa::QVFileObjectID &identifier) const noexcept {
    return std::hash<std::uint64_t>()(identifier.number() * 2 + (identifier.isDocumentID() ? 1 : 0));
  }
};
