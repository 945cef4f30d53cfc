#pragma once

#include <cstdint>
#include <string>

#include "keld/FolderReading.h"

// Single steps on files that the operations of ContentsStorage are made of. All of them answer 0 or an
// errno unless told otherwise. Thread contract: any thread.
namespace droxa::keld {

// Opens `name` in the folder, never through a link, without blocking on pipes or leases; an empty descriptor
// with errno set when it can't.
OwnedDescriptor OpenFileIn(int folder, const std::string &name, int flags, std::uint32_t mode = 0600);

// Makes the names in the folder durable. The folder may be open as a path alone.
int SyncFolder(int folder);

// Moves a file or folder to a name only if that is free (else EEXIST).
int RenameIfFree(int fromFolder, const std::string &from, int toFolder, const std::string &to);
// Swaps two names in one step.
int ExchangeNames(int folder, const std::string &name, int otherFolder, const std::string &otherName);

int SetModified(int descriptor, std::int64_t nanoseconds);

// Copies `size` bytes into an empty file, sharing the blocks where the file system can.
int CopyContents(int from, int to, std::uint64_t size);

// The user's own attributes (and access lists) follow a document into its new file. What can't be copied is
// left behind. Whether any was copied.
bool CopyForeignAttributes(int from, int to);
void RemoveAttributes(int descriptor);

// Gives back all of a file's blocks; its size stays. 0 or an errno.
int PunchOut(int file, std::uint64_t size);

// How much of an open file somebody has written.
enum class DataCoverage { none, some, all };
int ReadDataCoverage(int descriptor, std::uint64_t size, DataCoverage *coverage);
// Whether the first bytes of the file, up to `length` and at most a block, are all zero.
bool BeginsWithZeros(int descriptor, std::uint64_t length);

// Writes a small file of a new name and makes it durable (its contents; not yet its name).
int WriteSmallFile(int folder, const std::string &name, const std::string &bytes, std::uint32_t mode);
// Reads a file of at most `most` bytes; EFBIG when it is larger.
int ReadSmallFile(int folder, const std::string &name, std::size_t most, std::string *bytes);

}  // namespace droxa::keld
