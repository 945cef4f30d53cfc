#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <sys/types.h>

namespace droxa {

// Copies a folder's documents into another folder, sharing their blocks where the file system can. Nothing is
// ever written to the source. Symbolic links are copied as links; what is neither a file, a folder nor a link
// is left out. Documents that are there already are left alone, so that a copy that was cut off can be gone
// on with. Thread contract: one thread.
class DocumentCopy {
 public:
  struct Result {
    std::uint64_t documents = 0;
    std::uint64_t folders = 0;
    std::uint64_t leftOut = 0;  // couldn't be read, or is of no kind that a drive holds
  };
  // Told of each thing that is left out, with the reason.
  using Report = std::function<void(const std::string &path, const std::string &reason)>;

  // `except` is a folder that isn't copied, even if it lies below the source.
  DocumentCopy(const std::string &except, Report report);
  // False, with `problem`, when the copy can't go on (the target is full, or can't be written).
  bool copy(const std::string &source, const std::string &target, Result *result, std::string *problem);

 private:
  bool copyFolder(int source, int target, const std::string &path, std::string *problem);
  bool copyEntry(int source, int target, const char *name, const std::string &path, std::string *problem);
  bool copyDocument(int source, int target, const char *name, const std::string &path, std::string *problem);
  bool copyLink(int source, int target, const char *name, const std::string &path, std::string *problem);
  bool enterFolder(int source, int target, const char *name, const std::string &path, std::string *problem);
  void leaveOut(const std::string &path, int code);

  const Report report_;
  dev_t exceptDevice_ = 0;
  ino_t exceptInode_ = 0;  // 0: everything is copied
  Result result_;
};

}  // namespace droxa
