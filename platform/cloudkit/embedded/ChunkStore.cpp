#include "platform/cloudkit/embedded/ChunkStore.h"

#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/CKDigest.h"

namespace droxa::embedded {
namespace {

std::string folderName(unsigned number) {
  return {"0123456789abcdef"[(number >> 4) & 15], "0123456789abcdef"[number & 15]};
}

int makeFolder(const std::string &path) {
  return mkdir(path.c_str(), 0700) == 0 || errno == EEXIST ? 0 : errno;
}

// The names in a folder; none when it can't be read.
std::vector<std::string> namesIn(const std::string &folder) {
  std::vector<std::string> names;
  const std::unique_ptr<DIR, int (*)(DIR *)> open(opendir(folder.c_str()), &closedir);
  if (!open) return names;
  while (const dirent *entry = readdir(open.get())) {
    if (entry->d_name[0] != '.') names.emplace_back(entry->d_name);
  }
  return names;
}

// Reads to the end of the span; fewer bytes only where the file ends.
ssize_t readWhole(int file, std::span<std::uint8_t> into) {
  std::size_t done = 0;
  while (done < into.size()) {
    const ssize_t count = pread(file, into.data() + done, into.size() - done, static_cast<off_t>(done));
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return count;
    if (count == 0) break;
    done += static_cast<std::size_t>(count);
  }
  return static_cast<ssize_t>(done);
}

}  // namespace

ChunkStore::ChunkStore(const std::string &folder)
    : chunks_(folder + "/chunks"), unfinished_(folder + "/unfinished"), damaged_(folder + "/damaged") {}

int ChunkStore::create() const {
  for (const std::string &path : {chunks_, unfinished_, damaged_}) {
    if (const int code = makeFolder(path); code != 0) return code;
  }
  struct stat last {};  // is made last: where it is, all are
  if (stat((chunks_ + "/" + folderName(255)).c_str(), &last) == 0) return 0;
  for (unsigned i = 0; i < 256; ++i) {
    if (const int code = makeFolder(chunks_ + "/" + folderName(i)); code != 0) return code;
  }
  return 0;
}

std::string ChunkStore::folderOf(const std::string &digest) const {
  return chunks_ + "/" + digest.substr(0, 2);
}

std::string ChunkStore::path(const std::string &digest) const {
  return folderOf(digest) + "/" + digest;
}

bool ChunkStore::has(const std::string &digest, std::uint64_t size) const {
  struct stat status {};
  return stat(path(digest).c_str(), &status) == 0 && static_cast<std::uint64_t>(status.st_size) == size;
}

ChunkStore::Reading ChunkStore::read(const std::string &digest, std::uint64_t size,
                                     std::vector<std::uint8_t> &bytes, int *code) const {
  const int file = open(path(digest).c_str(), O_RDONLY | O_CLOEXEC);
  *code = file < 0 ? errno : 0;
  if (file < 0) return *code == ENOENT ? Reading::missing : Reading::damaged;
  bytes.resize(size + 1);  // one more, to notice a file that is too long
  const ssize_t count = readWhole(file, bytes);
  *code = count < 0 ? errno : 0;
  close(file);
  if (count < 0 || static_cast<std::uint64_t>(count) != size) return Reading::damaged;
  bytes.resize(size);
  CKDigest check;
  check.update(bytes);
  return check.hex() == digest ? Reading::intact : Reading::damaged;
}

void ChunkStore::setAside(const std::string &digest) const {
  rename(path(digest).c_str(), (damaged_ + "/" + digest).c_str());
}

std::vector<ChunkStore::Found> ChunkStore::unneededSince(std::int64_t time, unsigned folder) const {
  std::vector<Found> found;
  const std::string path = chunks_ + "/" + folderName(folder);
  for (const std::string &name : namesIn(path)) {
    struct stat status {};
    if (stat((path + "/" + name).c_str(), &status) == 0 && status.st_mtime <= time) {
      found.push_back({name, static_cast<std::uint64_t>(status.st_size)});
    }
  }
  return found;
}

bool ChunkStore::removeUnlessNeeded(const std::string &digest, std::int64_t time) const {
  struct stat status {};
  const std::string file = path(digest);
  return stat(file.c_str(), &status) == 0 && status.st_mtime <= time && unlink(file.c_str()) == 0;
}

void ChunkStore::removeUnfinished(std::int64_t time) const {
  for (const std::string &name : namesIn(unfinished_)) {
    struct stat status {};
    const std::string file = unfinished_ + "/" + name;
    if (stat(file.c_str(), &status) == 0 && status.st_mtime <= time) unlink(file.c_str());
  }
}

}  // namespace droxa::embedded
