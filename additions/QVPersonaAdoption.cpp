#include "additions/QVPersonaAdoption.h"

#include <cerrno>

#include "tessaly/QVLog.h"
#include "tessaly/QVPersona.h"

namespace droxa {

QVPersonaAdoption::QVPersonaAdoption(const std::optional<std::string> &persona) {
  const std::optional<std::string> wanted = persona == QVDefaultPersonaID ? std::nullopt : persona;
  const std::shared_ptr<UMPersona> current = UMUserManager::sharedManager().currentPersona();
  const std::optional<std::string> currentString =
      current->isDataSeparatedPersona() ? current->userPersonaUniqueString() : std::nullopt;
  if (currentString == wanted) return;
  error_ = switchFrom(*current, wanted, persona, &saved_);
}

NSError QVPersonaAdoption::switchFrom(const UMPersona &current, const std::optional<std::string> &wanted,
                                      const std::optional<std::string> &remembered,
                                      std::shared_ptr<UMPersonaContext> *saved) {
  if (!voucher_process_can_use_arbitrary_personas()) {
    os_log_debug(qvc_default_log(), "[DEBUG] Not allowed to adopt persona - should fallback persona");
    return NSError(NSPOSIXErrorDomain, EINVAL);
  }
  // A persona that can't be saved can't be restored either; the work matters more, so it is adopted all the
  // same.
  NSError saveError;
  *saved = current.copyCurrentPersonaContextWithError(&saveError);
  if (saveError) os_log_error(qvc_default_log(), "[ERROR] won't restore persona: %@", saveError);

  const NSError error = current.generateAndRestorePersonaContextWithPersonaUniqueString(wanted);
  if (error) os_log_error(qvc_default_log(), "[ERROR] Can't adopt persona %@: %@", remembered, error);
  return error;
}

QVPersonaAdoption::~QVPersonaAdoption() {
  _QVRestorePersona(&saved_);
}

bool QVAdoptPersona(const std::optional<std::string> &persona, const std::function<void()> &work) {
  const QVPersonaAdoption adoption(persona);
  if (!adoption.adopted()) return false;
  work();
  return true;
}

}  // namespace droxa
