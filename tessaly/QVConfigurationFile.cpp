#include "tessaly/QVConfigurationFile.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <nlohmann/json.hpp>
#include <sys/stat.h>
#include <unistd.h>

#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

NSError fileError(const std::string &path, const std::string &what, int code) {
  const NSError beneath = NSError::errorWithPOSIXCode(code);
  return NSError(
      QVTessalyErrorDomain, QVErrorUnreadable,
      {{NSLocalizedDescriptionKey, path + " can't be " + what + ": " + beneath.localizedDescription()},
       {NSUnderlyingErrorKey, beneath}});
}

NSError notAnObject(const std::string &path) {
  return qvc_error(QVErrorInvalidArgument, path + ": isn't a JSON object");
}

// Reads to the end; false with errno set.
bool readAll(int descriptor, std::string *contents) {
  char buffer[4096];
  for (;;) {
    const ssize_t count = read(descriptor, buffer, sizeof buffer);
    if (count == 0) return true;
    if (count < 0 && errno != EINTR) return false;
    if (count > 0) contents->append(buffer, static_cast<std::size_t>(count));
  }
}

bool writeAll(int descriptor, const std::string &contents) {
  std::size_t written = 0;
  while (written < contents.size()) {
    const ssize_t count = write(descriptor, contents.data() + written, contents.size() - written);
    if (count < 0 && errno != EINTR) return false;
    if (count > 0) written += static_cast<std::size_t>(count);
  }
  return true;
}

// Makes a rename or a removal in the folder of `path` durable.
bool syncFolderOf(const std::string &path) {
  const std::string folder = path.substr(0, path.rfind('/') + 1);
  const int descriptor = open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (descriptor < 0) return false;
  const bool synced = fsync(descriptor) == 0;
  close(descriptor);
  return synced;
}

NSError writeThrough(const std::string &path, const std::string &temporary, const std::string &contents) {
  const int descriptor = open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
  if (descriptor < 0) return fileError(path, "written", errno);
  const bool written = writeAll(descriptor, contents) && fsync(descriptor) == 0;
  const int problem = errno;
  close(descriptor);
  if (!written) return fileError(path, "written", problem);
  if (std::rename(temporary.c_str(), path.c_str()) != 0) return fileError(path, "replaced", errno);
  if (!syncFolderOf(path)) return fileError(path, "made durable", errno);
  return NSError();
}

}  // namespace

std::optional<std::string> QVConfigurationFileRead(const std::string &path, NSError *error) {
  const auto fail = [error](NSError problem) {
    if (error) *error = std::move(problem);
    return std::nullopt;
  };
  const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (descriptor < 0 && errno == ENOENT) return std::nullopt;
  if (descriptor < 0) return fail(fileError(path, "read", errno));
  std::string contents;
  const bool read = readAll(descriptor, &contents);
  const int problem = errno;
  close(descriptor);
  if (!read) return fail(fileError(path, "read", problem));
  if (!nlohmann::json::parse(contents, nullptr, false).is_object()) return fail(notAnObject(path));
  return contents;
}

NSError QVConfigurationFileWrite(const std::string &path, const std::string &contents) {
  const std::string temporary = path + ".new";
  NSError error = writeThrough(path, temporary, contents);
  if (error) unlink(temporary.c_str());
  return error;
}

NSError QVConfigurationFileRemove(const std::string &path) {
  if (unlink(path.c_str()) != 0) return errno == ENOENT ? NSError() : fileError(path, "removed", errno);
  return syncFolderOf(path) ? NSError() : fileError(path, "removed durably", errno);
}

}  // namespace droxa
