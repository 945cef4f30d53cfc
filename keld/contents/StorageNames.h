#pragma once

#include <string>
#include <string_view>

// The names of files in the storage's folders. Thread contract: any thread.
namespace droxa::keld {

// In the folder of parts.
inline std::string UnfinishedPartName(const std::string &digest) {
  return digest + ".part";
}
inline std::string WholePartName(const std::string &digest) {
  return digest + ".whole";
}

// In the folder of temporaries a name begins with what its file was made as.
enum class TemporaryKind : char {
  placeholder = 'p',
  promise = 's',
  folder = 'f',
  contents = 'c',  // "c-<id>-<digest>"
  takenOut = 't',  // a document on its way out; nothing is at its name meanwhile
};

// Where the file belongs that is in the storage under the name before the suffix.
inline constexpr std::string_view kNoteSuffix = ".note";

inline bool IsNoteName(std::string_view name) {
  return name.size() > kNoteSuffix.size() && name.substr(name.size() - kNoteSuffix.size()) == kNoteSuffix;
}
inline std::string NoteNameFor(const std::string &temporary) {
  return temporary + std::string(kNoteSuffix);
}

}  // namespace droxa::keld
