#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/usermanagement/UMUserManager.h"

namespace droxa {

// Makes a remembered persona the calling thread's for the length of a scope. The persona that was current is
// restored at the end of the scope, whether the adoption succeeded or not, as the last thing that happens in
// it.
//
// `persona` is as it was remembered: nil and QVDefaultPersonaID both stand for the default persona. A thread
// that already runs under the wanted persona is left as it is.
//
//   QVPersonaAdoption adoption(personaID);
//   if (adoption.adopted()) work();   // or, where the work must be done in any case: just work();
//
// A failed adoption is logged here; what else it means is its user's business.
// Thread contract: made, asked and destroyed on one thread, nested in order.
class QVPersonaAdoption {
 public:
  explicit QVPersonaAdoption(const std::optional<std::string> &persona);
  ~QVPersonaAdoption();
  QVPersonaAdoption(const QVPersonaAdoption &) = delete;
  QVPersonaAdoption &operator=(const QVPersonaAdoption &) = delete;

  bool adopted() const { return !error_; }
  // Why the persona wasn't adopted: NSPOSIXErrorDomain EINVAL when this process may not choose personas, else
  // the error of the switch; nil when it was.
  const NSError &error() const { return error_; }

 private:
  static NSError switchFrom(const UMPersona &current, const std::optional<std::string> &wanted,
                            const std::optional<std::string> &remembered,
                            std::shared_ptr<UMPersonaContext> *saved);

  std::shared_ptr<UMPersonaContext> saved_;  // null: nothing to restore
  NSError error_;
};

// Runs `work` under `persona`. False, with `work` not run, when the persona can't be adopted.
bool QVAdoptPersona(const std::optional<std::string> &persona, const std::function<void()> &work);

}  // namespace droxa
