#include "tessaly/QVPersona.h"

#include "tessaly/QVLog.h"

namespace droxa {

QVRememberBlockPersona qvc_block_remember_persona = nullptr;
QVRememberActivityPersona qvc_activity_block_remember_persona = nullptr;

namespace {

std::optional<std::string> personaID(const UMPersona &persona) {
  return persona.isDataSeparatedPersona() ? persona.userPersonaUniqueString() : QVDefaultPersonaID;
}

}  // namespace

std::optional<std::string> qv_currentPersonaIDWithIsDataSeparated(bool *isDataSeparated) {
  const std::shared_ptr<UMPersona> persona = UMUserManager::sharedManager().currentPersona();
  if (isDataSeparated) *isDataSeparated = persona->isDataSeparatedPersona();
  return personaID(*persona);
}

std::optional<std::string> qv_currentPersonaID(UMUserManager &manager) {
  return personaID(*manager.currentPersona());
}

void _QVRestorePersona(std::shared_ptr<UMPersonaContext> *saved) {  // NOLINT(bugprone-reserved-identifier)
  if (!saved || !*saved) return;
  const NSError error = UMRestorePersonaContext(*saved);
  if (error) os_log_error(qvc_default_log(), "[ERROR] can't restore the persona: %@", error);
  saved->reset();
}

}  // namespace droxa
