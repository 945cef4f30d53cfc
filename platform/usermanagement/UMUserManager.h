#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/NSError.h"

namespace droxa {

// A saved persona of one thread, restored by the thread that saved it.
class UMPersonaContext;

// The persona under which a thread works, as it was when currentPersona() was asked.
// Thread contract: immutable; the two context operations act on the calling thread.
class UMPersona {
 public:
  virtual ~UMPersona() = default;
  virtual std::optional<std::string> userPersonaUniqueString() const = 0;
  virtual bool isDataSeparatedPersona() const = 0;
  // Saves the calling thread's persona. Null, with `error` set, when it can't be saved.
  virtual std::shared_ptr<UMPersonaContext> copyCurrentPersonaContextWithError(NSError *error) const = 0;
  // Makes `uniqueString` the calling thread's persona; nullopt is the default, personal one. nil on success,
  // else NSPOSIXErrorDomain: ENOENT for a persona that isn't known, EPERM when the process may not switch.
  virtual NSError generateAndRestorePersonaContextWithPersonaUniqueString(
      const std::optional<std::string> &uniqueString) const = 0;
};

// The process's view of personas. Each thread has a current persona of its own; a new thread starts with the
// process's. Without configuration there is one personal persona without a unique string, so nothing is ever
// switched.
// Thread contract: any thread.
class UMUserManager {
 public:
  static UMUserManager &sharedManager();
  virtual ~UMUserManager() = default;
  virtual std::shared_ptr<UMPersona> currentPersona() const = 0;
};

// Restores what copyCurrentPersonaContextWithError saved. Restoring null does nothing. NSPOSIXErrorDomain:
// EINVAL on another thread than the one that saved, ESTALE when the personas were configured anew since.
NSError UMRestorePersonaContext(const std::shared_ptr<UMPersonaContext> &context);

// Whether this process may switch to any persona it names.
bool voucher_process_can_use_arbitrary_personas();

struct UMPersonaDescription {
  std::string uniqueString;
  bool isDataSeparated = true;
};

// How personas are set up in this process. Read from the file "personas.json" in the configuration folder by
// UMLoadConfiguration; tests set it directly.
struct UMConfiguration {
  std::vector<UMPersonaDescription> personas;       // besides the personal one
  std::optional<std::string> processPersona;        // nullopt: the personal one
  std::optional<std::string> personalUniqueString;  // of the personal persona, usually none
  bool mayUseArbitraryPersonas = true;
  // Failure injection for tests: errors that the operations answer with while set.
  NSError failSaving;
  NSError failSwitching;
};
// Puts every thread back to the process's persona. A process persona that isn't listed counts as
// data-separated.
void UMSetConfiguration(UMConfiguration configuration);
UMConfiguration UMGetConfiguration();
// nil when the file is read or missing; otherwise an error that names the file and what is wrong in it.
NSError UMLoadConfiguration(const std::string &configurationFolder);

}  // namespace droxa
