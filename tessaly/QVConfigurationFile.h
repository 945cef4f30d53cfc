#pragma once

#include <optional>
#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// A file of the configuration folder, whose text is a JSON object. For implementation files of this folder
// only. Thread contract: any thread.

// The text, which parses as a JSON object; nullopt without error when there is no such file, nullopt with
// `error` set when it can't be read (NSPOSIXErrorDomain beneath) or isn't a JSON object. Errors name the
// file.
std::optional<std::string> QVConfigurationFileRead(const std::string &path, NSError *error);
// Makes the file, or replaces it as a whole: after a crash there is the old contents or the new, never a
// mixture. Only its owner may read it. nil on success.
NSError QVConfigurationFileWrite(const std::string &path, const std::string &contents);
// Durable; nil also when there is no such file.
NSError QVConfigurationFileRemove(const std::string &path);

}  // namespace droxa
