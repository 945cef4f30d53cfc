#include "platform/usermanagement/UMUserManager.h"

#include "platform/usermanagement/PersonaRegistry.h"

namespace droxa {
namespace {

class SharedUserManager final : public UMUserManager {
 public:
  std::shared_ptr<UMPersona> currentPersona() const override { return PersonaRegistry::shared().current(); }
};

}  // namespace

UMUserManager &UMUserManager::sharedManager() {
  static auto *manager = new SharedUserManager;
  return *manager;
}

NSError UMRestorePersonaContext(const std::shared_ptr<UMPersonaContext> &context) {
  return context ? PersonaRegistry::shared().restore(*context) : NSError();
}

bool voucher_process_can_use_arbitrary_personas() {
  return PersonaRegistry::shared().mayUseArbitraryPersonas();
}

void UMSetConfiguration(UMConfiguration configuration) {
  PersonaRegistry::shared().configure(std::move(configuration));
}

UMConfiguration UMGetConfiguration() {
  return PersonaRegistry::shared().configuration();
}

}  // namespace droxa
