#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/ThreadSafety.h"
#include "platform/usermanagement/UMUserManager.h"

namespace droxa {

// A persona as one thread has it; nullopt is the personal one.
using PersonaChoice = std::optional<std::string>;

// The configuration, and which persona each thread has chosen under it. A choice belongs to the configuration
// under which it was made: a new one puts every thread back to the process's persona.
// Thread contract: any thread; the choice that is read or set is the calling thread's. Never destroyed.
class PersonaRegistry {
 public:
  static PersonaRegistry &shared();

  void configure(UMConfiguration configuration) EXCLUDES(mutex_);
  UMConfiguration configuration() const EXCLUDES(mutex_);
  bool mayUseArbitraryPersonas() const EXCLUDES(mutex_);

  std::shared_ptr<UMPersona> current() const EXCLUDES(mutex_);
  NSError switchTo(const PersonaChoice &choice) EXCLUDES(mutex_);
  std::shared_ptr<UMPersonaContext> save(NSError *error) const EXCLUDES(mutex_);
  NSError restore(const UMPersonaContext &context) EXCLUDES(mutex_);

 private:
  PersonaRegistry() = default;

  const PersonaChoice &choice() const REQUIRES(mutex_);  // of the calling thread
  void setChoice(PersonaChoice choice) const REQUIRES(mutex_);
  const UMPersonaDescription *find(const std::string &uniqueString) const REQUIRES(mutex_);

  mutable Mutex mutex_;
  UMConfiguration configuration_ GUARDED_BY(mutex_);
  std::uint64_t generation_ GUARDED_BY(mutex_) = 1;  // goes up with each configuration
};

}  // namespace droxa
