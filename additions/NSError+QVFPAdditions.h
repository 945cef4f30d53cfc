#pragma once

#include <string>

#include "platform/foundation/NSError.h"

// Translation of daemon and Foundation errors into errors that the framework understands. A nil receiver
// answers false or nil. Any thread; nothing blocks.

namespace droxa {

// The NSFileProviderErrorDomain code that stands for `error`. False, with `code` left alone, for a domain or
// a code that has no translation.
bool _qv_getFileProviderDomainErrorCode(const NSError &error,
                                        long *code);  // NOLINT(bugprone-reserved-identifier)

// The file-provider error that stands for `error`, with `error` as its underlying error; the very same error
// when it has no translation.
NSError qv_fileProviderError(const NSError &error);

// An error of NSPOSIXErrorDomain that describes itself so.
NSError qv_errorWithPOSIXCode(int code, const std::string &description);

}  // namespace droxa
